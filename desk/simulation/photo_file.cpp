#include "desk/simulation/photo_file.h"

#include <turbojpeg.h>

#include <memory>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "desk/base/failure.h"
#include "desk/base/files.h"

namespace qv {

namespace {

// A preview frame as a phone delivers it: luma, then half-size chroma, V before U.
std::string Nv21(const cv::Mat& photo) {
  if (photo.cols % 2 != 0 || photo.rows % 2 != 0) {
    throw Failure(kWrongUsage, "an NV21 frame needs an even width and height");
  }
  cv::Mat planes;  // luma, U plane, V plane
  cv::cvtColor(photo, planes, cv::COLOR_BGR2YUV_I420);
  const std::size_t luma = photo.total();
  const uchar* const u = planes.data + luma;
  const uchar* const v = u + luma / 4;
  std::string frame(reinterpret_cast<const char*>(planes.data), luma);
  for (std::size_t i = 0; i < luma / 4; ++i) {
    frame += static_cast<char>(v[i]);
    frame += static_cast<char>(u[i]);
  }
  return frame;
}

// OpenCV's encoder stores chroma for 2 x 2 pixels only.
std::string Jpeg(const cv::Mat& photo, const PhotoFile& file) {
  const std::unique_ptr<void, int (*)(tjhandle)> encoder(tjInitCompress(), tjDestroy);
  unsigned char* content = nullptr;
  unsigned long size = 0;  // NOLINT(google-runtime-int): the library's
  const int sampling = file.chroma == "444" ? TJSAMP_444 : TJSAMP_422;
  const int failed = tjCompress2(encoder.get(), photo.data, photo.cols, static_cast<int>(photo.step), photo.rows,
                                 TJPF_BGR, &content, &size, sampling, file.jpeg_quality, 0);
  const std::unique_ptr<unsigned char, void (*)(unsigned char*)> owner(content, tjFree);
  if (failed != 0) throw Failure(kInternalFault, file.path + ": " + tjGetErrorStr2(encoder.get()));
  return {reinterpret_cast<const char*>(content), size};
}

}  // namespace

std::string EncodePhoto(const cv::Mat& photo, const PhotoFile& file) {
  const bool is_hdr = photo.depth() == CV_32F;
  const std::string extension = file.path == "-" ? (is_hdr ? ".pfm" : ".png") : LowerExtension(file.path);
  if (is_hdr && extension != ".exr" && extension != ".tif" && extension != ".tiff" && extension != ".pfm") {
    throw Failure(kWrongUsage, file.path + ": floats are kept without loss in an .exr, .tif or .pfm file");
  }
  const bool takes_16_bits = extension == ".png" || extension == ".tif" || extension == ".tiff";
  if (photo.depth() == CV_16U && !takes_16_bits) {
    throw Failure(kWrongUsage, file.path + ": 16 bits a channel need a .png or .tif file");
  }
  if (extension == ".nv21") return Nv21(photo);
  if (file.chroma != "420") {
    if (extension != ".jpg" && extension != ".jpeg")
      throw Failure(kWrongUsage, file.path + ": only a .jpg has --chroma");
    return Jpeg(photo, file);
  }
  std::vector<uchar> content;
  try {
    // Fast compression: noise does not compress anyway. A float TIFF would be written as LogLuv unless told not to.
    constexpr int kLzw = 5;
    cv::imencode(extension, photo, content,
                 {cv::IMWRITE_PNG_COMPRESSION, 1, cv::IMWRITE_JPEG_QUALITY, file.jpeg_quality,
                  cv::IMWRITE_TIFF_COMPRESSION, kLzw});
  } catch (const cv::Exception&) {
    throw Failure(kWrongUsage, file.path + ": name a .png, .jpg, .bmp, .tif or .nv21 file");
  }
  return {content.begin(), content.end()};
}

}  // namespace qv
