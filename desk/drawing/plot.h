#ifndef QVTESTER_DESK_DRAWING_PLOT_H_
#define QVTESTER_DESK_DRAWING_PLOT_H_

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/drawing/picture.h"

namespace qv {

/// One curve in a frame with axes.
struct Plot {
  std::string title, x_label, y_label;
  double x_max = 1, y_min = 0, y_max = 1;  // the x axis starts at 0
  std::string second_x_label;              // above the frame, empty for none
  double second_x_factor = 1;              // second axis = first x factor
  std::vector<cv::Point2d> curve;
  std::vector<cv::Point2d> second_curve;
  struct Curve {
    std::vector<cv::Point2d> points;  // one that is not finite breaks the curve
    Colour colour;
    bool dots = true;
  };
  std::vector<Curve> more_curves;
  bool bars = false;  // the curve as bars
  std::vector<double> horizontal_lines;
  struct Marker {
    cv::Point2d at;
    std::string text;
    Colour colour;
  };
  std::vector<Marker> markers;
};

/// Draws the plot into this frame, axis labels included.
void DrawPlot(Picture& picture, const Plot& plot, const cv::Rect2d& area);

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_PLOT_H_
