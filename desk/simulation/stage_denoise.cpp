#include <opencv2/imgproc.hpp>

#include "desk/simulation/development.h"

namespace qv {

// A bilateral filter: neighbours count the less the further their level is from the pixel's.
void Denoise(double noise_levels, cv::Mat& levels) {
  constexpr int kWindow = 5;
  constexpr double kSigmaPx = 1.5;
  cv::Mat smooth;
  cv::bilateralFilter(levels, smooth, kWindow, noise_levels, kSigmaPx, cv::BORDER_REPLICATE);
  levels = smooth;
}

}  // namespace qv
