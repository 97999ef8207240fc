#ifndef QV_TESTS_LCD_LCD_PHOTO_H_
#define QV_TESTS_LCD_LCD_PHOTO_H_

#include <exception>
#include <opencv2/core.hpp>
#include <vector>

#include "qvtester/indices.h"
#include "qvtester/log.h"

/// Width to height: of the mean lengths of opposite sides.
float SideRatio(const std::vector<cv::Point2f>& corners);

/// Mean lengths of opposite sides, in whole pixels.
cv::Size ScreenSize(const std::vector<cv::Point2f>& corners);

/// The screen within these corners, its edges at the picture's; of the photo's type.
cv::Mat CutScreenOut(const cv::Mat& photo, const std::vector<cv::Point2f>& corners, cv::Size size);

/// Runs a call of QVTester_LCD: what OpenCV refuses is -95, anything else thrown -99, each with a line.
template <typename Call>
int GuardedLcd(const char* name, Call&& call) noexcept {
  try {
    return call();
  } catch (const cv::Exception& e) {
    QVDEBUGP("[%s] %s", name, e.what());
    return e.code == cv::Error::StsNoMem ? QV_ERROR_INTERNAL : QV_ERROR_UNUSABLE_INPUT;
  } catch (const std::exception& e) {
    QVDEBUGP("[%s] %s", name, e.what());
  } catch (...) {
    QVDEBUGP("[%s] unknown exception", name);
  }
  return QV_ERROR_INTERNAL;
}

#endif  // QV_TESTS_LCD_LCD_PHOTO_H_
