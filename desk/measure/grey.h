#ifndef QVTESTER_DESK_MEASURE_GREY_H_
#define QVTESTER_DESK_MEASURE_GREY_H_

#include <opencv2/core.hpp>

namespace qv {

/// The grey levels of a picture of one, three (BGR) or four channels (BGRA), of its own depth; one of a single channel
/// comes back as it is, without a copy.
cv::Mat GreyOf(const cv::Mat& picture);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_GREY_H_
