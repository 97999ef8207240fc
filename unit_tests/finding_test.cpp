// What the pictures of findings show: each thing in its colour, where the truth says that it is.

#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/measure/heading.h"
#include "desk/measure/measure.h"
#include "desk/measure/measurement.h"
#include "desk/simulation/simulation.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

cv::Mat Drawn(const Record& record) {
  const std::string file = record.finding->Draw(record)->Png();
  return cv::imdecode(std::vector<uchar>(file.begin(), file.end()), cv::IMREAD_COLOR);
}

int Count(const cv::Mat& picture, const cv::Rect& where, Colour colour) {
  const cv::Vec3d bgr = 255 * cv::Vec3d(colour.blue, colour.green, colour.red);
  cv::Mat found;
  cv::inRange(picture(where & cv::Rect({}, picture.size())), bgr - cv::Vec3d::all(3), bgr + cv::Vec3d::all(3), found);
  return cv::countNonZero(found);
}

cv::Rect About(cv::Point2d middle, double reach) {
  return {cv::Point(cvRound(middle.x - reach), cvRound(middle.y - reach)),
          cv::Point(cvRound(middle.x + reach), cvRound(middle.y + reach))};
}

Limits AtLeast(const std::string& figure, double least) {
  Limits limits;
  limits.by_name[figure].min = least;
  return limits;
}

cv::Mat ChartPhoto() { return DrawChart({3, 3, 0.09, {800, 800}, 0.8}); }

TEST(Finding, TheVerdictStandsInItsColourAndTheLimitWithIt) {
  const cv::Mat photo = ChartPhoto();
  const std::string figure = "camera_autofocus_mtf50_vertical";
  const int plain = Drawn(MeasureAnew({"camera_autofocus", {photo}})).rows;
  for (const auto& [limits, outcome] : {std::pair{Limits(), Outcome::kMeasured},
                                        {AtLeast(figure, 0.05), Outcome::kPass},
                                        {AtLeast(figure, 0.9), Outcome::kFail}}) {
    const Record record = MeasureAnew({"camera_autofocus", {photo}}, limits);
    ASSERT_EQ(outcome, record.outcome());
    const cv::Mat picture = Drawn(record);
    EXPECT_GT(Count(picture, {12, 12, 40, 20}, OnPaper(ToneOf(outcome))), 300) << Name(outcome);
    EXPECT_EQ(limits.given(), picture.rows > plain) << "a line for the figure that has a limit";
    if (!limits.given()) continue;
    EXPECT_GT(Count(picture, {12, 34, 500, 24}, OnPaper(ToneOf(outcome))), 50) << "its words";
    EXPECT_GT(Count(picture, {810, 400, 420, 400}, OnPaper(ToneOf(outcome))), 50) << "its line and marker";
  }
}

TEST(Finding, MarksRegionsAndBothCurvesAreDrawnWhereTheyAre) {
  const ::ChartView view = {3, 3, 0.09, {800, 800}, 0.8};
  const cv::Mat photo = DrawChart(view);
  const Record record = MeasureAnew({"camera_autofocus", {photo}});
  const cv::Mat picture = Drawn(record);
  const double top = picture.rows - photo.rows;
  const double radius = 5 * record.phase.Find("module_size")->value();
  for (const cv::Point2d& mark : MarkCentres(view)) {
    for (int turn = 0; turn < 8; ++turn) {
      const cv::Point2d rim = radius * cv::Point2d(std::cos(turn * CV_PI / 4), std::sin(turn * CV_PI / 4));
      EXPECT_GT(Count(picture, About(mark + cv::Point2d(0.5, top + 0.5) + rim, 4), OnLabel(kGood)), 4) << turn;
    }
    EXPECT_EQ(0, Count(picture, About(mark + cv::Point2d(0, top), 0.7 * radius - 3), OnLabel(kGood)))
        << "the mark is free";
  }
  // The slanted edges cross the regions' middles.
  const std::vector<cv::Point2d> marks = MarkCentres(view);
  for (const ChartRegion& region : {kVerticalRegion, kHorizontalRegion}) {
    const cv::Point2d side = marks[0] + (region.x * (marks[1] - marks[0]) + region.MiddleY() * (marks[2] - marks[0])) /
                                            static_cast<double>(kChartSide);
    EXPECT_GT(Count(picture, About(side + cv::Point2d(0, top), 5), OnLabel(kGood)), 5) << "its left side";
  }
  for (const Series& series : {kSeries[0], kSeries[1]}) {
    EXPECT_GT(Count(picture, {870, cvRound(top) + 400, 350, 250}, series.colour), 100) << "the curve";
  }
}

