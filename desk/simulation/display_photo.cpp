#include "desk/simulation/simulation.h"

#include <algorithm>
#include <cmath>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/simulation/truth.h"

namespace qv {

namespace {

// Apart from each other, from the rim and from the places where bars meet.
std::vector<cv::Point2d> PlaceDefects(const DisplayStyle& style, int count, std::uint64_t seed) {
  const cv::Rect2d screen = ScreenBounds(style);
  const double rim = 0.06 * std::min(screen.width, screen.height) + style.defect_side;
  cv::RNG random(seed + 12345);
  std::vector<cv::Point2d> places;
  for (int tries = 0; static_cast<int>(places.size()) < count && tries < 1000 * count; ++tries) {
    const double x = random.uniform(rim, screen.width - rim);
    const double y = random.uniform(rim, screen.height - rim);
    const cv::Point2d at(x, y);
    const double in_bar = std::fmod(at.x, screen.width / 4);
    const bool free = std::none_of(places.begin(), places.end(), [&](cv::Point2d other) {
      return cv::norm(other - at) < 6 * style.defect_side + 40;
    });
    if (free && in_bar > rim && in_bar < screen.width / 4 - rim) places.push_back(at);
  }
  if (static_cast<int>(places.size()) < count) {
    throw Failure(kWrongUsage, Format("--defects %d: only %zu have room on the screen", count, places.size()));
  }
  return places;
}

// The screen's first corner is darker by a share that falls off with the distance.
void DimCorner(cv::Mat& levels, const cv::Matx33d& photo_from_scene, const cv::Rect2d& screen, double share) {
  const cv::Matx33d scene_from_photo = photo_from_scene.inv();
  for (int row = 0; row < levels.rows; ++row) {
    for (int column = 0; column < levels.cols; ++column) {
      const cv::Point2d at = Map(scene_from_photo, cv::Point2d(column, row));
      if (!screen.contains(at)) continue;
      const double away = cv::norm(at) / (0.35 * screen.width);
      levels.at<cv::Vec3f>(row, column) *= static_cast<float>(1 - share * std::exp(-away * away));
    }
  }
}

}  // namespace

Simulation DisplayPhoto(const SimulationOptions& options) {
  DisplayStyle style = options.display;
  if (style.defects.empty()) style.defects = PlaceDefects(style, options.defects, options.camera.seed);
  const cv::Rect2d screen = ScreenBounds(style);
  const cv::Matx33d map = PhotoFromScene(options.camera, screen);
  Simulation s;
  s.levels = {Expose(options.camera, Display(style), map)};
  if (options.dim_corner > 0) DimCorner(s.levels[0], map, screen, options.dim_corner);

  const cv::Point2d across(screen.width, 0);
  s.truth["pattern"] = style.pattern;
  s.truth["ratio"] = style.ratio;
  s.truth["corners"] = Json::array();  // clockwise, from the screen's own first corner
  for (const cv::Point2d corner : {screen.tl(), screen.tl() + across, screen.br(), screen.br() - across}) {
    s.truth["corners"].push_back(ToJson(Seen(options.camera, map, corner)));
  }
  s.truth["defects"] = Json::array();
  for (const cv::Point2d at : style.defects) {
    Json defect = ToJson(Seen(options.camera, map, at));
    defect["across"] = at.x / screen.width;
    defect["down"] = at.y / screen.height;
    s.truth["defects"].push_back(defect);
  }
  s.truth["dim_corner"] = options.dim_corner;
  s.truth["tint"] = {style.tint[0], style.tint[1], style.tint[2]};
  return s;
}

}  // namespace qv
