#include <opencv2/imgproc.hpp>

#include "desk/simulation/development.h"

namespace qv {

// Unsharp mask: adds a share of what a Gaussian blur of this sigma takes away.
void Sharpen(double amount, double radius_px, cv::Mat& levels) {
  cv::Mat blurred;
  cv::GaussianBlur(levels, blurred, {}, radius_px, radius_px, cv::BORDER_REPLICATE);
  levels += amount * (levels - blurred);
}

}  // namespace qv
