#include <algorithm>
#include <opencv2/imgproc.hpp>

#include "desk/simulation/development.h"

namespace qv {

// Red at the even rows and columns, blue at the odd ones, green elsewhere; the others edge-aware, from 16 bits. Light
// below black is kept by an offset, as sensors do.
void Mosaic(cv::Mat& levels) {
  constexpr double kBlack = 16;  // levels
  double most = 0;
  cv::minMaxLoc(levels.reshape(1), nullptr, &most);
  const double scale = 65535 / (std::max(most, 255.0) + kBlack);
  cv::Mat raw(levels.size(), CV_16UC1);
  for (int i = 0; i < levels.rows; ++i) {
    for (int j = 0; j < levels.cols; ++j) {
      const int channel = i % 2 == j % 2 ? (i % 2 == 0 ? 2 : 0) : 1;
      raw.at<ushort>(i, j) = cv::saturate_cast<ushort>((levels.at<cv::Vec3f>(i, j)[channel] + kBlack) * scale);
    }
  }
  cv::Mat colours;
  cv::demosaicing(raw, colours, cv::COLOR_BayerBG2BGR_EA);  // named after the pixels at (1, 1) and (1, 2)
  colours.convertTo(levels, CV_32F, 1 / scale, -kBlack);
}

}  // namespace qv
