#include "qvtester/resource.h"

#include <algorithm>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/videoio/registry.hpp>

#include "core/slots.h"
#include "qvtester/log.h"

namespace {

// Pixels as stored: neither turned nor mirrored by orientation tags, since a test's geometry is the sensor's.
cv::Mat ReadColour(const char* path) {
  try {
    cv::Mat image = cv::imread(path, cv::IMREAD_COLOR | cv::IMREAD_IGNORE_ORIENTATION);
    if (image.empty()) QVDEBUGP("[%s] %s: not an image that can be decoded", "SetImage", path);
    return image;
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
    QVDEBUGP("[%s] %s: %s", "SetImage", path, e.what());
    return cv::Mat();
  }
}

cv::VideoCapture OpenFilm(const std::string& path) {
  cv::VideoCapture video;
  for (const cv::VideoCaptureAPIs backend : cv::videoio_registry::getStreamBackends()) {
    if (backend == cv::CAP_GPHOTO2) continue;  // would look for a USB camera of that name, and lose memory doing so
    if (video.open(path, backend)) break;
  }
  if (video.isOpened()) {
    video.set(cv::CAP_PROP_ORIENTATION_AUTO, 0);
  } else {
    QVDEBUGP("[%s] %s: not a video that can be opened", "SetVideo", path.c_str());
  }
  return video;
}

}  // namespace

int QVResource::SetImage(char* path) {
  cv::Mat image = ReadColour(path);
  if (image.empty()) return QV_ERROR_INVALID_ARGUMENT;
  image_ = image;
  return QV_SUCCESS;
}

int QVResource::SetImage(cv::Mat image) {
  CheckedPixels(image.cols, image.rows, std::max<std::size_t>(image.elemSize(), 1));
  image_ = image.clone();  // a fresh matrix: callers may still hold the former one
  return QV_SUCCESS;
}

int QVResource::SetImage(unsigned char* data, int width, int height) {
  return SetImage(cv::Mat(height, width, CV_8UC3, data));
}

int QVResource::SetVideo(char* path) {
  const cv::VideoCapture video = OpenFilm(path);
  if (!video.isOpened()) return QV_ERROR_INVALID_ARGUMENT;
  video_ = video;
  video_path_ = std::filesystem::absolute(path).string();
  return QV_SUCCESS;
}

int QVResource::SetHDRImage(float* data, int width, int height, bool /*flag*/) {
  const std::size_t pixels = CheckedPixels(width, height, 3 * sizeof(float));
  hdr_ = std::vector<float>(data, data + 3 * pixels);
  hdr_width_ = width;
  hdr_height_ = height;
  return QV_SUCCESS;
}

int QVResource::GetImage(cv::Mat* image) const {
  *image = image_;
  return QV_SUCCESS;
}

int QVResource::GetImage(unsigned char** data) const {
  *data = image_.data;
  return QV_SUCCESS;
}

int QVResource::GetWidth(int* width) const {
  *width = image_.cols;
  return QV_SUCCESS;
}

int QVResource::GetHeight(int* height) const {
  *height = image_.rows;
  return QV_SUCCESS;
}

int QVResource::GetVideo(cv::VideoCapture* video) const {
  *video = video_;
  return QV_SUCCESS;
}

int QVResource::OpenVideo(cv::VideoCapture* video) const {
  if (video_path_.empty()) return QV_ERROR_INVALID_ARGUMENT;
  *video = OpenFilm(video_path_);
  return video->isOpened() ? QV_SUCCESS : QV_ERROR_INVALID_ARGUMENT;
}

int QVResource::GetHDRImage(float** data) {
  *data = hdr_.empty() ? nullptr : hdr_.data();
  return QV_SUCCESS;
}

int QVResource::GetHDRWidth(int* width) const {
  *width = hdr_width_;
  return QV_SUCCESS;
}

int QVResource::GetHDRHeight(int* height) const {
  *height = hdr_height_;
  return QV_SUCCESS;
}
