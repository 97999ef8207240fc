// The commands on float pictures and picture pairs: dots, register, and the scenes made for them.

#include <gmock/gmock.h>

#include <cmath>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::HasSubstr;

using PictureProgram = SimulatedPhotos;

const std::string kHdr = "--scene hdr --size 400x300 ";

TEST_F(PictureProgram, DotsAreFoundWhereTheyWereDrawn) {
  Simulate(kHdr + "--dots 60 --dot-contrast 0.3 --shading 10", "panel.exr");
  const json truth = Truth("panel");
  std::vector<json> drawn;
  for (const json& dot : truth["dots"]) drawn.push_back({dot["column"], dot["row"]});
  EXPECT_THAT(drawn, ::testing::IsSupersetOf({json({0, 0}), json({399, 299})})) << "corners";
  for (const std::string radius : {"1", "10", "40"}) {
    const json record = Record("dots panel.exr --annotate seen.png --radius " + radius);
    EXPECT_EQ(60, Measured(record, "hdr_dots_dot_count"));
    EXPECT_THAT(Measured(record, "hdr_dots_areas"), ::testing::UnorderedElementsAreArray(drawn));
    EXPECT_FALSE(cv::imread(folder_.Path("seen.png")).empty());
  }
}

TEST_F(PictureProgram, LosslessFormatsHoldTheSameFloats) {
  for (const char* name : {"a.exr", "a.tif", "a.pfm"}) Simulate(kHdr + "--noise 1", name);
  const cv::Mat tif = cv::imread(folder_.Path("a.tif"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(CV_32FC3, tif.type());
  EXPECT_EQ(0, cv::norm(tif, cv::imread(folder_.Path("a.pfm"), cv::IMREAD_UNCHANGED), cv::NORM_INF));
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(tif, mean, deviation);
  EXPECT_NEAR(0.92, mean[0], 0.001);
  // 1 % noise, and 100 dots of +-0.46 in 120,000 pixels
  EXPECT_NEAR(std::hypot(0.01, 0.46 * std::sqrt(100.0 / 120000)), deviation[0], 0.0005);
  EXPECT_EQ(Record("dots a.tif")["phases"][0]["measurements"], Record("dots a.exr")["phases"][0]["measurements"]);
}

TEST_F(PictureProgram, DotsCloseTogetherMakeOneArea) {
  cv::Mat panel(60, 80, CV_32FC3, cv::Scalar::all(1));
  for (const int column : {20, 24, 60}) panel.at<cv::Vec3f>(30, column) = {1, 1, 2};  // red of BGR
  panel.at<cv::Vec3f>(5, 5) = {2, 1, 1};
  folder_.Write("panel.tif", panel);
  const std::string dots = "dots panel.tif --threshold 0.5 ";
  const json record = Record(dots + "--distance 8");
  EXPECT_EQ(json({{22.0, 30.0}, {60.0, 30.0}}), Measured(record, "hdr_dots_areas"));
  EXPECT_EQ(json({{0, 2}, {1, 1}}), Measured(record, "hdr_dots_area_pixels"));
  EXPECT_EQ(json({{0, 5}, {1, 1}}), Measured(record, "hdr_dots_area_width"));
  EXPECT_EQ(3, Measured(Record(dots + "--distance 2"), "hdr_dots_area_count"));
  EXPECT_EQ(json::parse("[[5.0, 5.0]]"), Measured(Record(dots + "--channel blue"), "hdr_dots_areas"));
}

TEST_F(PictureProgram, WhatCanNotBeSearchedForDotsIsTold) {
  EXPECT_EQ(-97, Record("dots " + Simulate(), 3)["phases"][0]["result_code"]);
  EXPECT_THAT(err_, HasSubstr("photo.png: not a float picture; dots are looked for in .exr"));
  EXPECT_EQ("ERROR", Record("dots --radius 150 " + Simulate(kHdr + "--noise 5", "panel.pfm"), 3)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("smaller than the window, 301 x 301 pixels"));
  // Single pixels apart from each other: nothing joins them.
  folder_.Write("panel.tif", cv::repeat(cv::Mat_<float>({2, 2}, {5.0F, 1.0F, 1.0F, 1.0F}), 150, 200));
  const json noise = Record("dots panel.tif --threshold 0.7", 3);
  EXPECT_EQ("ERROR", noise["outcome"]);
  EXPECT_FALSE(noise["phases"][0]["measurements"].contains("hdr_dots_area_count")) << "none is not what was found";
  EXPECT_THAT(err_, HasSubstr("30000 separate dots are noise"));
  cv::Mat hole(300, 400, CV_32FC1, cv::Scalar(1));
  hole.at<float>(100, 100) = NAN;
  folder_.Write("panel.tif", hole);
  EXPECT_EQ("ERROR", Record("dots panel.tif --annotate seen.png", 3)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("1 pixels are not finite"));
}

TEST_F(PictureProgram, APairIsBroughtIntoOneFrame) {
  Simulate("--scene pair --size 640x480 --motion 12,-7 --second-turn 4 --second-scale 1.05 --second-gain 0.9");
  const json record = Record("register photo.png photo.second.png -o out.png --matches matches.png");
  EXPECT_EQ(1280, cv::imread(folder_.Path("matches.png")).cols) << "both pictures, side by side";
  // Three matches, each good to a fraction of a pixel, fix the map.
  const json truth = Truth()["matrix"];
  const json matrix = Measured(record, "registration_matrix");
  for (int i = 0; i < 6; ++i) EXPECT_NEAR(truth[i], matrix[i][1], i % 3 == 2 ? 3 : 0.01) << i;
  EXPECT_NEAR(12, Measured(record, "registration_shift_columns"), 1);
  EXPECT_NEAR(-7, Measured(record, "registration_shift_rows"), 1);
  EXPECT_NEAR(4, Measured(record, "registration_turn"), 0.3);
  EXPECT_NEAR(1.05, Measured(record, "registration_scale"), 0.01);
  cv::Mat difference;
  cv::absdiff(cv::imread(folder_.Path("photo.png")) * 0.9, cv::imread(folder_.Path("out.png")), difference);
  EXPECT_LT(cv::mean(difference(cv::Rect(60, 60, 520, 360)))[0], 8) << "edges half a pixel off, nothing more";
}

TEST_F(PictureProgram, RegistrationsThatFailOrMayBeFalseSaySo) {
  Simulate("--scene pair --size 640x480");
  Simulate("--scene dust --specks 0", "blank.png");
  Simulate("--scene pair --size 640x480 --seed 9", "other.png");
  Run("register photo.png blank.png -oout.png --json cut.json --quiet");
  EXPECT_THAT(json::parse(ReadFile(folder_.Path("cut.json")))["metadata"]["command"].dump(),
              HasSubstr(R"("-o","out.png")"));
  folder_.Write("out.png", cv::Mat(9, 9, CV_8UC1, cv::Scalar(3)));  // of an earlier run
  EXPECT_EQ(-90, Record("register photo.png blank.png -o out.png", 3)["phases"][0]["result_code"]);
  EXPECT_THAT(err_, HasSubstr("too few features match"));
  EXPECT_FALSE(std::filesystem::exists(folder_.Path("out.png")));
  EXPECT_EQ("ERROR", Record("register photo.png other.png -o out.png", 3)["outcome"]);
  EXPECT_THAT(err_, HasSubstr("doubtful"));
  ExpectComplaint("register photo.png none.png -o out.png", 3, "none.png: no such file");
}

}  // namespace
