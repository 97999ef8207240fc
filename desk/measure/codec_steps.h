#ifndef QVTESTER_DESK_MEASURE_CODEC_STEPS_H_
#define QVTESTER_DESK_MEASURE_CODEC_STEPS_H_

#include <string>

namespace qv {

/// By how many levels a codec rounds the mean of a block: 0 where it keeps it.
struct CodecSteps {
  double luma = 0, chroma = 0;
};

/// Of a JPEG file's quantisation tables (ITU-T T.81, B.2.4.1); none for a file of another kind, or one that can't be
/// read.
CodecSteps StepsOf(const std::string& path);

/// Of what cv::imencode and others with the standard tables (T.81, Annex K) write at this quality.
CodecSteps StepsAtQuality(int quality);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CODEC_STEPS_H_
