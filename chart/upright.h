#ifndef QVTESTER_CHART_UPRIGHT_H_
#define QVTESTER_CHART_UPRIGHT_H_

#include <vector>

#include "qvtester/tester.h"

/// GetPatternAngle of an upright chart, degrees.
inline constexpr float kUprightAngle = 315.0f;

/// The turn of a picture of this size, by the chart's angle (QVTester::GetPatternAngle).
UprightTurn TurnUpright(cv::Size picture, float pattern_angle);

/// Whether the turn is by exactly 0 degrees and leaves the picture's pixels as they are: pixels times 0 add nothing,
/// and cv::warpAffine would take the picture.
bool LeavesPixels(const UprightTurn& turn, const cv::Mat& picture);

/// Carries three marks along, to whole pixels of the canvas; rows in x, columns in y.
void CarryMarks(const UprightTurn& turn, std::vector<cv::Point>& marks);

#endif  // QVTESTER_CHART_UPRIGHT_H_
