#ifndef QVTESTER_CHART_CHART_IMAGE_H_
#define QVTESTER_CHART_CHART_IMAGE_H_

#include "qvtester/tester.h"

// A chart photo's grey and binary picture, in the tester's work images: good until the next chart test.

/// Grey picture of a photo of three or four channels, weighed as red, green and blue.
const cv::Mat& ConvertToGray(QVTester& tester, const cv::Mat& photo);

/// Dark (0) and light (255) of the grey picture, light above the threshold: what the finder search reads.
/// Throws cv::Exception (StsUnsupportedFormat) unless the picture has 8 bits, since the search reads no other.
const cv::Mat& Binarise(QVTester& tester, int threshold);

#endif  // QVTESTER_CHART_CHART_IMAGE_H_
