#include "desk/simulation/development.h"

#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/scenes/scene.h"
#include "desk/simulation/method_law.h"
#include "desk/simulation/truth.h"

// What phones do with a photo, each stage by what it must make of a picture of known content.

namespace qv {
namespace {

cv::Mat Even(const cv::Scalar& bgr) { return {cv::Size(40, 30), CV_32FC3, bgr}; }

TEST(Development, StoredLevelsAreSrgb) {
  // IEC 61966-2-1: half the code value is 21.4 % of the light, 18 % of it is code value 0.4614.
  EXPECT_NEAR(0.2140, LightOf(127.5) / 255, 5e-5);
  EXPECT_NEAR(0.4614, LevelOf(0.18 * 255) / 255, 5e-5);
  EXPECT_NEAR(10 / 12.92, LightOf(10), 1e-9);  // the linear part
  for (int level = -20; level < 300; ++level) EXPECT_NEAR(level, LevelOf(LightOf(level)), 0.01);
}

TEST(Development, TheShoulderStartsSmoothlyAndStaysBelowWhite) {
  cv::Mat levels(1, 1000, CV_32FC3);
  for (int i = 0; i < 1000; ++i) levels.at<cv::Vec3f>(i) = cv::Vec3f::all(static_cast<float>(i));
  const cv::Mat before = levels.clone();
  Bend(0.8, levels);
  EXPECT_EQ(0, cv::norm(levels.colRange(0, 205), before.colRange(0, 205)));  // 204 = 0.8 x 255
  for (int i = 1; i < 1000; ++i) {
    const float step = levels.at<cv::Vec3f>(i)[1] - levels.at<cv::Vec3f>(i - 1)[1];
    EXPECT_TRUE(step >= 0 && step <= 1.0001f) << i;
    EXPECT_LE(levels.at<cv::Vec3f>(i)[1], 255) << i;
  }
  EXPECT_NEAR(std::exp(-5.5 / 51), levels.at<cv::Vec3f>(210)[1] - levels.at<cv::Vec3f>(209)[1], 1e-3);
}

TEST(Development, EachChannelSaturatesByItself) {
  CameraModel camera;
  camera.saturation = {1.5, 0, 0.5};
  cv::Mat levels = Even({300, 400, 500});
  Saturate(camera, levels);
  EXPECT_EQ(cv::Vec3f(127.5f, 400, 382.5f), levels.at<cv::Vec3f>(7, 7));
}

TEST(Development, AMosaicLeavesEvenColoursAloneAndFringesEdges) {
  for (const cv::Scalar& colour : {cv::Scalar(10, 120, 250), cv::Scalar(250, 120, 10), cv::Scalar(-3, 40, 600)}) {
    cv::Mat levels = Even(colour);
    Mosaic(levels);
    EXPECT_LT(cv::norm(levels, Even(colour), cv::NORM_INF), 0.02) << colour;
  }
  cv::Mat edge = Even(cv::Scalar::all(20));
  edge.colRange(20, 40).setTo(cv::Scalar::all(200));
  Mosaic(edge);
  cv::Mat channels[3];
  cv::split(edge, channels);
  EXPECT_GT(cv::norm(channels[0], channels[2], cv::NORM_INF), 20);
}

TEST(Development, SharpeningRaisesAFrequencyByItsLaw) {
  cv::Mat wave(21, 200, CV_32FC3);
  for (const double period : {4.0, 8.0, 25.0}) {
    for (int i = 0; i < 200; ++i) {
      wave.col(i).setTo(cv::Scalar::all(100 + 50 * std::cos(2 * CV_PI * (i - 100) / period)));
    }
    Sharpen(0.8, 1.2, wave);
    const double taken = 1 - std::exp(-2 * std::pow(CV_PI * 1.2 / period, 2));
    EXPECT_NEAR(50 * (1 + 0.8 * taken), wave.at<cv::Vec3f>(10, 100)[1] - 100, 0.2) << period;
  }
}

TEST(Development, DenoisingEvensNoiseAndKeepsEdges) {
  cv::Mat levels = Even(cv::Scalar::all(50));
  levels.colRange(20, 40).setTo(cv::Scalar::all(150));
  cv::Mat noise(levels.size(), CV_32FC3);
  cv::RNG(1).fill(noise, cv::RNG::NORMAL, 0, 2);
  levels += noise;
  Denoise(6, levels);
  for (const int half : {0, 20}) {
    cv::Scalar mean;
    cv::Scalar deviation;
    cv::meanStdDev(levels.colRange(half, half + 20), mean, deviation);
    EXPECT_NEAR(50 + 5 * half, mean[1], 0.5);
    EXPECT_LT(deviation[1], 1);
  }
}

// A Gaussian of 1.5 px, among levels that are near.
TEST(Development, DenoisingWeighsNeighboursByTheirDistance) {
  cv::Mat levels(9, 9, CV_32FC3, cv::Scalar::all(100));
  levels.at<cv::Vec3f>(4, 4) = {101, 101, 101};
  Denoise(1000, levels);
  const auto lifted = [&](int column) { return levels.at<cv::Vec3f>(4, column)[1] - 100; };
  EXPECT_NEAR(std::exp(-1 / 4.5), lifted(5) / lifted(4), 0.01);
}

// Lens and unsharp mask have their analytic responses; the truth's is taken from a picture of an edge.
TEST(Development, TheSystemsFigureIsThatOfAllItsParts) {
  for (const auto& [amount, blur] : {std::pair(0.5, 0.9), {2.0, 0.9}, {2.0, 0.4}}) {
    CameraModel camera;
    camera.blur_px = blur;
    camera.sharpen = amount;
    camera.sharpen_radius_px = 1.5;
    camera.gain = 0.6;  // room for the overshoot
    const cv::Point2d along(std::sin(0.09), std::cos(0.09));
    const auto response = [&, share = amount](double f) {
      return LensResponse(camera, f, {along.y, -along.x}) *
             (1 + share * (1 - std::exp(-2 * std::pow(CV_PI * 1.5 * f, 2))));
    };
    const Json truth = SystemTruth(camera, along, 2);
    const double mtf50 = 2 * method_law::HalfPoint(response, 1.0);
    EXPECT_NEAR(mtf50, truth["light"]["mtf50_nyquist"], 0.005 * mtf50);
    for (int i = 0; i <= 20; ++i) EXPECT_NEAR(response(i / 40.0), truth["stored"]["sfr"][i][1], 0.01) << i;

    // Without the other stages encoding changes nothing in light.
    camera.sharpen = 0;
    camera.srgb = true;
    const double lens = 2 * method_law::HalfPoint([&](double f) { return LensResponse(camera, f, along); }, 1.0);
    EXPECT_NEAR(lens, SystemTruth(camera, along, 2)["light"]["mtf50_nyquist"], 0.005 * lens);
  }
}

TEST(Development, LightIsStoredAsTheLevelsThatStoodForIt) {
  CameraModel camera;
  camera.size = {64, 48};
  camera.gain = 1;
  camera.srgb = true;
  for (const double level : {3.0, 20.0, 90.5, 240.0}) {
    Scene scene;
    scene.paper = Grey(level);
    const cv::Mat stored = Stored(camera, Expose(camera, scene, cv::Matx33d::eye()));
    EXPECT_LT(cv::norm(stored, cv::Mat(48, 64, CV_32FC3, cv::Scalar::all(level)), cv::NORM_INF), 0.05) << level;
  }
}

}  // namespace
}  // namespace qv
