#ifndef QVTESTER_DESK_SCENES_DISPLAY_H_
#define QVTESTER_DESK_SCENES_DISPLAY_H_

#include <string>
#include <vector>

#include "desk/scenes/scene.h"

namespace qv {

// A phone's display on a table, as an outer camera sees it.

inline constexpr double kScreenWidth = 1600;  // screen units; the screen's first corner lies at (0, 0)

/// What a display can show, for options and checks.
inline const std::vector<std::string> kDisplayPatterns = {"control", "green", "black", "white", "tick", "cross"};

struct DisplayStyle {
  std::string pattern = "white";
  double ratio = 16.0 / 9.0;  // width to height
  double surround = 40;       // level of what lies around the phone
  double bezel = 0;           // width of the dark rim about the screen, screen units
  double bezel_level = 8;
  double black = 6;                  // level of a screen that shows nothing
  cv::Vec3d tint = {1, 1, 1};        // factors on what the screen shows: a wrong colour
  std::vector<cv::Point2d> defects;  // points that are black, or white in black
  double defect_side = 6;            // screen units
};

cv::Rect2d ScreenBounds(const DisplayStyle& style);

Scene Display(const DisplayStyle& style);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_DISPLAY_H_
