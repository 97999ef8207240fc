#include "desk/scenes/lights.h"

namespace qv {

cv::Rect2d LightsBounds(const LightsStyle& style) {
  return {0, 0, style.columns * kLightPitch, style.rows * kLightPitch};
}

cv::Point2d LightMiddle(const LightsStyle& style, int light) {
  const int row = light / style.columns;
  const int column = light % style.columns;
  return {(column + 0.5) * kLightPitch, (row + 0.5) * kLightPitch};
}

Scene Lights(const LightsStyle& style) {
  Scene scene;
  scene.paper = Grey(style.ground);
  for (int i = 0; i < style.columns * style.rows; ++i) {
    scene.shapes.push_back(Square(LightMiddle(style, i), kLightSide / 2, style.colour));
  }
  for (const LightsStyle::Spot& spot : style.spots) {
    scene.shapes.push_back(Square(spot.middle, spot.side / 2, style.colour * (1 - style.spot_darkness)));
  }
  return scene;
}

}  // namespace qv
