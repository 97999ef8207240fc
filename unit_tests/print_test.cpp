#include <opencv2/imgproc.hpp>

#include "unit_tests/drawing.h"
#include "unit_tests/module_test.h"

namespace {

constexpr double kNoise = 8;  // levels: 3 % of the range

// Turned about the middle by degrees, scaled, shifted: reference to photo.
cv::Mat Motion(cv::Size size, double turn_deg, double scale, cv::Point2d shift) {
  cv::Mat map = cv::getRotationMatrix2D(cv::Point2f(size.width / 2.0f, size.height / 2.0f), turn_deg, scale);
  map.at<double>(0, 2) += shift.x;
  map.at<double>(1, 2) += shift.y;
  return map;
}

cv::Mat Photograph(const cv::Mat& print, const cv::Mat& map, unsigned seed) {
  cv::Mat seen;
  cv::warpAffine(print, seen, map, print.size(), cv::INTER_CUBIC, cv::BORDER_REPLICATE);
  cv::Mat noise(seen.size(), CV_16S);
  cv::RNG(seed).fill(noise, cv::RNG::NORMAL, 0, kNoise);
  cv::add(seen, noise, seen, cv::noArray(), CV_8U);
  cv::cvtColor(seen, seen, cv::COLOR_GRAY2BGR);
  return seen;
}

// Mean distance over the picture's grid of points between where two maps put them.
double Apart(const cv::Mat& a, const cv::Mat& b, cv::Size size) {
  double sum = 0;
  for (int i = 0; i < 25; ++i) {
    const cv::Mat point = (cv::Mat_<double>(3, 1) << i % 5 * size.width / 4, i / 5 * size.height / 4, 1);
    sum += cv::norm(a * point, b * point);
  }
  return sum / 25;
}

TEST(Refine, ARoughMapBecomesAFineOne) {
  QVTester tester;
  const cv::Mat reference = DrawScene(3, {320, 240}, 120);
  cv::RNG random(1);
  for (int i = 0; i < 12; ++i) {
    const double turn = random.uniform(-10.0, 10.0);
    const double scale = random.uniform(0.9, 1.1);
    const cv::Point2d shift{random.uniform(-20.0, 20.0), random.uniform(-20.0, 20.0)};
    const cv::Mat truth = Motion(reference.size(), turn, scale, shift);
    cv::Mat photo = Photograph(reference, truth, i);
    cv::extractChannel(photo, photo, 0);
    cv::Mat map = Motion(reference.size(), turn + 1, scale * 1.01, shift + cv::Point2d(5, -6));
    EXPECT_GT(tester.RefineUnwarp(reference, photo, map), 0.9f);
    EXPECT_LT(Apart(truth, map, reference.size()), 0.1) << "turn " << turn << " scale " << scale;
  }
  cv::Mat third = Motion(reference.size(), 1, 1, {200, 0});
  cv::Mat beside = Photograph(reference, third, 1);
  cv::extractChannel(beside, beside, 0);
  EXPECT_GT(tester.RefineUnwarp(reference, beside, third), 0.9f) << "two fifths overlap";
  const cv::Mat blank(240, 320, CV_8UC1, cv::Scalar(9));
  const cv::Mat start = Motion(reference.size(), 1, 1, {});
  const cv::Mat beyond = Motion(reference.size(), 1, 1, {900, 0});
  for (const auto& [image, from] : {std::pair{blank, start}, {reference, beyond}}) {
    cv::Mat map = from.clone();
    EXPECT_TRUE(std::isnan(tester.RefineUnwarp(reference, image, map)));
    EXPECT_EQ(0, cv::norm(map, from, cv::NORM_INF)) << "left as it is";
  }
  cv::Mat map = start.clone();
  EXPECT_THROW(tester.RefineUnwarp(cv::Mat(), reference, map), cv::Exception);
}

// Good prints differ in one mark, which some have and some don't.
class Print : public ModuleTest {
 protected:
  Print() {
    std::vector<std::string> files;
    for (int i = 0; i < 4; ++i) files.push_back(folder_.Write(std::to_string(i) + ".png", Good(i % 2 == 0)));
    EXPECT_EQ(1, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, files));
  }
  cv::Mat Good(bool marked) const {
    cv::Mat print = scene_.clone();
    if (marked) print(cv::Rect(60, 180, 20, 20)).setTo(255);
    return print;
  }
  static const QVResultData& Measure(const cv::Mat& photo) {
    Load(QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO, photo);
    EXPECT_EQ(1, RunTest(QV_TEST_TOUCH_PANEL_PRINT, false));
    return Results();
  }

