#include "chart/surf.h"

#include <gtest/gtest.h>

#include "unit_tests/drawing.h"
#include "unit_tests/plain/surf.h"

namespace {

// Noise of this grain, or polygons with sharp edges when it is 0.
cv::Mat DrawTexture(unsigned seed, cv::Size size, double grain) {
  if (grain == 0) return DrawScene(seed, size, size.area() / 1000, 0);
  cv::Mat picture(size, CV_8UC1);
  cv::RNG(seed).fill(picture, cv::RNG::UNIFORM, 0, 256);
  cv::GaussianBlur(picture, picture, {}, grain);
  cv::normalize(picture, picture, 0, 255, cv::NORM_MINMAX);
  return picture;
}

TEST(Surf, KeyPointsAndDescriptorsAreThoseOfThePlainForm) {
  const struct {
    cv::Size size;
    double grain;
    std::size_t least;  // key points, so that something is compared
  } kPictures[] = {{{320, 240}, 0, 100}, {{233, 317}, 2, 300}, {{320, 240}, 6, 20}, {{700, 520}, 0, 500},
                   {{31, 200}, 1.5, 10}, {{1, 1}, 0, 0},       {{13, 9}, 0, 0},     {{640, 480}, 20, 1}};
  unsigned seed = 1;
  for (const auto& [size, grain, least] : kPictures) {
    const cv::Mat picture = DrawTexture(seed++, size, grain);
    std::vector<cv::KeyPoint> points;
    std::vector<cv::KeyPoint> expected_points;
    cv::Mat values;
    cv::Mat expected_values;
    DetectAndDescribe(picture, points, values);
    plain::DetectAndDescribe(picture, expected_points, expected_values);
    ASSERT_EQ(expected_points.size(), points.size()) << size;
    EXPECT_GE(points.size(), least) << size;
    for (std::size_t i = 0; i < points.size(); ++i) {
      const cv::KeyPoint& point = points[i];
      const cv::KeyPoint& expected = expected_points[i];
      ASSERT_TRUE(point.pt == expected.pt && point.size == expected.size && point.angle == expected.angle &&
                  point.response == expected.response)
          << size << " point " << i;
    }
    ASSERT_EQ(expected_values.size(), values.size());
    EXPECT_TRUE(values.empty() || cv::norm(expected_values, values, cv::NORM_INF) == 0) << size;
  }
}

}  // namespace
