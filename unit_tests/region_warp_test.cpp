#include "chart/region_warp.h"

#include <gtest/gtest.h>

#include <opencv2/imgproc.hpp>
#include <random>

namespace {

cv::Mat Turn(int side, double degrees) {
  const float middle = static_cast<float>(side) * 0.5f;
  return cv::getRotationMatrix2D(cv::Point2f(middle, middle), degrees, 1.0);
}

// Should this fail on a later OpenCV, or on another processor, cv::warpAffine forms its places differently there: then
// WarpRegion has to do the same, or to cut its region from the whole.
TEST(RegionWarp, EveryPixelIsThatOfTheWholeWarpAtAllDegrees) {
  std::mt19937 random(1);
  const auto any = [&](int from, int to) { return std::uniform_int_distribution<int>(from, to)(random); };
  for (const cv::Size& size : {cv::Size(320, 240), cv::Size(167, 251), cv::Size(500, 31), cv::Size(5, 3)}) {
    const int side = std::max(size.width, size.height);
    for (int degrees = 0; degrees < 360; ++degrees) {
      cv::Mat image(size, degrees % 3 == 0 ? CV_8UC3 : CV_8UC1);
      cv::randu(image, 0, 256);
      cv::Mat whole;
      const cv::Mat turn = Turn(side, degrees);
      cv::warpAffine(image, whole, turn, {side, side}, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
      const int x = any(0, side - 1);
      const int y = any(0, side - 1);
      for (const cv::Rect& region : {cv::Rect(0, 0, side, side), cv::Rect(x, y, any(1, side - x), any(1, side - y)),
                                     cv::Rect(side - 1, 0, 1, side), cv::Rect(0, side - 1, side, 1),
                                     cv::Rect(x, y, 0, 1), cv::Rect(x, y, 1, 0)}) {
        const cv::Mat warped = WarpRegion(image, turn, {side, side}, region);
        ASSERT_EQ(whole(region).size(), warped.size());
        ASSERT_EQ(0, region.empty() ? 0 : cv::norm(whole(region), warped, cv::NORM_INF))
            << size << ' ' << degrees << ' ' << region;
      }
    }
  }
}

TEST(RegionWarp, ALargePictureKeepsItsPlaces) {
  cv::Mat image(3000, 4000, CV_8UC1);  // far from the origin, where places round most
  cv::randu(image, 0, 256);
  for (const double degrees : {1.0, 29.0, 88.0, 183.0, 271.0, 359.0}) {
    const cv::Mat turn = Turn(4000, degrees);
    cv::Mat whole;
    cv::warpAffine(image, whole, turn, {4000, 4000}, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
    for (const cv::Rect& region : {cv::Rect(2100, 1900, 777, 270), cv::Rect(3200, 3000, 800, 1000)}) {
      const cv::Mat warped = WarpRegion(image, turn, {4000, 4000}, region);
      ASSERT_EQ(0, cv::norm(whole(region), warped, cv::NORM_INF)) << degrees << ' ' << region;
    }
  }
}

}  // namespace
