#ifndef QVTESTER_DESK_MEASURE_CAPTURE_TRUST_H_
#define QVTESTER_DESK_MEASURE_CAPTURE_TRUST_H_

#include <array>
#include <map>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/codec_steps.h"
#include "desk/measure/record.h"

namespace qv {

/// The colour patches of a photo, and what they were compared with.
struct PatchScene {
  cv::Mat photo;                                     // CV_8UC3
  std::vector<std::array<cv::Point2d, 4>> outlines;  // of the patches on it
  std::vector<cv::Point3i> measured;                 // their colours, as they are stored
  std::vector<cv::Point3i> standard;                 // of the test's own comparison; may be empty
  std::map<int, cv::Vec3d> given;                    // L*a*b* by patch, given as exact; may be empty
  CodecSteps codec;                                  // of the photo's file
};

/// Tells how far a capture's colours and differences may be trusted: from each patch's own noise; that of a standard
/// photo is taken to be the same. Says nothing where a patch is too small to show noise.
void TrustPatches(Phase& phase, const PatchScene& scene);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CAPTURE_TRUST_H_
