#include "desk/simulation/simulation.h"

#include "chart/chart_layout.h"
#include "desk/scenes/charts.h"
#include "desk/simulation/truth.h"

namespace qv {

Simulation TargetPhoto(const SimulationOptions& options) {
  const cv::Matx33d map = PhotoFromScene(options.camera, SfrChartBounds());
  Simulation s;
  s.levels = {Expose(options.camera, AimingTarget(), map)};
  s.truth.update(MarkTruth(options.camera, map, kMarkSizes.back().module));
  return s;
}

}  // namespace qv
