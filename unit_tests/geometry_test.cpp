#include <gmock/gmock.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstring>
#include <opencv2/imgproc.hpp>

#include "qvtester/tester.h"
#include "unit_tests/plain/chart_mtf.h"

namespace {

using ::testing::ElementsAre;

// Points hold the row in x, the column in y.
const cv::Point kCorner(100, 200), kRight(100, 300), kBelow(200, 200);

TEST(Geometry, EveryListOrderGivesTheSameMarks) {
  QVTester tester;
  std::vector<cv::Point> points = {kCorner, kRight, kBelow};
  std::vector<int> order = {0, 1, 2};
  do {
    const std::vector<cv::Point> list = {points[order[0]], points[order[1]], points[order[2]]};
    cv::Point corner;
    cv::Point second;
    cv::Point third;
    tester.SortPatternPoints(list, corner, second, third);
    EXPECT_EQ(kCorner, tester.GetCornerPoint(list));
    EXPECT_EQ(kCorner, corner);
    EXPECT_EQ(kRight, second);
    EXPECT_EQ(kBelow, third);
  } while (std::next_permutation(order.begin(), order.end()));
}

TEST(Geometry, EqualLongestSidesAreSettledByOrder) {
  QVTester tester;
  const cv::Point a(0, 0), b(0, 10), apex(30, 5);  // both long sides meet in the apex
  EXPECT_EQ(b, tester.GetCornerPoint({a, apex, b})) << "d01 = d12";
  EXPECT_EQ(b, tester.GetCornerPoint({apex, a, b})) << "d01 = d20";
  EXPECT_EQ(a, tester.GetCornerPoint({a, b, apex})) << "d12 = d20";
}

TEST(Geometry, ShortListsAreSurvived) {
  QVTester tester;
  cv::Point corner;
  cv::Point second;
  cv::Point third(9, 9);
  tester.SortPatternPoints({}, corner, second, third);
  EXPECT_EQ(cv::Point(-1, -1), second);
  EXPECT_EQ(cv::Point(0, 0), third);
  EXPECT_EQ(-1.0f, tester.GetPatternAngle({kCorner, kRight}));
  EXPECT_EQ(-1.0f, tester.GetPatternAngle({kCorner, kRight, kBelow, kBelow}));
}

TEST(Geometry, AnglesCountFromTheUprightChart) {
  QVTester tester;
  // The right and lower marks after quarter turns of the chart, counter-clockwise.
  const cv::Point k(500, 500);
  const std::vector<std::pair<cv::Point, cv::Point>> turned = {
      {{0, 100}, {100, 0}}, {{-100, 0}, {0, 100}}, {{0, -100}, {-100, 0}}, {{100, 0}, {0, -100}}};
  std::vector<float> angles;
  for (const auto& [right, below] : turned) angles.push_back(tester.GetPatternAngle({k, k + right, k + below}));
  EXPECT_THAT(angles, ElementsAre(315, 45, 135, 224));
}

TEST(Geometry, APictureOfAnyKindIsWhatTheWarpGives) {
  QVTester tester;
  const std::vector<std::vector<cv::Point>> charts = {
      {kCorner, kRight, kBelow}, {{300, 200}, {200, 200}, {300, 300}}, {{200, 200}, {210, 300}, {300, 190}}};
  for (const int type : {CV_8UC1, CV_8UC3, CV_8UC4, CV_16UC1, CV_16SC3, CV_32FC1}) {
    for (const cv::Size& size : {cv::Size(64, 48), cv::Size(31, 77), cv::Size(50, 50)}) {
      for (const std::vector<cv::Point>& chart : charts) {  // upright, turned by 90 degrees, by 6 the other way
        cv::Mat image(size, type);
        cv::randu(image, 0, 256);
        if (image.depth() == CV_32F) image.at<float>(5, 5) = INFINITY;  // its neighbours become NaN
        std::vector<cv::Point> expected_points = chart;
        cv::Mat expected;
        plain::NormalizePatternImage(tester, image, expected_points, expected);
        cv::Mat upright(expected.size(), type, cv::Scalar::all(7));  // as a picture before it would be
        for (cv::Mat* normalized : {&upright, &image}) {
          std::vector<cv::Point> points = chart;
          tester.NormalizePatternImage(image, points, *normalized);
          ASSERT_EQ(expected.size(), normalized->size());
          const std::size_t bytes = expected.total() * expected.elemSize();
          EXPECT_EQ(0, std::memcmp(expected.data, normalized->data, bytes)) << type << ' ' << size;
          EXPECT_EQ(expected_points, points);
        }
      }
    }
  }
  std::vector<cv::Point> points = charts[0];
  cv::Mat upright;
  EXPECT_THROW(tester.NormalizePatternImage(cv::Mat(), points, upright), cv::Exception);
  EXPECT_THROW(tester.NormalizePatternImage(cv::Mat(1, SHRT_MAX, CV_8UC1), points, upright), cv::Exception);
}

TEST(Geometry, PointsTravelWithThePicture) {
  QVTester tester;
  for (int turn = 0; turn < 360; turn += 7) {
    // A chart turned about the middle of a 640 x 640 picture, its marks drawn as dots.
    std::vector<cv::Point> points;
    cv::Mat image = cv::Mat::zeros(480, 640, CV_8UC1);
    const double angle = turn * CV_PI / 180;
    for (const cv::Point2d& p : {cv::Point2d(-80, -80), {80, -80}, {-80, 80}}) {
      const cv::Point2d at(320 + p.x * std::cos(angle) + p.y * std::sin(angle),
                           240 - p.x * std::sin(angle) + p.y * std::cos(angle));
      points.emplace_back(cvRound(at.y), cvRound(at.x));
      cv::circle(image, {cvRound(at.x), cvRound(at.y)}, 4, cv::Scalar(255), cv::FILLED);
    }
    cv::Mat upright;
    tester.NormalizePatternImage(image, points, upright);
    for (const cv::Point& p : points) EXPECT_GT(upright.at<uchar>(p.x, p.y), 200) << "turned by " << turn;
    cv::Point corner;
    cv::Point second;
    cv::Point third;
    tester.SortPatternPoints(points, corner, second, third);
    // The angle is known to a degree: 160 pixels sideways rise by 3 at the most, 2 more for rounding.
    EXPECT_NEAR(0, second.x - corner.x, 5) << "turned by " << turn;
    EXPECT_NEAR(160, second.y - corner.y, 3);
    EXPECT_NEAR(0, third.y - corner.y, 5);
    EXPECT_NEAR(160, third.x - corner.x, 3);
  }
}

}  // namespace
