#include "desk/measure/uncertainty.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <tuple>
#include <utility>

#include "desk/measure/codec_steps.h"
#include "desk/measure/decision.h"
#include "desk/measure/edge_resampling.h"
#include "desk/measure/film_trust.h"
#include "desk/measure/mean_trust.h"
#include "desk/measure/measure.h"
#include "desk/measure/patch_trust.h"
#include "desk/measure/trust_table.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

TEST(Uncertainty, StudentsFactorIsThePublishedOne) {
  // JCGM 100:2008, table G.2, 95 %.
  for (const auto& [degrees, factor] :
       {std::pair{1.0, 12.71}, {2.0, 4.30}, {3.0, 3.18}, {7.0, 2.36}, {20.0, 2.09}, {50.0, 2.01}, {INFINITY, 1.960}}) {
    EXPECT_NEAR(factor, StudentFactor(degrees), 0.006) << degrees;
  }
  EXPECT_DOUBLE_EQ(StudentFactor(3), StudentFactor(3.9));  // cut, which is the safe side
}

TEST(Uncertainty, MeansMediansAndErrors) {
  // Readings of JCGM 100:2008, H.3-like: mean 4, s 2, u = s / sqrt(4), three degrees of freedom.
  const Uncertainty mean = OfMean({4 - std::sqrt(6.0), 4, 4, 4 + std::sqrt(6.0)}, 0, kBandsMethod);
  EXPECT_NEAR(1, mean.standard, 1e-12);
  EXPECT_NEAR(3.182, mean.expanded, 1e-3);
  // A type B part of infinite freedom as large again: Welch and Satterthwaite give 12 degrees.
  EXPECT_NEAR(2.179 * std::sqrt(2.0), OfMean({4 - std::sqrt(6.0), 4, 4, 4 + std::sqrt(6.0)}, 1, kBandsMethod).expanded,
              1e-3);
  EXPECT_TRUE(std::isnan(OfMean({1, NAN, 2}, 0, kBandsMethod).expanded));
  EXPECT_TRUE(std::isnan(OfMean({1}, 0, kBandsMethod).expanded));
  EXPECT_DOUBLE_EQ(3, Median({9, 1, 3}));
  EXPECT_DOUBLE_EQ(2, Median({3, 1}));
  std::vector<double> errors;
  for (int i = 1; i <= 99; ++i) errors.push_back(i % 2 == 0 ? i : -i);
  EXPECT_DOUBLE_EQ(95, FromErrors(errors, kResamplingMethod).expanded);  // a hundredth error exceeds it 5 times in 100
  EXPECT_TRUE(std::isinf(FromErrors({1, NAN}, kResamplingMethod).expanded));
}

// The median of n frames scatters by sqrt(pi / 2n) of one, and those of the pulse tell nothing of the base; a cut of
// the decoder's is an error that is left in.
TEST(Uncertainty, AFlashsBaseIsThatOfItsQuietFrames) {
  Phase phase;
  phase.name = "video_flash";
  cv::RNG random(4);
  std::vector<double> time;
  std::vector<double> mean;
  for (int i = 0; i < 90; ++i) {
    time.push_back(33.0 * i);
    mean.push_back((i < 25 || i >= 65 ? 40 : 200) + random.gaussian(3));
  }
  for (const auto& [name, value] : {std::pair{"peak", 200.0}, {"peak_frame", 45.0}, {"base", 40.0}, {"width", 1320.0}})
    phase.Add(name, value);
  phase.Add("mean", time, mean);
  TrustFlash(phase, time, {0.25, 0}, {0.5, 0});
  const auto noise = [&](const char* name, double cut) {
    return std::pow(phase.Find(name)->uncertainties[0].standard, 2) - cut * cut - 0.2 * 0.2;  // and the codec's
  };
  EXPECT_NEAR(CV_PI / 2 / 50, noise("base", 0.25) / noise("peak", 0.5), 1e-5);
}

