#ifndef QVTESTER_ISO_MTF_H_
#define QVTESTER_ISO_MTF_H_

#include <array>
#include <opencv2/core.hpp>

#include "qvtester/indices.h"

// The sharpness figure of ISO 12233 as it is usually taken. It stands beside the tests' own figure, which limits refer
// to, and has no part in it.

struct QVIsoMtf {
  double mtf50;           // units of Nyquist (1.0 = 0.5 cycles/pixel) along the edge's normal; NaN where there is none
  double edge_angle_deg;  // of the edge from the nearer of the photo's rows and columns, -45 to 45; NaN where not found
  const char* reason;     // why there is no figure, a phrase; null otherwise
};

/// MTF50 of one slanted edge of a photo as it was taken, whatever the region's turn in it: nothing is resampled.
///
/// @param gray     rows x cols, CV_8UC1, CV_16UC1 or CV_32FC1.
/// @param corners  of a rectangle, in order around it: column and row, pixel centres at whole numbers. The edge runs
///                 along its longer sides, from one shorter side to the other; pixels outside the photo are left out.
/// @param[out] result  figure, or the reason why there is none.
/// @return 1, -97 without a result, -95 for another type or an empty picture, -99 when memory runs out; `result` is
///         set with 1 only.
/// Slanted edge after ISO 12233, four bins a pixel; steps and corrections: sharpness/iso_mtf.cpp.
QV_API int MeasureIsoMtf50(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, QVIsoMtf* result);

#endif  // QVTESTER_ISO_MTF_H_