  // Black and white; the two places of the marks are white and black.
  cv::Mat scene_ = [] {
    cv::Mat scene = DrawScene(8, {360, 280}, 150, 0) > 128;
    scene(cv::Rect(50, 170, 40, 40)).setTo(0);
    scene(cv::Rect(200, 80, 40, 40)).setTo(255);
    cv::GaussianBlur(scene, scene, {}, 1);
    return scene;
  }();
};

TEST_F(Print, WhatNoGoodPrintHasIsAnErrorArea) {
  for (const bool marked : {false, true}) {
    EXPECT_EQ(0, Measure(Good(marked)).print_error_count_) << "as good prints are";
    EXPECT_LT(Results().print_rms_, 0.03);
    EXPECT_GT(Results().print_correlation_, 0.98f);
  }
  int least = 16;  // the median leaves slivers under five pixels to chance
  SetProperty(QV_PROPERTY_AREA_LEAST_PIXELS, &least);
  cv::Mat bad = Good(true);
  bad(cv::Rect(212, 94, 10, 8)).setTo(0);
  const cv::Mat truth = Motion(bad.size(), 4, 1.03, {6.3, -4.8});
  const QVResultData& result = Measure(Photograph(bad, truth, 1));
  EXPECT_LT(Apart(truth, theTester->print_map_, bad.size()), 0.3);
  ASSERT_EQ(1, result.print_error_count_);
  const QVRECT& area = result.print_error_areas_[0];
  EXPECT_NEAR(212, area.left, 1);
  EXPECT_NEAR(94, area.top, 1);
  EXPECT_NEAR(221, area.right, 1);
  EXPECT_NEAR(101, area.bottom, 1);
  EXPECT_NEAR(80, result.print_error_pixels_[0], 16) << "within the rim";

  least = 200;
  SetProperty(QV_PROPERTY_AREA_LEAST_PIXELS, &least);
  EXPECT_EQ(0, Measure(Photograph(bad, truth, 1)).print_error_count_);
}

TEST_F(Print, TheMeanIsOverWhatIsSeen) {
  cv::Mat bad = Good(true);
  bad(cv::Rect(205, 85, 30, 30)).setTo(0);
  const float whole = Measure(bad).print_rms_;
  const float part = Measure(bad.rowRange(0, 210)).print_rms_;  // three quarters, and all of the fault
  EXPECT_NEAR(std::sqrt(280.0 / 210), part / whole, 0.05);
}

TEST_F(Print, WhatCannotBeRegisteredChangesNothing) {
  const QVResultData& result = Measure(Good(true));
  const float rms = result.print_rms_;
  const cv::Mat map = theTester->print_map_.clone();
  const struct {
    cv::Mat photo;
    int code;
  } kBad[] = {{cv::Mat(99, 99, CV_8UC3, cv::Scalar::all(200)), -90},
              {cv::Mat(), -95},
              {cv::Mat(99, 99, CV_16UC3, cv::Scalar::all(200)), -95}};
  for (const auto& [photo, code] : kBad) {
    Load(QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO, photo);
    EXPECT_EQ(code, RunTest(QV_TEST_TOUCH_PANEL_PRINT, false));
  }
  EXPECT_EQ(rms, result.print_rms_);
  EXPECT_EQ(0, cv::norm(map, theTester->print_map_, cv::NORM_INF));
  InitTestModule();
  Load(QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO, scene_);
  EXPECT_EQ(-98, RunTest(QV_TEST_TOUCH_PANEL_PRINT, false)) << "the list went with the module";
  Load(QV_RESOURCE_IMAGE_LIST, scene_);
  EXPECT_EQ(-95, RunTest(QV_TEST_TOUCH_PANEL_PRINT, false)) << "a picture is no list";
}

}  // namespace
