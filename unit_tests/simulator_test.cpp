#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/simulation/method_law.h"
#include "unit_tests/program.h"

// The simulated camera's faults, each by its effect on the photo.

namespace {

using nlohmann::json;

using qv::method_law::Sinc;

class Simulator : public SimulatedPhotos {
 protected:
  // 16 bits a channel, as CV_32FC3 in levels of 255.
  cv::Mat Levels(const std::string& options) const {
    cv::Mat levels;
    cv::imread(folder_.Path(Simulate(options + " --bits 16")), cv::IMREAD_UNCHANGED)
        .convertTo(levels, CV_32F, 1 / 257.0);
    return levels;
  }
};

TEST_F(Simulator, LensFaultsHaveTheirAnalyticResponse) {
  // At a frequency along the edge's normal, without the pixel's own.
  const auto none = [](double, cv::Point2d) { return 1.0; };
  const auto gaussian = [](double f, cv::Point2d) { return std::exp(-2 * std::pow(CV_PI * 0.9 * f, 2)); };
  const auto disc = [](double f, cv::Point2d) {
    const double x = 2 * CV_PI * 2.3 * f;
    return std::fabs(2 * std::cyl_bessel_j(1, x) / x);
  };
  const auto motion = [](double f, cv::Point2d n) { return std::fabs(Sinc(f * n.dot({3, 1.5}))); };
  const auto target = EdgeTarget(6);
  for (const auto& [fault, blur] : std::vector<std::pair<std::string, double (*)(double, cv::Point2d)>>{
           {"", none}, {"--blur 0.9", gaussian}, {"--defocus 2.3", disc}, {"--smear 3,1.5", motion}}) {
    const json record = Record("autofocus --transfer linear " + Simulate("--edge-angle 6 " + fault));
    for (const bool lying : {false, true}) {
      const std::string region = lying ? "vertical" : "horizontal";
      const cv::Point2d edge = target[lying ? 1 : 3] - target[0];
      const cv::Point2d n = cv::Point2d(edge.y, -edge.x) / cv::norm(edge);
      const auto response = [&, own = blur](double f) { return std::fabs(Sinc(f * n.x) * Sinc(f * n.y)) * own(f, n); };
      const json truth = Truth()["mtf50"][region];
      const double half = 2 * qv::method_law::HalfPoint(response, 1.0);
      EXPECT_NEAR(half, truth["mtf50_nyquist"], 1e-3 * half) << fault;
      for (int i = 1; i <= 20; ++i) {
        EXPECT_NEAR(response(truth["sfr"][i][0].get<double>() / 2), truth["sfr"][i][1], 1e-3) << fault;
      }
      // 1 % is the measure's own; blur kernels are drawn on quarters of a pixel.
      EXPECT_NEAR(half, Measured(record, "camera_autofocus_mtf50_iso_" + region), 0.015 * half) << fault;
    }
  }
}

TEST_F(Simulator, NoiseHasItsVariance) {
  for (const auto& [full_well, percent] : {std::pair(0.0, 2.0), {3000.0, 0.0}, {1500.0, 1.0}}) {
    const cv::Mat levels = Levels("--scene dust --specks 0 --cast 1,0.5,0.25 --gain 0.6 --exposure 0.5 --full-well " +
                                  std::to_string(full_well) + " --noise " + std::to_string(percent));
    cv::Scalar mean;
    cv::Scalar deviation;
    cv::meanStdDev(levels, mean, deviation);
    const auto pixels = static_cast<double>(levels.total());
    for (int channel = 0; channel < 3; ++channel) {
      const double level = 255 * 0.6 * std::sqrt(2.0) * (channel == 2 ? 1 : channel == 1 ? 0.5 : 0.25);
      const double shot = full_well > 0 ? level * 255 / full_well : 0;
      const double variance = shot + std::pow(2.55 * percent, 2);
      EXPECT_NEAR(level, mean[channel], 5 * std::sqrt(variance / pixels));
      EXPECT_NEAR(1, deviation[channel] * deviation[channel] / variance, 5 * std::sqrt(2 / pixels));
    }
  }
}

TEST_F(Simulator, ShadingContrastAndFillAreWhatTheySay) {
  const cv::Mat shaded = Levels("--scene dust --specks 0 --shading 40");
  const float middle = shaded.at<cv::Vec3f>(450, 600)[1];
  EXPECT_NEAR(0.6, shaded.at<cv::Vec3f>(0, 0)[1] / middle, 1e-3);
  EXPECT_NEAR(0.6, shaded.at<cv::Vec3f>(899, 1199)[1] / middle, 1e-3);

  for (const double contrast : {4.0, 10.0}) {
    const cv::Mat chart = Levels("--fill 0.5 --contrast " + std::to_string(contrast));
    const json truth = Truth();
    const double scale = truth["pixels_per_unit"];
    const auto level = [&](double x, double y) {
      const cv::Point2d corner(truth["marks"][0]["x"], truth["marks"][0]["y"]);
      return chart.at<cv::Vec3f>(corner + cv::Point2d(x, y) * scale)[1];
    };
    // The drawing's levels are whole ones.
    EXPECT_NEAR(contrast, level(2000, 2000) / level(4800, 2000), 0.02 * contrast);
    EXPECT_NEAR(0.5 * 900, (kChartSide + 2 * kPatchHalf) * scale, 1e-6);
  }
}

TEST_F(Simulator, TiltedChartsAreSeenInPerspective) {
  const json record = Record("circles " + Simulate("--scene target --pan 12 --tilt -7 --turn 20"));
  const json truth = Truth();
  for (std::size_t i = 0; i < 3; ++i) {
    const json mark = truth["marks"][i];
    const json seen = Measured(record, "circle_check_marks")[i];
    // the search gives whole pixels
    EXPECT_LT(cv::norm(cv::Point2d(mark["x"], mark["y"]) - cv::Point2d(seen[0], seen[1])), 1.5);
  }
  EXPECT_NEAR(truth["legs_ratio"], Measured(record, "circle_check_legs_ratio"), 0.005);
  EXPECT_NEAR(truth["legs_angle_deg"], Measured(record, "circle_check_legs_angle"), 0.3);
  EXPECT_NEAR(truth["chart_turn_deg"], Measured(record, "circle_check_chart_turn"), 0.3);

  // A pinhole 2.5 sides away sees a point x to the right at cos x / (1 + sin x / 2.5), sides.
  Simulate("--pan 30");
  const auto side = [&](double x) { return std::cos(CV_PI / 6) * x / (1 + std::sin(CV_PI / 6) * x / 2.5); };
  const double half = kChartSide / 2.0 / (kChartSide + 2 * kPatchHalf);
  const double width = side(half) - side(-half);
  const double nearer = 2 * half / (1 - std::sin(CV_PI / 6) * half / 2.5);  // the left side's length
  EXPECT_NEAR(std::hypot(width, half / (1 + std::sin(CV_PI / 6) * half / 2.5) - nearer / 2) / nearer,
              Truth()["legs_ratio"], 1e-9);
}

TEST_F(Simulator, BentPhotosAreSeenWhereTheTruthSays) {
  const json record = Record("circles " + Simulate("--scene target --fill 0.9 --distortion -6 --shutter 40 --turn 8"));
  for (std::size_t i = 0; i < 3; ++i) {
    const json mark = Truth()["marks"][i];
    const json seen = Measured(record, "circle_check_marks")[i];
    EXPECT_LT(cv::norm(cv::Point2d(mark["x"], mark["y"]) - cv::Point2d(seen[0], seen[1])), 1.5);
  }
  const json bent = Truth()["marks"];
  Simulate("--scene target --fill 0.9 --turn 8");
  // The corner mark lies at (x, y) from the middle: 6 % nearer at the photo's corner, by the square of the distance.
  const cv::Point2d off(Truth()["marks"][0]["x"].get<double>() - 599.5, Truth()["marks"][0]["y"].get<double>() - 449.5);
  const double nearer = 1 - 0.06 * off.dot(off) / (599.5 * 599.5 + 449.5 * 449.5);
  EXPECT_NEAR(599.5 + off.x * nearer + 40 * off.y * nearer / 899, bent[0]["x"], 1e-6);
  EXPECT_NEAR(449.5 + off.y * nearer, bent[0]["y"], 1e-6);

  const cv::Mat dimmed = Levels("--scene dust --specks 0 --falloff 30 --falloff-direction 90");
  EXPECT_NEAR(0.7, dimmed.at<cv::Vec3f>(899, 3)[1] / dimmed.at<cv::Vec3f>(0, 900)[1], 1e-3);
}

TEST_F(Simulator, APhoneDoesAllOfIt) {
  const json record = Record("capture " + Simulate("--pipeline phone --gain 0.8 --falloff 0 --noise 0.5", "p.jpg"));
  const json truth = Truth("p");
  EXPECT_EQ("srgb", truth["parameters"]["transfer"]);
  EXPECT_EQ("bayer", truth["parameters"]["mosaic"]);
  EXPECT_EQ(0, truth["parameters"]["falloff_percent"]) << "what is given goes before the pipeline";
  for (const char* edge : {"vertical", "horizontal"}) {
    EXPECT_GT(truth["mtf50"][edge]["system"]["light"]["mtf50_nyquist"], truth["mtf50"][edge]["mtf50_nyquist"]);
  }
  for (int i = 0; i < 3; ++i) {
    const json seen = Measured(record, std::string("camera_capture_lab_") + "lab"[i]);
    ASSERT_EQ(4U, seen.size());
    for (const json& patch : seen) EXPECT_NEAR(truth["patches"][patch[0].get<int>()]["lab"][i], patch[1], 1);
  }
}

TEST_F(Simulator, WidePhotosShowNoSeams) {
  const std::string chart = "--marks coarse --blur 0.3 --turn 9 --size ";
  // The same chart in the middle of more paper, wider than a drawing can be.
  // Corners are drawn to 1/256 of a subpixel; rounded the other way, one moves a level by 1 at most.
  EXPECT_LT(cv::norm(Levels(chart + "600x300"), Levels(chart + "8200x300").colRange(3800, 4400), cv::NORM_INF), 1);
}

TEST_F(Simulator, FilesAreOfTheirFormats) {
  const auto write = [&](const std::string& name, const std::string& options = "") {
    return ReadFile(folder_.Path(Simulate("--marks coarse " + options, name)));
  };
  const auto picture = [&](const std::string& name) { return cv::imread(folder_.Path(name)); };
  write("photo.png");
  std::string frame = write("frame.nv21");
  ASSERT_EQ(1200u * 900 * 3 / 2, frame.size());
  cv::Mat decoded;
  cv::cvtColor(cv::Mat(900 * 3 / 2, 1200, CV_8UC1, frame.data()), decoded, cv::COLOR_YUV2BGR_NV21);
  EXPECT_LT(cv::norm(picture("photo.png"), decoded, cv::NORM_L1) / (1200 * 900 * 3), 1)
      << "chroma of half the size moves edges of colours only";
  EXPECT_LT(write("poor.jpg", "--quality 10").size(), write("good.jpg", "--quality 90").size());
  EXPECT_GT(cv::norm(picture("photo.png"), picture("poor.jpg")), cv::norm(picture("photo.png"), picture("good.jpg")));
  const std::string cast = "--scene pair --mosaic bayer --noise 8 --quality 90 ";
  write("all.png", cast);
  std::vector<double> lost;
  for (const char* chroma : {"444", "422", "420"}) {
    write("chroma.jpg", cast + "--chroma " + chroma);
    lost.push_back(cv::norm(picture("all.png"), picture("chroma.jpg")));
  }
  EXPECT_TRUE(lost[0] < lost[1] && lost[1] < lost[2]) << lost[0] << " " << lost[1] << " " << lost[2];
  const std::string seven = write("a.png", "--noise 2 --seed 7");
  EXPECT_EQ(seven, write("a.png", "--noise 2 --seed 7"));
  EXPECT_NE(seven, write("a.png", "--noise 2 --seed 8"));
}

TEST_F(Simulator, PhotosHaveTheLevelsOfTheirTruth) {
  json record = Record("flash " + Simulate("--turn -4 --cast 1,0.9,0.8 --shading 20 --gain 1.1"));
  EXPECT_NEAR(Truth()["flash_mean"], Measured(record, "camera_flash_mean"), 0.1);  // rounding to levels evens out
  record = Record("dust " + Simulate("--scene dust --specks 3 --blur 0.8 --shading 3"));
  const json truth = Truth();
  EXPECT_NEAR(truth["mean_level"], Measured(record, "lens_dust_mean_level"), 0.1);
  const json histogram = Measured(record, "lens_dust_histogram");
  double moved = 0;
  for (std::size_t i = 0; i < 256; ++i) {
    moved += std::fabs(truth["histogram"][i].get<double>() - histogram[i][1].get<double>());
  }
  EXPECT_LT(moved, 2 * 0.01 * 1200 * 900) << "greys half-way between levels may go either way";
}

}  // namespace
