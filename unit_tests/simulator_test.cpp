#include <gmock/gmock.h>

#include <cmath>
#include <complex>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "unit_tests/program.h"

// The simulated camera's faults, each by its effect on the photo.

namespace {

using nlohmann::json;

double Sinc(double x) { return x == 0 ? 1 : std::sin(CV_PI * x) / (CV_PI * x); }

class Simulator : public SimulatedPhotos {
 protected:
  // 16 bits a channel, as CV_32FC3 in levels of 255.
  cv::Mat Levels(std::vector<std::string> options) {
    options.insert(options.end(), {"--bits", "16"});
    cv::Mat levels;
    cv::imread(Simulate(options), cv::IMREAD_UNCHANGED).convertTo(levels, CV_32F, 1 / 257.0);
    return levels;
  }

  // Where a place on the upright chart lies in the photo.
  cv::Point2d Place(double x, double y) const {
    const json truth = Truth();
    const cv::Point2d corner(truth["marks"][0]["x"], truth["marks"][0]["y"]);
    return corner + cv::Point2d(x, y) * truth["pixels_per_unit"].get<double>();
  }
};

// Response at a frequency (cycles/pixel) of the slanted edge from one point to the other, within a region: the edge is
// gathered in bins of an eighth of a pixel, differenced and transformed, both steps' own responses divided out.
class EdgeMeasure {
 public:
  EdgeMeasure(const cv::Mat& levels, const cv::Rect& region, cv::Point2d from, cv::Point2d to) {
    const cv::Point2d along = (to - from) / cv::norm(to - from);
    normal_ = {along.y, -along.x};
    const int bins = static_cast<int>(kReachPx * 2 * kOversampling);
    std::vector<double> sum(bins);
    std::vector<double> count(bins);
    for (int i = region.y; i < region.br().y; ++i) {
      for (int j = region.x; j < region.br().x; ++j) {
        const int bin =
            static_cast<int>(std::floor(((cv::Point2d(j, i) - from).dot(normal_) + kReachPx) * kOversampling));
        if (bin < 0 || bin >= bins) continue;
        sum[bin] += levels.at<cv::Vec3f>(i, j)[1];
        ++count[bin];
      }
    }
    for (int i = 0; i + 1 < bins; ++i) spread_.push_back(sum[i + 1] / count[i + 1] - sum[i] / count[i]);
  }

  double operator()(double f) const {
    std::complex<double> transform;
    double area = 0;
    for (std::size_t i = 0; i < spread_.size(); ++i) {
      transform += std::polar(spread_[i], -2 * CV_PI * f * static_cast<double>(i) / kOversampling);
      area += spread_[i];
    }
    return std::abs(transform / area) / std::pow(Sinc(f / kOversampling), 2);
  }

  cv::Point2d normal() const { return normal_; }

