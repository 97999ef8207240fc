#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/simulation/method_law.h"
#include "unit_tests/golden.h"
#include "unit_tests/module_test.h"
#include "unit_tests/plain/chart_mtf.h"

namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::Gt;
using ::testing::Lt;

class Autofocus : public ModuleTest {
 protected:
  static int Measure(const cv::Mat& photo) {
    Load(17, photo);
    return RunTest(QV_TEST_CAMERA_AUTOFOCUS, false);
  }
  // All that the last good run left.
  static std::vector<float> Held() {
    const QVResultData& results = Results();
    std::vector<float> held = {results.af_sfr_scalar1_, results.af_sfr_scalar2_};
    for (const float* list : {results.af_sfr_first_, results.af_sfr_second_, results.af_sfr_third_}) {
      held.insert(held.end(), list, list + results.af_sfr_count_);
    }
    return held;
  }
};

TEST_F(Autofocus, AChartPhotoGivesCurvesAndFigures) {
  ASSERT_EQ(1, Measure(DrawChart()));
  ExpectGolden("log_autofocus", LogLines::Text());
  const QVResultData& results = Results();
  EXPECT_EQ(75 / 2 + 1, results.af_sfr_count_);  // 750 chart units at a tenth of a pixel
  EXPECT_EQ(1.0f, results.af_sfr_second_[0]);
  EXPECT_EQ(1.0f, results.af_sfr_third_[0]);
  const auto [low, high] = qv::method_law::MeasuredMtf50(ChartView().blur_px, 75);
  const auto lawful = AllOf(Gt(0.95 * low), Lt(1.05 * high));  // 5 %: four subpixels and whole grey levels are drawn
  EXPECT_THAT(results.af_sfr_scalar1_, lawful);
  EXPECT_THAT(results.af_sfr_scalar2_, lawful);
}

// The fault that matters: stale numbers taken for new ones.
TEST_F(Autofocus, PhotosThatCanNotBeMeasuredChangeNothing) {
  ASSERT_EQ(1, Measure(DrawChart()));
  const std::vector<float> before = Held();
  const LogLines log;
  EXPECT_EQ(-91, Measure(DrawChart({2})));
  EXPECT_EQ(before, Held());
  ExpectGolden("log_autofocus_miss", LogLines::Text());
  float vertical = 5;
  float horizontal = 6;
  EXPECT_EQ(-91, CheckMTF(&vertical, &horizontal));
  EXPECT_EQ(5.0f, vertical);
  EXPECT_EQ(6.0f, horizontal);
  EXPECT_EQ("CheckMTF Fail to get SFR data (Result:-91)", LogLines::Texts().back());
  for (const int type : {CV_16UC3, CV_8UC1}) EXPECT_EQ(-95, Measure(cv::Mat(50, 50, type, cv::Scalar::all(0))));
  EXPECT_EQ(-95, Measure(cv::Mat()));
  EXPECT_EQ(before, Held());

  EXPECT_EQ(1, ReleaseTestResult(QV_TEST_CAMERA_AUTOFOCUS));
  EXPECT_EQ(0, Results().af_sfr_count_);
  EXPECT_EQ(nullptr, Results().af_sfr_first_);
}

TEST_F(Autofocus, TheMtfMeasuresAgree) {
  ASSERT_EQ(1, Measure(DrawChart()));
  const LogLines log;
  float vertical = 0;
  float horizontal = 0;
  ASSERT_EQ(1, theTester->GetMTFFromImage(DrawChart(), vertical, horizontal));
  EXPECT_EQ(Held()[0], vertical);
  EXPECT_EQ(Held()[1], horizontal);
  ExpectGolden("log_mtf", LogLines::Text());  // the marks' middles in a picture of 1000 x 1000: 151.5 and 848.5
  ASSERT_EQ(1, CheckMTF(&vertical, &horizontal));
  EXPECT_EQ(Held()[0], vertical);

  const LogLines miss;
  EXPECT_EQ(-91, theTester->GetMTFFromImage(cv::Mat(50, 50, CV_8UC3, cv::Scalar::all(255)), vertical, horizontal));
  ExpectGolden("log_mtf_miss", LogLines::Text());
}

