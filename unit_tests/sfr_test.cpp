#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/simulation/method_law.h"
#include "qvtester/tester.h"
#include "unit_tests/agreement_test.h"
#include "unit_tests/drawing.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::FloatNear;
using ::testing::Pointwise;

struct Sfr {
  std::vector<float> freq, sfr;
  float mtf50 = 0;
};

Sfr Measure(const cv::Mat& region) {
  QVTester tester;
  Sfr result;
  EXPECT_TRUE(tester.CalculateSFR(region, result.freq, result.sfr, result.mtf50));
  return result;
}

cv::Mat Column(std::vector<float> values) { return cv::Mat(values, true); }

std::vector<float> Values(const cv::Mat& matrix) { return matrix.reshape(1, 1); }

class KnownBlur : public ::testing::TestWithParam<double> {};

TEST_P(KnownBlur, Mtf50LiesWithinTheLaw) {
  const double sigma = GetParam();
  for (const int cols : {100, 151}) {
    const auto [low, high] = qv::method_law::MeasuredMtf50(sigma, cols);
    for (const double slope_deg : {3.0, 5.0, 8.0}) {
      for (const double place : {0.3, -6.5}) {
        const double slope = std::tan(slope_deg * CV_PI / 180);
        const float mtf50 = Measure(DrawEdge({2 * cols, cols, slope, sigma, 40, 200, true, place})).mtf50;
        EXPECT_GT(mtf50, 0.98 * low) << cols << " " << slope_deg << " " << place;  // 2 % is the law's own
        EXPECT_LT(mtf50, 1.02 * high) << cols << " " << slope_deg << " " << place;
      }
    }
  }
}
INSTANTIATE_TEST_SUITE_P(Sigma, KnownBlur, ::testing::Values(0.5, 0.8, 1.2, 2.0, 3.0));

TEST(SlantedEdge, PolarityAndOrientationLeaveTheResponseAlone) {
  const float rounding = 2e-5f;  // sums of other grey levels round elsewhere, no more
  EdgeView view;
  const Sfr plain = Measure(DrawEdge(view));
  view.dark_left = false;
  const Sfr inverted = Measure(DrawEdge(view));
  EXPECT_THAT(inverted.sfr, Pointwise(FloatNear(rounding), plain.sfr));
  const Sfr lying = Measure(DrawEdge({}).t());
  EXPECT_EQ(plain.sfr, lying.sfr) << "a region wider than tall is transposed, nothing else";
  EXPECT_EQ(plain.mtf50, lying.mtf50);
}

TEST(SlantedEdge, WithoutAnEdgeThereIsNoFigure) {
  const Sfr flat = Measure(cv::Mat(200, 60, CV_32F, cv::Scalar(128)));
  EXPECT_EQ(31u, flat.freq.size());
  EXPECT_FALSE(std::isfinite(flat.mtf50));
  for (const float response : flat.sfr) EXPECT_FALSE(std::isfinite(response));
  EXPECT_NO_THROW(Measure(cv::Mat(20, 5, CV_32F, cv::Scalar(3))));
  EXPECT_THROW(Measure(cv::Mat(20, 4, CV_32F, cv::Scalar(3))), cv::Exception);
}

TEST(SfrSteps, KernelsFollowTheBrighterSide) {
  QVTester tester;
  cv::Mat region = cv::Mat::zeros(3, 10, CV_32F);
  const auto first_tap = [&] {
    float* fil1 = nullptr;
    float* fil2 = nullptr;
    tester.CalculateFilterValue(&region, &fil1, &fil2);
    const float first = fil1[0];
    EXPECT_THAT(std::vector<float>(fil2, fil2 + 3), ElementsAre(first, 0, fil1[1]));
    EXPECT_EQ(-first, fil1[1]);
    delete[] fil1;
    delete[] fil2;
    return first;
  };
  EXPECT_EQ(0.5f, first_tap()) << "equal sides";
  region.col(9).setTo(-100);  // the right strip stops a column short of this
  region.col(4).setTo(-100);
  EXPECT_EQ(0.5f, first_tap());
  region.col(3).setTo(1);
  EXPECT_EQ(-0.5f, first_tap());
}

