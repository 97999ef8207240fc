#ifndef QVTESTER_DESK_SIMULATION_CAMERA_H_
#define QVTESTER_DESK_SIMULATION_CAMERA_H_

#include <array>
#include <cstdint>
#include <opencv2/core.hpp>

#include "desk/scenes/scene.h"

namespace qv {

// A camera of known faults. Unless light is asked for, all of them act on the stored levels, with no tone curve.

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

  // Where the scene is seen, and in what light.
  double distortion_percent = 0;      // how much further out the photo's corners are seen
  double shutter_px = 0;              // rolling shutter: how far the scene moves to the right while the photo is read
  double falloff_percent = 0;         // how much darker the far end is of a line through the photo
  double falloff_direction_deg = 30;  // of that line, from the right, clockwise as seen

  // What the phone makes of it (desk/simulation/development.h).
  cv::Vec3d saturation;  // levels over 255 at which the sensor's red, green, blue are full; 0: never
  bool mosaic = false;   // one colour a pixel (Bayer), the others from its neighbours
  double shoulder = 0;   // light over 255 from which the tone curve bends, to reach white never; 0: it is cut at white
  bool srgb = false;     // the scene's stored levels stand for light, and light is stored as sRGB
  double denoise = 0;    // edge-keeping smoothing: levels that count as noise
  double sharpen = 0;    // unsharp mask: share of what the blur took that is added
  double sharpen_radius_px = 1;

  /// Levels of the photo over those of the scene, red, green, blue.
  cv::Vec3d Gains() const;

  bool bends() const { return distortion_percent != 0 || shutter_px != 0; }
};

/// Where the lens and the shutter put what an ideal camera sees at this place of the photo.
cv::Point2d OnSensor(const CameraModel& camera, cv::Point2d ideal);

/// Scene coordinates to photo coordinates; the photo's first pixel is centred at (0, 0).
cv::Matx33d PhotoFromScene(const CameraModel& camera, const cv::Rect2d& bounds);

/// What falls on the sensor, CV_32FC3 (BGR) in levels of 255 (of light, where it is stored as sRGB): each pixel the
/// mean over its square of the blurred scene, shaded.
cv::Mat Expose(const CameraModel& camera, const Scene& scene, const cv::Matx33d& photo_from_scene);

/// Adds the camera's shot and read noise to levels of 255.
void AddNoise(const CameraModel& camera, cv::Mat& levels, cv::RNG& random);

/// The photo that the sensor makes of it, noise added, developed, rounded: CV_8UC3, or CV_16UC3 with levels times 257.
cv::Mat Sense(const CameraModel& camera, const cv::Mat& levels, int bits);

/// Response of lens and pixel to a frequency (cycles/pixel) along a direction in the photo.
double LensResponse(const CameraModel& camera, double frequency, cv::Point2d direction);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_CAMERA_H_