// The code and all figures of a measure.
template <typename Measure>
std::vector<float> Figures(const Measure& measure) {
  std::vector<float> lists[3];
  float vertical = 0;
  float horizontal = 0;
  const int code = measure(lists[0], lists[1], lists[2], vertical, horizontal);
  std::vector<float> figures = {static_cast<float>(code), vertical, horizontal};
  for (const auto& list : lists) figures.insert(figures.end(), list.begin(), list.end());
  return figures;
}

TEST(ChartMtf, WorkImagesAndRegionsGiveWhatTheLiteralChainGives) {
  QVTester tester;  // one for all photos: what it keeps must not be seen
  const LogLines log;
  int measured = 0;
  for (const double turn : {0.0, 31.0, 90.0, 143.0, 359.0}) {
    for (const cv::Size& size : {cv::Size(900, 700), cv::Size(640, 800), cv::Size(500, 500)}) {
      const cv::Mat photo = DrawChart({size.width == 500 && turn < 3 ? 2 : 3, turn, 0.05, size});
      const cv::Mat untouched = photo.clone();
      const auto plain = Figures([&](auto&... out) { return plain::GetSFRFromImage(tester, photo, out...); });
      EXPECT_EQ(plain, Figures([&](auto&... out) { return tester.GetSFRFromImage(photo, out...); }))
          << turn << ' ' << size;
      EXPECT_EQ(0, cv::norm(photo, untouched, cv::NORM_INF));
      if (plain[0] != QV_SUCCESS) continue;
      ++measured;
      std::vector<float> mtf50(2);
      EXPECT_EQ(QV_SUCCESS, tester.GetMTFFromImage(photo, mtf50[0], mtf50[1]));
      EXPECT_THAT(mtf50, ElementsAre(plain[1], plain[2]));
    }
  }
  EXPECT_GT(measured, 9) << "of 14 with three marks";
}

TEST(ChartMtf, ARegionOutsideTheUprightPictureIsTheSameError) {
  QVTester tester;
  const LogLines log;
  for (const cv::Mat& marks : {// A chart turned by 45 degrees at the upper right: the vertical region is out of view.
                               DrawMarks({1000, 1000}, 6, {{279, 679}, {19, 939}, {539, 939}}),
                               // With corner and second mark in one column the scale is 0, and both regions are empty.
                               DrawMarks({400, 400}, 5, {{20, 20}, {20, 60}, {340, 20}}),
                               DrawMarks({330, 330}, 3, {{187, 28}, {33, 135}, {24, 181}})}) {
    cv::Mat photo;
    cv::cvtColor(marks, photo, cv::COLOR_GRAY2BGR);
    std::vector<float> list;
    float mtf50 = 0;
    EXPECT_THROW(plain::GetSFRFromImage(tester, photo, list, list, list, mtf50, mtf50), cv::Exception);
    EXPECT_THROW(tester.GetSFRFromImage(photo, list, list, list, mtf50, mtf50), cv::Exception);
    EXPECT_EQ(3u, tester.kept_->chart.marks.size());
    EXPECT_THROW(tester.GetMTFFromImage(photo, mtf50, mtf50), cv::Exception);
  }
}

// In so flat a triangle the second mark comes to lie to the left of the corner; one measure minds, the other does not.
TEST(ChartMtf, OnlyTheAutofocusMeasureTakesTheDistanceWithItsSign) {
  QVTester tester;
  const LogLines log;
  cv::Mat photo;
  cv::cvtColor(DrawMarks({716, 750}, 5, {{429, 127}, {653, 251}, {290, 70}}), photo, cv::COLOR_GRAY2BGR);
  std::vector<float> list;
  float mtf50 = 0;
  EXPECT_THROW(tester.GetSFRFromImage(photo, list, list, list, mtf50, mtf50), cv::Exception);
  EXPECT_EQ(QV_SUCCESS, tester.GetMTFFromImage(photo, mtf50, mtf50));
}

}  // namespace
