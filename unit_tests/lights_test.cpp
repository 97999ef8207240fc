#include <climits>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "unit_tests/module_test.h"

namespace {

using ::testing::HasSubstr;

class Lights : public ModuleTest {
 protected:
  static void SetRegions(std::vector<QVRegionRecord> regions, int count) {
    int all = static_cast<int>(regions.size());
    SetProperty(QV_PROPERTY_REGION_COUNT_0, &all);
    SetProperty(QV_PROPERTY_REGION_LIST_0, regions.data());
    SetProperty(QV_PROPERTY_REGION_COUNT_0, &count);
  }
  static const QVLightResult& Measure(const cv::Mat& photo) {
    Load(QV_RESOURCE_LED_PHOTO, photo);
    EXPECT_EQ(1, RunTest(QV_TEST_LED_LIGHT, false));
    return Results().led_;
  }
};

TEST_F(Lights, ColoursOfTheStandardAreFound) {
  // Primaries and white of IEC 61966-2-1; the library's matrix has four decimals.
  const struct {
    cv::Scalar bgr;
    double x, y;
  } kColours[] = {
      {{0, 0, 255}, 0.64, 0.33}, {{0, 255, 0}, 0.30, 0.60}, {{255, 0, 0}, 0.15, 0.06}, {{90, 90, 90}, 0.3127, 0.3290}};
  for (const auto& [bgr, x, y] : kColours) {
    const QVLightResult& result = Measure(cv::Mat(40, 60, CV_8UC3, bgr));
    ASSERT_EQ(1, result.region_count_);
    EXPECT_NEAR(x, result.regions_[0].chromaticity_[0], 2e-4) << bgr;
    EXPECT_NEAR(y, result.regions_[0].chromaticity_[1], 2e-4) << bgr;
  }
  EXPECT_NEAR(6504, Results().led_.regions_[0].cct_, 100) << "D65";
  const QVLightRegion& black = Measure(cv::Mat::zeros(3, 5, CV_8UC3)).regions_[0];
  EXPECT_TRUE(std::isnan(black.chromaticity_[0]) && std::isnan(black.chromaticity_[1]));
  EXPECT_TRUE(black.cct_ == 0 && black.uniformity_ == 0 && black.mean_grey_ == 0);
}

TEST_F(Lights, LightIsAveragedInLinearUnitsAndByBlocks) {
  cv::Mat photo = cv::Mat::zeros(32, 64, CV_8UC3);
  photo.colRange(0, 32).setTo(cv::Scalar(0, 0, 255));
  photo.colRange(32, 64).setTo(cv::Scalar(0, 0, 128));
  const QVLightRegion& region = Measure(photo).regions_[0];
  EXPECT_FLOAT_EQ(0.5f, region.clipped_share_);
  EXPECT_NEAR((1 + 0.215861) / 2, region.linear_rgb_[0], 1e-5);  // 128 is 0.2158605 of linear light
  EXPECT_NEAR(0.2126 * region.linear_rgb_[0], region.xyz_[1], 1e-6);
  EXPECT_FLOAT_EQ(15 / 29.f, region.uniformity_) << "levels of grey are whole";
  photo.at<cv::Vec3b>(0, 0) = {0, 0, 0};  // of a block of 32 pixels
  EXPECT_FLOAT_EQ(15 / 29.f, Measure(photo).regions_[0].uniformity_);
  photo(cv::Rect(8, 4, 8, 4)).setTo(0);
  EXPECT_EQ(0, Measure(photo).regions_[0].uniformity_) << "one whole block is dark";
}

TEST_F(Lights, DotsAreLookedForInEachRegion) {
  cv::Mat photo(100, 160, CV_8UC3, cv::Scalar::all(10));
  const cv::Rect left(10, 20, 60, 60);
  const cv::Rect right(90, 20, 60, 60);
  for (const cv::Rect& lit : {left, right}) photo(lit).setTo(cv::Scalar::all(180));
  photo(cv::Rect(30, 40, 2, 3)).setTo(cv::Scalar::all(60));
  photo(cv::Rect(35, 41, 1, 1)).setTo(cv::Scalar::all(60));  // 3 pixels on: one area
  photo(cv::Rect(120, 60, 1, 1)).setTo(cv::Scalar::all(250));
  SetRegions({{{10, 20, 60, 60, 7}}, {{90, 20, 60, 60, -3}}}, 2);
  const QVLightResult& result = Measure(photo);
  ASSERT_EQ(2, result.region_count_);
  EXPECT_EQ(-3, result.regions_[1].label_);
  EXPECT_EQ(90, result.regions_[1].left_);
  ASSERT_EQ(2, result.error_count_) << "a rim on dark ground is no dot";
  const QVRECT& area = result.error_areas_[0];
  EXPECT_TRUE(area.left == 30 && area.top == 40 && area.right == 35 && area.bottom == 42);
  EXPECT_EQ(7, result.error_pixels_[0]);
  EXPECT_EQ(120, result.error_areas_[1].left);

  int least = 2;
  SetProperty(QV_PROPERTY_AREA_LEAST_PIXELS, &least);
  EXPECT_EQ(1, Measure(photo).error_count_);
  SetRegions({{{10, 20, 60, 60, 7}}, {{90, 20, 60, 60, -3}}}, 1'000'000);
  EXPECT_EQ(2, Measure(photo).region_count_) << "no further than the list was set";
  SetRegions({{{10, 20, 60, 60, 7}}, {{90, 20, 60, 60, -3}}}, 1);
  EXPECT_EQ(1, Measure(photo).region_count_);
  SetRegions({}, 0);
  EXPECT_GT(Measure(photo).error_pixels_[0], 100) << "the whole photo has rims";
  EXPECT_EQ(0, Measure(photo(cv::Rect(0, 0, 16, 16))).error_count_) << "smaller than the window";
}

TEST_F(Lights, UpToTwentyThousandSpotsAreMerged) {
  float threshold = 1;
  int distance = 4;
  SetProperty(QV_PROPERTY_DOT_THRESHOLD, &threshold);
  SetProperty(QV_PROPERTY_AREA_DISTANCE, &distance);
  for (const auto& [rows, areas] : {std::pair(100, 1), {101, 20200}}) {
    cv::Mat photo(2 * rows, 400, CV_8UC3, cv::Scalar::all(10));
    for (int i = 0; i < 200 * rows; ++i) photo.at<cv::Vec3b>(2 * (i / 200), 2 * (i % 200)) = {250, 250, 250};
    EXPECT_EQ(areas, Measure(photo).error_count_);
  }
}

TEST_F(Lights, WhatCannotBeMeasuredChangesNothing) {
  const cv::Mat photo(100, 160, CV_8UC3, cv::Scalar::all(80));
  const QVLightRegion* const before = Measure(photo).regions_;
  const QVRegionRecord kOutside[] = {{{-1, 0, 5, 5, 42}},     {{0, 96, 5, 5, 42}}, {{0, 0, 161, 5, 42}},
                                     {{3, 3, 0, 5, 42}},      {{3, 3, 5, -5, 42}}, {{5, 5, INT_MAX, 5, 42}},
                                     {{INT_MAX, 3, 5, 5, 42}}};
  for (const QVRegionRecord& outside : kOutside) {
    SetRegions({{{0, 0, 9, 9, 1}}, outside}, 2);
    EXPECT_EQ(-95, RunTest(QV_TEST_LED_LIGHT, false));
    EXPECT_THAT(LogLines::Texts().back(), HasSubstr("region 1, label 42 (left " + std::to_string(outside.fields[0])));
  }
  SetRegions({}, 0);
  for (const cv::Mat& bad : {cv::Mat(9, 9, CV_16UC3, cv::Scalar(9)), cv::Mat(), cv::Mat(9, 9, CV_8UC1)}) {
    Load(QV_RESOURCE_LED_PHOTO, bad);
    EXPECT_EQ(-95, RunTest(QV_TEST_LED_LIGHT, false));
  }
  EXPECT_EQ(before, Results().led_.regions_);
  Load(QV_RESOURCE_TOUCH_PANEL_LED_PHOTO, photo);
  EXPECT_EQ(1, RunTest(QV_TEST_TOUCH_PANEL_LED, false));
  EXPECT_EQ(80, Results().touch_led_.regions_[0].mean_grey_);
  EXPECT_EQ(1, ReleaseTestResult(QV_TEST_TOUCH_PANEL_LED));
  EXPECT_EQ(nullptr, Results().touch_led_.regions_);
  EXPECT_EQ(before, Results().led_.regions_) << "each test has a result of its own";
  SetRegions({{{155, 0, 5, 100, 42}}}, 1);
  EXPECT_EQ(1, Measure(photo).region_count_) << "up to the photo's edges";
}

}  // namespace
