#ifndef QVTESTER_PLATFORM_JPEG_H_
#define QVTESTER_PLATFORM_JPEG_H_

#include <opencv2/core.hpp>
#include <vector>

namespace platform {

/// The pixels of a sound JPEG file in colour, CV_8UC3, blue first: those of cv::imdecode (IMREAD_COLOR without
/// orientation), which spends a quarter of its time on putting blue in red's place. Empty for a file that the decoder
/// has something to say about, that isn't YCbCr, or where there is no such decoder: cv::imdecode has the last word
/// there.
cv::Mat DecodeSoundJpeg(const std::vector<unsigned char>& file);

}  // namespace platform

#endif  // QVTESTER_PLATFORM_JPEG_H_