 private:
  static constexpr double kReachPx = 20;
  static constexpr double kOversampling = 8;
  cv::Point2d normal_;
  std::vector<double> spread_;
};

struct LensFault {
  const char* name;
  std::vector<std::string> options;
  double (*response)(double f, cv::Point2d normal);  // without the pixel's own
};

void PrintTo(const LensFault& fault, std::ostream* out) { *out << fault.name; }

class LensFaults : public Simulator, public ::testing::WithParamInterface<LensFault> {};

TEST_P(LensFaults, HaveTheirAnalyticResponse) {
  std::vector<std::string> options = {"--edge-angle", "6"};
  options.insert(options.end(), GetParam().options.begin(), GetParam().options.end());
  const cv::Mat levels = Levels(options);
  const auto target = EdgeTarget(6);
  for (const bool lying : {false, true}) {
    const ChartRegion& r = lying ? kVerticalRegion : kHorizontalRegion;
    const cv::Rect region(cv::Point(Place(r.x, r.y)), cv::Point(Place(r.x + r.width, r.y + r.height)));
    const cv::Point2d& end = target[lying ? 1 : 3];
    const EdgeMeasure measured(levels, region, Place(target[0].x, target[0].y), Place(end.x, end.y));
    const cv::Point2d n = measured.normal();
    double half = 0;  // in units of Nyquist
    for (int i = 1; i < 50; ++i) {
      const double f = 0.01 * i;
      const double pixel = std::fabs(Sinc(f * n.x) * Sinc(f * n.y));
      // Blur kernels are drawn on quarters of a pixel.
      EXPECT_NEAR(pixel * GetParam().response(f, n), measured(f), 0.005) << f;
      if (half == 0 && measured(f) < 0.5) {
        half = 2 * (f - 0.01 * (0.5 - measured(f)) / (measured(f - 0.01) - measured(f)));
      }
    }
    const json truth = Truth()["mtf50"][lying ? "vertical" : "horizontal"];
    if (half > 0) {
      EXPECT_NEAR(truth["mtf50_nyquist"], half, 0.005 * half);
    }
    EXPECT_NEAR(measured(0.25), truth["sfr"][10][1], 0.01);
  }
}

INSTANTIATE_TEST_SUITE_P(Kinds, LensFaults,
                         ::testing::Values(LensFault{"none", {}, [](double, cv::Point2d) { return 1.0; }},
                                           LensFault{"gaussian",
                                                     {"--blur", "0.9"},
                                                     [](double f, cv::Point2d) {
                                                       return std::exp(-2 * std::pow(CV_PI * 0.9 * f, 2));
                                                     }},
                                           LensFault{"disc",
                                                     {"--defocus", "2.3"},
                                                     [](double f, cv::Point2d) {
                                                       const double x = 2 * CV_PI * 2.3 * f;
                                                       return std::fabs(2 * std::cyl_bessel_j(1, x) / x);
                                                     }},
                                           LensFault{"motion",
                                                     {"--smear", "3,1.5"},
                                                     [](double f, cv::Point2d n) {
                                                       return std::fabs(Sinc(f * n.dot({3, 1.5})));
                                                     }}),
                         [](const auto& fault) { return std::string(fault.param.name); });

TEST_F(Simulator, NoiseHasItsVariance) {
  const std::vector<std::string> plain = {"--scene", "dust", "--specks", "0", "--cast", "1,0.5,0.25", "--gain", "0.6"};
  for (const auto& [full_well, percent] : {std::pair(0.0, 2.0), {3000.0, 0.0}, {1500.0, 1.0}}) {
    std::vector<std::string> options = plain;
    options.insert(options.end(), {"--full-well", std::to_string(full_well), "--noise", std::to_string(percent)});
    cv::Scalar mean;
    cv::Scalar deviation;
    const cv::Mat levels = Levels(options);
    cv::meanStdDev(levels, mean, deviation);
    const auto pixels = static_cast<double>(levels.total());
    for (int channel = 0; channel < 3; ++channel) {
      const double level = 255 * 0.6 * (channel == 2 ? 1 : channel == 1 ? 0.5 : 0.25);
      const double shot = full_well > 0 ? level * 255 / full_well : 0;
      const double variance = shot + std::pow(2.55 * percent, 2);
      EXPECT_NEAR(level, mean[channel], 5 * std::sqrt(variance / pixels));
      EXPECT_NEAR(1, deviation[channel] * deviation[channel] / variance, 5 * std::sqrt(2 / pixels));
    }
  }
}

TEST_F(Simulator, ShadingContrastAndFillAreWhatTheySay) {
  const cv::Mat shaded = Levels({"--scene", "dust", "--specks", "0", "--shading", "40"});
  const float middle = shaded.at<cv::Vec3f>(450, 600)[1];
  EXPECT_NEAR(0.6, shaded.at<cv::Vec3f>(0, 0)[1] / middle, 1e-3);
  EXPECT_NEAR(0.6, shaded.at<cv::Vec3f>(899, 1199)[1] / middle, 1e-3);

  for (const double contrast : {4.0, 10.0}) {
    const cv::Mat chart = Levels({"--contrast", std::to_string(contrast), "--fill", "0.5"});
    const cv::Point dark = Place(4800, 2000);
    const cv::Point light = Place(2000, 2000);
    // The drawing's levels are whole ones.
    EXPECT_NEAR(contrast, chart.at<cv::Vec3f>(light)[1] / chart.at<cv::Vec3f>(dark)[1], 0.02 * contrast);
    EXPECT_NEAR(0.5 * 900, (kChartSide + 2 * kPatchHalf) * Truth()["pixels_per_unit"].get<double>(), 1e-6);
  }
}

TEST_F(Simulator, TiltedChartsAreSeenInPerspective) {
  const std::string photo = Simulate({"--scene", "target", "--pan", "12", "--tilt", "-7", "--turn", "20"});
  const json record = CheckedRecord(RunProgram({"circles", photo, "--json", "-"}).out);
  const json truth = Truth();
  for (std::size_t i = 0; i < 3; ++i) {
    const json mark = Measured(record, "circle_check_marks")[i];
    EXPECT_NEAR(truth["marks"][i]["x"], mark[0], 1.5);  // the search gives whole pixels
    EXPECT_NEAR(truth["marks"][i]["y"], mark[1], 1.5);
  }
  EXPECT_NEAR(truth["legs_ratio"], Measured(record, "circle_check_legs_ratio"), 0.005);
  EXPECT_NEAR(truth["legs_angle_deg"], Measured(record, "circle_check_legs_angle"), 0.3);
  EXPECT_NEAR(truth["chart_turn_deg"], Measured(record, "circle_check_chart_turn"), 0.3);

  // A pinhole 2.5 sides away sees a point x to the right at cos x / (1 + sin x / 2.5), sides.
  Simulate({"--pan", "30"});
  const auto side = [&](double x) { return std::cos(CV_PI / 6) * x / (1 + std::sin(CV_PI / 6) * x / 2.5); };
  const double half = kChartSide / 2.0 / (kChartSide + 2 * kPatchHalf);
  const double width = side(half) - side(-half);
  const double nearer = 2 * half / (1 - std::sin(CV_PI / 6) * half / 2.5);  // the left side's length
  EXPECT_NEAR(std::hypot(width, half / (1 + std::sin(CV_PI / 6) * half / 2.5) - nearer / 2) / nearer,
              Truth()["legs_ratio"], 1e-9);
}

TEST_F(Simulator, WidePhotosShowNoSeams) {
  const std::vector<std::string> options = {"--marks", "coarse", "--blur", "0.3", "--turn", "9"};
  const auto photo = [&](const std::string& size) {
    std::vector<std::string> all = options;
    all.insert(all.end(), {"--size", size});
    return Levels(all);
  };
  // The same chart in the middle of more paper, wider than a drawing can be.
  // Corners are drawn to 1/256 of a subpixel; rounded the other way, one moves a level by 1 at most.
  EXPECT_LT(cv::norm(photo("600x300"), photo("8200x300").colRange(3800, 4400), cv::NORM_INF), 1);
}

TEST_F(Simulator, RawFramesAreNv21) {
  const cv::Mat photo = cv::imread(Simulate({"--marks", "coarse"}));
  const std::string frame = folder_.Path("frame.nv21");
  ASSERT_EQ(0, RunProgram({"simulate", "-o", frame, "--size", "1200x900", "--marks", "coarse"}).status);
  std::string bytes = ReadFile(frame);
  ASSERT_EQ(1200u * 900 * 3 / 2, bytes.size());
  cv::Mat decoded;
  cv::cvtColor(cv::Mat(900 * 3 / 2, 1200, CV_8UC1, bytes.data()), decoded, cv::COLOR_YUV2BGR_NV21);
  EXPECT_LT(cv::norm(photo, decoded, cv::NORM_L1) / static_cast<double>(photo.total() * 3), 1)
      << "chroma of half the size moves edges of colours only";
  EXPECT_EQ(2, RunProgram({"simulate", "-o", frame, "--size", "1201x900"}).status);
}

TEST_F(Simulator, LowerQualityIsSmallerAndWorse) {
  const cv::Mat photo = cv::imread(Simulate({"--blur", "1"}));
  std::size_t size = 1e9;
  double error = 0;
  for (const char* quality : {"98", "80", "40", "10"}) {
    const std::string jpeg = folder_.Path("photo.jpg");
    ASSERT_EQ(0,
              RunProgram({"simulate", "-o", jpeg, "--size", "1200x900", "--blur", "1", "--quality", quality}).status);
    EXPECT_LT(ReadFile(jpeg).size(), size) << quality;
    size = ReadFile(jpeg).size();
    EXPECT_GT(cv::norm(photo, cv::imread(jpeg)), error) << quality;
    error = cv::norm(photo, cv::imread(jpeg));
  }
}

TEST_F(Simulator, EveryFigureOfATestHasItsTruth) {
  const std::string chart = Simulate({"--turn", "-4", "--cast", "1,0.9,0.8", "--shading", "20", "--gain", "1.1"});
  json record = CheckedRecord(RunProgram({"flash", chart, "--json", "-"}).out);
  EXPECT_NEAR(Truth()["flash_mean"], Measured(record, "camera_flash_mean"), 0.1);  // rounding to levels evens out
  record = CheckedRecord(RunProgram({"autofocus", chart, "--json", "-"}).out);
  EXPECT_NEAR(Truth()["module_px"], Measured(record, "camera_autofocus_module_size"), 0.3);
  EXPECT_NEAR(-4, Truth()["chart_turn_deg"], 1e-9);

  const std::string dust = Simulate({"--scene", "dust", "--specks", "3", "--blur", "0.8", "--shading", "3"});
  record = CheckedRecord(RunProgram({"dust", dust, "--json", "-"}).out);
  EXPECT_NEAR(Truth()["mean_level"], Measured(record, "lens_dust_mean_level"), 0.1);
  EXPECT_EQ(Truth()["specks"].size(), Measured(record, "lens_dust_blob_count"));
  const json histogram = Measured(record, "lens_dust_histogram");
  double moved = 0;
  for (std::size_t i = 0; i < 256; ++i) {
    moved += std::fabs(Truth()["histogram"][i].get<double>() - histogram[i][1].get<double>());
  }
  EXPECT_LT(moved, 2 * 0.01 * 1200 * 900) << "greys half-way between levels may go either way";
}

}  // namespace
