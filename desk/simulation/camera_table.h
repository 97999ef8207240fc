#ifndef QVTESTER_DESK_SIMULATION_CAMERA_TABLE_H_
#define QVTESTER_DESK_SIMULATION_CAMERA_TABLE_H_

#include <optional>

#include "desk/simulation/camera.h"

// Every number of the camera in one row: options, their help and the truth's parameters are made of it. The model's own
// values are the defaults.

namespace qv {

struct CameraNumber {
  const char* option;
  const char* key;  // in the truth
  double CameraModel::*member;
  double low, high;
  const char* unit;
  const char* help;
  std::optional<double> phone = {};  // what --pipeline phone takes
};

inline constexpr CameraNumber kCameraNumbers[] = {
    {"--fill", "fill", &CameraModel::fill, 0.02, 3, "SHARE", "Share of the photo that the turned scene takes"},
    {"--turn", "turn_deg", &CameraModel::turn_deg, -360, 360, "DEG", "Turn of the scene, counter-clockwise"},
    {"--pan", "pan_deg", &CameraModel::pan_deg, -60, 60, "DEG", "Turn about the vertical axis: the right side recedes"},
    {"--tilt", "tilt_deg", &CameraModel::tilt_deg, -60, 60, "DEG",
     "Turn about the horizontal axis: the lower side recedes"},
    {"--distortion", "distortion_percent", &CameraModel::distortion_percent, -20, 20, "PERCENT",
     "How much further out the photo's corners are seen; below 0 a barrel", -1},
    {"--shutter", "shutter_px", &CameraModel::shutter_px, -1000, 1000, "PX",
     "Rolling shutter: how far the scene moves to the right while the photo is read", 2},
    {"--blur", "blur_px", &CameraModel::blur_px, 0, 50, "PX", "Gaussian blur, sigma"},
    {"--defocus", "defocus_px", &CameraModel::defocus_px, 0, 30, "PX", "Defocus disc, radius"},
    {"--gain", "gain", &CameraModel::gain, 0, 4, "FACTOR", "Level of white paper in the photo, over 255"},
    {"--exposure", "exposure_ev", &CameraModel::exposure_ev, -8, 8, "EV", "Doublings of every level"},
    {"--shading", "shading_percent", &CameraModel::shading_percent, 0, 100, "PERCENT",
     "How much darker the photo's corners are"},
    {"--falloff", "falloff_percent", &CameraModel::falloff_percent, 0, 100, "PERCENT",
     "How much darker the far end is of a line through the photo", 10},
    {"--falloff-direction", "falloff_direction_deg", &CameraModel::falloff_direction_deg, -360, 360, "DEG",
     "Where that end is, from the right, clockwise"},
    {"--noise", "noise_percent", &CameraModel::noise_percent, 0, 100, "PERCENT",
     "Read noise, standard deviation, of 255"},
    {"--full-well", "full_well", &CameraModel::full_well, 0, 1e9, "N",
     "Electrons at level 255, for shot noise; 0 for none"},
    {"--shoulder", "shoulder", &CameraModel::shoulder, 0, 0.99, "SHARE",
     "Light over 255 from which the tone curve bends; 0: it is cut at white", 0.8},
    {"--denoise", "denoise_levels", &CameraModel::denoise, 0, 255, "LEVELS",
     "Edge-keeping smoothing: levels that count as noise", 6},
    {"--sharpen", "sharpen", &CameraModel::sharpen, 0, 10, "SHARE",
     "Unsharp mask: share of what a blur takes that is added", 0.8},
    {"--sharpen-radius", "sharpen_radius_px", &CameraModel::sharpen_radius_px, 0.3, 20, "PX", "Sigma of that blur"},
};

// The rest of --pipeline phone.
inline constexpr const char* kPhoneSaturation = "1.6,1.2,1.4";

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_CAMERA_TABLE_H_
