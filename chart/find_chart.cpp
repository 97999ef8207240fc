#include "chart/find_chart.h"

#include <algorithm>
#include <array>
#include <climits>
#include <opencv2/imgproc.hpp>

#include "chart/points.h"
#include "chart/upright.h"
#include "qvtester/log.h"

namespace {

// The candidates that the search handed out: three as corner, second and third, fewer as found. Two that share a pixel
// have no such order.
std::vector<QVFinderPattern> MarksInOrder(QVTester& tester, const std::vector<cv::Point>& points) {
  const auto& found = tester.possibleCenters;
  std::vector<QVFinderPattern> marks(found.begin(), found.begin() + static_cast<std::ptrdiff_t>(points.size()));
  if (points.size() != kMarks) return marks;
  std::array<cv::Point, kMarks> order;
  tester.SortPatternPoints(points, order[0], order[1], order[2]);
  if (!std::is_permutation(order.begin(), order.end(), points.begin())) return marks;
  const auto place = [&](const QVFinderPattern& mark) {
    return std::find(order.begin(), order.end(), cv::Point(mark.getY(), mark.getX()));
  };
  std::stable_sort(marks.begin(), marks.end(),
                   [&](const QVFinderPattern& a, const QVFinderPattern& b) { return place(a) < place(b); });
  return marks;
}

}  // namespace

const cv::Mat& Binarise(QVTester& tester, const cv::Mat& photo, int threshold, const char* name) {
  FoundChart& chart = tester.kept_->chart;
  cv::cvtColor(photo, chart.gray, cv::COLOR_RGB2GRAY);
  if (name != nullptr) QVDEBUGP("[%s] prop_binary_thr_working_: %d", name, threshold);
  if (chart.gray.depth() != CV_8U) CV_Error(cv::Error::StsUnsupportedFormat, "a chart photo needs 8 bits a channel");
  cv::Mat& binary = tester.kept_->binary;
  cv::threshold(chart.gray, binary, threshold, 255, cv::THRESH_BINARY);
  return binary;
}

FoundChart& QVTester::FindChart(cv::Mat photo, int threshold, const char* name) {
  FoundChart& chart = kept_->chart;
  FoundChart fresh;
  cv::swap(fresh.gray, chart.gray);
  chart = fresh;
  chart.points = GetFinderPoints(Binarise(*this, photo, threshold, name));
  chart.searched = true;
  chart.threshold = threshold;
  chart.candidates = startSize;
  chart.marks = MarksInOrder(*this, chart.points);
  chart.angle_deg = GetPatternAngle(chart.points);
  return chart;
}

void SetUpright(QVTester& tester, FoundChart& chart) {
  chart.turn = TurnUpright(chart.gray.size(), chart.angle_deg);
  CV_Assert(chart.turn.canvas.width < SHRT_MAX);
  std::vector<cv::Point> carried = chart.points;
  CarryMarks(chart.turn, carried);
  tester.SortPatternPoints(carried, chart.corner, chart.second, chart.third);
}
