#ifndef QVTESTER_DESK_SIMULATION_CAMERA_H_
#define QVTESTER_DESK_SIMULATION_CAMERA_H_

#include <array>
#include <cstdint>
#include <opencv2/core.hpp>

#include "desk/scenes/scene.h"

namespace qv {

// A camera of known faults. All of them act on the stored levels, with no tone curve, so that what a measure should
// read is known.

struct CameraModel {
  cv::Size size = {4000, 3000};
  double fill = 0.8;           // share of the photo that the scene's bounds take, turned as they are
  double turn_deg = 0;         // of the scene, counter-clockwise in the photo
  double pan_deg = 0;          // of the scene's plane about its vertical axis: the right side recedes
  double tilt_deg = 0;         // about its horizontal axis: the lower side recedes
  double blur_px = 0;          // Gaussian, sigma
  double defocus_px = 0;       // uniform disc, radius
  cv::Point2d smear_px;        // straight motion during the exposure
  double gain = 0.92;          // level of white paper in the photo, over 255
  double exposure_ev = 0;      // doublings of every level
  cv::Vec3d cast = {1, 1, 1};  // factors on red, green, blue
  double shading_percent = 0;  // how much darker the photo's corners are
  double noise_percent = 0;    // read noise, standard deviation, of 255
  double full_well = 0;        // electrons at level 255, for shot noise; 0 for none
  std::uint64_t seed = 1;

  /// Levels of the photo over those of the scene, red, green, blue.
  cv::Vec3d Gains() const;
};

/// Scene coordinates to photo coordinates; the photo's first pixel is centred at (0, 0).
cv::Matx33d PhotoFromScene(const CameraModel& camera, const cv::Rect2d& bounds);

/// What falls on the sensor, CV_32FC3 (BGR) in levels of 255: each pixel the mean over its square of the blurred scene,
/// shaded.
cv::Mat Expose(const CameraModel& camera, const Scene& scene, const cv::Matx33d& photo_from_scene);

/// Adds the camera's shot and read noise to levels of 255.
void AddNoise(const CameraModel& camera, cv::Mat& levels, cv::RNG& random);

/// The photo that the sensor makes of it, noise added, rounded: CV_8UC3, or CV_16UC3 with levels times 257.
cv::Mat Sense(const CameraModel& camera, const cv::Mat& levels, int bits);

/// Response of lens and pixel to a frequency (cycles/pixel) along a direction in the photo.
double LensResponse(const CameraModel& camera, double frequency, cv::Point2d direction);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_CAMERA_H_
