#ifndef QVTESTER_DESK_MEASURE_SHARPNESS_H_
#define QVTESTER_DESK_MEASURE_SHARPNESS_H_

#include <array>
#include <memory>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/measure/chart_view.h"
#include "desk/measure/measurement.h"
#include "desk/measure/record.h"

namespace qv {

// What the two measurements of a chart photo's sharpness share.

inline constexpr std::array<const char*, 2> kRegionNames = {"vertical", "horizontal"};

/// The test's own figures, slanted edge as it is fixed.
extern const Method kSfrMethod;

/// A measured region: where it lies on the photo (column and row, from top left clockwise) and the upright pixels that
/// were measured, CV_8UC1.
struct SharpnessRegion {
  std::array<cv::Point2d, 4> outline;
  cv::Mat pixels;
};

class SharpnessFinding : public Finding {
 public:
  std::string Report(const Record& record) const override;
  std::optional<Picture> Draw(const Record& record) const override;

  ChartView view;
  std::vector<SharpnessRegion> regions;  // vertical, horizontal; none after a miss
  cv::Mat photo;
};

/// The photo to be measured.
InputSpec SharpnessInput();
std::vector<Parameter> SharpnessParameters();
/// MTF50 by the test and by ISO 12233, then `more`, then what was seen of the chart.
std::vector<Figure> SharpnessFigures(const std::vector<Figure>& more = {});

/// The test's own MTF50 of a region as it is, CV_8UC1 or CV_32FC1 in grey levels; NaN where the test has none.
double ReadOwnMtf50(QVTester& tester, const cv::Mat& pixels);

/// What the test's own figures would be of good light and without noise.
std::vector<Figure> DoubtFigures();
/// Adds these figures, and a doubt for each of the test's own figures that something in the photo has made wrong.
void DoubtSharpness(Record& record, const SharpnessFinding& finding);

/// What follows the measure itself, whatever its code: the chart's figures, those by ISO 12233, and doubts.
std::unique_ptr<Finding> LookAtSharpness(const QVTester& tester, Record& record);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_SHARPNESS_H_
