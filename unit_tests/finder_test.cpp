#include <gmock/gmock.h>

#include <cfloat>
#include <opencv2/imgproc.hpp>

#include "qvtester/tester.h"
#include "unit_tests/agreement_test.h"
#include "unit_tests/drawing.h"
#include "unit_tests/log_lines.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAre;

TEST(FinderPattern, MergesAreWeightedByCount) {
  const QVFinderPattern merged = QVFinderPattern(10, 20, 4, 2).combineEstimate(23, 13, 7);  // row 23, column 13
  EXPECT_EQ(11.0f, merged.x);
  EXPECT_EQ(21.0f, merged.y);
  EXPECT_EQ(5.0f, merged.estimatedModuleSize);
  EXPECT_EQ(3, merged.count);
}

TEST(FinderPattern, TheSameMarkIsOneModuleAwayAtMost) {
  const QVFinderPattern mark(100, 50, 4, 1);
  EXPECT_TRUE(mark.aboutEquals(4, 54, 96));
  EXPECT_FALSE(mark.aboutEquals(4, 54.5f, 100));
  EXPECT_FALSE(mark.aboutEquals(4, 50, 95.5f));
  EXPECT_FALSE(mark.aboutEquals(4, NAN, 100) || mark.aboutEquals(4, 50, NAN));
  EXPECT_TRUE(mark.aboutEquals(8, 50, 100)) << "differs by the mark's own module size";
  EXPECT_FALSE(mark.aboutEquals(8.5f, 50, 100));
  EXPECT_TRUE(QVFinderPattern(0, 0, 0.25f, 1).aboutEquals(1.25f, 0, 0)) << "one pixel is always allowed";
}

struct Runs {
  std::array<int, 5> counts;
  bool pattern;
};

TEST(FinderRuns, TheRatioIsHalfAModuleWide) {
  QVTester tester;
  for (const auto& [counts, pattern] : {Runs{{1, 1, 3, 1, 1}, true},
                                        {{1, 1, 2, 1, 1}, false},  // under seven pixels
                                        {{3, 3, 9, 3, 0}, false},  // a run is missing
                                        {{20, 20, 44, 28, 28}, true},
                                        {{30, 20, 60, 20, 10}, false},  // 10 is exactly half a module off
                                        {{20, 20, 30, 35, 35}, false},  // the core exactly 1.5 modules off
                                        {{20, 20, 31, 35, 34}, false},
                                        {{22, 22, 45, 25, 26}, true}}) {
    auto copy = counts;
    EXPECT_EQ(pattern, tester.foundPatternCross(copy.data())) << ::testing::PrintToString(counts);
  }
}

TEST(CrossChecks, TheSizesMayDifferByDirection) {
  QVTester tester;
  const cv::Mat image = DrawMarks({40, 40}, 3, {{10, 8}});
  // A total of 21 against a row total of 30 is 30 % off: enough for the vertical check, too much for the horizontal.
  EXPECT_EQ(20.5f, tester.crossCheckVertical(image, 20, 18, 9, 30));
  EXPECT_EQ(FLT_MAX, tester.crossCheckHorizontal(image, 18, 20, 9, 30));
  EXPECT_EQ(FLT_MAX, tester.crossCheckVertical(image, 20, 18, 9, 35));  // exactly 40 %
  EXPECT_EQ(18.5f, tester.crossCheckHorizontal(image, 18, 20, 9, 26));
  EXPECT_FALSE(tester.crossCheckDiagonal(image, 20, 18, 9, 7)) << "twice the row's total off";
  EXPECT_TRUE(tester.crossCheckDiagonal(image, 20, 18, 9, 8));
}

