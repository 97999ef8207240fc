#ifndef QVTESTER_DESK_MEASURE_CHART_VIEW_H_
#define QVTESTER_DESK_MEASURE_CHART_VIEW_H_

#include <array>
#include <opencv2/core.hpp>
#include <optional>
#include <string>
#include <vector>

#include "desk/drawing/labels.h"
#include "desk/drawing/picture.h"
#include "desk/measure/legs.h"
#include "desk/measure/measurement.h"
#include "desk/measure/miss.h"
#include "desk/measure/record.h"
#include "qvtester/tester.h"

namespace qv {

// What a search for finder marks saw of a chart photo, told to people.

struct ChartView {
  std::vector<Mark> marks;      // with three: corner, second, third; otherwise the candidates, in the order found
  int candidates = 0;           // before the best three were chosen
  int threshold = 0;            // grey level
  std::optional<Miss> miss;     // after DescribeChart, without three marks
  Legs legs;                    // the rest only with three marks
  double turn_deg = 0;          // of the first leg, counter-clockwise
  int straightened_by_deg = 0;  // clockwise, whole degrees, as the measures turn the photo

  bool plausible() const { return legs.plausible(); }
  bool complete() const { return marks.size() == 3; }
};

/// What a search has found, in photo coordinates.
ChartView LookAtChart(const FoundChart& found);

/// Looks at what a test has found on this photo: adds its figures to the record, and a remark about a miss, a doubtful
/// find or more candidates than marks. `threshold_property` is the one that the test's search read.
ChartView DescribeChart(Record& record, const FoundChart& found, const std::string& photo_path, const cv::Mat& photo,
                        QV_PROPERTY_INDEX threshold_property = QV_PROPERTY_BINARY_THR_WORKING);

/// How the marks are found.
extern const Method kScanMethod;

/// A doubt where the chart is seen obliquely: what is looked for on a square lies beside its place then.
///
/// @param parts         of the chart that are measured: "patches".
/// @param most_oblique  how far the legs' ratio may be from 1.
void DoubtView(Record& record, const ChartView& view, const std::string& photo_path, const char* parts,
               double most_oblique);

/// Doubts where three marks don't lie as a chart's, or the chart is seen in a mirror.
void DoubtMarks(Record& record, const FoundChart& found, const ChartView& view, const std::string& photo_path);

/// The figures that DescribeChart adds.
const std::vector<Figure>& ChartFigures();

/// The threshold of the marks' search, as all measurements that look for the chart offer it.
Parameter ThresholdParameter();

/// "marks ..." and "chart ..." lines for a person.
std::string ReportChart(const ChartView& view);

/// Rings and numbers the marks: good, or doubtful ones in words. Of a miss what was found, the nearest candidates with
/// the check that each fails, and what another threshold, or a changed photo, shows. The chart's patches are kept free.
void DrawMarks(Picture& picture, Labels& labels, const ChartView& view, const PhotoPlace& place);

/// Corners of a rectangle of the upright picture where they lie on the photo: column and row, from top left clockwise.
std::array<cv::Point2d, 4> OnPhoto(const FoundChart& found, const cv::Rect& region);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CHART_VIEW_H_
