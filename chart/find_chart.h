#ifndef QVTESTER_CHART_FIND_CHART_H_
#define QVTESTER_CHART_FIND_CHART_H_

#include "qvtester/tester.h"

/// Dark (0) and light (255) of a photo, light above the threshold: what the search reads. Grey and binary picture are
/// the tester's own, good until the next chart test. `name` is the measure that logs the threshold; null: none does.
/// Throws cv::Exception for a photo without three or four channels, or (StsUnsupportedFormat) of other than 8 bits.
const cv::Mat& Binarise(QVTester& tester, const cv::Mat& photo, int threshold, const char* name);

/// Turns a chart with three marks upright: its turn, and the marks carried along and put in order.
/// Throws cv::Exception for a photo of 32,767 pixels or more a side, as cv::warpAffine does.
void SetUpright(QVTester& tester, FoundChart& chart);

#endif  // QVTESTER_CHART_FIND_CHART_H_
