#include "desk/scenes/charts.h"

#include "chart/chart_layout.h"

namespace qv {

namespace {

constexpr double kPatchFrame = 10;  // chart units

void AddMark(Scene& scene, cv::Point2d centre, double module) {
  scene.shapes.push_back(Square(centre, 3.5 * module, Grey(0)));
  scene.shapes.push_back(Square(centre, 2.5 * module, scene.paper));
  scene.shapes.push_back(Square(centre, 1.5 * module, Grey(0)));
}

}  // namespace

double LightContrast(double contrast) { return 255 / LightOf(255 / contrast); }

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

}  // namespace qv
