// From three finder marks to the chart's corner, order and angle, and the upright picture. Points hold the row in x and
// the column in y, so the formulas below read with the axes exchanged.

#include <algorithm>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "chart/points.h"
#include "qvtester/tester.h"

namespace {

constexpr float kUprightAngle = 315.0f;

}  // namespace

cv::Point QVTester::GetCornerPoint(std::vector<cv::Point> points) {
  if (points.size() < kMarks) return {};
  const auto d01 = static_cast<float>(Distance(points[0], points[1]));
  const auto d12 = static_cast<float>(Distance(points[1], points[2]));
  const auto d20 = static_cast<float>(Distance(points[2], points[0]));
  const float longest = std::max({d01, d12, d20});
  if (longest == d01) return points[2];
  if (longest == d12) return points[0];
  return points[1];
}

void QVTester::SortPatternPoints(std::vector<cv::Point> points, cv::Point& corner, cv::Point& second,
                                 cv::Point& third) {
  const cv::Point k = GetCornerPoint(points);
  cv::Point a(-1, -1);
  cv::Point b(0, 0);
  for (const cv::Point& point : points) {
    if (point == k) continue;
    (a.x == -1 ? a : b) = point;
  }
  const double cross = static_cast<double>(a.x - k.x) * (b.y - k.y) - static_cast<double>(b.x - k.x) * (a.y - k.y);
  if (cross > 0) std::swap(a, b);
  corner = k;
  second = a;
  third = b;
}

float QVTester::GetPatternAngle(std::vector<cv::Point> points) {
  if (points.size() != kMarks) return -1.0f;
  const cv::Point k = GetCornerPoint(points);
  float sum_row = 0;
  float sum_col = 0;
  for (const cv::Point& point : points) {
    sum_row += static_cast<float>(k.x - point.x);
    sum_col += static_cast<float>(point.y - k.y);
  }
  // The sum in single precision and both cut constants decide on which side of a whole degree a boundary case falls.
  const auto turned = static_cast<float>(std::atan2(sum_row, sum_col) + 6.283184);
  const double degrees = turned / 3.141592 * 180.0;
  return static_cast<float>(static_cast<int>(degrees) % 360);
}

void QVTester::NormalizePatternImage(cv::Mat image, std::vector<cv::Point>& points, cv::Mat& normalized) {
  const float rotation = kUprightAngle - GetPatternAngle(points);
  const int side = std::max(image.cols, image.rows);
  const cv::Point2f centre(static_cast<float>(side) * 0.5f, static_cast<float>(side) * 0.5f);
  cv::Mat turn = cv::getRotationMatrix2D(centre, rotation, 1.0);
  cv::warpAffine(image, normalized, turn, cv::Size(side, side), cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
  if (points.size() != kMarks) return;

  cv::Mat marks(3, 3, CV_32F);  // a column per mark: column, row, 1
  for (int k = 0; k < 3; ++k) {
    marks.at<float>(0, k) = static_cast<float>(points[k].y);
    marks.at<float>(1, k) = static_cast<float>(points[k].x);
    marks.at<float>(2, k) = 1.0f;
  }
  turn.convertTo(turn, CV_32F);
  const cv::Mat moved = turn * marks;
  for (int k = 0; k < 3; ++k) {
    points[k] = {static_cast<int>(moved.at<float>(1, k)), static_cast<int>(moved.at<float>(0, k))};
  }
}
