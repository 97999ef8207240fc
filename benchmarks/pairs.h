#ifndef QVTESTER_BENCHMARKS_PAIRS_H_
#define QVTESTER_BENCHMARKS_PAIRS_H_

#include <cstdint>
#include <opencv2/core.hpp>

#include "desk/simulation/simulation.h"

/// Two textured photos of 640 x 480, the second shifted by up to 40 px either way, turned by up to 10 degrees and
/// scaled by 0.9 to 1.1, all drawn from `random`.
qv::SimulationOptions DrawPair(double blur_px, double noise_percent, std::uint64_t seed, cv::RNG& random);

struct PhotoPair {
  cv::Mat reference, image;  // CV_8UC3
  cv::Mat truth;             // 2 x 3, CV_64F, from the second to the first
};

/// Each photo with noise of its own.
PhotoPair ShootPair(const qv::SimulationOptions& options);

#endif  // QVTESTER_BENCHMARKS_PAIRS_H_
