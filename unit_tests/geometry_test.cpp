#include <gmock/gmock.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <opencv2/imgproc.hpp>

#include "qvtester/tester.h"
#include "unit_tests/plain/chart_mtf.h"

namespace {

using ::testing::ElementsAre;

// Points hold the row in x, the column in y.
const cv::Point kCorner(100, 200), kRight(100, 300), kBelow(200, 200);

// Corner, second and third mark.
std::vector<cv::Point> Sorted(const std::vector<cv::Point>& points) {
  std::vector<cv::Point> marks(3, {9, 9});
  QVTester().SortPatternPoints(points, marks[0], marks[1], marks[2]);
  return marks;
}

TEST(Geometry, EveryListOrderGivesTheSameMarks) {
  std::vector<int> order = {0, 1, 2};
  do {
    const cv::Point points[] = {kCorner, kRight, kBelow};
    EXPECT_THAT(Sorted({points[order[0]], points[order[1]], points[order[2]]}), ElementsAre(kCorner, kRight, kBelow));
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
  EXPECT_THAT(Sorted({}), ElementsAre(cv::Point(0, 0), cv::Point(-1, -1), cv::Point(0, 0)));
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
          EXPECT_EQ(0, std::memcmp(expected.data, normalized->data, expected.total() * expected.elemSize()))
              << type << ' ' << size;
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
    // A chart turned about the middle of a picture, its marks drawn as dots.
    std::vector<cv::Point> points;
    cv::Mat image = cv::Mat::zeros(480, 640, CV_8UC1);
    const cv::Matx23d map = cv::getRotationMatrix2D({320, 240}, turn, 1);
    for (const cv::Vec3d& mark : {cv::Vec3d(240, 160, 1), {400, 160, 1}, {240, 320, 1}}) {
      const cv::Vec2d at = map * mark;
      points.emplace_back(cvRound(at[1]), cvRound(at[0]));
      cv::circle(image, {points.back().y, points.back().x}, 4, cv::Scalar(255), cv::FILLED);
    }
    cv::Mat upright;
    tester.NormalizePatternImage(image, points, upright);
    for (const cv::Point& p : points) EXPECT_GT(upright.at<uchar>(p.x, p.y), 200) << "turned by " << turn;
    const std::vector<cv::Point> marks = Sorted(points);
    // The angle is known to a degree: 160 pixels sideways rise by 3 at the most, 2 more for rounding.
    EXPECT_NEAR(0, marks[1].x - marks[0].x, 5) << "turned by " << turn;
    EXPECT_NEAR(160, marks[1].y - marks[0].y, 3);
    EXPECT_NEAR(0, marks[2].y - marks[0].y, 5);
    EXPECT_NEAR(160, marks[2].x - marks[0].x, 3);
  }
}

}  // namespace
