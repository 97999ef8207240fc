#ifndef QVTESTER_DESK_MEASURE_CODEC_STEPS_H_
#define QVTESTER_DESK_MEASURE_CODEC_STEPS_H_

#include <cmath>
#include <string>

#include "desk/measure/request.h"

namespace qv {

/// By how many levels a codec rounds the mean of a block: 0 where it keeps it.
struct CodecSteps {
  double luma = 0, chroma = 0;
};

/// Of a JPEG file's quantisation tables (ITU-T T.81, B.2.4.1); none for a file of another kind, or one that can't be
/// read.
CodecSteps StepsOf(const std::string& path);
/// The same of an input: none for a picture from memory.
CodecSteps StepsOf(const Input& input);

/// Of what cv::imencode and others with the standard tables (T.81, Annex K) write at this quality.
CodecSteps StepsAtQuality(int quality);

/// Standard uncertainty, in levels, of what the codec does to the mean of a whole picture. Blocks half-way between two
/// steps, one in eight times the first table entry, are all rounded away from middle grey, by half a step; the entry
/// cancels. A 128th of a level is the most of it (all blocks on one side of middle grey), so it may be anything up to
/// that.
inline double MeanShift(const CodecSteps& codec) { return codec.luma == 0 ? 0 : 1.0 / 128 / std::sqrt(3.0); }

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CODEC_STEPS_H_
