#ifndef QVTESTER_CHART_CHART_IMAGE_H_
#define QVTESTER_CHART_CHART_IMAGE_H_

#include <opencv2/core.hpp>

/// Dark (0) and light (255) of a grey picture, light above the threshold: what the finder search reads.
/// Throws cv::Exception (StsUnsupportedFormat) unless the picture has 8 bits, since the search reads no other.
cv::Mat Binarise(const cv::Mat& gray, int threshold);

#endif  // QVTESTER_CHART_CHART_IMAGE_H_
