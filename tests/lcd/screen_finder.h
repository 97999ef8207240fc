#ifndef QV_TESTS_LCD_SCREEN_FINDER_H_
#define QV_TESTS_LCD_SCREEN_FINDER_H_

#include <opencv2/core.hpp>
#include <vector>

struct ScreenRules {
  double min_area;      // share of the photo
  double min_contrast;  // levels of 0 to 255, across each side
  bool dark_first;      // take a dark screen in a bright surround before a larger bright one
};

/// The screen's corners, clockwise from the upper left, or none. `photo`: rows x cols of 8 or 16 bits with 1, 3 or 4
/// channels, a fourth of no account.
std::vector<cv::Point2d> FindScreenCorners(const cv::Mat& photo, const ScreenRules& rules);

#endif  // QV_TESTS_LCD_SCREEN_FINDER_H_
