#include "desk/measure/grey.h"

#include <opencv2/imgproc.hpp>

namespace qv {

cv::Mat GreyOf(const cv::Mat& picture) {
  if (picture.channels() == 1) return picture;
  cv::Mat grey;
  cv::cvtColor(picture, grey, picture.channels() == 4 ? cv::COLOR_BGRA2GRAY : cv::COLOR_BGR2GRAY);
  return grey;
}

}  // namespace qv
