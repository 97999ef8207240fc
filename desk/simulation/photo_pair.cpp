#include "desk/simulation/simulation.h"

#include <cmath>

#include "desk/scenes/targets.h"
#include "desk/simulation/truth.h"

namespace qv {

// The second photo is the first one's view turned and scaled about its middle, then moved.
Simulation PhotoPair(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  const double side = 1.6 * std::hypot(camera.size.width, camera.size.height);  // beyond both views
  const cv::Point2d middle((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  const cv::Matx33d first(1, 0, middle.x - side / 2, 0, 1, middle.y - side / 2, 0, 0, 1);
  const double turn = options.second_turn_deg * CV_PI / 180;
  const double c = options.second_scale * std::cos(turn);
  const double s = options.second_scale * std::sin(turn);
  const cv::Point2d to = middle + options.motion_px;
  const cv::Matx33d move(c, s, to.x - c * middle.x - s * middle.y, -s, c, to.y + s * middle.x - c * middle.y, 0, 0, 1);
  const Scene scene = TexturedScene(side, camera.seed);
  CameraModel second = camera;
  second.gain *= options.second_gain;
  Simulation pair;
  pair.levels = {Expose(camera, scene, first), Expose(second, scene, move * first)};
  pair.truth["matrix"] = {move(0, 0), move(0, 1), move(0, 2), move(1, 0), move(1, 1), move(1, 2)};
  pair.truth["shift_px"] = ToJson(options.motion_px);
  pair.truth["turn_deg"] = options.second_turn_deg;
  pair.truth["scale"] = options.second_scale;
  pair.truth["gain"] = options.second_gain;
  return pair;
}

}  // namespace qv
