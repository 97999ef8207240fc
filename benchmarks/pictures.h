#ifndef QVTESTER_BENCHMARKS_PICTURES_H_
#define QVTESTER_BENCHMARKS_PICTURES_H_

#include <opencv2/core.hpp>

// Inputs that benchmarks share, each made when first asked for.

/// Photo of the sharpness chart, 4000 x 3000, CV_8UC3: blurred by one pixel, a little noise, turned counter-clockwise.
const cv::Mat& ChartPhoto(double turn_deg = 0);

/// A slanted edge of 5 degrees, rows x cols, CV_32F with whole grey levels, a little noise.
cv::Mat EdgeRegion(int cols, int rows);

#endif  // QVTESTER_BENCHMARKS_PICTURES_H_
