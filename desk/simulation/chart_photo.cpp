#include "desk/simulation/simulation.h"

#include "chart/chart_layout.h"
#include "desk/scenes/charts.h"
#include "desk/simulation/truth.h"

namespace qv {

Simulation ChartPhoto(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  SfrChartStyle style = options.style;
  style.module = ModuleOf(options);
  const cv::Matx33d map = PhotoFromScene(camera, SfrChartBounds());
  Simulation s;
  s.levels = {Expose(camera, SfrChart(style), map)};

  const double scale = PixelsPerUnit(map);
  const int npix = static_cast<int>(kVerticalRegion.height * scale);
  const auto target = EdgeTarget(style.edge_angle_deg);
  s.truth["edge_angle_deg"] = style.edge_angle_deg;
  s.truth["contrast"] = style.contrast;
  s.truth["contrast_in_light"] = LightContrast(style.contrast);
  s.truth["module_units"] = style.module;
  s.truth["pixels_per_unit"] = scale;
  s.truth["npix"] = npix;
  s.truth.update(MarkTruth(camera, map, style.module));
  s.truth["mtf50"] = {
      {"vertical", EdgeTruth(camera, Seen(camera, map, target[0]), Seen(camera, map, target[1]), npix, style.contrast)},
      {"horizontal",
       EdgeTruth(camera, Seen(camera, map, target[0]), Seen(camera, map, target[3]), npix, style.contrast)}};
  s.truth["patches"] = PatchTruth(camera, map);
  s.truth["flash_mean"] = cv::mean(Stored(camera, s.levels[0]))[0];
  return s;
}

}  // namespace qv
