#ifndef QVTESTER_TESTS_LED_TOUCH_SPOTS_H_
#define QVTESTER_TESTS_LED_TOUCH_SPOTS_H_

#include <memory>
#include <opencv2/core.hpp>

#include "qvtester/tester.h"

/// Error areas as the result block holds them: arrays from new[], null where there are none.
struct ErrorAreas {
  int count = 0;
  std::unique_ptr<QVRECT[]> areas;
  std::unique_ptr<int[]> pixels;
};

/// Flagged pixels (CV_8UC1, not 0) as 8-connected rectangles, merged within the distance of property 59, without those
/// of fewer pixels than property 60. More than 20,000 are noise: logged under the test's name, and not merged, since
/// merging holds each against each.
ErrorAreas FindErrorAreas(QVTester& tester, const char* test, const cv::Mat& flagged);

#endif  // QVTESTER_TESTS_LED_TOUCH_SPOTS_H_
