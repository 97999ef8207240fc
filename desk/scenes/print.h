#ifndef QVTESTER_DESK_SCENES_PRINT_H_
#define QVTESTER_DESK_SCENES_PRINT_H_

#include <cstdint>
#include <vector>

#include "desk/scenes/scene.h"

namespace qv {

// A print on a touch panel's glass: dark signs of bars and blots on light ground, no two alike.

struct PrintStyle {
  std::uint64_t seed = 1;  // of the signs
  double ink = 30, ground = 255;
  struct Defect {
    cv::Point2d middle;
    double side;
    bool missing;  // ink that should be there; else ink that should not
  };
  std::vector<Defect> defects;
  double defect_contrast = 1;  // share of the way from what should be there to its opposite
};

cv::Rect2d PrintBounds();

Scene Print(const PrintStyle& style);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_PRINT_H_
