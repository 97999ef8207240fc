// What is said of a chart that is not found.

#include "desk/measure/miss.h"

#include <gmock/gmock.h>

#include <opencv2/imgproc.hpp>

#include "desk/measure/chart_view.h"
#include "desk/simulation/simulation.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

using ::testing::HasSubstr;

cv::Mat Photo(void (*fault)(SimulationOptions& options)) {
  SimulationOptions options;
  options.camera.size = {800, 600};
  options.camera.blur_px = 0.6;
  options.camera.turn_deg = 20;
  fault(options);
  return Sense(options.camera, Simulate(options).levels[0], 8);
}

Miss Explain(const cv::Mat& photo) {
  QVTester tester;
  const ::qv::ChartView view = LookAtChart(tester.FindChart(photo, 125));
  EXPECT_FALSE(view.complete());
  return ExplainMiss(view.marks, view.threshold, photo);
}

cv::Point2d Corner(const cv::Mat& photo) {
  QVTester tester;
  return LookAtChart(tester.FindChart(photo, 125)).marks.at(0).centre;
}

struct Fault {
  const char* name;
  MissCause cause;
  const char* sentence;
  cv::Mat (*photo)();
};

const Fault kFaults[] = {
    {"Flat", MissCause::kContrast, "hardly any contrast (grey peaks at 90 and 90)",
     [] { return cv::Mat(600, 800, CV_8UC3, cv::Scalar::all(90)); }},
    {"Dark", MissCause::kThreshold, "the threshold of 125 is far from the middle",
     [] { return Photo([](SimulationOptions& o) { o.camera.exposure_ev = -2; }); }},
    {"Blurred", MissCause::kBlur, "blurred by about 11 px (sigma)",
     [] { return Photo([](SimulationOptions& o) { o.camera.blur_px = 10; }); }},
    {"Small", MissCause::kSmall, "px a module: at least 3 are needed",
     [] { return Photo([](SimulationOptions& o) {
            o.camera.size = {200, 150};
          }); }},
    {"Oblique", MissCause::kOblique, "seen from aside",
     [] { return Photo([](SimulationOptions& o) { o.camera.tilt_deg = 58; }); }},
    {"Noisy", MissCause::kNoise, "noise breaks up the marks",
     [] { return Photo([](SimulationOptions& o) { o.camera.noise_percent = 30; }); }},
    {"NoChart", MissCause::kNoChart, "nothing in the picture looks like a chart's mark",
     [] { return Photo([](SimulationOptions& o) { o.scene = "pair"; }); }},
};

class MissOf : public ::testing::TestWithParam<Fault> {};

TEST_P(MissOf, IsToldItsCause) {
  const Miss miss = Explain(GetParam().photo());
  EXPECT_EQ(GetParam().cause, miss.cause) << ::testing::PrintToString(miss.reasons);
  EXPECT_THAT(miss.reasons, ::testing::Contains(HasSubstr(GetParam().sentence)));
  EXPECT_EQ(GetParam().cause == MissCause::kThreshold, miss.threshold.has_value());
}

INSTANTIATE_TEST_SUITE_P(Faults, MissOf, ::testing::ValuesIn(kFaults),
                         [](const auto& info) { return info.param.name; });

// The patches tell which of the three is lacking, and so where it is.
TEST(Miss, TheThirdMarksPlaceIsTold) {
  const cv::Mat photo = Photo([](SimulationOptions&) {});
  const cv::Point2d corner = Corner(photo);
  const auto expect = [&](const cv::Mat& seen, cv::Point2d at, MissCause cause, const char* sentence) {
    const Miss miss = Explain(seen);
    EXPECT_EQ(cause, miss.cause);
    EXPECT_THAT(miss.reasons, ::testing::Contains(HasSubstr(sentence)));
    if (miss.candidates.empty()) return;
    EXPECT_LT(cv::norm(at - miss.candidates[0].mark.centre), 6);
  };
  cv::Mat covered = photo.clone();
  cv::circle(covered, corner, 20, cv::Scalar::all(235), cv::FILLED);
  expect(covered, corner, MissCause::kCovered, "nothing dark is there: is it covered?");
  QVTester tester;
  for (const Mark& mark : LookAtChart(tester.FindChart(photo, 125)).marks) {
    covered = photo.clone();
    cv::circle(covered, mark.centre, 20, cv::Scalar::all(235), cv::FILLED);
    expect(covered, mark.centre, MissCause::kCovered, "nothing dark is there: is it covered?");
  }
  covered = photo.clone();  // from its middle to the left
  cv::rectangle(covered, corner - cv::Point2d(30, 30), corner + cv::Point2d(-3, 30), cv::Scalar::all(20), cv::FILLED);
  expect(covered, corner, MissCause::kCovered, "its bands along the row are ");
  for (const auto& [past, sentence] :
       {std::pair{0, "is cut by the picture's left border"}, {60, "lies beyond the picture's left border"}}) {
    const int from = cvRound(corner.x) + past;
    expect(photo.colRange(from, photo.cols).clone(), corner - cv::Point2d(from, 0), MissCause::kCut, sentence);
  }
}

// A QR code's marks are of the same shape, at a right angle, on legs of 14 to 170 modules.
TEST(Miss, AThresholdIsSuggestedForAChartAlone) {
  for (const auto& [legs, suggested] : {std::pair{14, false}, {38, false}, {70, true}, {100, false}}) {
    constexpr int kModule = 6;
    cv::Mat sheet(800, 800, CV_8UC1, cv::Scalar(235));
    const int to = 40 + legs * kModule;
    for (const cv::Point at : {cv::Point(40, 40), {40, to}, {to, 40}}) DrawMark(sheet, at.x, at.y, kModule, 150, 235);
    cv::cvtColor(sheet, sheet, cv::COLOR_GRAY2BGR);
    EXPECT_EQ(suggested, Explain(sheet).threshold.has_value()) << legs << " modules";
  }
}

}  // namespace
}  // namespace qv
