#include "desk/scenes/targets.h"

#include <algorithm>
#include <cmath>

namespace qv {

Scene DustyTarget(const std::vector<DustSpeck>& specks, double darkness) {
  constexpr int kCorners = 96;
  Scene scene;
  for (const DustSpeck& speck : specks) {
    FilledShape disc = {{}, Grey(255 * (1 - darkness))};
    for (int i = 0; i < kCorners; ++i) {
      const double angle = 2 * CV_PI * i / kCorners;
      disc.outline.push_back(speck.centre + cv::Point2d(std::cos(angle), std::sin(angle)) * (speck.diameter_px / 2));
    }
    scene.shapes.push_back(disc);
  }
  return scene;
}

Scene TexturedScene(double side, std::uint64_t seed) {
  constexpr int kShapes = 900;
  constexpr int kCorners = 5;
  cv::RNG random(seed);
  Scene scene;
  for (int i = 0; i < kShapes; ++i) {
    const double x = random.uniform(0.0, side);  // one draw a statement: arguments have no order
    const double y = random.uniform(0.0, side);
    const cv::Point2d centre(x, y);
    std::vector<double> directions;
    for (int k = 0; k < kCorners; ++k) directions.push_back(random.uniform(0.0, 2 * CV_PI));
    std::sort(directions.begin(), directions.end());
    FilledShape shape = {{}, Grey(random.uniform(0.0, 255.0))};
    for (const double direction : directions) {
      const double reach = random.uniform(0.015, 0.06) * side;
      shape.outline.push_back(centre + reach * cv::Point2d(std::cos(direction), std::sin(direction)));
    }
    scene.shapes.push_back(shape);
  }
  return scene;
}

}  // namespace qv
