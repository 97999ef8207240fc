#include "desk/measure/iso_mtf.h"

#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgcodecs.hpp>
#include <string>
#include <vector>

#include "desk/simulation/method_law.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

using ::testing::DoubleNear;
using ::testing::HasSubstr;

constexpr double kLength = 400;
constexpr double kWidth = 160;
constexpr Transfer kLinear = {Transfer::Kind::kLinear, 1};

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
  return MeasureIsoMtf(photo, TurnedRectangle(middle, kLength, slant.width, slant.turn_deg), kLinear);
}

double ErrorPercent(const Slant& slant) {
  const double truth = method_law::TrueMtf50(slant.sigma_px, slant.turn_deg + slant.slope_deg);
  return (MeasureEdge(slant).figures.mtf50 / truth - 1) * 100;
}

class IsoBlur : public ::testing::TestWithParam<double> {};

TEST_P(IsoBlur, TheFigureIsTheTrueOneWhateverSlopeTurnAndPlace) {
  for (const double slope : {-8.0, -3.0, 3.0, 5.0, 8.0}) {
    for (const double turn : {0.0, 2.0, 31.0, 44.0, 90.0, 118.0, 180.0, 270.0}) {
      const Slant slant = {turn, slope, GetParam(), 0, {0.37, 0.81}};
      // The plateaus are whole levels, on which rounding has nothing to average over: 0.2 %.
      EXPECT_NEAR(0, ErrorPercent(slant), 0.5) << "slope " << slope << ", turned by " << turn;
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

TEST_P(IsoBlur, EveryFigureIsThatOfTheLens) {
  const double sigma = GetParam();
  const IsoMtf iso = MeasureEdge({0, 5, sigma});
  const auto falls_to = [&](double level) {
    return 2 * method_law::HalfPoint([&](double f) { return method_law::TrueResponse(f, sigma, 5) * 0.5 / level; }, 1);
  };
  double place = 0;  // by symmetry half of the way from 10 to 90 %
  while (EdgeRise(place, sigma, 5) < 0.9) place += 1e-4;
  EXPECT_NEAR(iso.figures.mtf30, falls_to(0.3), 0.005 * falls_to(0.3));
  EXPECT_NEAR(iso.figures.mtf10, falls_to(0.1), 0.02 * falls_to(0.1));  // the rounding of 8 bits shows
  EXPECT_NEAR(iso.figures.mtf50p, iso.figures.mtf50, 1e-3 * iso.figures.mtf50);
  EXPECT_NEAR(iso.figures.edge_width, 2 * place, 0.01 * 2 * place);
  EXPECT_NEAR(iso.figures.peak, 1, 1e-3);
  EXPECT_LT(iso.figures.overshoot, 0.002);
  for (std::size_t i = 0; i < iso.response.size(); ++i) {
    const double truth = method_law::TrueResponse(static_cast<double>(i) * kIsoStep / 2, sigma, 5);
    // Below, what shows is the rounding to 8 bits.
    if (truth > 0.05) {
      EXPECT_NEAR(iso.response[i], truth, 0.004) << i;
    }
  }
}
INSTANTIATE_TEST_SUITE_P(Sigma, IsoBlur, ::testing::Values(0.3, 0.5, 0.8, 1.2, 2.0, 3.0, 8.0));

// What a camera and its light do to a photo, each by itself; the errors are the ones promised.
struct Road {
  const char* name;
  double contrast = 5, fall = 0, fall_towards_deg = 0, bow_px = 0;
  bool srgb = false;
  double percent = 0.5;
};
class IsoRoad : public ::testing::TestWithParam<Road> {};

TEST_P(IsoRoad, LeavesTheFigureAlone) {
  for (const double sigma : {0.3, 0.8, 3.0}) {
    const Road& road = GetParam();
    const EdgePhoto view = {{160, 400}, {81, 199.3},          4, sigma, 170 / road.contrast, 170, road.bow_px,
                            road.fall,  road.fall_towards_deg};
    const cv::Mat light = DrawEdgePhoto(view);
    const cv::Mat levels = road.srgb ? EncodeSrgb(light) : light;
    cv::Mat noise(levels.size(), CV_32F);  // of half a level, that the plateaus are not rounded as a whole
    cv::RNG(7).fill(noise, cv::RNG::NORMAL, 0, 0.5);
    cv::Mat photo;
    cv::Mat(levels + noise).convertTo(photo, CV_8U);
    const auto all = TurnedRectangle({79.5, 199.5}, 400, 160, 0);
    const double figure = MeasureIsoMtf(photo, all, road.srgb ? Transfer{} : kLinear).figures.mtf50;
    EXPECT_NEAR(0, (figure / method_law::TrueMtf50(sigma, 4) - 1) * 100, road.percent) << "blur " << sigma;
  }
}
INSTANTIATE_TEST_SUITE_P(Roads, IsoRoad,
                         ::testing::Values(Road{"srgb_4", 4, 0, 0, 0, true}, Road{"srgb_30", 30, 0, 0, 0, true},
                                           Road{"bowed", 5, 0, 0, 1}, Road{"bowed_back", 5, 0, 0, -1},
                                           Road{"shade_across", 5, 0.4, 0, 0, false, 1},
                                           Road{"shade_back", 5, -0.4, 0, 0, false, 1},
                                           Road{"shade_along", 5, 0.4, 90, 0, false, 1},
                                           Road{"all", 8, 0.4, 45, 1, true, 1}),
                         [](const auto& road) { return road.param.name; });

TEST(IsoMtf, SharpeningShows) {
  cv::Mat photo = DrawEdgePhoto({{160, 400}, {80, 200}, 5, 0.8, 70, 170});
  cv::Mat soft = DrawEdgePhoto({{160, 400}, {80, 200}, 5, std::hypot(0.8, 1.5), 70, 170});
  photo = 2 * photo - soft;
  const IsoFigures figures = MeasureIsoMtf(photo / 255, TurnedRectangle({79.5, 199.5}, 400, 160, 0), kLinear).figures;
  double peak = 0;
  for (int i = 0; i < 500; ++i) {
    const double f = i / 1000.0;
    peak =
        std::max(peak, 2 * method_law::TrueResponse(f, 0.8, 5) - method_law::TrueResponse(f, std::hypot(0.8, 1.5), 5));
  }
  EXPECT_NEAR(figures.peak, peak, 0.005);
  EXPECT_GT(figures.peak, kSharpenedPeak);
  EXPECT_GT(figures.overshoot, kSharpenedOvershoot);
  EXPECT_LT(figures.mtf50p, figures.mtf50);
}

TEST(IsoMtf, PolarityPlaceAndOrientationLeaveItAlone) {
  const IsoMtf plain = MeasureEdge({});
  const double mtf50 = plain.figures.mtf50;
  EXPECT_EQ(nullptr, plain.reason);
  EXPECT_NEAR(-5, plain.edge_angle_deg, 0.01);
  EXPECT_NEAR(mtf50, MeasureEdge({0, 185}).figures.mtf50, 1e-3 * mtf50);  // levels are rounded elsewhere
  EXPECT_NEAR(mtf50, MeasureEdge({90, 185}).figures.mtf50, 1e-3 * mtf50);
  for (const cv::Point2d off : {cv::Point2d(68, 0),      // the edge leaves the region half-way to its end
                                cv::Point2d(3, -20)}) {  // the window goes with the edge, not with the region
    EXPECT_NEAR(mtf50, MeasureEdge({90, 185, 0.8, 0, off}).figures.mtf50, 5e-3 * mtf50);
  }
}

TEST(IsoMtf, KnowsWhatACodecTakesOffAnEdge) {
  constexpr int kEdges = 12;
  double lost = 0;
  double told = 0;
  for (int i = 0; i < kEdges; ++i) {
    const bool lying = i % 2 != 0;
    cv::Mat photo = DrawEdgePhoto({{151, 333}, {75.3 + i / 3.0, 166}, 3 + i / 3.0, 0.8, 36, 180});
    if (lying) cv::transpose(photo, photo);
    cv::Mat noise(photo.size(), CV_32F);
    cv::RNG(i + 1).fill(noise, cv::RNG::NORMAL, 0, 2.5);
    cv::Mat(photo + noise).convertTo(photo, CV_8U);
    std::vector<uchar> file;
    cv::imencode(".jpg", photo, file, {cv::IMWRITE_JPEG_QUALITY, 75});
    const cv::Point2d middle(photo.cols / 2.0, photo.rows / 2.0);
    const auto region = TurnedRectangle(middle, 301, 97, lying ? 90 : 0);
    const IsoMtf plain = MeasureIsoMtf(photo, region, kLinear);
    const IsoMtf coded = MeasureIsoMtf(cv::imdecode(file, cv::IMREAD_GRAYSCALE), region, kLinear,
                                       StepsOf(std::string(file.begin(), file.end())));
    lost += (plain.figures.mtf10 - coded.figures.mtf10) / kEdges;
    told += -coded.of_codec.mean.mtf10 / kEdges;
    EXPECT_GT(UncertaintyOf(coded, &IsoFigures::mtf10).expanded, -coded.of_codec.mean.mtf10) << i;
  }
  EXPECT_GT(lost, 0.02);
  EXPECT_NEAR(lost, told, lost / 3);
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
    EXPECT_TRUE(std::isnan(result.figures.mtf50)) << reason;
    EXPECT_THAT(result.reason, HasSubstr(reason));
  }
  const cv::Mat photo = cv::Mat::zeros(9, 9, CV_8U);
  const auto beyond = TurnedRectangle({5000, -3}, kLength, kWidth, 0);
  EXPECT_THAT(MeasureIsoMtf(photo, beyond, kLinear).reason, HasSubstr("outside the photo"));
  for (const double nowhere : {1e300, -1e12, std::nan("")}) {
    const IsoMtf result = MeasureIsoMtf(photo, TurnedRectangle({nowhere, 0}, kLength, kWidth, 0), kLinear);
    EXPECT_TRUE(std::isnan(result.figures.mtf50) && result.reason != nullptr) << nowhere;
  }
  EXPECT_THROW(MeasureIsoMtf(cv::Mat(9, 9, CV_8UC3), TurnedRectangle({4, 4}, 99, 30, 0), kLinear), cv::Exception);
  EXPECT_THROW(MeasureIsoMtf(cv::Mat(), beyond, kLinear), cv::Exception);
}

TEST(Transfer, WordsAndLight) {
  // Of IEC 61966-2-1: 188 is the level of half the light, 0.5029.
  EXPECT_NEAR(0.5029, Transfer{}.Light(188 / 255.0), 1e-4);
  for (const char* word : {"srgb", "linear", "gamma:2.2"}) EXPECT_EQ(word, ParseTransfer(word)->Text());
  for (const char* word : {"", "sRGB", "gamma", "gamma:", "gamma:x", "gamma:2x", "gamma:0", "gamma:nan", "gamma:11"}) {
    EXPECT_FALSE(ParseTransfer(word)) << word;
  }
  for (const auto& [level, type] : {std::pair{128.0, CV_8U}, {128 * 257.0, CV_16U}, {128 / 255.0, CV_32F}}) {
    const cv::Mat light = LinearLight(cv::Mat(1, 1, type, cv::Scalar(level)), *ParseTransfer("gamma:2"));
    EXPECT_THAT(light.at<double>(0), DoubleNear(std::pow(128 / 255.0, 2), 1e-7));
  }
}

}  // namespace
}  // namespace qv
