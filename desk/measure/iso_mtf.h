#ifndef QVTESTER_DESK_MEASURE_ISO_MTF_H_
#define QVTESTER_DESK_MEASURE_ISO_MTF_H_

#include <array>
#include <opencv2/core.hpp>

// The sharpness figure of ISO 12233 as it is usually taken. It stands beside the tests' own figure, which limits refer
// to, and has no part in it.

namespace qv {

struct IsoMtf {
  double mtf50;           // units of Nyquist (1.0 = 0.5 cycles/pixel) along the edge's normal; NaN where there is none
  double edge_angle_deg;  // of the edge from the nearer of the photo's rows and columns, -45 to 45; NaN where not found
  const char* reason;     // why there is no figure, a phrase; null otherwise
};

/// MTF50 of one slanted edge of a photo as it was taken, whatever the region's turn in it: nothing is resampled.
///
/// @param gray     rows x cols, CV_8UC1, CV_16UC1 or CV_32FC1.
/// @param corners  of a rectangle, in order around it: column and row, pixel centres at whole numbers. The edge runs
///                 along its longer sides, from one shorter side to the other; pixels outside the photo are left out.
/// @return figure, or the reason why there is none.
/// @throws cv::Exception for another type or an empty picture.
/// Slanted edge after ISO 12233, four bins a pixel; steps and corrections: desk/measure/iso_mtf.cpp.
IsoMtf MeasureIsoMtf(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_ISO_MTF_H_
