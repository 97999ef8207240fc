#ifndef QVTESTER_DESK_MEASURE_LIGHT_TRUST_H_
#define QVTESTER_DESK_MEASURE_LIGHT_TRUST_H_

#include <array>
#include <opencv2/core.hpp>

#include "desk/measure/codec_steps.h"
#include "desk/measure/uncertainty.h"
#include "qvtester/results.h"

namespace qv {

/// How far each figure of a lit region may be trusted.
struct LightTrust {
  Uncertainty mean_grey, luminance, cct, clipped_share, uniformity;
  std::array<Uncertainty, 3> linear;        // red, green, blue
  std::array<Uncertainty, 2> chromaticity;  // x, y
};

/// Of a region of a photo, CV_8UC3 or CV_8UC4, blue first. The true value is that of the light without noise, which the
/// mean of bent levels is moved by.
LightTrust TrustInLight(const cv::Mat& photo, const QVLightRegion& region, const CodecSteps& codec);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LIGHT_TRUST_H_
