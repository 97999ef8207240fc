#include "desk/simulation/development.h"

namespace qv {

bool Develops(const CameraModel& camera) {
  return camera.saturation != cv::Vec3d() || camera.mosaic || camera.shoulder > 0 || camera.srgb ||
         camera.denoise > 0 || camera.sharpen > 0;
}

cv::Mat Develop(const CameraModel& camera, const cv::Mat& levels) {
  cv::Mat stored = levels.clone();
  Saturate(camera, stored);
  if (camera.mosaic) Mosaic(stored);
  if (camera.shoulder > 0) Bend(camera.shoulder, stored);
  if (camera.srgb) StoreAsSrgb(stored);
  if (camera.denoise > 0) Denoise(camera.denoise, stored);
  if (camera.sharpen > 0) Sharpen(camera.sharpen, camera.sharpen_radius_px, stored);
  return stored;
}

cv::Vec3d DevelopColour(const CameraModel& camera, const cv::Vec3d& colour) {
  if (!Develops(camera)) return colour;
  CameraModel even = camera;
  even.mosaic = false;  // these leave an even area alone
  even.denoise = even.sharpen = 0;
  const cv::Vec3f bgr(static_cast<float>(colour[2]), static_cast<float>(colour[1]), static_cast<float>(colour[0]));
  const cv::Vec3f stored = Develop(even, cv::Mat(1, 1, CV_32FC3, cv::Scalar(bgr[0], bgr[1], bgr[2]))).at<cv::Vec3f>(0);
  return {stored[2], stored[1], stored[0]};
}

}  // namespace qv
