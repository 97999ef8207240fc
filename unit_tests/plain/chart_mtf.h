#ifndef QVTESTER_UNIT_TESTS_PLAIN_CHART_MTF_H_
#define QVTESTER_UNIT_TESTS_PLAIN_CHART_MTF_H_

#include <algorithm>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "chart/chart_layout.h"
#include "unit_tests/plain/finder.h"
#include "unit_tests/plain/sfr.h"

// The sharpness of a chart photo step by step, each picture whole and in new memory.
namespace plain {

/// Stands for QVTester::NormalizePatternImage with three points.
inline void NormalizePatternImage(QVTester& tester, const cv::Mat& image, std::vector<cv::Point>& points,
                                  cv::Mat& normalized) {
  const float rotation = 315.0f - tester.GetPatternAngle(points);
  const int side = std::max(image.cols, image.rows);
  const cv::Point2f centre(static_cast<float>(side) * 0.5f, static_cast<float>(side) * 0.5f);
  cv::Mat turn = cv::getRotationMatrix2D(centre, rotation, 1.0);
  cv::warpAffine(image, normalized, turn, cv::Size(side, side), cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
  turn.convertTo(turn, CV_32F);
  for (cv::Point& point : points) {
    const cv::Mat_<float> mark = (cv::Mat_<float>(3, 1) << point.y, point.x, 1);
    const cv::Mat_<float> moved = turn * mark;
    point = {static_cast<int>(moved(1)), static_cast<int>(moved(0))};
  }
}

/// Stands for QVTester::GetSFRFromImage.
inline int GetSFRFromImage(QVTester& tester, const cv::Mat& photo, std::vector<float>& freq,
                           std::vector<float>& sfrVertical, std::vector<float>& sfrHorizontal, float& mtf50Vertical,
                           float& mtf50Horizontal) {
  cv::Mat gray;
  cv::Mat binary;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  cv::threshold(gray, binary, tester.prop_binary_thr_working_, 255, cv::THRESH_BINARY);
  std::vector<cv::Point> points = GetFinderPoints(tester, binary);
  if (points.size() != kMarks) return QV_ERROR_PATTERN_NOT_FOUND;
  cv::Mat upright;
  NormalizePatternImage(tester, gray, points, upright);
  cv::Point corner;
  cv::Point second;
  cv::Point third;
  tester.SortPatternPoints(points, corner, second, third);
  const float scale = static_cast<float>(second.y - corner.y) / kChartSide;
  const cv::Mat vertical = upright(PlaceRegion(kVerticalRegion, corner, scale));
  const cv::Mat horizontal = upright(PlaceRegion(kHorizontalRegion, corner, scale));
  CalculateSFR(tester, vertical, freq, sfrVertical, mtf50Vertical);
  std::vector<float> same_freq;
  CalculateSFR(tester, horizontal, same_freq, sfrHorizontal, mtf50Horizontal);
  return QV_SUCCESS;
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_CHART_MTF_H_
