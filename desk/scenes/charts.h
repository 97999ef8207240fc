#ifndef QVTESTER_DESK_SCENES_CHARTS_H_
#define QVTESTER_DESK_SCENES_CHARTS_H_

#include <opencv2/core.hpp>

#include "desk/scenes/scene.h"

namespace qv {

struct SfrChartStyle {
  double edge_angle_deg = 5;
  int module = 25;      // of the finder marks, chart units
  double contrast = 5;  // stored level of the paper over that of the dark side of the edges
};

/// What a contrast of stored levels is of light.
double LightContrast(double contrast);

/// The sharpness chart, in chart units (chart/chart_layout.h).
Scene SfrChart(const SfrChartStyle& style);

/// What of the sharpness chart must be in view, in chart units.
cv::Rect2d SfrChartBounds();

/// The three marks alone, large, for aiming a preview at; in chart units, with bounds as the sharpness chart's.
Scene AimingTarget();

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_CHARTS_H_
