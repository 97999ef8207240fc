#ifndef QVTESTER_DESK_MEASURE_CODEC_STEPS_H_
#define QVTESTER_DESK_MEASURE_CODEC_STEPS_H_

#include <cmath>
#include <opencv2/core.hpp>
#include <string>

namespace qv {

/// By how many levels a codec rounds the mean of a block: 0 where it keeps it.
struct CodecSteps {
  double luma = 0, chroma = 0;
  cv::Matx<float, 8, 8> luma_table = {};  // steps of a block's coefficients, by vertical and horizontal frequency
};

/// Of the quantisation tables of a JPEG file with this content (ITU-T T.81, B.2.4.1); none for another kind of file.
CodecSteps StepsOf(const std::string& content);

/// Of what cv::imencode and others with the standard tables (T.81, Annex K) write at this quality.
CodecSteps StepsAtQuality(int quality);

/// A part of a photo, CV_8UC1, as the codec leaves it; its blocks begin at the photo's first pixel. Those that reach
/// over the part's rim stay as they are.
/// @param first  the part's first pixel in the photo.
cv::Mat Coded(const cv::Mat& part, cv::Point first, const CodecSteps& codec);

/// Standard uncertainty, in levels, of what the codec does to the mean of a whole picture. Blocks half-way between two
/// steps, one in eight times the first table entry, are all rounded away from middle grey, by half a step; the entry
/// cancels. A 128th of a level is the most of it (all blocks on one side of middle grey), so it may be anything up to
/// that.
inline double MeanShift(const CodecSteps& codec) { return codec.luma == 0 ? 0 : 1.0 / 128 / std::sqrt(3.0); }

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CODEC_STEPS_H_
