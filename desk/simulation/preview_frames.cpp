#include "desk/simulation/simulation.h"

#include "chart/chart_layout.h"
#include "desk/scenes/charts.h"
#include "desk/simulation/truth.h"

namespace qv {

Simulation ChartPhoto(const SimulationOptions& options);

Simulation PreviewFrames(const SimulationOptions& options) {
  Simulation s = ChartPhoto(options);
  SfrChartStyle style = options.style;
  style.module = ModuleOf(options);
  const cv::Matx33d moved = cv::Matx33d(1, 0, options.motion_px.x, 0, 1, options.motion_px.y, 0, 0, 1) *
                            PhotoFromScene(options.camera, SfrChartBounds());
  s.levels.push_back(Expose(options.camera, SfrChart(style), moved));
  s.truth["motion_px"] = ToJson(options.motion_px);
  cv::Mat difference;
  cv::absdiff(Gray(Stored(options.camera, s.levels[0])), Gray(Stored(options.camera, s.levels[1])), difference);
  s.truth["difference_mean"] = cv::mean(difference)[0] / 255;
  return s;
}

}  // namespace qv
