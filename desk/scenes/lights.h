#ifndef QVTESTER_DESK_SCENES_LIGHTS_H_
#define QVTESTER_DESK_SCENES_LIGHTS_H_

#include <vector>

#include "desk/scenes/scene.h"

namespace qv {

// A panel of square lights on dark ground, in rows and columns.

inline constexpr double kLightSide = 300;   // panel units
inline constexpr double kLightPitch = 400;  // from light to light

struct LightsStyle {
  int columns = 3, rows = 2;
  cv::Vec3d colour = {255, 214, 170};  // red, green, blue as stored levels
  double ground = 12;                  // level of what lies around
  struct Spot {
    cv::Point2d middle;
    double side;
  };
  std::vector<Spot> spots;     // squares that are darker
  double spot_darkness = 0.6;  // share of the light's level that they lack
};

cv::Rect2d LightsBounds(const LightsStyle& style);

/// The middle of a light; they are counted row by row.
cv::Point2d LightMiddle(const LightsStyle& style, int light);

Scene Lights(const LightsStyle& style);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_LIGHTS_H_
