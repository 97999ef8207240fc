#include "desk/measure/iso_mtf.h"

#include <gmock/gmock.h>

#include <cmath>

#include "desk/simulation/method_law.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

using ::testing::HasSubstr;

constexpr double kLength = 400;
constexpr double kWidth = 160;

struct Slant {
  double turn_deg = 0, slope_deg = 5;  // of the region in the photo, of the edge in the region
  double sigma_px = 0.8, noise = 0;
  cv::Point2d off = {0, 0};  // of the edge's middle from the region's
  double width = kWidth;     // of the region
};

IsoMtf MeasureEdge(const Slant& slant) {
  const int side = static_cast<int>(std::hypot(kLength, kWidth)) + 2;
  const cv::Point2d middle(side / 2.0, side / 2.0);
  cv::Mat photo = DrawEdgePhoto({{side, side}, middle + slant.off, slant.turn_deg + slant.slope_deg, slant.sigma_px});
  cv::Mat noise(photo.size(), CV_32F);
  cv::randn(noise, 0, slant.noise);
  cv::Mat(photo + noise).convertTo(photo, CV_8U);
  return MeasureIsoMtf(photo, TurnedRectangle(middle, kLength, slant.width, slant.turn_deg));
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
  const IsoMtf plain = MeasureEdge({});
  EXPECT_EQ(nullptr, plain.reason);
  EXPECT_NEAR(-5, plain.edge_angle_deg, 0.01);
  EXPECT_NEAR(plain.mtf50, MeasureEdge({0, 185}).mtf50, 1e-3 * plain.mtf50);  // levels are rounded elsewhere
  EXPECT_NEAR(plain.mtf50, MeasureEdge({90, 185}).mtf50, 1e-3 * plain.mtf50);
  for (const cv::Point2d off : {cv::Point2d(68, 0),      // the edge leaves the region half-way to its end
                                cv::Point2d(3, -20)}) {  // the window goes with the edge, not with the region
    EXPECT_NEAR(plain.mtf50, MeasureEdge({90, 185, 0.8, 0, off}).mtf50, 5e-3 * plain.mtf50);
  }
}

TEST(IsoMtf, ARegionMayFillThePhoto) {
  const EdgePhoto view = {{100, 250}, {50, 125}};
  const IsoMtf result = MeasureIsoMtf(DrawEdgePhoto(view), TurnedRectangle({49.5, 124.5}, 250, 100, 0));
  EXPECT_NEAR(method_law::TrueMtf50(view.sigma_px, view.normal_deg), result.mtf50, 0.01 * result.mtf50);
}

TEST(IsoMtf, WhereThereIsNoFigureItSaysWhy) {
  for (const auto& [slant, reason] : std::vector<std::pair<Slant, const char*>>{
           {{0, 0}, "follows the pixel grid"},
           {{40, 5}, "follows the pixel grid"},  // at 45 degrees
           {{0, 5, 0.8, 0, {}, 10}, "too small"},
           {{0, 5, 30}, "too wide"},
           {{0, 0.3, 1, 0, {kWidth / 2 - 5, 0}}, "too near"},  // and still in every row
           {{0, 0.3, 1, 0, {3 * kWidth, 0}}, "not show one edge"},
           {{0, 0.3, 1, 5, {3 * kWidth, 0}}, "not show one edge"}}) {
    const IsoMtf result = MeasureEdge(slant);
    EXPECT_TRUE(std::isnan(result.mtf50)) << reason;
    EXPECT_THAT(result.reason, HasSubstr(reason));
  }
  const cv::Mat photo = cv::Mat::zeros(9, 9, CV_8U);
  const auto beyond = TurnedRectangle({5000, -3}, kLength, kWidth, 0);
  EXPECT_THAT(MeasureIsoMtf(photo, beyond).reason, HasSubstr("outside the photo"));
  for (const double nowhere : {1e300, -1e12, std::nan("")}) {
    const IsoMtf result = MeasureIsoMtf(photo, TurnedRectangle({nowhere, 0}, kLength, kWidth, 0));
    EXPECT_TRUE(std::isnan(result.mtf50) && result.reason != nullptr) << nowhere;
  }
  EXPECT_THROW(MeasureIsoMtf(cv::Mat::zeros(9, 9, CV_8UC3), beyond), cv::Exception);
  EXPECT_THROW(MeasureIsoMtf(cv::Mat(), beyond), cv::Exception);
}

}  // namespace
}  // namespace qv
