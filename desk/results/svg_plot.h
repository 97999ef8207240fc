#ifndef QVTESTER_DESK_RESULTS_SVG_PLOT_H_
#define QVTESTER_DESK_RESULTS_SVG_PLOT_H_

#include <string>
#include <utility>
#include <vector>

// Plots for documents: SVG without script or outside references, told apart by dashes as well as by colour.

namespace qv {

struct SvgSeries {
  std::string name;
  std::vector<std::pair<double, double>> points;  // a point that is not finite ends a stroke
  int style = 0;                                  // colour and dashes, 0 to 3
  bool bars = false;                              // from zero, as wide as the first two are apart
};

struct SvgPanel {
  std::string title, x_label, y_label;
  std::vector<SvgSeries> series;
  std::vector<std::pair<double, std::string>> lines;  // upright, with their words
};

/// The panels one below the other.
std::string SvgDocument(const std::vector<SvgPanel>& panels);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_SVG_PLOT_H_
