#include "desk/simulation/simulation.h"

#include <algorithm>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/simulation/truth.h"

namespace qv {

namespace {

// Where ink (or, else, ground) reaches so far to every side: CV_8UC1, a pixel a print unit.
cv::Mat RoomFor(const PrintStyle& style, double reach, bool ink) {
  const cv::Rect2d bounds = PrintBounds();
  cv::Mat place(cvRound(bounds.height), cvRound(bounds.width), CV_8U, cv::Scalar(ink ? 0 : 1));
  for (const FilledShape& shape : Print(style).shapes) {
    std::vector<cv::Point> outline(shape.outline.begin(), shape.outline.end());
    cv::fillPoly(place, std::vector{outline}, cv::Scalar(ink ? 1 : 0));
  }
  const int side = 2 * static_cast<int>(std::ceil(reach)) + 1;
  cv::erode(place, place, cv::Mat::ones(side, side, CV_8U), {-1, -1}, 1, cv::BORDER_CONSTANT, cv::Scalar(0));
  return place;
}

// Missing ones where there is ink, extra ones where there is none, apart from each other.
std::vector<PrintStyle::Defect> PlaceDefects(const SimulationOptions& options, double side) {
  constexpr double kMargin = 3;  // print units to the nearest edge of ink
  cv::RNG random(options.camera.seed + 12345);
  std::vector<PrintStyle::Defect> defects;
  for (const bool missing : {true, false}) {
    const cv::Mat room = RoomFor(options.print, side / 2 + kMargin, missing);
    const int wanted = missing ? options.missing : options.extra;
    int placed = 0;
    for (int tries = 0; placed < wanted && tries < 100'000; ++tries) {
      const int x = random.uniform(0, room.cols);
      const int y = random.uniform(0, room.rows);
      const cv::Point at(x, y);
      const bool free = std::none_of(defects.begin(), defects.end(), [&](const PrintStyle::Defect& other) {
        return cv::norm(other.middle - cv::Point2d(at)) < 2 * side + 30;
      });
      if (room.at<unsigned char>(at) == 0 || !free) continue;
      defects.push_back({at, side, missing});
      ++placed;
    }
    if (placed < wanted) {
      throw Failure(kWrongUsage, Format("%s %d: only %d of that size have room on the print",
                                        missing ? "--missing" : "--extra", wanted, placed));
    }
  }
  return defects;
}

cv::Matx33d MoveAbout(cv::Point2d middle, double turn_deg, double scale, cv::Point2d shift) {
  const double turn = turn_deg * CV_PI / 180;
  const double c = scale * std::cos(turn);
  const double s = scale * std::sin(turn);
  const cv::Point2d to = middle + shift;
  return {c, s, to.x - c * middle.x - s * middle.y, -s, c, to.y + s * middle.x - c * middle.y, 0, 0, 1};
}

// Good prints differ a little: in place, turn, size, ink and sharpness; the first is as it was drawn.
cv::Mat Sample(const SimulationOptions& options, int number, const cv::Matx33d& map, cv::Point2d middle) {
  cv::RNG random(options.camera.seed + 777 + static_cast<std::uint64_t>(number));
  PrintStyle style = options.print;
  CameraModel camera = options.camera;
  cv::Matx33d move = cv::Matx33d::eye();
  if (number > 0) {
    const double turn_deg = random.uniform(-0.5, 0.5);
    const double scale = random.uniform(0.995, 1.005);
    const double x = random.uniform(-2.0, 2.0);
    const double y = random.uniform(-2.0, 2.0);
    move = MoveAbout(middle, turn_deg, scale, {x, y});
    style.ink += random.uniform(-15.0, 15.0);
    camera.blur_px *= random.uniform(0.85, 1.15);
  }
  return Expose(camera, Print(style), move * map);
}

}  // namespace

Simulation PrintPhoto(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  const cv::Matx33d map = PhotoFromScene(camera, PrintBounds());
  const cv::Point2d middle((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  const cv::Matx33d move = MoveAbout(middle, options.second_turn_deg, options.second_scale, options.motion_px);
  const double unit_px = cv::norm(Map(map, {1, 0}) - Map(map, {0, 0}));

  PrintStyle style = options.print;
  style.defects = PlaceDefects(options, options.print_defect_px / unit_px);
  Simulation s;
  s.levels = {Expose(camera, Print(style), move * map)};
  for (int i = 0; i < options.samples; ++i) {
    s.levels.push_back(Sample(options, i, map, middle));
    s.names.push_back(Format("samples/%02d", i));
  }
  s.truth["matrix"] = {move(0, 0), move(0, 1), move(0, 2), move(1, 0), move(1, 1), move(1, 2)};
  s.truth["samples"] = options.samples;
  s.truth["defect_contrast"] = style.defect_contrast;
  s.truth["defects"] = Json::array();
  for (const PrintStyle::Defect& defect : style.defects) {
    Json json = ToJson(Seen(camera, map, defect.middle));
    json["side_px"] = options.print_defect_px;
    json["kind"] = defect.missing ? "missing" : "extra";
    s.truth["defects"].push_back(json);
  }
  return s;
}

}  // namespace qv
