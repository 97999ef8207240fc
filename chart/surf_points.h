#ifndef QVTESTER_CHART_SURF_POINTS_H_
#define QVTESTER_CHART_SURF_POINTS_H_

#include <opencv2/core.hpp>
#include <vector>

#include "chart/surf_sums.h"

/// Where the determinant of the Hessian is largest among its neighbours in place and scale.
struct SurfPoint {
  cv::Point2d center;  // column and row
  double scale;
  double score;
};

/// The smallest scale that is looked for.
inline constexpr double kSmallestSurfScale = 3.2;

/// Points whose centre lies in `inside`, in order of octave, interval, row and column.
std::vector<SurfPoint> FindSurfPoints(const SurfSums& sums, const cv::Rect& inside);

#endif  // QVTESTER_CHART_SURF_POINTS_H_
