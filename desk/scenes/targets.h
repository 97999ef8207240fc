#ifndef QVTESTER_DESK_SCENES_TARGETS_H_
#define QVTESTER_DESK_SCENES_TARGETS_H_

#include <cstdint>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/scenes/scene.h"

namespace qv {

struct DustSpeck {
  cv::Point2d centre;  // column, row
  double diameter_px;
};

/// A plain target with specks on the lens, in photo pixels; `darkness` is how much darker than the target they are, 0
/// to 1.
Scene DustyTarget(const std::vector<DustSpeck>& specks, double darkness);

/// A textured scene with few repeats, for registration: overlapping polygons of random grey on mid grey, over a square
/// of this side. The same seed gives the same scene.
Scene TexturedScene(double side, std::uint64_t seed);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_TARGETS_H_