// Levels of blue by BT.601 in limited range, cut as the decoder cuts them.
TEST(Uncertainty, AFramesPixelsTellWhatTheDecoderCut) {
  cv::Mat frame(64, 64, CV_8UC3);
  cv::RNG random(6);
  double cut = 0;
  for (auto& pixel : cv::Mat_<cv::Vec3b>(frame)) {
    const double luma = (random.uniform(60, 180) - 16) * 255 / 219.0;
    const int u = random.uniform(-12, 13);
    const int v = random.uniform(-12, 13);
    const int whole = cvFloor(luma + 1e-9);
    pixel = cv::Vec3b(cv::saturate_cast<uchar>(whole + cvFloor(2.017232 * u)),
                      cv::saturate_cast<uchar>(whole + cvFloor(-0.391762 * u) + cvFloor(-0.812968 * v)),
                      cv::saturate_cast<uchar>(whole + cvFloor(1.596027 * v)));
    cut += luma + 2.017232 * u - pixel[0];
  }
  EXPECT_NEAR(cut / static_cast<double>(frame.total()), CutOf(frame).mean, 0.02);
  cv::randu(frame, 60, 180);
  EXPECT_TRUE(std::isnan(CutOf(frame).mean)) << "no luma and chroma give these";
}

TEST(Uncertainty, PixelsTellTheirNoiseWhateverTheLight) {
  cv::Mat patch(60, 80, CV_8UC3);
  cv::theRNG().state = 5;
  cv::randn(patch, cv::Scalar(100, 120, 140), cv::Scalar(2, 4, 6));
  for (int column = 0; column < patch.cols; ++column)
    patch.col(column) += cv::Scalar::all(std::floor(column * 0.5));  // falls off
  const cv::Matx33d covariance = CovarianceOfMean(patch, 0);
  for (int channel = 0; channel < 3; ++channel) {
    const double noise = 2.0 * (channel + 1);
    EXPECT_NEAR(noise / std::sqrt(4800.0), std::sqrt(covariance(channel, channel)), 0.1 * noise / std::sqrt(4800.0));
  }
  const auto product = [](const cv::Vec3d& x) { return x[0] * x[1]; };
  EXPECT_NEAR(5, Propagated<3>(product, {3, 4, 0}, cv::Matx33d::eye(), 0.1), 1e-9);
}

TEST(Uncertainty, AMeanIsAsGoodAsItsBlocksWhateverStandsInThePhoto) {
  cv::Mat photo(800, 1200, CV_32F);
  cv::theRNG().state = 5;
  cv::randn(photo, cv::Scalar(100), cv::Scalar(4));
  for (int column = 0; column < photo.cols; ++column) photo.col(column) += column * 0.05;  // falls off
  photo(cv::Rect(300, 200, 300, 300)) -= cv::Scalar(70);                                   // as noisy as all
  photo.convertTo(photo, CV_8U);
  const double law = 4 / std::sqrt(1.0 * photo.total());
  EXPECT_NEAR(law, OfMeanLevel(photo).standard, 0.1 * law);
  EXPECT_DOUBLE_EQ(OfMeanLevel(photo).standard / 255, OfMeanLevel(photo, 1.0 / 255).standard);

  cv::Mat mask(photo.size(), CV_8U);
  cv::randu(mask, 0, 100);
  mask = mask < 20;
  const double of_share = std::sqrt(0.2 * 0.8 / static_cast<double>(mask.total()));  // binomial
  EXPECT_NEAR(of_share, OfShare(mask).standard, 0.1 * of_share);
  EXPECT_GT(OfShare(cv::Mat::zeros(80, 80, CV_8U)).expanded, 1 / 6400.0) << "none was seen";
}