// Beyond 2^24 a sum of whole levels is rounded: then its order counts.
TEST(SfrSteps, SumsOfVeryTallRegionsAreTakenInThePlainOrder) {
  cv::Mat region(140'000, 8, CV_8UC1);
  cv::randu(region, 200, 256);
  region.convertTo(region, CV_32F);
  QVTester tester;
  EXPECT_EQ(plain::Bits(Values(plain::ProjectData(region, -3e-5f, 1))),
            plain::Bits(Values(tester.ProjectData(region, -3e-5f, 0, 1))));
  const cv::Mat square = region.rowRange(0, 8);
  EXPECT_EQ(square.data, tester.ConvertToVertical(square).data) << "only a wider one is turned";
}

TEST(SfrSteps, TheDerivativeCorrelatesAndFillsItsFirstColumn) {
  QVTester tester;
  const cv::Mat rows = (cv::Mat_<float>(2, 5) << 0, 1, 4, 9, 16, 5, 5, 5, 5, 7);
  cv::Mat out;
  float two[] = {0.5f, -0.5f};
  tester.GetFirstDerivative(rows, 2, 5, two, 2, out);
  EXPECT_THAT(Values(out), ElementsAre(-0.5f, -0.5f, -1.5f, -2.5f, -3.5f, 0, 0, 0, 0, -1));
  float three[] = {0.5f, 0, -0.5f};
  tester.GetFirstDerivative(rows, 2, 5, three, 3, out);  // the last column sees its neighbour mirrored
  EXPECT_THAT(Values(out), ElementsAre(0, -4, -4, -6, 0, 0, 0, 0, -1, 0));
}

TEST(SfrSteps, ShiftsMoveTheCentreToTheMiddle) {
  QVTester tester;
  const cv::Mat x = Column({1, 2, 3, 4, 5});  // middle: index 3
  EXPECT_THAT(Values(tester.GetShiftedArray(x, 4)), ElementsAre(2, 3, 4, 5, 0));
  EXPECT_THAT(Values(tester.GetShiftedArray(x, 3)), ElementsAre(1, 2, 3, 4, 5));
  EXPECT_THAT(Values(tester.GetShiftedArray(x, 1)), ElementsAre(0, 0, 1, 2, 3));
  EXPECT_THAT(Values(tester.GetShiftedArray(x, 100)), Each(0));
  EXPECT_THAT(Values(tester.GetShiftedArray(x, -100)), Each(0));
  EXPECT_EQ(2.875f, tester.GetCentroid(Column({0, 1, 2, 3, 1, 1})));
}

TEST(SfrSteps, PolynomialsAreFittedLowestPowerFirst) {
  QVTester tester;
  const cv::Mat x = Column({0, 1, 2, 3, 4});
  cv::Mat fit(3, 1, CV_32F);
  tester.polyfit(x, Column({3, 4, 9, 18, 31}), fit, 2);  // 3 - x + 2 x^2
  EXPECT_THAT(Values(fit), Pointwise(FloatNear(1e-4f), {3.0f, -1.0f, 2.0f}));
  float slope = 0;
  float offset = 0;
  EXPECT_TRUE(tester.FindEdge(Column({7, 7.5f, 8, 8.5f}), 4, &slope, &offset));
  EXPECT_FLOAT_EQ(0.5f, slope);
  EXPECT_FLOAT_EQ(7.0f, offset);
  try {
    cv::Mat wrong(3, 1, CV_32F);
    tester.polyfit(x, x, wrong, 1);
    FAIL();
  } catch (const cv::Exception& e) {
    EXPECT_EQ(-215, e.code);
    EXPECT_EQ("polyfit", e.func);
    EXPECT_EQ("external/vision/lib/QVTester_MTF", e.file);
    EXPECT_EQ(
        "(src_x.rows>0)&&(src_y.rows>0)&&(src_x.cols==1)&&(src_y.cols==1) "
        "&&(dst.cols==1)&&(dst.rows==(order+1))&&(order>=1)",
        e.err);
  }
}

TEST(SfrSteps, TheResponseOfAPointIsTheCosineOfItsPlace) {  // the imaginary part is dropped
  for (const int npix : {16, 17}) {
    cv::Mat point = cv::Mat::zeros(npix, 1, CV_32F);
    point.at<float>(3) = 2;
    std::vector<float> freq;
    std::vector<float> sfr;
    AppendResponse(point, freq, sfr);
    ASSERT_EQ(9u, sfr.size());
    for (std::size_t k = 0; k < sfr.size(); ++k) {
      EXPECT_EQ(static_cast<float>(2 * k) / static_cast<float>(npix), freq[k]);
      EXPECT_NEAR(std::fabs(std::cos(2 * CV_PI * static_cast<double>(3 * k) / npix)), sfr[k], 1e-6);
    }
  }
}

TEST(SfrSteps, Mtf50LiesOnTheLineThroughTheTwoNearest) {
  const float freq[] = {0, 0.25f, 0.5f, 0.75f, 1};
  const auto of = [&](std::array<float, 5> sfr) { return InterpolateMTF50(freq, sfr.data(), 5); };
  EXPECT_FLOAT_EQ(0.5f + 0.25f * 2 / 3, of({1, 0.75f, 0.625f, 0.4375f, 0}));
  EXPECT_FLOAT_EQ(0.375f, of({1, 0.75f, 0.25f, 0, 0}));
  EXPECT_FLOAT_EQ(0.625f, of({1, 0.75f, 0.625f, 0.375f, 0.625f})) << "of equal distances the first two";
  EXPECT_FLOAT_EQ(0.25f, of({1, 0.75f, 1, 0, 0.625f})) << "they need not be neighbours";
  EXPECT_FLOAT_EQ(0.5f, of({1, 1, 1, 0.875f, 0.75f})) << "with all above, distances count without their sign";
}

TEST(SfrForms, AgreeOnAnyRegion) {
  ExpectAgreement(plain::Sfr, 4000);
  QVTester tester;
  EXPECT_EQ(plain::Outcome([&](auto&... out) { plain::CalculateSFR(tester, {}, out...); }),
            plain::Outcome([&](auto&... out) { tester.CalculateSFR({}, out...); }));
}

TEST(SfrForms, AgreeOnBinsOfAnySlope) {
  QVTester tester;
  cv::RNG random(10);
  cv::Mat region(300, 90, CV_32S);
  random.fill(region, cv::RNG::UNIFORM, 0, 256);
  region.convertTo(region, CV_32F);
  std::vector<float> slopes = {0,     -0.0f,  1,      -1,   0.5f,  -0.25f, 1.0f / 3,
                               1e-7f, -1e-7f, 1e-38f, 4e8f, -3e9f, NAN,    INFINITY};
  for (int round = 0; round < 1000; ++round) {  // from slants lost in rounding to such that no bin has its own float
    const auto size = static_cast<float>(std::pow(10.0, random.uniform(-9.0, 7.0)));
    slopes.push_back(round % 2 == 0 ? size : -size);
  }
  for (const float slope : slopes) {
    for (const int fac : {1, 2, 4}) {
      const cv::Mat part = region(cv::Rect{0, 0, random.uniform(1, 91), random.uniform(1, 301)});
      ASSERT_EQ(plain::Bits(Values(plain::ProjectData(part, slope, fac))),
                plain::Bits(Values(tester.ProjectData(part, slope, 0, fac))))
          << slope << " " << fac << " " << part.size;
    }
  }
}

}  // namespace
