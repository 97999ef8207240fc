#include <gmock/gmock.h>

#include <climits>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "unit_tests/golden.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::Each;
using ::testing::SizeIs;

// The chart's photo with this colour at patch i of the ring, in sampling order.
template <typename ColourOf>
cv::Mat DrawPatches(const ColourOf& colour_of) {
  cv::Mat photo = DrawChart();
  for (int i = 0; i < 24; ++i) {
    const cv::Point2d centre = PatchCentre(i) * ChartView().scale + cv::Point2d(151.5, 151.5);
    cv::rectangle(photo, cv::Rect(cvRound(centre.x) - 40, cvRound(centre.y) - 40, 80, 80), colour_of(i), cv::FILLED);
  }
  return photo;
}

cv::Scalar Drawn(int i) { return cv::Scalar(kPatches[i].blue, kPatches[i].green, kPatches[i].red); }

class Capture : public ModuleTest {
 protected:
  static QVCaptureResult& Main() { return Results().capture_main_; }
  static std::vector<float> Lab(const cv::Scalar& bgr) {
    std::vector<float> xyz(3);
    std::vector<float> lab(3);
    theTester->ConvertRGB2XYZ(cvRound(bgr[2]), cvRound(bgr[1]), cvRound(bgr[0]), xyz[0], xyz[1], xyz[2]);
    theTester->ConvertXYZ2LAB(xyz[0], xyz[1], xyz[2], 0, 0, 0, lab[0], lab[1], lab[2]);
    return lab;
  }
  static std::vector<float> Triple(int i) { return {Main().capture_lab_ + 3 * i, Main().capture_lab_ + 3 * i + 3}; }
};

TEST_F(Capture, SamplingStopsAtTheFirstPatchOutside) {
  const cv::Mat image(700, 1000, CV_8UC3, cv::Scalar::all(50));
  // D = 210, so the half-size is 10 and the pitch 30.
  EXPECT_THAT(theTester->GetColorPatchRGB(image, {{20, 20}, {20, 230}, {695, 20}}), SizeIs(6));
  EXPECT_THAT(theTester->GetColorPatchRGB(image.colRange(0, 120), {{20, 20}, {20, 230}, {400, 20}}), SizeIs(3));
  EXPECT_THAT(theTester->GetColorPatchRGB(image, {{20, 5}, {20, 215}, {400, 5}}), SizeIs(12));
  // A range may end exactly with the image.
  cv::Mat striped = image.clone();
  for (int column = 0; column < 1000; column += 2) striped.col(column).setTo(cv::Scalar::all(51));
  const auto patches = theTester->GetColorPatchRGB(striped, {{10, 10}, {10, 220}, {690, 10}});
  EXPECT_THAT(patches, SizeIs(24));
  EXPECT_EQ(cv::Point3i(50, 50, 50), patches[0]) << "means of 50.5 are cut";
  ExpectGolden("log_patches", LogLines::Text());
}

TEST_F(Capture, WithoutAStandardFourPatchesAreKept) {
  const cv::Mat photo = DrawPatches(Drawn);
  // The top row's patches begin in the photo; at -1; farther out, and are too few.
  for (const int top : {0, 116, 119}) {
    Load(17, photo(cv::Rect(116, top, 884, 1000 - top)));
    EXPECT_EQ(top == 119 ? -87 : 1, TestCameraCapture(false));
    ASSERT_EQ(4, Main().capture_lab_count_);
    EXPECT_EQ(0, Main().capture_delta_e_count_);
    const int kept[] = {12, 13, 14, 9};  // the white, too, with its own values and not 100, 0, 0
    for (int i = 0; i < 4; ++i) EXPECT_EQ(Lab(Drawn(kept[i])), Triple(i)) << i;
  }
  ExpectGolden("log_capture", LogLines::Text());
}

// Marks in a triangle, between which the third patch of the left column, or the fourth, lies outside.
TEST_F(Capture, FifteenPatchesAreEnough) {
  for (const auto& [size, module, marks, code] :
       {std::tuple(cv::Size(713, 525), 5, std::vector<cv::Point>{{39, 141}, {145, 471}, {58, 626}}, -87),
        {cv::Size(759, 761), 6, {{119, 434}, {117, 49}, {13, 498}}, 1}}) {
    cv::Mat photo;
    cv::cvtColor(DrawMarks(size, module, marks), photo, cv::COLOR_GRAY2BGR);
    Load(17, photo);
    EXPECT_EQ(code, TestCameraCapture(false));
    EXPECT_THAT(theTester->kept_->chart.patches, SizeIs(code == 1 ? 15 : 14));
  }
}

