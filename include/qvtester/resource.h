#ifndef QVTESTER_RESOURCE_H_
#define QVTESTER_RESOURCE_H_

#include <cstdint>
#include <opencv2/core.hpp>
#include <opencv2/videoio.hpp>
#include <string>
#include <vector>

#include "qvtester/indices.h"

/// What one input slot holds: an image, an opened video, a float HDR buffer, each optional, all owned by the slot.
/// Every call answers 1; a file that can't be read answers -97, with one line in the log, and the content stays as it
/// was. Files are regular ones: pictures that OpenCV's own decoders read (JPEG, JPEG 2000, PNG, BMP, TIFF, WebP, PNM,
/// PAM, PFM, Sun raster, HDR, EXR) and films (MP4, QuickTime, 3GP, Matroska, WebM, AVI, MPEG-TS, MPEG-PS, bare H.264 or
/// H.265), by their first bytes. Nothing else reaches a decoder.
class QV_API QVResource {
 public:
  /// Reads an image file as 8-bit colour (CV_8UC3, BGR), as stored: orientation tags are ignored.
  int SetImage(char* path);
  /// Copies an image of any type.
  int SetImage(cv::Mat image);
  /// Copies height x width pixels of three 8-bit channels, rows packed.
  int SetImage(unsigned char* data, int width, int height);
  /// Opens a video file; frames come as stored: orientation tags are ignored.
  int SetVideo(char* path);
  /// Copies height x width pixels of three floats, rows packed. The flag is for the tests that read the buffer.
  int SetHDRImage(float* data, int width, int height, bool flag);

  /// Shares the image, no copy.
  int GetImage(cv::Mat* image) const;
  /// First pixel of the image, null when there is none.
  int GetImage(unsigned char** data) const;
  int GetWidth(int* width) const;
  int GetHeight(int* height) const;
  /// Shares the video source and its position.
  int GetVideo(cv::VideoCapture* video) const;
  /// Opens the video file anew, at its start. -97 when there is none, or it can't be opened any more.
  int OpenVideo(cv::VideoCapture* video) const;
  /// First float of the HDR buffer, null when there is none.
  int GetHDRImage(float** data);
  int GetHDRWidth(int* width) const;
  int GetHDRHeight(int* height) const;

  // How picture files are read, for whoever reads some without a slot.

  /// Pixels that a picture file may hold at most; a program that reads larger ones raises it before it does.
  static std::int64_t most_pixels_;
  /// The bytes of a picture file, unchanged. False, with the reason as a phrase, for what is no regular file, no
  /// picture of the formats above, of more pixels, or of 2 GiB and more.
  static bool ReadPicture(const char* path, std::vector<unsigned char>& bytes, std::string& reason);
  /// Decodes the bytes of a picture file as SetImage does, to colour (CV_8UC3, BGR), or by other flags of cv::imread's.
  /// Empty, with the reason, where they are refused as above or can't be decoded.
  static cv::Mat DecodePicture(const std::vector<unsigned char>& bytes, std::string& reason, int flags = 1);

 private:
  cv::Mat image_;
  cv::VideoCapture video_;
  std::string video_path_;  // absolute; empty without a video
  std::vector<float> hdr_;
  int hdr_width_ = 0;
  int hdr_height_ = 0;
};

#endif  // QVTESTER_RESOURCE_H_