TEST(Uncertainty, AFileTellsByHowMuchItsCodecRounds) {
  const TemporaryFolder folder;
  cv::Mat photo(64, 64, CV_8UC3);
  cv::randu(photo, 0, 255);
  for (const auto& [quality, luma, chroma] : {std::tuple(75, 8, 9), {50, 16, 17}, {100, 1, 1}}) {  // T.81, Annex K
    cv::imwrite(folder.Path("photo.jpg"), photo, {cv::IMWRITE_JPEG_QUALITY, quality});
    for (const CodecSteps& steps : {StepsOf(ReadFile(folder.Path("photo.jpg"))), StepsAtQuality(quality)}) {
      EXPECT_EQ(luma / 8.0, steps.luma);
      EXPECT_EQ(chroma / 8.0, steps.chroma);
    }
  }
  const std::string whole = ReadFile(folder.Path("photo.jpg"));
  for (const std::size_t size : {0U, 1U, 3U, 21U, 40U, 90U}) {
    EXPECT_EQ(0, StepsOf(whole.substr(0, size)).chroma) << size;
  }
}

TEST(Uncertainty, ACodecLetLooseOnItsOwnBlocksChangesNothing) {
  cv::Mat photo(96, 96, CV_8UC1);
  cv::randu(photo, 60, 200);
  std::vector<uchar> file;
  cv::imencode(".jpg", photo, file, {cv::IMWRITE_JPEG_QUALITY, 50});
  const CodecSteps codec = StepsOf(std::string(file.begin(), file.end()));
  const std::array<std::tuple<int, int, float>, 4> known = {{{0, 1, 11}, {1, 0, 12}, {0, 7, 61}, {7, 0, 72}}};
  for (const auto& [row, column, step] : known) EXPECT_EQ(step, codec.luma_table(row, column));  // T.81, table K.1
  const cv::Mat coded = cv::imdecode(file, cv::IMREAD_GRAYSCALE);
  const auto changed = [&](const cv::Rect& part, cv::Point first) {  // by more than what rounding to levels may
    return cv::countNonZero(cv::abs(Coded(coded(part), first, codec) - coded(part)) > 3);
  };
  for (const cv::Rect part : {cv::Rect(0, 0, 64, 64), {4, 13, 60, 50}}) EXPECT_EQ(0, changed(part, part.tl())) << part;
  EXPECT_LT(1000, changed({4, 4, 64, 64}, {}));  // between the file's own blocks
  const cv::Rect inner(8, 16, 56, 48);
  const cv::Mat own = Coded(photo(cv::Rect(3, 11, 70, 60)), {3, 11}, codec)(inner - cv::Point(3, 11));
  // What the codec itself makes of the photo, but for blocks with a coefficient half-way between two steps.
  EXPECT_GT(0.2 * inner.area(), cv::countNonZero(cv::abs(own - coded(inner)) > 1));
}

TEST(Uncertainty, AKnownErrorMovesTheIntervalToOneSide) {
  const Uncertainty about = Combined(1, 3, 0, kBandsMethod);
  EXPECT_DOUBLE_EQ(about.expanded, OffBy(0, about, 3).expanded);
  EXPECT_NEAR(20 + 2.353, OffBy(-20, about, 3).expanded, 0.002);  // Student's 95 % quantile, of one side
}

TEST(Uncertainty, HoldsWhatACodecDoesToTheGreyOfAPoint) {
  constexpr int kPhotos = 30;
  const cv::Rect point(131, 77, 30, 30);
  int within = 0;
  double widest = 0;
  for (int i = 0; i < kPhotos; ++i) {
    cv::RNG random(i + 1);
    cv::Vec3d colour;
    for (int k = 0; k < 3; ++k) colour[k] = random.uniform(120.0, 200.0);
    cv::Mat levels(240, 320, CV_32FC3);
    random.fill(levels, cv::RNG::NORMAL, cv::Scalar(colour[0], colour[1], colour[2]), cv::Scalar::all(2.5));
    cv::Mat photo;
    levels.convertTo(photo, CV_8U);
    std::vector<uchar> file;
    cv::imencode(".jpg", photo, file, {cv::IMWRITE_JPEG_QUALITY, 90});
    cv::Mat grey;
    cv::cvtColor(cv::imdecode(file, cv::IMREAD_COLOR), grey, cv::COLOR_RGB2GRAY);  // as the tests weigh channels
    const MeanErrors errors(cv::imdecode(file, cv::IMREAD_COLOR), StepsOf(std::string(file.begin(), file.end())));
    const double u = FromErrors(errors.OfGreyPart(point.area(), 400), kPixelMethod).expanded;
    within += std::fabs(cv::mean(grey(point))[0] - GreyOfMeans(colour)) <= u ? 1 : 0;
    widest = std::max(widest, u);
  }
  EXPECT_GE(within, 25);
  EXPECT_LT(widest, 1.5);
}