TEST(Finding, AMissShowsWhatFailedAndWhy) {
  const ::ChartView view = {3, 0, 0.09, {800, 800}, 0.8};
  cv::Mat photo = DrawChart(view);
  const std::vector<cv::Point2d> marks = MarkCentres(view);
  const double module = kMarkSizes.back().module * view.scale;
  // The second mark's right side is covered.
  cv::rectangle(photo, About(marks[1] + cv::Point2d(4 * module, 0), 2.2 * module), cv::Scalar::all(220), cv::FILLED);
  const Record record = MeasureAnew({"camera_autofocus", {photo}});
  ASSERT_EQ(QV_ERROR_PATTERN_NOT_FOUND, record.phase.code);
  const cv::Mat picture = Drawn(record);
  const double top = picture.rows - photo.rows;
  EXPECT_GT(Count(picture, About(marks[1] + cv::Point2d(0, top), 6 * module), OnLabel(kPoor)), 100) << "the candidate";
  for (const int found : {0, 2}) {
    EXPECT_GT(Count(picture, About(marks[found] + cv::Point2d(0, top), 6 * module), OnLabel(kGood)), 100) << found;
  }
  EXPECT_GT(Count(picture, {0, 34, picture.cols, 30}, OnPaper(kPoor)), 100) << "the reason, in words";
}

TEST(Finding, BrightAndDarkDotsAreOfTwoColours) {
  cv::Mat panel(120, 160, CV_32FC3, cv::Scalar::all(1));
  panel.at<cv::Vec3f>(40, 40) = {2, 2, 2};
  panel.at<cv::Vec3f>(80, 120) = {0.3F, 0.3F, 0.3F};
  const TemporaryFolder folder;
  const cv::Mat picture = Drawn(MeasureAnew({"hdr_dots", {folder.Write("panel.tif", panel)}}));
  const double scale = 8;  // 1280 over 160
  const double top = picture.rows - 120 * scale;
  EXPECT_EQ(64, Count(picture, About({40.5 * scale, top + 40.5 * scale}, 5), OnLabel(kDoubtful)));
  EXPECT_EQ(64, Count(picture, About({120.5 * scale, top + 80.5 * scale}, 5), OnLabel(kGood)));
  for (const Tone tone : {kDoubtful, kGood}) {
    EXPECT_GT(Count(picture, {0, cvRound(top) - 34, 400, 26}, OnLabel(tone)), 20) << "what it stands for";
  }
}

TEST(Finding, MatchesThatTheMapExplainsAreOfAnotherColour) {
  SimulationOptions options;
  options.scene = "pair";
  options.camera.size = {480, 360};
  const Simulation pair = Simulate(options);
  const cv::Mat first = Sense(options.camera, pair.levels[0], 8);
  const cv::Mat second = Sense(options.camera, pair.levels[1], 8);
  Record record = MeasureAnew({"registration", {first, second}});
  const cv::Mat picture = Drawn(record);
  const int good = Count(picture, {0, 60, 960, 400}, OnLabel(kGood));
  EXPECT_GT(good, 5000);
  EXPECT_LT(Count(picture, {0, 60, 960, 400}, OnLabel(kPoor)), good / 10);
  options.camera.seed = 9;  // another scene: nearly all matches are false
  const cv::Mat other = Sense(options.camera, Simulate(options).levels[0], 8);
  record = MeasureAnew({"registration", {first, other}});
  ASSERT_EQ(QV_SUCCESS, record.phase.code);
  EXPECT_GT(Count(Drawn(record), {0, 60, 960, 400}, OnLabel(kPoor)), 1000);
}

TEST(Finding, LargePhotosAreDrawnSmaller) {
  const cv::Mat photo(100, 2400, CV_8UC3, cv::Scalar::all(90));
  EXPECT_EQ(1200, Drawn(MeasureAnew({"camera_flash", {photo}})).cols);
}

// The map's lightest colour stands at the top of its bar, beside the largest difference as a number.
TEST(Finding, ADifferenceMapHasABarWithNumbers) {
  cv::Mat first(240, 320, CV_8UC3, cv::Scalar::all(100));
  cv::Mat second = first.clone();
  second(cv::Rect(100, 100, 40, 40)).setTo(cv::Scalar::all(150));
  const cv::Mat picture = Drawn(MeasureAnew({"camera_preview", {first, second}}));
  cv::Mat ends = (cv::Mat_<uchar>(1, 2) << 255, 0);
  cv::applyColorMap(ends, ends, cv::COLORMAP_VIRIDIS);
  const double top = picture.rows - 240;
  const auto at = [&](double x, double y) { return picture.at<cv::Vec3b>(cvRound(top + y), cvRound(x)); };
  EXPECT_EQ(ends.at<cv::Vec3b>(0), at(328 + 120, 120)) << "50 levels, the largest difference";
  EXPECT_EQ(ends.at<cv::Vec3b>(1), at(328 + 20, 20));
  EXPECT_LT(cv::norm(ends.at<cv::Vec3b>(0), at(665, 9)), 10) << "the bar's top";
  for (const int step : {0, 1, 2, 3, 4}) {
    EXPECT_GT(Count(picture, {688, cvRound(top + 8 + 50 * step - 8), 40, 16}, OnPaper(kInk)), 3) << step;
  }
}

}  // namespace
}  // namespace qv
