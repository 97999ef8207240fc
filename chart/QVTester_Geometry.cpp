// From three finder marks to the chart's corner, order and angle, and the upright picture. Points hold the row in x and
// the column in y, so the formulas below read with the axes exchanged.

#include <algorithm>
#include <climits>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "chart/points.h"
#include "chart/upright.h"
#include "qvtester/tester.h"

namespace {

void CopyOntoCanvas(const cv::Mat& image, cv::Size size, cv::Mat& canvas) {
  canvas.create(size, image.type());
  image.copyTo(canvas({0, 0, image.cols, image.rows}));
  canvas.rowRange(image.rows, size.height).setTo(0);
  canvas.colRange(image.cols, size.width).setTo(0);
}

}  // namespace

UprightTurn TurnUpright(cv::Size picture, float pattern_angle) {
  const int side = std::max(picture.width, picture.height);
  const cv::Point2f centre(static_cast<float>(side) * 0.5f, static_cast<float>(side) * 0.5f);
  return {{side, side}, cv::getRotationMatrix2D(centre, kUprightAngle - pattern_angle, 1.0)};
}

bool LeavesPixels(const UprightTurn& turn, const cv::Mat& picture) {
  const int depth = picture.depth();
  return cv::norm(turn.map, cv::Mat::eye(2, 3, CV_64F), cv::NORM_INF) == 0 && !picture.empty() &&
         (depth == CV_8U || depth == CV_16U || depth == CV_16S) && std::max(picture.cols, picture.rows) < SHRT_MAX;
}

// The map in single precision times (column, row, 1), each product and sum rounded in this order: the coordinate is
// truncated, so a build of OpenCV that fuses them in its matrix product could move a mark by a pixel.
void CarryMarks(const UprightTurn& turn, std::vector<cv::Point>& marks) {
  const cv::Matx23f map(cv::Matx23d{turn.map});
  for (std::size_t k = 0; k < kMarks; ++k) {
    const auto column = static_cast<float>(marks[k].y);
    const auto row = static_cast<float>(marks[k].x);
    const auto carried = [&](int i) { return static_cast<int>(map(i, 0) * column + map(i, 1) * row + map(i, 2)); };
    marks[k] = {carried(1), carried(0)};
  }
}

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

// A turn by exactly 0 degrees gives the same pixels as a copy, at a fraction of the time. Where it would not, it is
// warped: floating-point pixels meet their neighbours times 0, and what cv::warpAffine refuses is still refused. The
// plain form is in unit_tests/plain/chart_mtf.h.
void QVTester::NormalizePatternImage(cv::Mat image, std::vector<cv::Point>& points, cv::Mat& normalized) {
  const UprightTurn turn = TurnUpright(image.size(), GetPatternAngle(points));
  if (LeavesPixels(turn, image)) {
    CopyOntoCanvas(image, turn.canvas, normalized);
  } else {
    cv::warpAffine(image, normalized, turn.map, turn.canvas, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
  }
  if (points.size() == kMarks) CarryMarks(turn, points);
}