TEST(Uncertainty, HoldsWhatACodecDoesToAPatch) {
  const auto blue_to_yellow = [](const cv::Vec3d& rgb) { return OwnLab(rgb)[2]; };
  for (const auto& [quality, side] : {std::pair(95, 64), {90, 64}, {75, 64}, {50, 64}, {90, 20}}) {  // few blocks too
    constexpr int kPatches = 100;
    int within = 0;
    cv::RNG random(quality);
    for (int i = 0; i < kPatches; ++i) {
      const cv::Vec3d truth{random.uniform(60.0, 200.0), random.uniform(60.0, 200.0), random.uniform(60.0, 200.0)};
      cv::Mat patch(side, side, CV_32FC3);
      random.fill(patch, cv::RNG::NORMAL, cv::Scalar(truth[0], truth[1], truth[2]), cv::Scalar::all(2.5));
      patch.convertTo(patch, CV_8U);
      std::vector<uchar> file;
      cv::imencode(".jpg", patch, file, {cv::IMWRITE_JPEG_QUALITY, quality});
      const cv::Scalar mean = cv::mean(patch = cv::imdecode(file, cv::IMREAD_COLOR));
      const cv::Point3i cut(cvFloor(mean[0]), cvFloor(mean[1]), cvFloor(mean[2]));
      const auto draws = DrawPatchColours(patch, side * side, cut, random.next(), StepsOf({file.begin(), file.end()}));
      const double error = blue_to_yellow(cv::Vec3d(cut.x, cut.y, cut.z)) - blue_to_yellow(truth);
      const double u = TrustInColour(cut, draws, blue_to_yellow).expanded;
      within += std::isfinite(u) && std::fabs(error) <= u ? 1 : 0;
    }
    EXPECT_GT(within, 0.88 * kPatches) << quality << ", " << side;  // 95 in 100 are meant; four deviations off
  }
}

TEST(Uncertainty, ResamplingFindsWhatNoiseDoes) {
  const EdgePhoto view = {{90, 260}, {45, 130}, 5, 0.8, 60, 180};
  const cv::Mat edge = DrawEdgePhoto(view);
  const auto mean = [](const cv::Mat& region) { return cv::mean(region)[0]; };  // whose law is known: sigma / sqrt(n)
  for (const double sigma : {2.0, 8.0}) {
    cv::Mat noise(edge.size(), CV_32F);
    cv::RNG(3).fill(noise, cv::RNG::NORMAL, 0, sigma);
    cv::Mat photo;
    cv::Mat(edge + noise).convertTo(photo, CV_8U);
    const double law = sigma / std::sqrt(90.0 * 260);
    EXPECT_NEAR(law, ResampleEdge(photo, mean).standard, 0.35 * law);  // of 50 runs
  }
  EXPECT_TRUE(std::isnan(ResampleEdge(cv::Mat(260, 90, CV_8U, cv::Scalar(9)), mean).expanded));
}

