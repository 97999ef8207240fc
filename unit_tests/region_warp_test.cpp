#include "chart/region_warp.h"

#include <gtest/gtest.h>

#include <opencv2/imgproc.hpp>

#include "unit_tests/agreement_test.h"
#include "unit_tests/drawing.h"

namespace {

// Holds regions of a picture, turned about the middle of its square canvas, against the whole warp's.
void ExpectPartsOfTheWhole(const cv::Mat& image, double degrees, const std::vector<cv::Rect>& regions) {
  const int side = std::max(image.cols, image.rows);
  const float middle = static_cast<float>(side) * 0.5f;
  const cv::Mat turn = cv::getRotationMatrix2D({middle, middle}, degrees, 1.0);
  cv::Mat whole;
  cv::warpAffine(image, whole, turn, {side, side}, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
  for (const cv::Rect& region : regions) {
    const cv::Mat warped = WarpRegion(image, turn, whole.size(), region);
    ASSERT_EQ(whole(region).size(), warped.size());
    ASSERT_EQ(0, region.empty() ? 0 : cv::norm(whole(region), warped, cv::NORM_INF))
        << image.size() << ' ' << degrees << ' ' << region;
  }
}

// Should this fail on a later OpenCV, or on another processor, cv::warpAffine forms its places differently there: then
// WarpRegion has to do the same, or to cut its region from the whole.
TEST(RegionWarp, EveryPixelIsThatOfTheWholeWarp) { ExpectAgreement(plain::Warp, 2000); }

TEST(RegionWarp, EveryPixelIsThatOfTheWholeWarpAtAllDegrees) {
  SeededDraws any(1);
  for (const cv::Size& size : {cv::Size(320, 240), cv::Size(167, 251), cv::Size(500, 31), cv::Size(5, 3)}) {
    const int side = std::max(size.width, size.height);
    for (int degrees = 0; degrees < 360 && !HasFailure(); ++degrees) {
      cv::Mat image(size, degrees % 3 == 0 ? CV_8UC3 : CV_8UC1);
      cv::randu(image, 0, 256);
      const cv::Point at{any.Whole(0, side - 1), any.Whole(0, side - 1)};
      const cv::Size part{any.Whole(1, side - at.x), any.Whole(1, side - at.y)};
      ExpectPartsOfTheWhole(image, degrees,
                            {{0, 0, side, side},
                             {at, part},
                             {side - 1, 0, 1, side},
                             {0, side - 1, side, 1},
                             {at, cv::Size(0, 1)},
                             {at, cv::Size(1, 0)}});
    }
  }
}

TEST(RegionWarp, AMapThatFoldsShowsOnePixel) {
  cv::Mat image(20, 30, CV_8UC1);
  cv::randu(image, 0, 256);
  const cv::Mat map = (cv::Mat_<double>(2, 3) << 1, 2, 3, 2, 4, 5);
  cv::Mat whole;
  cv::warpAffine(image, whole, map, {30, 30});
  EXPECT_EQ(0, cv::norm(whole(cv::Rect(4, 5, 20, 20)), WarpRegion(image, map, {30, 30}, {4, 5, 20, 20}), cv::NORM_INF));
}

TEST(RegionWarp, ALargePictureKeepsItsPlaces) {
  cv::Mat image(3000, 4000, CV_8UC1);  // far from the origin, where places round most
  cv::randu(image, 0, 256);
  for (const double degrees : {1.0, 29.0, 88.0, 183.0, 271.0, 359.0}) {
    ExpectPartsOfTheWhole(image, degrees, {{2100, 1900, 777, 270}, {3200, 3000, 800, 1000}});
  }
}

}  // namespace
