// Saturation, shoulder and encoding: each pixel for itself.

#include <algorithm>
#include <cmath>

#include "desk/scenes/scene.h"
#include "desk/simulation/development.h"

namespace qv {

namespace {

template <typename Curve>
void Apply(cv::Mat& levels, const Curve& curve) {
  levels.forEach<cv::Vec3f>([&](cv::Vec3f& pixel, const int* /*place*/) {
    for (int i = 0; i < 3; ++i) pixel[i] = static_cast<float>(curve(pixel[i]));
  });
}

}  // namespace

void Saturate(const CameraModel& camera, cv::Mat& levels) {
  if (camera.saturation == cv::Vec3d()) return;
  cv::Vec3f full;
  for (int i = 0; i < 3; ++i) {
    const double at = camera.saturation[2 - i];
    full[i] = at > 0 ? static_cast<float>(255 * at) : INFINITY;
  }
  levels.forEach<cv::Vec3f>([&](cv::Vec3f& pixel, const int* /*place*/) {
    for (int i = 0; i < 3; ++i) pixel[i] = std::min(pixel[i], full[i]);
  });
}

// Goes on at the same slope and approaches white.
void Bend(double shoulder, cv::Mat& levels) {
  Apply(levels, [shoulder](double level) {
    const double v = level / 255;
    return 255 * (v <= shoulder ? v : shoulder + (1 - shoulder) * (1 - std::exp(-(v - shoulder) / (1 - shoulder))));
  });
}

// The linear part goes on below black, so that noise about black keeps its mean.
void StoreAsSrgb(cv::Mat& levels) { Apply(levels, LevelOf); }

}  // namespace qv
