#include "desk/scenes/print.h"

#include <algorithm>
#include <cmath>

namespace qv {

namespace {

constexpr int kColumns = 8;
constexpr int kRows = 6;
constexpr double kCell = 100;  // print units, one sign in each
constexpr double kReach = 40;  // of a sign from its cell's middle
constexpr double kThinnest = 9;
constexpr double kThickest = 20;

using Outline = std::vector<cv::Point2d>;

Outline Bar(cv::Point2d from, cv::Point2d to, double thickness) {
  const cv::Point2d along = (to - from) / cv::norm(to - from) * (thickness / 2);
  const cv::Point2d across(-along.y, along.x);
  return {from - along + across, to + along + across, to + along - across, from - along - across};
}

// Bars from point to point.
std::vector<Outline> Strokes(cv::Point2d middle, cv::RNG& random) {
  const double thickness = random.uniform(kThinnest, kThickest);
  const auto place = [&] {
    const double reach = kReach - thickness / 2;
    const double x = random.uniform(-reach, reach);
    const double y = random.uniform(-reach, reach);
    return middle + cv::Point2d(x, y);
  };
  std::vector<Outline> bars;
  cv::Point2d from = place();
  for (int i = 0, count = random.uniform(2, 5); i < count;) {
    const cv::Point2d to = place();
    if (cv::norm(to - from) < kReach / 2) continue;
    bars.push_back(Bar(from, to, thickness));
    from = to;
    ++i;
  }
  return bars;
}

Outline Blot(cv::Point2d middle, cv::RNG& random) {
  std::vector<double> directions;
  for (int i = 0, count = random.uniform(4, 8); i < count; ++i) directions.push_back(random.uniform(0.0, 2 * CV_PI));
  std::sort(directions.begin(), directions.end());
  Outline outline;
  for (const double direction : directions) {
    outline.push_back(middle +
                      random.uniform(0.5, 1.0) * kReach * cv::Point2d(std::cos(direction), std::sin(direction)));
  }
  return outline;
}

}  // namespace

cv::Rect2d PrintBounds() { return {0, 0, kColumns * kCell, kRows * kCell}; }

Scene Print(const PrintStyle& style) {
  cv::RNG random(style.seed);
  Scene scene;
  scene.paper = Grey(style.ground);
  for (int row = 0; row < kRows; ++row) {
    for (int column = 0; column < kColumns; ++column) {
      const cv::Point2d middle((column + 0.5) * kCell, (row + 0.5) * kCell);
      const bool is_blot = random.uniform(0, 2) == 0;
      const std::vector<Outline> sign = is_blot ? std::vector<Outline>{Blot(middle, random)} : Strokes(middle, random);
      for (const Outline& outline : sign) scene.shapes.push_back({outline, Grey(style.ink)});
    }
  }
  for (const PrintStyle::Defect& defect : style.defects) {
    const double from = defect.missing ? style.ink : style.ground;
    const double to = defect.missing ? style.ground : style.ink;
    const double level = from + (to - from) * style.defect_contrast;
    scene.shapes.push_back(Square(defect.middle, defect.side / 2, Grey(level)));
  }
  return scene;
}

}  // namespace qv
