// The commands on float pictures and picture pairs: dots, register, and the scenes made for them.

#include <gmock/gmock.h>

#include <cmath>
#include <filesystem>
#include <limits>
#include <map>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;

class PictureProgram : public SimulatedPhotos {
 protected:
  std::string SimulateHdr(const std::string& name, const std::vector<std::string>& options = {}) {
    std::string file = folder_.Path(name);
    std::vector<std::string> arguments = {"simulate", "--scene", "hdr", "-o", file, "--size", "400x300", "--quiet"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    const ProgramRun run = RunProgram(arguments);
    EXPECT_EQ(0, run.status) << run.err;
    return file;
  }

  json Record(std::vector<std::string> arguments, int status = 0) {
    arguments.insert(arguments.end(), {"--json", "-"});
    const ProgramRun run = RunProgram(arguments);
    EXPECT_EQ(status, run.status) << run.err;
    err_ = run.err;
    return CheckedRecord(run.out);
  }

  std::string err_;
};

TEST_F(PictureProgram, DotsAreFoundWhereTheyWereDrawn) {
  for (const std::string radius : {"1", "10", "40"}) {
    const std::string file = SimulateHdr("panel.exr", {"--dots", "60", "--dot-contrast", "0.3", "--shading", "10"});
    const json record = Record({"dots", file, "--radius", radius, "--annotate", folder_.Path("seen.png")});
    EXPECT_EQ(60, Measured(record, "hdr_dots_dot_count"));
    std::map<std::pair<double, double>, int> seen;
    for (const json& area : Measured(record, "hdr_dots_areas")) ++seen[{area[0], area[1]}];
    const json truth = Truth("panel");
    for (const json& dot : truth["dots"]) {
      const std::pair<double, double> at(dot["column"], dot["row"]);
      EXPECT_EQ(1, seen[at]) << dot;
    }
    EXPECT_TRUE(seen.count({0, 0}) == 1 && seen.count({399, 299}) == 1) << "corners";
    EXPECT_FALSE(cv::imread(folder_.Path("seen.png")).empty());
  }
}

TEST_F(PictureProgram, LosslessFormatsHoldTheSameFloats) {
  const cv::Mat tif = cv::imread(SimulateHdr("a.tif", {"--noise", "1"}), cv::IMREAD_UNCHANGED);
  const cv::Mat pfm = cv::imread(SimulateHdr("a.pfm", {"--noise", "1"}), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(CV_32FC3, tif.type());
  EXPECT_EQ(0, cv::norm(tif, pfm, cv::NORM_INF));
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(tif, mean, deviation);
  EXPECT_NEAR(0.92, mean[0], 0.001);
  // 1 % noise, and 100 dots of +-0.46 in 120,000 pixels
  EXPECT_NEAR(std::hypot(0.01, 0.46 * std::sqrt(100.0 / 120000)), deviation[0], 0.0005);
  const json from_exr = Record({"dots", SimulateHdr("a.exr", {"--noise", "1"})});
  const json from_tif = Record({"dots", folder_.Path("a.tif")});
  EXPECT_EQ(from_tif["phases"][0]["measurements"], from_exr["phases"][0]["measurements"]);
  EXPECT_EQ(2, RunProgram({"simulate", "--scene", "hdr", "-o", folder_.Path("a.png"), "--size", "40x30"}).status);
}

TEST_F(PictureProgram, DotsCloseTogetherMakeOneArea) {
  cv::Mat panel(60, 80, CV_32FC3, cv::Scalar::all(1));
  for (const int column : {20, 24, 60}) panel.at<cv::Vec3f>(30, column) = {1, 1, 2};  // red of BGR
  panel.at<cv::Vec3f>(5, 5) = {2, 1, 1};
  const std::string file = folder_.Path("panel.tif");
  ASSERT_TRUE(cv::imwrite(file, panel));
  const json record = Record({"dots", file, "--distance", "8", "--threshold", "0.5"});
  EXPECT_EQ(3, Measured(record, "hdr_dots_dot_count"));
  EXPECT_EQ(json::parse("[[22.0, 30.0], [60.0, 30.0]]"), Measured(record, "hdr_dots_areas"));
  EXPECT_EQ(json::parse("[[0, 2], [1, 1]]"), Measured(record, "hdr_dots_area_pixels"));
  EXPECT_EQ(json::parse("[[0, 5], [1, 1]]"), Measured(record, "hdr_dots_area_width"));
  EXPECT_EQ(3, Measured(Record({"dots", file, "--distance", "2", "--threshold", "0.5"}), "hdr_dots_area_count"));
  EXPECT_EQ(json::parse("[[5.0, 5.0]]"),
            Measured(Record({"dots", file, "--channel", "blue", "--threshold", "0.5"}), "hdr_dots_areas"));
  const std::string limits =
      folder_.Write("limits.json", R"({"name": "a", "revision": "1", "limits": {"hdr_dots_area_count": {"max": 1}}})");
  Record({"dots", file, "--threshold", "0.5", "--limits", limits}, 1);
}

TEST_F(PictureProgram, WhatCanNotBeSearchedForDotsIsTold) {
  EXPECT_EQ(-97, Record({"dots", Simulate()}, 3)["phases"][0]["result_code"]);
  EXPECT_THAT(err_, HasSubstr("photo.png: not a float picture; dots are looked for in .exr"));
  const std::string file = SimulateHdr("panel.pfm", {"--noise", "5"});
  EXPECT_EQ("ERROR", Record({"dots", file, "--radius", "150"}, 3)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("smaller than the window, 301 x 301 pixels"));
  cv::Mat noise(300, 400, CV_32FC1);  // single pixels apart from each other: nothing joins them
  for (int i = 0; i < 300; ++i) {
    for (int j = 0; j < 400; ++j) noise.at<float>(i, j) = i % 2 == 0 && j % 2 == 0 ? 5.0f : 1.0f;
  }
  ASSERT_TRUE(cv::imwrite(folder_.Path("noise.tif"), noise));
  EXPECT_EQ("ERROR", Record({"dots", folder_.Path("noise.tif"), "--threshold", "0.7"}, 3)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("30000 separate dots are noise"));
  noise = cv::Scalar(1);
  noise.at<float>(100, 100) = std::numeric_limits<float>::quiet_NaN();
  ASSERT_TRUE(cv::imwrite(folder_.Path("noise.tif"), noise));
  EXPECT_EQ("ERROR", Record({"dots", folder_.Path("noise.tif"), "--annotate", folder_.Path("seen.png")}, 3)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("1 pixels are not finite"));
}

TEST_F(PictureProgram, APairIsBroughtIntoOneFrame) {
  const std::string reference = Simulate({"--scene", "pair", "--size", "640x480", "--motion", "12,-7", "--second-turn",
                                          "4", "--second-scale", "1.05", "--second-gain", "0.9"},
                                         "pair");
  const std::string image = folder_.Path("pair.second.png");
  const std::string out = folder_.Path("out.png");
  const json record = Record({"register", reference, image, "-o", out, "--matches", folder_.Path("matches.png")});
  EXPECT_EQ(cv::Size(1280, 480), cv::imread(folder_.Path("matches.png")).size());
  // Three matches, each good to a fraction of a pixel, fix the map.
  const json truth = Truth("pair")["matrix"];
  const json matrix = Measured(record, "registration_matrix");
  for (int i = 0; i < 6; ++i) EXPECT_NEAR(truth[i], matrix[i][1], i % 3 == 2 ? 3 : 0.01) << i;
  EXPECT_NEAR(12, Measured(record, "registration_shift_columns"), 1);
  EXPECT_NEAR(-7, Measured(record, "registration_shift_rows"), 1);
  EXPECT_NEAR(4, Measured(record, "registration_turn"), 0.3);
  EXPECT_NEAR(1.05, Measured(record, "registration_scale"), 0.01);
  cv::Mat difference;
  cv::absdiff(cv::imread(reference) * 0.9, cv::imread(out), difference);
  EXPECT_LT(cv::mean(difference(cv::Rect(60, 60, 520, 360)))[0], 8) << "edges half a pixel off, nothing more";
}

TEST_F(PictureProgram, RegistrationsThatFailOrMayBeFalseSaySo) {
  const std::string scene = Simulate({"--scene", "pair", "--size", "640x480"}, "scene");
  const std::string out = folder_.Path("out.png");
  EXPECT_EQ(-90, Record({"register", scene, Simulate({"--scene", "dust", "--specks", "0"}, "blank"), "-o", out},
                        3)["phases"][0]["result_code"]);
  EXPECT_THAT(err_, AllOf(HasSubstr("too few features match"), HasSubstr("-90")));
  EXPECT_FALSE(std::filesystem::exists(out));
  const std::string other = Simulate({"--scene", "pair", "--size", "640x480", "--seed", "9"}, "other");
  EXPECT_EQ("FAIL", Record({"register", scene, other, "-o", out}, 1)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("doubtful"));
  EXPECT_EQ(2, RunProgram({"register", scene, other, "-o", folder_.Path("out.xyz")}).status);
  EXPECT_EQ(2, RunProgram({"register", scene, other, "-o", "-", "--json", "-"}).status);
  EXPECT_EQ(3, RunProgram({"register", scene, folder_.Path("none.png"), "-o", out}).status);
}

}  // namespace
