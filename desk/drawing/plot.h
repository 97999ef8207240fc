#ifndef QVTESTER_DESK_DRAWING_PLOT_H_
#define QVTESTER_DESK_DRAWING_PLOT_H_

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/drawing/picture.h"

namespace qv {

/// Curves in a frame with axes, and a legend below it.
struct Plot {
  std::string title, x_label, y_label;
  double x_max = 1, y_min = 0, y_max = 1;  // the x axis starts at 0
  std::string second_x_label;              // above the frame, empty for none
  double second_x_factor = 1;              // second axis = first x factor
  struct Curve {
    std::string name;                 // in the legend; nothing for a part of the curve before
    std::vector<cv::Point2d> points;  // one that is not finite breaks the curve
    Series series = kSeries[0];
    bool bars = false;                  // from the axis up, in place of a line
    std::vector<cv::Vec2d> spans = {};  // low and high about each point; none, or one each
    double shift_px = 0;                // so that the bars of several curves stand side by side
    bool ends_only = false;             // no spots but at points that stand alone
  };
  std::vector<Curve> curves;
  struct Level {
    double at;
    std::string name;  // in the legend
    bool upright = false;
    Tone tone = kInk;
    Dash dash = Dash::kDashed;
  };
  std::vector<Level> levels;  // lines across the frame: limits and the like
  struct Marker {
    cv::Point2d at;
    std::string text;
    Tone tone;
  };
  std::vector<Marker> markers;
};

/// Draws the plot into this area, labels and legend included.
void DrawPlot(Picture& picture, const Plot& plot, const cv::Rect2d& area);

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_PLOT_H_
