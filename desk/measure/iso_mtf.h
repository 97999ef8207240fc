#ifndef QVTESTER_DESK_MEASURE_ISO_MTF_H_
#define QVTESTER_DESK_MEASURE_ISO_MTF_H_

#include <array>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/codec_steps.h"
#include "desk/measure/slanted_edge.h"
#include "desk/measure/transfer.h"
#include "desk/measure/uncertainty.h"

// Sharpness by ISO 12233. These figures stand beside the tests' own, which limits refer to, and have no part in them.

namespace qv {

/// Frequencies in units of Nyquist (1.0 = 0.5 cycles/pixel) along the edge's normal. Each is NaN where there is none.
struct IsoFigures {
  double mtf50, mtf30, mtf10;  // the lowest frequency at which the response falls to this many hundredths
  double mtf50p;               // and to half of its peak, from the peak on
  double peak;                 // highest response; 1 where it only falls
  double edge_width;           // pixels in which the edge rises from 10 to 90 % of its step
  double overshoot;            // of the edge beyond its plateaus, the larger of both sides, share of the step
};

struct IsoMtf {
  IsoFigures figures;
  std::array<IsoFigures, kBands> bands;  // the same from each quarter of the edge alone
  std::vector<double> response;          // at 0, kIsoStep, 2 kIsoStep, ... to 2 (units of Nyquist)
  double edge_angle_deg;  // of the edge from the nearer of the photo's rows and columns, -45 to 45; NaN where not found
  const char* reason;     // why there is no figure, a phrase; null otherwise
};

inline constexpr double kIsoStep = 0.02;

/// From here on an edge is said to have been sharpened in the camera.
inline constexpr double kSharpenedPeak = 1.05;
inline constexpr double kSharpenedOvershoot = 0.05;

/// Figures of one slanted edge of a photo as it was taken, whatever the region's turn in it: nothing is resampled.
///
/// @param gray     rows x cols, CV_8UC1, CV_16UC1 or CV_32FC1.
/// @param corners  of a rectangle, in order around it: column and row, pixel centres at whole numbers. The edge runs
///                 along its longer sides, from one shorter side to the other; pixels outside the photo are left out.
/// @return figures, or the reason why there are none.
/// @throws cv::Exception for another type or an empty picture.
/// Slanted edge after ISO 12233:2014 in linear light, four bins a pixel; steps: slanted_edge.cpp, iso_mtf.cpp.
IsoMtf MeasureIsoMtf(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer);

/// The figures alone, of a photo whose file's codec is let loose on the region once more.
IsoFigures MeasureCodedAgain(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer,
                             const CodecSteps& codec);

/// Of one figure, from the scatter of its bands; NaN where a band gives none.
///
/// @param again  the same from a photo that went through its file's codec once more: what that does to a figure, it
///               has done before. Null for a file that keeps all.
Uncertainty UncertaintyOf(const IsoMtf& iso, double IsoFigures::*figure, const IsoFigures* again = nullptr);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_ISO_MTF_H_
