#include "qvtester/resource.h"

#include <algorithm>
#include <climits>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "core/file_gate.h"
#include "core/slots.h"
#include "platform/jpeg.h"
#include "qvtester/log.h"

namespace {

// By FFmpeg alone, and under a name that is no protocol and no pattern of file names; opened files then lead to no
// protocol but the file's. OpenCV also takes options from the environment (OPENCV_FFMPEG_CAPTURE_OPTIONS), by which its
// owner may allow more: a host that runs for others clears it, as the program does.
cv::VideoCapture OpenFilm(const std::string& path) {
  const RegularFile file(path.c_str());
  cv::VideoCapture video;
  const char* refused = nullptr;
  if (!file.valid() || !StartsAsFilm(file.Read(kFilmHead))) {
    refused = "not a video file";
  } else if (!video.open(file.Name(), cv::CAP_FFMPEG)) {
    refused = "not a video that can be opened";
  } else if (video.get(cv::CAP_PROP_FRAME_WIDTH) * video.get(cv::CAP_PROP_FRAME_HEIGHT) >
             static_cast<double>(QVResource::most_pixels_)) {
    refused = "too many pixels";
  }
  if (refused != nullptr) {
    QVDEBUGP("[%s] %s: %s", "SetVideo", path.c_str(), refused);
    return {};
  }
  video.set(cv::CAP_PROP_ORIENTATION_AUTO, 0);
  return video;
}

}  // namespace

std::int64_t QVResource::most_pixels_ = 200'000'000;

bool QVResource::ReadPicture(const char* path, std::vector<unsigned char>& bytes, std::string& reason) {
  constexpr std::int64_t kHead = 256;  // as much as tells a picture from the rest
  const RegularFile file(path);
  if (!file.valid()) {
    reason = "not a regular file that can be read";
  } else if (!StartsAsPicture(file.Read(kHead))) {
    reason = "not an image that can be decoded";
  } else if (file.size() > INT_MAX - 2) {
    reason = "a file too large for an image";
  } else {
    bytes = file.Read(file.size());
    const char* const refused = RefusePicture(bytes, most_pixels_);
    if (refused == nullptr) return true;
    reason = refused;
  }
  return false;
}

// Pixels as stored: neither turned nor mirrored by orientation tags, since a test's geometry is the sensor's.
cv::Mat QVResource::DecodePicture(const std::vector<unsigned char>& bytes, std::string& reason, int flags) {
  if (const char* const refused = RefusePicture(bytes, most_pixels_)) {
    reason = refused;
    return {};
  }
  cv::Mat image;
  try {
    const std::size_t size = bytes.size();
    const bool jpeg = bytes[0] == 0xFF && bytes[1] == 0xD8;
    if (jpeg && flags == cv::IMREAD_COLOR) image = platform::DecodeSoundJpeg(bytes);
    if (!image.empty()) return image;
    if (jpeg && (bytes[size - 2] != 0xFF || bytes[size - 1] != 0xD9)) {
      // A cut JPEG is filled up as from a file, where libjpeg adds the mark of the end itself.
      std::vector<unsigned char> ended(bytes);
      ended.insert(ended.end(), {0xFF, 0xD9});
      image = cv::imdecode(ended, flags | cv::IMREAD_IGNORE_ORIENTATION);
    } else {
      image = cv::imdecode(bytes, flags | cv::IMREAD_IGNORE_ORIENTATION);
    }
    if (image.empty()) reason = "not an image that can be decoded";
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
    reason = e.what();
  }
  return image;
}

int QVResource::SetImage(char* path) {
  std::vector<unsigned char> bytes;
  std::string reason;
  cv::Mat image;
  if (ReadPicture(path, bytes, reason)) image = DecodePicture(bytes, reason);
  if (image.empty()) {
    QVDEBUGP("[%s] %s: %s", "SetImage", path, reason.c_str());
    return QV_ERROR_INVALID_ARGUMENT;
  }
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
