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

/// By how much the codec of the photo's file puts each figure off, and how much of that is chance: the difference that
/// it makes to a drawn edge which lies where the photo's does, is as sharp and as noisy, and is seen in the same light.
/// Its line spread is taken for a Gaussian.
struct CodecError {
  IsoFigures mean = {}, chance = {};
};

struct IsoMtf {
  IsoFigures figures;
  std::array<IsoFigures, kBands> bands;  // the same from each quarter of the edge alone
  std::vector<double> response;          // at 0, kIsoStep, 2 kIsoStep, ... to 2 (units of Nyquist)
  double edge_angle_deg;  // of the edge from the nearer of the photo's rows and columns, -45 to 45; NaN where not found
  CodecError of_codec;
  const char* reason;  // why there is no figure, a phrase; null otherwise
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
/// @param codec    of the photo's file, of which only the uncertainty takes notice.
/// @return figures, or the reason why there are none.
/// @throws cv::Exception for another type or an empty picture.
/// Slanted edge after ISO 12233:2014 in linear light, four bins a pixel; steps: slanted_edge.cpp, iso_mtf.cpp.
IsoMtf MeasureIsoMtf(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer,
                     const CodecSteps& codec = {});

/// Of one figure, from the scatter of its bands and what the codec does to them; NaN where a band gives none.
Uncertainty UncertaintyOf(const IsoMtf& iso, double IsoFigures::*figure);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_ISO_MTF_H_
