#ifndef QVTESTER_RESOURCE_H_
#define QVTESTER_RESOURCE_H_

#include <opencv2/core.hpp>
#include <opencv2/videoio.hpp>
#include <string>
#include <vector>

#include "qvtester/indices.h"

/// What one input slot holds: an image, an opened video, a float HDR buffer, each optional, all owned by the slot.
/// Every call answers 1; a file that can't be read answers -97, and the content stays as it was.
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

 private:
  cv::Mat image_;
  cv::VideoCapture video_;
  std::string video_path_;  // absolute; empty without a video
  std::vector<float> hdr_;
  int hdr_width_ = 0;
  int hdr_height_ = 0;
};

#endif  // QVTESTER_RESOURCE_H_
