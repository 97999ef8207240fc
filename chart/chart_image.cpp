#include "chart/chart_image.h"

#include <opencv2/imgproc.hpp>

const cv::Mat& ConvertToGray(QVTester& tester, const cv::Mat& photo) {
  cv::cvtColor(photo, tester.gray_, cv::COLOR_RGB2GRAY);
  return tester.gray_;
}

const cv::Mat& Binarise(QVTester& tester, int threshold) {
  if (tester.gray_.depth() != CV_8U) {
    CV_Error(cv::Error::StsUnsupportedFormat, "a chart photo needs 8 bits a channel");
  }
  cv::threshold(tester.gray_, tester.binary_, threshold, 255, cv::THRESH_BINARY);
  return tester.binary_;
}
