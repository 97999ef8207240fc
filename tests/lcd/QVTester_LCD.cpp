// The display in a photo: where it is, cut out and straightened.

#include "qvtester/lcd.h"

#include <algorithm>
#include <array>
#include <opencv2/imgproc.hpp>

#include "tests/lcd/lcd_photo.h"
#include "tests/lcd/screen_finder.h"

float SideRatio(const std::vector<cv::Point2f>& c) {
  const double width = cv::norm(c[1] - c[0]) + cv::norm(c[2] - c[3]);
  const double height = cv::norm(c[3] - c[0]) + cv::norm(c[2] - c[1]);
  return static_cast<float>(width / height);
}

cv::Size ScreenSize(const std::vector<cv::Point2f>& c) {
  const double width = cv::norm(c[1] - c[0]) + cv::norm(c[2] - c[3]);
  const double height = cv::norm(c[3] - c[0]) + cv::norm(c[2] - c[1]);
  return {std::max(cvRound(width / 2), 1), std::max(cvRound(height / 2), 1)};
}

cv::Mat CutScreenOut(const cv::Mat& photo, const std::vector<cv::Point2f>& corners, cv::Size size) {
  const cv::Size full = ScreenSize(corners);
  if (full.width > 1.5 * size.width && full.height > 1.5 * size.height) {  // each pixel the mean of what it covers
    cv::Mat reduced;
    cv::resize(CutScreenOut(photo, corners, full), reduced, size, 0, 0, cv::INTER_AREA);
    return reduced;
  }
  const auto right = static_cast<float>(size.width - 0.5);
  const auto below = static_cast<float>(size.height - 0.5);
  const std::array<cv::Point2f, 4> edges = {{{-0.5f, -0.5f}, {right, -0.5f}, {right, below}, {-0.5f, below}}};
  const cv::Mat map = cv::getPerspectiveTransform(edges.data(), corners.data());  // from screen to photo
  cv::Mat screen;
  cv::warpPerspective(photo, screen, map, size, cv::INTER_LINEAR | cv::WARP_INVERSE_MAP, cv::BORDER_REPLICATE);
  return screen;
}

int QVTester_LCD::Locate(const cv::Mat& photo, bool anew, bool dark_first, std::vector<cv::Point2f>& corners) const {
  const int channels = photo.channels();
  if (photo.empty() || photo.dims != 2 || (photo.depth() != CV_8U && photo.depth() != CV_16U) ||
      (channels != 1 && channels != 3 && channels != 4)) {
    QVDEBUGP("[%s] %s", "FindScreen",
             photo.empty() ? "an empty photo" : "a photo needs 8 or 16 bits and 1, 3 or 4 channels");
    return QV_ERROR_UNUSABLE_INPUT;
  }
  if (!anew && keep_corners_ && corners_.size() == 4) {
    corners = corners_;
    return QV_SUCCESS;
  }
  const std::vector<cv::Point2d> found = FindScreenCorners(photo, {min_screen_area_, min_edge_contrast_, dark_first});
  if (found.empty()) {
    QVDEBUGP("[%s] no screen in a photo of %d x %d", "FindScreen", photo.cols, photo.rows);
    return QV_ERROR_PATTERN_NOT_FOUND;
  }
  corners.assign(found.begin(), found.end());
  return QV_SUCCESS;
}

int QVTester_LCD::FindScreen(cv::Mat photo) {
  return GuardedLcd("FindScreen", [&]() -> int {
    std::vector<cv::Point2f> corners;
    if (const int code = Locate(photo, true, false, corners); code != QV_SUCCESS) return code;
    aspect_ratio_ = SideRatio(corners);
    corners_.swap(corners);
    return QV_SUCCESS;
  });
}

int QVTester_LCD::Straighten(cv::Mat photo, cv::Size size, cv::Mat& screen) {
  constexpr int kLongest = 32766;  // beyond, the warp's coordinates overflow
  if (size.width < 1 || size.height < 1 || size.width > kLongest || size.height > kLongest) {
    QVDEBUGP("[%s] a screen of %d x %d pixels", "Straighten", size.width, size.height);
    return QV_ERROR_INVALID_ARGUMENT;
  }
  return GuardedLcd("Straighten", [&]() -> int {
    std::vector<cv::Point2f> corners;
    if (const int code = Locate(photo, false, false, corners); code != QV_SUCCESS) return code;
    cv::Mat cut = CutScreenOut(photo, corners, size);
    aspect_ratio_ = SideRatio(corners);
    corners_.swap(corners);
    screen = cut;
    return QV_SUCCESS;
  });
}
