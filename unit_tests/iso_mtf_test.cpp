#include "qvtester/iso_mtf.h"

#include <gmock/gmock.h>

#include <cmath>

#include "tools/method_law.h"
#include "unit_tests/drawing.h"

namespace {

using ::testing::HasSubstr;

constexpr double kLength = 400;
constexpr double kWidth = 160;

struct Slant {
  double turn_deg = 0, slope_deg = 5;  // of the region in the photo, of the edge in the region
  double sigma_px = 0.8, noise = 0;
  cv::Point2d off = {0, 0};  // of the edge's middle from the region's
  double width = kWidth;
  bool light_left = false;
};

QVIsoMtf MeasureEdge(const Slant& slant) {
  const int side = static_cast<int>(std::hypot(kLength, kWidth)) + 2;
  EdgePhoto view;
  view.size = {side, side};
  const cv::Point2d middle(side / 2.0, side / 2.0);
  view.through = middle + slant.off;
  view.normal_deg = slant.turn_deg + slant.slope_deg + (slant.light_left ? 180 : 0);
  view.sigma_px = slant.sigma_px;
  cv::Mat photo = DrawEdgePhoto(view);
  cv::Mat noise(photo.size(), CV_32F);
  cv::randn(noise, 0, slant.noise);
  cv::Mat(photo + noise).convertTo(photo, CV_8U);
  QVIsoMtf result;
  EXPECT_EQ(QV_SUCCESS, MeasureIsoMtf50(photo, TurnedRectangle(middle, kLength, slant.width, slant.turn_deg), &result));
  return result;
}

double ErrorPercent(const Slant& slant) {
  const double truth = method_law::TrueMtf50(slant.sigma_px, slant.turn_deg + slant.slope_deg);
  return (MeasureEdge(slant).mtf50 / truth - 1) * 100;
}

class IsoBlur : public ::testing::TestWithParam<double> {};

TEST_P(IsoBlur, TheFigureIsTheTrueOneWhateverSlopeTurnAndPlace) {
  for (const double slope : {-8.0, -3.0, 3.0, 5.0, 8.0}) {
    for (const double turn : {0.0, 2.0, 31.0, 44.0, 90.0, 118.0, 180.0, 270.0}) {
      const Slant slant = {turn, slope, GetParam(), 0, {0.37, 0.81}};
      // Where few distinct distances fall into a bin, their mean is not its middle: 1 % at some slopes.
      EXPECT_NEAR(0, ErrorPercent(slant), 1.0) << "slope " << slope << ", turned by " << turn;
    }
  }
}

TEST_P(IsoBlur, NoiseOfTwoPercentCostsTwoPercentAtMost) {
  cv::theRNG().state = 12;
  double sum = 0;
  constexpr int kPhotos = 20;
  for (int i = 0; i < kPhotos; ++i) sum += std::fabs(ErrorPercent({0, 3 + i / 4.0, GetParam(), 0.02 * 255}));
  EXPECT_LT(sum / kPhotos, 2);
}
INSTANTIATE_TEST_SUITE_P(Sigma, IsoBlur, ::testing::Values(0.3, 0.5, 0.8, 1.2, 2.0, 3.0, 8.0));

TEST(IsoMtf, PolarityPlaceAndOrientationLeaveItAlone) {
  const QVIsoMtf plain = MeasureEdge({});
  EXPECT_EQ(nullptr, plain.reason);
  EXPECT_NEAR(-5, plain.edge_angle_deg, 0.01);
  Slant slant;
  slant.light_left = true;
  EXPECT_NEAR(plain.mtf50, MeasureEdge(slant).mtf50, 1e-3 * plain.mtf50);  // levels are rounded elsewhere
  slant.turn_deg = 90;
  EXPECT_NEAR(plain.mtf50, MeasureEdge(slant).mtf50, 1e-3 * plain.mtf50);
  slant.off = {68, 0};  // it leaves the region half-way to its end
  EXPECT_NEAR(plain.mtf50, MeasureEdge(slant).mtf50, 5e-3 * plain.mtf50);
  slant.off = {3, -20};  // the window goes with the edge, not with the region
  EXPECT_NEAR(plain.mtf50, MeasureEdge(slant).mtf50, 5e-3 * plain.mtf50);
}

TEST(IsoMtf, ARegionMayFillThePhoto) {
  EdgePhoto view;
  view.size = {100, 250};
  view.through = {50, 125};
  QVIsoMtf result;
  const auto all = TurnedRectangle({49.5, 124.5}, 250, 100, 0);
  ASSERT_EQ(QV_SUCCESS, MeasureIsoMtf50(DrawEdgePhoto(view), all, &result));
  EXPECT_NEAR(method_law::TrueMtf50(view.sigma_px, view.normal_deg), result.mtf50, 0.01 * result.mtf50);
}

TEST(IsoMtf, WhereThereIsNoFigureItSaysWhy) {
  const auto why = [](const Slant& slant) {
    const QVIsoMtf result = MeasureEdge(slant);
    EXPECT_TRUE(std::isnan(result.mtf50));
    return std::string(result.reason == nullptr ? "" : result.reason);
  };
  EXPECT_THAT(why({0, 0}), HasSubstr("follows the pixel grid"));
  EXPECT_THAT(why({40, 5}), HasSubstr("follows the pixel grid")) << "at 45 degrees";
  Slant slant;
  slant.width = 10;
  EXPECT_THAT(why(slant), HasSubstr("too small"));
  slant.width = kWidth;
  slant.sigma_px = 30;
  EXPECT_THAT(why(slant), HasSubstr("too wide"));
  slant.sigma_px = 1;
  slant.off = {kWidth / 2 - 5, 0};
  slant.slope_deg = 0.3;  // and still in every row
  EXPECT_THAT(why(slant), HasSubstr("too near"));
  slant.off = {3 * kWidth, 0};
  EXPECT_THAT(why(slant), HasSubstr("not show one edge"));
  slant.noise = 5;
  EXPECT_THAT(why(slant), HasSubstr("not show one edge"));

  QVIsoMtf result;
  const auto beyond = TurnedRectangle({5000, -3}, kLength, kWidth, 0);
  EXPECT_EQ(QV_SUCCESS, MeasureIsoMtf50(cv::Mat::zeros(9, 9, CV_8U), beyond, &result));
  EXPECT_THAT(result.reason, HasSubstr("outside the photo"));
  for (const double nowhere : {1e300, -1e12, std::nan("")}) {
    const auto corners = TurnedRectangle({nowhere, 0}, kLength, kWidth, 0);
    EXPECT_EQ(QV_SUCCESS, MeasureIsoMtf50(cv::Mat::zeros(9, 9, CV_8U), corners, &result));
    EXPECT_TRUE(std::isnan(result.mtf50) && result.reason != nullptr) << nowhere;
  }
  EXPECT_EQ(QV_ERROR_UNUSABLE_INPUT, MeasureIsoMtf50(cv::Mat::zeros(9, 9, CV_8UC3), beyond, &result));
  EXPECT_EQ(QV_ERROR_UNUSABLE_INPUT, MeasureIsoMtf50(cv::Mat(), beyond, &result));
  EXPECT_EQ(QV_ERROR_INVALID_ARGUMENT, MeasureIsoMtf50(cv::Mat::zeros(9, 9, CV_8U), beyond, nullptr));
}

}  // namespace
