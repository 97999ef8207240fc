#include "benchmarks/pairs.h"

#include <vector>

using namespace qv;

SimulationOptions DrawPair(double blur_px, double noise_percent, std::uint64_t seed, cv::RNG& random) {
  SimulationOptions options;
  options.scene = "pair";
  options.camera.size = {640, 480};
  options.camera.blur_px = blur_px;
  options.camera.noise_percent = noise_percent;
  options.camera.gain = 0.75;
  options.camera.seed = seed;
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
