#include "benchmarks/pairs.h"

#include <vector>

#include "benchmarks/trials.h"

using namespace qv;

SimulationOptions DrawPair(double blur_px, double noise_percent, std::uint64_t seed, cv::RNG& random) {
  SimulationOptions options = SceneOptions("pair", {640, 480}, noise_percent, seed);
  options.camera.blur_px = blur_px;
  options.camera.gain = 0.75;
  const double x = random.uniform(-40.0, 40.0);
  const double y = random.uniform(-40.0, 40.0);
  options.motion_px = {x, y};
  options.second_turn_deg = random.uniform(-10.0, 10.0);
  options.second_scale = random.uniform(0.9, 1.1);
  return options;
}

PhotoPair ShootPair(const SimulationOptions& options) {
  const Simulation simulation = Simulate(options);
  CameraModel other = options.camera;
  other.seed += 1000;
  return {Sense(options.camera, simulation.levels[0], 8), Sense(other, simulation.levels[1], 8),
          cv::Mat(simulation.truth.at("matrix").get<std::vector<double>>(), true).reshape(1, 2)};
}
