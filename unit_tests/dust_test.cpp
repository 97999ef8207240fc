#include <gmock/gmock.h>

#include <numeric>
#include <opencv2/imgproc.hpp>

#include "unit_tests/golden.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::Contains;
using ::testing::ContainsRegex;

// A plain photo with dark discs of this diameter.
cv::Mat DrawDust(const std::vector<cv::Point>& places, int diameter = 9, int level = 180) {
  cv::Mat photo(480, 640, CV_8UC3, cv::Scalar::all(level));
  for (const cv::Point& place : places) cv::circle(photo, place, diameter / 2, cv::Scalar::all(60), cv::FILLED);
  return photo;
}

class Dust : public ModuleTest {
 protected:
  static int Measure(const cv::Mat& photo, bool front = false, bool fake_mode = false) {
    Load(front ? 26 : 19, photo);
    return RunTest(front ? QV_TEST_LENS_DUST_2 : QV_TEST_LENS_DUST, fake_mode);
  }
};

TEST_F(Dust, SpecksAreCountedAndPublished) {
  SetStep(7);
  ASSERT_EQ(1, Measure(DrawDust({{100, 300}, {400, 120}})));
  EXPECT_EQ(2, Results().dust_blob_count_main_);
  EXPECT_EQ("[100,300][400,120]", Property("t82.vi7_mung_loc"));
  ASSERT_EQ(1, Measure(DrawDust({})));
  EXPECT_EQ(0, Results().dust_blob_count_main_);
  EXPECT_EQ("", Property("t82.vi7_mung_loc"));
  ExpectGolden("log_dust", LogLines::Text());
}

TEST_F(Dust, FivePlacesAreEnough) {
  ASSERT_EQ(1, Measure(DrawDust({{80, 200}, {150, 200}, {220, 200}, {290, 200}, {360, 200}, {430, 200}, {500, 200}})));
  EXPECT_EQ(5, Results().dust_blob_count_main_);
  EXPECT_THAT(Property("t82.vi0_mung_loc"), ContainsRegex("^(.[0-9]+,[0-9]+.){5}$"));
  EXPECT_THAT(LogLines::Texts(), Contains("[detectBlob] enough!!!! too many mungs!!!").Times(1));
}

TEST_F(Dust, OnlyTheCornersAreLeftOut) {
  for (const cv::Point2f inside : {cv::Point2f(10, 300), {21, 20}, {619.5f, 460}}) {
    EXPECT_TRUE(theTester->isValidLocation(640, 480, inside)) << inside;
  }
  for (const cv::Point2f corner : {cv::Point2f(20, 20), {10, 470}, {620, 460}}) {
    EXPECT_FALSE(theTester->isValidLocation(640, 480, corner)) << corner;
  }
  EXPECT_EQ("[isValidLocation] invalid location!! x: 620.00, y: 460.00", LogLines::Texts().back());
  ASSERT_EQ(1, Measure(DrawDust({{12, 12}, {12, 240}})));
  EXPECT_EQ("[12,240]", Property("t82.vi0_mung_loc"));
}

TEST_F(Dust, TheSearchSeesSizesAndLevelsAsTuned) {
  const auto count = [](int column, int diameter, int level = 180) {
    EXPECT_EQ(1, Measure(DrawDust({{column, 200}}, diameter, level)));
    return Results().dust_blob_count_main_;
  };
  EXPECT_EQ(0, count(300, 3)) << "under 20 pixels";
  for (const int bump : {1, 2}) {  // areas of 19 and 20, as the outline goes through the light pixels around
    cv::Mat photo = DrawDust({});
    photo(cv::Rect(300, 200, 4, 3)).setTo(60);
    photo(cv::Rect(301, 199, bump, 1)).setTo(60);
    EXPECT_EQ(1, Measure(photo));
    EXPECT_EQ(bump - 1, Results().dust_blob_count_main_);
  }
  for (const int level : {171, 172}) {  // of 49 pixels, 7 and 6 below a local mean that is rounded to 178
    cv::Mat photo = DrawDust({});
    photo(cv::Rect(300, 200, 7, 7)).setTo(level);
    EXPECT_EQ(1, Measure(photo));
    EXPECT_EQ(172 - level, Results().dust_blob_count_main_) << level;
  }
  for (const int diameter : {7, 9, 13}) EXPECT_EQ(1, count(300, diameter)) << diameter;
  EXPECT_EQ(0, count(300, 31)) << "hollow in the binary picture";
  EXPECT_EQ(0, count(300, 9, 124)) << "too dark a photo to see any";
  EXPECT_EQ(0, count(0, 21)) << "one with the frame";
}