TEST_F(Capture, DifferencesAreTakenToTheStandard) {
  Load(18, DrawPatches(Drawn));
  const auto seen = [](int i) { return i == 5 ? cv::Scalar(60, 80, 70) : Drawn(i); };
  Load(17, DrawPatches(seen));
  ASSERT_EQ(1, RunTest(QV_TEST_CAMERA_CAPTURE, false));
  ASSERT_EQ(24, Main().capture_lab_count_);
  ASSERT_EQ(24, Main().capture_delta_e_count_);
  for (int i = 0; i < 24; ++i) {
    const double distance = cv::norm(Lab(seen(i)), Lab(Drawn(i)));  // exactly 0 but for one
    EXPECT_NEAR(distance, Main().capture_delta_e_[i], 1e-4 * distance) << i;
  }

  // The standard is measured once; a new image in its slot, or Initialize, does not change that.
  InitTestModule();
  Load(18, cv::Mat(50, 50, CV_8UC3, cv::Scalar::all(0)));
  Load(17, DrawPatches(Drawn));
  ASSERT_EQ(1, TestCameraCapture(false)) << "black has no marks to measure it by";
  EXPECT_THAT(std::vector<float>(Main().capture_delta_e_, Main().capture_delta_e_ + 24), Each(0.0f));

  Load(24, DrawPatches(Drawn));
  ASSERT_EQ(1, RunTest(QV_TEST_CAMERA_CAPTURE_2, false)) << "the front camera has no standard yet";
  EXPECT_EQ(4, Results().capture_front_.capture_lab_count_);
  EXPECT_EQ(24, Main().capture_lab_count_);
}

// A run turns only the patches upright.
TEST_F(Capture, PatchesAreThoseOfTheStraightenedPhoto) {
  for (const double turn_deg : {0.0, -29.0, 118.0}) {
    cv::Mat photo = DrawChart({3, turn_deg, 0.06, {1100, 900}});
    cv::Mat noise(photo.size(), CV_8UC3);
    cv::randu(noise, 0, 60);  // too little to hide the marks
    photo -= noise;
    cv::Mat gray;
    cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
    std::vector<cv::Point> points = theTester->GetFinderPoints(gray > 125);
    cv::Mat upright;
    theTester->NormalizePatternImage(photo, points, upright);
    const std::vector<cv::Point3i> patches = theTester->GetColorPatchRGB(upright, points);
    ASSERT_THAT(patches, SizeIs(24));
    for (const int slot : {17, 18}) Load(slot, photo);
    ASSERT_EQ(1, TestCameraCapture(false));
    for (int i = 0; i < 24; ++i) {
      EXPECT_EQ(Lab(cv::Scalar(patches[i].z, patches[i].y, patches[i].x)), Triple(i)) << turn_deg << ", patch " << i;
    }
  }
}

TEST_F(Capture, MissesInEitherPhotoStoreNothing) {
  const cv::Mat blank(200, 200, CV_8UC3, cv::Scalar::all(255));
  EXPECT_EQ(-98, TestCameraCapture(true));
  for (const bool extracted : {false, true}) {  // missed in the standard, then in the photo
    Load(18, extracted ? DrawPatches(Drawn) : blank);
    Load(17, extracted ? blank : DrawPatches(Drawn));
    EXPECT_EQ(-91, TestCameraCapture(false));
    EXPECT_EQ(extracted, theTester->kept_->standard_main.is_extracted);
  }
  ExpectGolden("log_capture_miss", LogLines::Text());
  Load(17, cv::Mat(50, 50, CV_16UC3, cv::Scalar::all(9)));
  EXPECT_EQ(-95, TestCameraCapture(false));
  EXPECT_EQ(0, Main().capture_lab_count_);
}

TEST_F(Capture, ChartsThatOpenCvCannotCutAreRefused) {  // as the whole upright picture and its patches would be
  cv::Mat tiny;
  cv::cvtColor(DrawMarks({60, 60}, 1, {{10, 10}, {10, 20}, {20, 10}}), tiny, cv::COLOR_GRAY2BGR);
  const cv::Mat wide(DrawChart({3, 0, 0.04, {SHRT_MAX, 360}, 0.5}));
  for (const cv::Mat& refused : {tiny, wide}) {
    Load(17, refused);
    EXPECT_EQ(-95, TestCameraCapture(false)) << refused.size;
    EXPECT_EQ(3u, theTester->kept_->chart.marks.size()) << "found, but of no use";
    Load(17, DrawChart());
    Load(18, refused);
    EXPECT_EQ(-95, TestCameraCapture(false)) << refused.size << " as the standard";
    EXPECT_FALSE(theTester->kept_->standard_main.is_extracted);
  }
  EXPECT_EQ(nullptr, Main().capture_lab_);
  Load(18, wide.colRange(0, SHRT_MAX - 1));
  EXPECT_EQ(1, TestCameraCapture(false));
}

}  // namespace