TEST(CrossChecks, ASideMayHoldMaxCountBeforeTheCoreButNotBehind) {
  QVTester tester;
  for (const auto& [runs, passes] : {Runs{{4, 4, 12, 3, 3}, true},
                                     {{5, 4, 12, 3, 3}, false},
                                     {{4, 5, 12, 3, 3}, false},
                                     {{4, 4, 12, 4, 3}, false},
                                     {{4, 4, 12, 3, 4}, false},
                                     {{4, 4, 12, 9, 3}, false}}) {
    const cv::Mat wide(60, 9, CV_8UC1, cv::Scalar(255));
    cv::Mat column = wide.col(4);  // with a stride of its own
    int end = 10;
    for (std::size_t i = 0; i < 5; end += runs[i], ++i) {
      column.rowRange(end, end + runs[i]).setTo(i % 2 == 0 ? 0 : 255);
    }
    const int core = 10 + runs[0] + runs[1] + runs[2] / 2;
    EXPECT_EQ(passes, tester.crossCheckVertical(column, core, 0, 4, end - 10) != FLT_MAX)
        << ::testing::PrintToString(runs);
  }
  EXPECT_THAT(tester.crossCheckStateCount, ElementsAre(4, 4, 12, 4, 0)) << "a run too long is counted no further";
}

TEST(CrossChecks, MarksAtTheBorderFailInsteadOfReadingOutside) {
  QVTester tester;
  const cv::Mat image = DrawMarks({40, 40}, 3, {{10, 8}});
  EXPECT_EQ(20.5f, tester.crossCheckVertical(image, 20, 18, 9, 21));
  EXPECT_EQ(18.5f, tester.crossCheckHorizontal(image, 18, 20, 9, 21));
  EXPECT_TRUE(tester.crossCheckDiagonal(image, 20, 18, 9, 21));
  EXPECT_THAT(tester.crossCheckStateCount, ElementsAre(3, 3, 9, 3, 3));
  for (const auto& [top, rows] : {std::pair(10, 18), {10, 12}, {16, 15}, {20, 11}}) {
    const cv::Mat cut = image(cv::Rect(8, top, 21, rows));  // the rest of the mark lies beyond its rows
    EXPECT_EQ(FLT_MAX, tester.crossCheckVertical(cut, 20 - top, 10, 9, 21)) << top;
    EXPECT_EQ(FLT_MAX, tester.crossCheckHorizontal(cut.t(), 20 - top, 10, 9, 21)) << top;
    EXPECT_FALSE(tester.crossCheckDiagonal(cut, 20 - top, 10, 9, 21)) << top;
  }
  EXPECT_FALSE(tester.crossCheckDiagonal(image, -1, 5, 9, 21));
  EXPECT_EQ(FLT_MAX, tester.crossCheckVertical(image, 40, 5, 9, 21));
}

TEST(FinderPoints, TheDiagonalIsAlwaysChecked) {
  QVTester tester;
  cv::Mat ring = DrawMarks({60, 60}, 4, {{10, 10}});
  ASSERT_THAT(tester.GetFinderPoints(ring), SizeIs(1));
  for (const int row : {10, 30}) {
    for (const int column : {10, 30}) ring(cv::Rect(column, row, 8, 8)).setTo(255);
  }
  EXPECT_THAT(tester.GetFinderPoints(ring), IsEmpty()) << "a ring without corners";
}

TEST(FinderPoints, DrawnMarksAreFoundExactly) {
  cv::RNG random(1);
  QVTester tester;
  for (int round = 0; round < 1000; ++round) {
    const int module = random.uniform(2, 10);
    const int room = 11 * module;
    const auto near = [&] { return random.uniform(0, 2 * module + 1); };
    const auto away = [&] { return room + random.uniform(0, 41); };
    const std::vector<cv::Point> corners = {{near(), near()}, {near(), away()}, {away(), near()}};
    const cv::Point middle(7 * module / 2, 7 * module / 2);  // of a mark, cut to whole pixels
    EXPECT_THAT(tester.GetFinderPoints(DrawMarks({2 * room + 50, 2 * room + 50}, module, corners)),
                UnorderedElementsAre(corners[0] + middle, corners[1] + middle, corners[2] + middle))
        << "round " << round << ", module " << module;
  }
}

