#ifndef QVTESTER_DESK_SIMULATION_DEVELOPMENT_H_
#define QVTESTER_DESK_SIMULATION_DEVELOPMENT_H_

#include <opencv2/core.hpp>

#include "desk/simulation/camera.h"

// From what falls on the sensor to what is stored, as phones do it: saturation, mosaic, tone curve, denoising,
// sharpening, in this order, each only when the camera has it. Levels are CV_32FC3 (BGR) of 255, neither rounded nor
// cut.

namespace qv {

/// Whether the camera has any of the stages.
bool Develops(const CameraModel& camera);

cv::Mat Develop(const CameraModel& camera, const cv::Mat& levels);

/// Red, green and blue of an even area, as Develop gives them.
cv::Vec3d DevelopColour(const CameraModel& camera, const cv::Vec3d& colour);

// The stages, one file each; all in place.
void Saturate(const CameraModel& camera, cv::Mat& levels);
void Mosaic(cv::Mat& levels);
void Bend(double shoulder, cv::Mat& levels);
void StoreAsSrgb(cv::Mat& levels);
void Denoise(double noise_levels, cv::Mat& levels);
void Sharpen(double amount, double radius_px, cv::Mat& levels);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_DEVELOPMENT_H_
