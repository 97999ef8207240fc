#ifndef QVTESTER_CHART_POINTS_H_
#define QVTESTER_CHART_POINTS_H_

#include <cmath>
#include <opencv2/core.hpp>

/// Marks on a chart; every measure needs as many.
inline constexpr std::size_t kMarks = 3;

/// Euclidean distance in double precision.
inline double Distance(cv::Point a, cv::Point b) {
  const double dx = static_cast<double>(a.x) - b.x;
  const double dy = static_cast<double>(a.y) - b.y;
  return std::sqrt(dx * dx + dy * dy);
}

#endif  // QVTESTER_CHART_POINTS_H_