TEST(FinderPoints, FewerThanThreeAreHandedOutAndLogged) {
  QVTester tester;
  const LogLines log;
  for (const cv::Mat& image :
       {cv::Mat(2, 50, CV_8UC1, cv::Scalar(0)), cv::Mat(), cv::Mat(9, 9, CV_8UC1, cv::Scalar(255))}) {
    EXPECT_THAT(tester.GetFinderPoints(image), IsEmpty());
  }
  EXPECT_THAT(tester.GetFinderPoints(DrawMarks({80, 60}, 3, {{5, 5}, {5, 50}})), SizeIs(2));
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[OKAPI] startSize : 0", "[OKAPI] startSize : 0", "[OKAPI] startSize : 0",
                                             "[OKAPI] startSize : 2"));
  for (const int type : {CV_16UC1, CV_32FC1, CV_8UC3}) {
    EXPECT_THROW(tester.GetFinderPoints(cv::Mat(10, 10, type, cv::Scalar(0))), cv::Exception) << type;
  }
}

TEST(FinderPoints, TheScanByRunsEqualsTheScanByPixels) { ExpectAgreement(plain::ScanOfRunsAndOfPixels, 8000, 0.1); }

TEST(FinderSelection, ThePatternIsConfirmedBySizes) {
  QVTester tester;
  tester.possibleCenters = {{0, 0, 10, 2}, {0, 0, 10, 2}, {0, 0, 10, 1}};
  EXPECT_FALSE(tester.haveMultiplyConfirmedCenters()) << "only two were seen twice";
  tester.possibleCenters = {{0, 0, 10, 2}, {0, 0, 10.5f, 2}, {0, 0, 11, 3}};
  EXPECT_TRUE(tester.haveMultiplyConfirmedCenters());  // deviations sum to 1.0 of 31.5
  tester.possibleCenters.emplace_back(0.0f, 0.0f, 10.0f, 1);
  EXPECT_FALSE(tester.haveMultiplyConfirmedCenters()) << "an unconfirmed one lowers the average";
  tester.possibleCenters = {{0, 0, 10, 2}, {0, 0, 10.9f, 2}, {0, 0, 11.8f, 2}};
  EXPECT_FALSE(tester.haveMultiplyConfirmedCenters()) << "deviations of 5.5 %";
}

TEST(FinderSelection, TwoConfirmedMarksOnlyRaiseTheFlag) {
  QVTester tester;
  tester.possibleCenters = {{0, 0, 5, 2}, {300, 0, 5, 1}};
  EXPECT_EQ(0, tester.findRowSkip());
  EXPECT_FALSE(tester.hasSkipped);
  tester.possibleCenters[1].count = 2;
  EXPECT_EQ(0, tester.findRowSkip()) << "no rows are ever jumped";
  EXPECT_TRUE(tester.hasSkipped);
}

TEST(FinderSelection, StrayModuleSizesGoFirstThenTheLeastSeen) {
  QVTester tester;
  for (const float stray : {30.0f, 13.0f}) {  // 13 is 2.25 off an average of 10.75: a fifth of the average is the limit
    tester.possibleCenters = {{1, 1, 10, 3}, {2, 2, 10, 2}, {3, 3, 10, 5}, {4, 4, stray, 9}};
    EXPECT_THAT(tester.selectBestPatterns(), UnorderedElementsAre(cv::Point(1, 1), cv::Point(2, 2), cv::Point(3, 3)));
    EXPECT_THAT(tester.possibleCenters, SizeIs(3));
  }
  tester.possibleCenters = {{1, 1, 10, 3}, {2, 2, 10, 2}, {3, 3, 10, 5}, {4, 4, 11.6f, 9}};  // 1.2 off 10.4
  EXPECT_THAT(tester.selectBestPatterns(), ElementsAre(cv::Point(4, 4), cv::Point(3, 3), cv::Point(1, 1)));
  tester.possibleCenters.clear();
  for (int i = 1; i <= 8; ++i) tester.possibleCenters.emplace_back(0.0f, static_cast<float>(i), 10.0f, i);
  EXPECT_THAT(tester.selectBestPatterns(), ElementsAre(cv::Point(8, 0), cv::Point(7, 0), cv::Point(6, 0)));
  EXPECT_THAT(tester.possibleCenters, SizeIs(5)) << "of a tail of five, every other one goes";
}

}  // namespace
