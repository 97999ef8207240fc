#ifndef QVTESTER_DESK_MEASURE_RESIDUAL_TRUST_H_
#define QVTESTER_DESK_MEASURE_RESIDUAL_TRUST_H_

#include <opencv2/core.hpp>

#include "desk/measure/chart_view.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/robust_map.h"

namespace qv {

// How far places and maps may be trusted, from what their fits leave over.

/// Of a figure whose error is known but for this standard uncertainty, and left in it; both, and what comes back, in
/// the figure's unit.
Uncertainty FromKnownError(double error, double standard, const char* method = kResidualMethod);

/// The marks' places, module size, the legs' ratio and angle, the chart's turn: from how far the search's places lie
/// from the centres of gravity of the marks' inner squares. Says nothing unless there are three marks. `photo` is the
/// one that was searched, CV_8U or CV_16U; its file rounds by the steps of `codec`.
void TrustMarks(Phase& phase, const ChartView& view, const cv::Mat& photo, const CodecSteps& codec);

/// Both maps of a registration. The map of all matches: from the grey levels' residuals under it, by 64 parts of the
/// picture. The fixed one: from how far it lies from that. Says nothing where the map of all is doubtful. Pictures are
/// CV_8U, the maps 2 x 3, CV_64F.
void TrustMaps(Phase& phase, const cv::Mat& reference, const cv::Mat& image, const cv::Mat& fixed,
               const RobustMap& robust);

/// `matrix` and `correlation` of a map that was refined as the one of all matches is; nothing where it was not.
void TrustRefinedMap(Phase& phase, const cv::Mat& reference, const cv::Mat& image, const cv::Mat& map);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_RESIDUAL_TRUST_H_