TEST_F(Dust, FakeModeLeavesTheBlobsOut) {
  ASSERT_EQ(1, Measure(DrawDust({{100, 300}})));
  ASSERT_EQ(1, Measure(DrawDust({}), false, true));
  EXPECT_EQ(-1, Results().dust_blob_count_main_);
  EXPECT_EQ("[100,300]", Property("t82.vi0_mung_loc"));
  EXPECT_EQ(480 * 640, Results().dust_hist_main_[180]);
  const cv::Mat deep(20, 20, CV_16UC3, cv::Scalar::all(200));
  EXPECT_EQ(-95, Measure(deep));
  EXPECT_EQ(1, Measure(deep, false, true));
  EXPECT_EQ(400, Results().dust_hist_main_[200]);
}

TEST_F(Dust, HistogramsAreComparedWithTheCamerasReference) {
  std::array<int, 256> reference = {};
  reference[180] = 480 * 640 - 50;
  const auto difference = [] {
    EXPECT_EQ(1, Measure(DrawDust({}), true));
    return Results().dust_hist_diff_front_;
  };
  EXPECT_EQ(0, difference()) << "no reference, no difference";
  std::array<int, 256> out = {};
  EXPECT_EQ(-97, GetProperty(QV_PROPERTY_FRONT_DUST_HISTOGRAM, out.data()));
  SetProperty(QV_PROPERTY_FRONT_DUST_HISTOGRAM, reference.data());
  reference[3] = 107;
  EXPECT_EQ(157, difference()) << "the table is the caller's";
  ASSERT_EQ(1, GetProperty(QV_PROPERTY_FRONT_DUST_HISTOGRAM, out.data()));
  EXPECT_EQ(reference, out);
  EXPECT_EQ(nullptr, Results().dust_hist_main_);
  reference.fill(INT_MIN);
  difference();  // hostile, but no overflow
  const int* held = Results().dust_hist_front_;
  EXPECT_EQ(480 * 640, std::accumulate(held, held + 256, 0));
}

TEST_F(Dust, LongPublicationsStayWholeItems) {
  for (int i = 0; i < 30; ++i) theTester->save_mung_location({1000.0f + static_cast<float>(i), 2000}, 3);
  const std::string published = Property("t82.vi3_mung_loc");
  EXPECT_EQ("[1007,2000]", published.substr(77)) << "eight items of eleven characters; a ninth would pass 91";
  theTester->save_mung_location({3e38f, -3e38f}, 3);
  EXPECT_EQ(published, Property("t82.vi3_mung_loc"));
  theTester->remove_mung_location(3);
  EXPECT_EQ("", Property("t82.vi3_mung_loc"));
  theTester->save_mung_location({0.5f, 1.5f}, -2147483647);
  EXPECT_EQ("[0,2]", Property("t82.vi-2147483647_mung_loc"));
}

TEST_F(Dust, DarkPixelsAreCountedInTwoRegions) {
  cv::Mat gray(100, 100, CV_8UC1, cv::Scalar(200));
  gray(cv::Rect(10, 10, 3, 4)).setTo(20);
  gray(cv::Rect(50, 50, 40, 40)).setTo(120);  // dim, not dark
  EXPECT_EQ(12, theTester->detectMung(gray, {0, 0, 50, 100}, {50, 0, 50, 100}));
  EXPECT_EQ(0, theTester->detectMung(gray, {50, 0, 50, 100}, {50, 50, 50, 50}));
  ExpectGolden("log_dark_pixels", LogLines::Text());
  cv::Mat halves(10, 10, CV_8UC1, cv::Scalar(180));
  halves.rowRange(0, 5).setTo(60);
  EXPECT_EQ(0, theTester->detectMung(halves, {0, 0, 10, 10}, {0, 0, 1, 1})) << "half the mean is not dark";
  EXPECT_THROW(theTester->detectMung(gray, {0, 0, 101, 10}, {0, 0, 1, 1}), cv::Exception);
}

// Work images are kept from run to run; what somebody took a hold of is not among them.
TEST_F(Dust, FormerPicturesStayWithTheirHolders) {
  EXPECT_TRUE(theTester->DrawBlobs().empty());
  std::vector<std::pair<cv::Mat, cv::Mat>> held;  // and a copy of each
  for (const int x : {100, 200, 300}) {
    ASSERT_EQ(1, Measure(DrawDust({{x, 300}})));
    EXPECT_TRUE(theTester->kept_->blobs.drawing.empty()) << "drawn when asked for";
    ASSERT_EQ(-95, Measure(cv::Mat(480, 640, CV_16UC3, cv::Scalar::all(200))));
    for (const cv::Mat& image : {theTester->kept_->blobs.image, theTester->DrawBlobs()})
      held.emplace_back(image, image.clone());
    EXPECT_EQ(0, theTester->kept_->blobs.image.at<uchar>(300, x)) << "the last search that succeeded";
    cv::Mat channels[3];
    cv::split(held.back().first, channels);
    EXPECT_GT(cv::countNonZero(channels[0] - channels[2] > 50), 10) << "blue rings";
  }
  for (const auto& [image, copy] : held) EXPECT_EQ(0, cv::norm(image, copy, cv::NORM_INF));
}

}  // namespace