TEST(Uncertainty, EveryRealFigureHasALawOrAReason) {
  for (const FigureInfo& info : AllFigures()) {
    const TrustLaw* const law = LawOf(info);
    ASSERT_EQ(info.figure->number == Number::kReal, law != nullptr) << info.name;
    if (law == nullptr) continue;
    EXPECT_NE(law->method == nullptr, law->reason == nullptr) << info.name;
    const auto& methods = UncertaintyMethods();
    const bool told = std::any_of(methods.begin(), methods.end(), [&](const UncertaintyMethod& method) {
      return law->method == nullptr || std::string(method.name) == law->method;
    });
    EXPECT_TRUE(told) << info.name;
  }
}

// The truth is that of the light without noise, which the mean of bent levels is lifted from; the extremes of even
// blocks lie apart by noise alone.
TEST(Uncertainty, HoldsForTheColourAndTheEvennessOfALight) {
  constexpr int kSide = 72;
  int within_green = 0;
  int within_even = 0;
  constexpr int kLights = 60;
  for (int i = 0; i < kLights; ++i) {
    cv::RNG random(100 + i);
    cv::Mat photo(kSide, kSide, CV_32FC3);
    random.fill(photo, cv::RNG::NORMAL, cv::Scalar(90.3, 120.4, 150.2), cv::Scalar::all(12));
    photo.convertTo(photo, CV_8U);
    const Record record = MeasureAnew({"led_light", {photo}});
    const auto holds = [&](const char* figure, double is) {
      const Reading& reading = *record.phase.Find(figure);
      return std::fabs(reading.value() - is) <= reading.uncertainties.at(0).expanded ? 1 : 0;
    };
    within_green += holds("linear_green", std::pow((120.4 / 255 + 0.055) / 1.055, 2.4));
    within_even += holds("uniformity", 1);
  }
  EXPECT_GT(within_green, 0.85 * kLights);  // 95 in 100 are meant; nearly four deviations off
  EXPECT_GT(within_even, 0.85 * kLights);
}

struct Verdict {
  const char* rule;
  double reading, standard, expanded;
  Tolerance limits;
  double factor;
  bool pass, near_limit;
  double wrong;  // JCGM 106:2012, 7.3: of the normal distribution
};

TEST(Decision, ByTheRule) {
  const Tolerance min = {0.4, {}};
  const Tolerance both = {0.4, 0.5};
  for (const Verdict& v : std::vector<Verdict>{
           {"simple", 0.41, 0.01, 0.02, min, 1, true, true, 0.1587},
           {"simple", 0.39, 0.01, 0.02, min, 1, false, true, 0.1587},
           {"simple", 0.44, 0.01, 0.02, min, 1, true, false, 3.2e-5},
           {"guarded", 0.41, 0.01, 0.02, min, 1, false, true, 0.8413},  // surely good enough is what it is not
           {"guarded", 0.42, 0.01, 0.02, min, 0.5, true, true, 0.0228},
           {"guarded_rejection", 0.39, 0.01, 0.02, min, 1, true, true, 0.8413},
           {"guarded_rejection", 0.37, 0.01, 0.02, min, 1, false, false, 0.0013},
           {"simple", 0.49, 0.01, 0.02, both, 1, true, true, 0.1587},
           {"guarded", 0.45, 0.03, 0.06, both, 1, false, true, 0.9044},  // no reading passes between such limits
           {"simple", 0.4, 0, 0, min, 1, true, false, 0},
           {"guarded", 0.399, 0, 0, min, 1, false, false, 0},
           {"guarded_rejection", NAN, 0.01, 0.02, min, 1, false, false, 0}}) {
    const Decision d = Decide(v.reading, v.standard, v.expanded, v.limits, {*ParseDecisionRule(v.rule), v.factor});
    EXPECT_EQ(v.pass, d.pass) << v.rule << v.reading;
    EXPECT_EQ(v.near_limit, d.near_limit) << v.rule << v.reading;
    EXPECT_NEAR(v.wrong, d.wrong_probability, 1e-4) << v.rule << v.reading;
  }
  EXPECT_FALSE(ParseDecisionRule("strict"));
}

