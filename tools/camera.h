#ifndef QVTESTER_TOOLS_CAMERA_H_
#define QVTESTER_TOOLS_CAMERA_H_

#include <cstdint>
#include <opencv2/core.hpp>

#include "tools/scene.h"

// A camera of known faults. All of them act on the stored levels, with no tone curve, so that what a measure should
// read is known.

struct CameraModel {
  cv::Size size = {4000, 3000};
  double fill = 0.8;           // share of the photo that the scene's bounds take, turned as they are
  double turn_deg = 0;         // of the scene, counter-clockwise in the photo
  double blur_px = 0;          // Gaussian sigma
  double gain = 0.92;          // level of white paper in the photo, over 255
  double shading_percent = 0;  // how much darker the photo's corners are
  double noise_percent = 0;    // standard deviation, of 255
  std::uint64_t seed = 1;
};

/// Scene coordinates to photo coordinates; the photo's first pixel is centred at (0, 0).
cv::Matx33d PhotoFromScene(const CameraModel& camera, const cv::Rect2d& bounds);

/// The photo, CV_8UC3 (BGR): each pixel the mean over its square of the blurred scene, shaded, with noise, rounded.
cv::Mat TakePhoto(const CameraModel& camera, const Scene& scene, const cv::Rect2d& bounds);

#endif  // QVTESTER_TOOLS_CAMERA_H_
