#ifndef QVTESTER_DESK_SCENES_CHART_SHEET_H_
#define QVTESTER_DESK_SCENES_CHART_SHEET_H_

#include <cairo.h>

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/scenes/charts.h"
#include "desk/scenes/scene.h"

namespace qv {

// The test charts as sheets of paper: laid out and drawn once, in millimetres, whatever file they go to.

struct SheetOptions {
  std::string kind = "sfr";
  std::string paper = "A4";  // a name, or WIDTHxHEIGHT in mm
  double margin_mm = 10;
  std::string marks = "fine";
  SfrChartStyle style;
};

struct ChartSheet {
  cv::Size2d paper_mm;
  Scene chart;
  cv::Matx33d mm_from_chart;
  cv::Rect2d label_mm;             // the strip below the chart: ruler, facts and the QR code that repeats them
  std::vector<std::string> facts;  // printed, a line each
};

/// Names of the kinds, for help and checks.
std::vector<std::string> SheetKinds();

/// Turns the paper so that the chart comes out largest; throws Failure (wrong usage) when it has no room.
ChartSheet LayOut(const SheetOptions& options);

/// Draws the sheet; the target's unit is the millimetre, its origin the paper's top left corner.
void Draw(cairo_t* cr, const ChartSheet& sheet);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_CHART_SHEET_H_