class Trusted : public ::testing::Test {
 protected:
  static cv::Mat Photo(int seed) {
    cv::Mat noise(1000, 1000, CV_16SC3);
    cv::RNG(seed).fill(noise, cv::RNG::NORMAL, 0, 2.5);
    cv::Mat photo;
    cv::add(DrawChart(), noise, photo, cv::noArray(), CV_8U);
    return photo;
  }

  static Record Run(const Json& parameters, const Limits& limits = {}, std::vector<Input> repeats = {}) {
    QVTester tester;
    Request request = {"camera_autofocus", {Photo(1)}};
    request.parameters = parameters;
    request.repeats = std::move(repeats);
    return Measure(tester, request, limits);
  }

  static constexpr char kOwn[] = "mtf50_vertical";
  static constexpr char kIso[] = "mtf50_iso_vertical";
};

TEST_F(Trusted, ARecordTellsHowFarItsFiguresMayBeTrusted) {
  const Record plain = Run({{"transfer", "linear"}});
  EXPECT_TRUE(plain.phase.Find(kOwn)->uncertainties.empty());  // costs 50 more readings
  const Record asked = Run({{"transfer", "linear"}, {"uncertainty", true}});
  for (const char* figure : {kOwn, kIso}) {
    const double expanded = asked.phase.Find(figure)->uncertainty().expanded;
    EXPECT_GT(expanded, 0) << figure;
    // Two photos differ by sqrt(2) times what one is off by.
    QVTester tester;
    const Record other = Measure(tester, {"camera_autofocus", {Photo(2)}, {{"transfer", "linear"}}});
    EXPECT_NEAR(asked.phase.Find(figure)->value(), other.phase.Find(figure)->value(), 2 * expanded) << figure;
  }
  EXPECT_LT(asked.phase.Find(kIso)->value(),
            Run(Json::object()).phase.Find(kIso)->value());  // as sRGB the edge is steeper
}

TEST_F(Trusted, ALimitNearTheReadingFollowsTheRule) {
  const Json linear = {{"transfer", "linear"}};
  const Reading reading = *Run(linear).phase.Find(kIso);
  const double half = reading.uncertainty().expanded / 2;
  const std::string name = reading.info->name;
  const auto judged = [&](const char* rule, double min, const char* figure) {
    Limits limits;
    limits.rule.kind = *ParseDecisionRule(rule);
    limits.by_name[figure].min = min;
    return Run(linear, limits);
  };
  for (const auto& [rule, off, outcome] : {std::tuple("simple", -half, Outcome::kPass),
                                           {"guarded", -half, Outcome::kFail},
                                           {"simple", half, Outcome::kFail},
                                           {"guarded_rejection", half, Outcome::kPass}}) {
    const Record record = judged(rule, reading.value() + off, name.c_str());
    EXPECT_EQ(outcome, record.phase.Find(kIso)->outcome) << rule << off;
    EXPECT_TRUE(record.marginal()) << rule << off;
  }
  EXPECT_FALSE(judged("simple", reading.value() - 3 * half, name.c_str()).marginal());
  // Nothing is known of the test's own figure unless asked for, so no guard band can be had.
  EXPECT_EQ(Outcome::kError, judged("guarded", 0.1, "camera_autofocus_mtf50_vertical").outcome());
}

TEST_F(Trusted, RepeatsGiveMediansAndTheirSpread) {
  const Record record = Run({{"transfer", "linear"}}, {}, {Photo(2), Photo(3)});
  const Reading& m = *record.phase.Find(kIso);
  ASSERT_EQ(3U, m.repeats.size());
  EXPECT_DOUBLE_EQ(Median(m.repeats), m.value());
  EXPECT_STREQ(kRepeatMethod, m.uncertainty().method.c_str());
  EXPECT_EQ(3U, record.inputs.size());
  // A photo without a chart: the unit was not measured.
  EXPECT_FALSE(Run(Json::object(), {}, {cv::Mat(300, 300, CV_8UC3, cv::Scalar::all(200))}).measured());
}

}  // namespace
}  // namespace qv
