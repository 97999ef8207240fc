#include "desk/measure/robust_map.h"

#include <gmock/gmock.h>

#include <opencv2/imgproc.hpp>

#include "qvtester/tester.h"
#include "unit_tests/drawing.h"

namespace {

using ::testing::HasSubstr;

TEST(RobustMap, IsRightWhereThreeMatchesAreNot) {
  QVTester tester;
  const cv::Mat scene = DrawScene(11, {420, 340}, 220);
  cv::RNG random(5);
  for (int i = 0; i < 4; ++i) {
    const double turn = random.uniform(-10.0, 10.0);
    cv::Mat truth = cv::getRotationMatrix2D({210, 170}, turn, random.uniform(0.9, 1.1));
    truth.at<double>(0, 2) += random.uniform(-41.0, 41.0);
    truth.at<double>(1, 2) += random.uniform(-41.0, 41.0);
    cv::Mat image;
    cv::warpAffine(scene, image, truth, scene.size(), cv::INTER_CUBIC, cv::BORDER_REFLECT);
    cv::Mat noise(image.size(), CV_16S);
    random.fill(noise, cv::RNG::NORMAL, 0, 8);  // 3 %
    cv::add(image, noise, image, cv::noArray(), CV_8U);
    cv::cvtColor(image, image, cv::COLOR_GRAY2BGR);
    const qv::RobustMap map = qv::FindRobustMap(tester, scene, image);
    ASSERT_FALSE(map.matrix.empty()) << map.doubt;
    EXPECT_LT(qv::MapDistance(truth, map.matrix, scene.size()), 0.1);
    EXPECT_EQ("", map.doubt);
    EXPECT_GT(map.agreeing, 50);
    EXPECT_LT(map.residual_px, 1.5);
  }
  cv::Mat large(1000, 1600, CV_8UC1, cv::Scalar(128));  // is shrunk to be searched
  scene.copyTo(large({{900, 500}, scene.size()}));
  const qv::RobustMap map = qv::FindRobustMap(tester, scene, large);
  EXPECT_EQ("", map.doubt);
  EXPECT_LT(qv::MapDistance((cv::Mat_<double>(2, 3) << 1, 0, 900, 0, 1, 500), map.matrix, scene.size()), 0.1);
}

TEST(RobustMap, SaysWhyThereIsNoneOrItIsDoubtful) {
  QVTester tester;
  const cv::Mat scene = DrawScene(11, {420, 340}, 220);
  const cv::Mat blank(340, 420, CV_8UC1, cv::Scalar(90));
  for (const auto& [image, why] : {std::pair{blank, "0 features match"}, {DrawScene(12, {420, 340}, 220), "match"}}) {
    const qv::RobustMap map = qv::FindRobustMap(tester, scene, image);
    EXPECT_THAT(map.doubt, HasSubstr(why));
    EXPECT_TRUE(map.matrix.empty());
  }
  cv::Mat scattered = blank.clone();  // pieces that went each its own way
  cv::RNG random(1);
  for (int i = 0; i < 20; ++i) {
    const cv::Point from{random.uniform(0, 396), random.uniform(0, 316)};
    scene({from, cv::Size(24, 24)}).copyTo(scattered({{i % 5 * 84 + 20, i / 5 * 84 + 20}, cv::Size(24, 24)}));
  }
  const qv::RobustMap none = qv::FindRobustMap(tester, scene, scattered);
  EXPECT_THAT(none.doubt, HasSubstr("matches agree with one map"));
  EXPECT_TRUE(none.matrix.empty());
  cv::Mat corner = blank.clone();  // a few features agree; the rest is another picture
  DrawScene(13, {420, 340}, 220).copyTo(corner);
  scene(cv::Rect(0, 0, 110, 90)).copyTo(corner(cv::Rect(0, 0, 110, 90)));
  EXPECT_NE("", qv::FindRobustMap(tester, scene, corner).doubt);
}

TEST(RobustMap, DistanceIsTheMeanOverThePicture) {
  const cv::Mat none = (cv::Mat_<double>(2, 3) << 1, 0, 0, 0, 1, 0);
  const cv::Mat shifted = (cv::Mat_<double>(2, 3) << 1, 0, 3, 0, 1, -4);
  const cv::Mat wider = (cv::Mat_<double>(2, 3) << 1.01, 0, 0, 0, 1, 0);
  EXPECT_DOUBLE_EQ(5, qv::MapDistance(none, shifted, {640, 480}));
  EXPECT_NEAR(0.5, qv::MapDistance(none, wider, {101, 7}), 1e-12);
}

}  // namespace
