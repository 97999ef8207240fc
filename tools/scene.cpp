#include "tools/scene.h"

#include <algorithm>
#include <cmath>

#include "chart/chart_layout.h"

namespace {

constexpr double kPatchFrame = 10;  // chart units

FilledShape Square(cv::Point2d centre, double half, cv::Vec3d colour) {
  return {{centre + cv::Point2d(-half, -half), centre + cv::Point2d(half, -half), centre + cv::Point2d(half, half),
           centre + cv::Point2d(-half, half)},
          colour};
}

cv::Vec3d Grey(double level) { return {level, level, level}; }

void AddMark(Scene& scene, cv::Point2d centre, double module) {
  scene.shapes.push_back(Square(centre, 3.5 * module, Grey(0)));
  scene.shapes.push_back(Square(centre, 2.5 * module, scene.paper));
  scene.shapes.push_back(Square(centre, 1.5 * module, Grey(0)));
}

}  // namespace

Scene SfrChart(const SfrChartStyle& style) {
  Scene scene;
  for (const auto& [x, y] : kMarkCentres) {
    AddMark(scene, {static_cast<double>(x), static_cast<double>(y)}, style.module);
  }
  for (int i = 0; i < static_cast<int>(kPatches.size()); ++i) {
    const ChartPatch& patch = kPatches[i];
    scene.shapes.push_back(Square(PatchCentre(i), kPatchHalf, Grey(185)));  // shows where the white one is
    scene.shapes.push_back(
        Square(PatchCentre(i), kPatchHalf - kPatchFrame, cv::Vec3d(patch.red, patch.green, patch.blue)));
  }
  const auto target = EdgeTarget(style.edge_angle_deg);
  scene.shapes.push_back({{target.begin(), target.end()}, Grey(255 / style.contrast)});
  return scene;
}

cv::Rect2d SfrChartBounds() {
  return {-kPatchHalf, -kPatchHalf, kChartSide + 2 * kPatchHalf, kChartSide + 2 * kPatchHalf};
}

Scene AimingTarget() {
  Scene scene;
  for (const auto& [x, y] : kMarkCentres) {
    AddMark(scene, {static_cast<double>(x), static_cast<double>(y)}, kMarkSizes.back().module);
  }
  return scene;
}

Scene DustyTarget(const std::vector<DustSpeck>& specks, double darkness) {
  constexpr int kCorners = 96;
  Scene scene;
  for (const DustSpeck& speck : specks) {
    FilledShape disc = {{}, Grey(255 * (1 - darkness))};
    for (int i = 0; i < kCorners; ++i) {
      const double angle = 2 * CV_PI * i / kCorners;
      disc.outline.push_back(speck.centre + cv::Point2d(std::cos(angle), std::sin(angle)) * (speck.diameter_px / 2));
    }
    scene.shapes.push_back(disc);
  }
  return scene;
}

Scene TexturedScene(double side, std::uint64_t seed) {
  constexpr int kShapes = 900;
  constexpr int kCorners = 5;
  cv::RNG random(seed);
  Scene scene;
  for (int i = 0; i < kShapes; ++i) {
    const cv::Point2d centre(random.uniform(0.0, side), random.uniform(0.0, side));
    std::vector<double> directions;
    for (int k = 0; k < kCorners; ++k) directions.push_back(random.uniform(0.0, 2 * CV_PI));
    std::sort(directions.begin(), directions.end());
    FilledShape shape = {{}, Grey(random.uniform(0.0, 255.0))};
    for (const double direction : directions) {
      const double reach = random.uniform(0.015, 0.06) * side;
      shape.outline.push_back(centre + reach * cv::Point2d(std::cos(direction), std::sin(direction)));
    }
    scene.shapes.push_back(shape);
  }
  return scene;
}

cv::Point2d Map(const cv::Matx33d& transform, cv::Point2d point) {
  const cv::Vec3d p = transform * cv::Vec3d(point.x, point.y, 1);
  return {p[0] / p[2], p[1] / p[2]};
}

void Fill(cairo_t* cr, const Scene& scene, const cv::Matx33d& to_target) {
  for (const FilledShape& shape : scene.shapes) {
    for (const cv::Point2d& corner : shape.outline) {
      const cv::Point2d p = Map(to_target, corner);
      cairo_line_to(cr, p.x, p.y);
    }
    cairo_close_path(cr);
    cairo_set_source_rgb(cr, shape.colour[0] / 255, shape.colour[1] / 255, shape.colour[2] / 255);
    cairo_fill(cr);
  }
}
