#include "chart/chart_image.h"

#include <opencv2/imgproc.hpp>

cv::Mat Binarise(const cv::Mat& gray, int threshold) {
  if (gray.depth() != CV_8U) CV_Error(cv::Error::StsUnsupportedFormat, "a chart photo needs 8 bits a channel");
  cv::Mat binary;
  cv::threshold(gray, binary, threshold, 255, cv::THRESH_BINARY);
  return binary;
}
