#include "desk/measure/areas.h"

#include <algorithm>

#include "desk/base/text.h"
#include "desk/measure/heading.h"

namespace qv {

Areas AreasOf(int count, const QVRECT* areas, const int* pixels) {
  Areas found;
  for (int i = 0; i < count; ++i) {
    const QVRECT& area = areas[i];
    found.rectangles.emplace_back(cv::Point(area.left, area.top), cv::Point(area.right + 1, area.bottom + 1));
    found.pixels.push_back(pixels[i]);
  }
  return found;
}

std::vector<Parameter> AreaParameters() {
  return {{"distance",
           Parameter::kWhole,
           "PX",
           "Areas closer than this are merged",
           nullptr,
           0,
           100'000,
           {},
           QV_PROPERTY_AREA_DISTANCE},
          {"least_pixels",
           Parameter::kWhole,
           "N",
           "Smaller areas are dropped",
           nullptr,
           0,
           1'000'000,
           {},
           QV_PROPERTY_AREA_LEAST_PIXELS}};
}

std::vector<Figure> AreaFigures(const Method& method) {
  constexpr auto kWhole = Number::kWhole;
  constexpr auto kReal = Number::kReal;
  return {{"area_count", kOne, kWhole, nullptr, method, "Areas that the dots make."},
          {"areas", kPixel, kReal, &kColumnAxis, method, "Middle of each area's rectangle, column and row."},
          {"area_pixels", kPixel, kWhole, &kAreaAxis, method, "Dots in each area."},
          {"area_width", kPixel, kWhole, &kAreaAxis, method, "Columns of each area's rectangle."},
          {"area_height", kPixel, kWhole, &kAreaAxis, method, "Rows of each area's rectangle."}};
}

void AddAreas(Phase& phase, const Areas& areas) {
  phase.Add("area_count", static_cast<double>(areas.rectangles.size()));
  std::vector<double> columns, rows, numbers, pixels, widths, heights;  // NOLINT(readability-isolate-declaration)
  for (std::size_t i = 0; i < areas.rectangles.size(); ++i) {
    const cv::Rect& area = areas.rectangles[i];
    columns.push_back(area.x + (area.width - 1) / 2.0);
    rows.push_back(area.y + (area.height - 1) / 2.0);
    numbers.push_back(static_cast<double>(i));
    pixels.push_back(areas.pixels[i]);
    widths.push_back(area.width);
    heights.push_back(area.height);
  }
  phase.Add("areas", columns, rows);
  phase.Add("area_pixels", numbers, pixels);
  phase.Add("area_width", numbers, widths);
  phase.Add("area_height", numbers, heights);
}

std::string AreaLines(const Areas& areas, const char* unit) {
  constexpr std::size_t kShown = 20;
  std::string text;
  for (std::size_t i = 0; i < std::min(areas.rectangles.size(), kShown); ++i) {
    const cv::Rect& area = areas.rectangles[i];
    text += Format("           column %d, row %d, %d x %d, %d %s\n", area.x, area.y, area.width, area.height,
                   areas.pixels[i], unit);
  }
  if (areas.rectangles.size() > kShown) {
    text += Format("           and %zu more\n", areas.rectangles.size() - kShown);
  }
  return text;
}

void DrawAreas(Picture& picture, Labels& labels, const PhotoPlace& place, const Areas& areas, const Phase& phase,
               const std::vector<Tone>& tones) {
  constexpr double kFrame = 6;  // picture pixels around an area
  constexpr std::size_t kNumbered = 200;
  constexpr std::size_t kEdged = 2000;  // more would black out the photo with their edges
  std::vector<cv::Rect2d> boxes;
  for (std::size_t i = 0; i < areas.rectangles.size(); ++i) {
    const cv::Rect& area = areas.rectangles[i];
    const cv::Point2d from = place(cv::Point2d(area.tl()) - cv::Point2d(0.5, 0.5)) - cv::Point2d(kFrame, kFrame);
    const cv::Point2d to = place(cv::Point2d(area.br()) - cv::Point2d(0.5, 0.5)) + cv::Point2d(kFrame, kFrame);
    const Tone tone = tones.empty() ? kDoubtful : tones[i];
    const std::vector<cv::Point2d> frame = {from, {to.x, from.y}, to, {from.x, to.y}};
    if (areas.rectangles.size() > kEdged) {
      picture.Line(frame, OnLabel(tone), 1, true);
    } else {
      picture.Line(frame, tone, 2, true);
    }
    boxes.emplace_back(from, to);
    if (areas.rectangles.size() <= kNumbered) labels.Keep(boxes.back());
  }
  for (std::size_t i = 0; i < boxes.size() && boxes.size() <= kNumbered; ++i) {
    PlaceWords words(std::to_string(i), tones.empty() ? kDoubtful : tones[i]);
    for (const char* figure : {"areas", "area_pixels", "area_width", "area_height"}) {
      words.AddEntry(phase.Find(figure), i);
    }
    const std::vector<std::string> lines = words.judged() ? words.Lines() : std::vector<std::string>{std::to_string(i)};
    labels.Add(picture, lines, boxes[i], words.tone(), 13);
  }
}

void DrawKey(Picture& picture, cv::Point2d place, const std::vector<std::pair<std::string, Tone>>& entries) {
  for (const auto& [name, tone] : entries) {
    picture.Line({place, place + cv::Point2d(16, 0), place + cv::Point2d(16, -12), place + cv::Point2d(0, -12)}, tone,
                 2, true);
    picture.Text(name, place + cv::Point2d(24, 0), 14, kInk);
    place.x += 44 + WidthOf(name, 14);
  }
}

}  // namespace qv
