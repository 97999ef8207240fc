#ifndef QVTESTER_UNIT_TESTS_PLAIN_CHART_MTF_H_
#define QVTESTER_UNIT_TESTS_PLAIN_CHART_MTF_H_

#include <algorithm>
#include <cstdlib>
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
  cv::Mat marks(3, 3, CV_32F);
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

/// Both regions of a photo, CV_32F; not found when the chart does not show exactly three marks.
struct EdgeRegions {
  bool found = false;
  cv::Mat vertical, horizontal;
};

inline EdgeRegions CutEdgeRegions(QVTester& tester, const cv::Mat& photo) {
  cv::Mat gray;
  cv::Mat binary;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  cv::threshold(gray, binary, tester.prop_binary_thr_working_, 255, cv::THRESH_BINARY);
  std::vector<cv::Point> points = GetFinderPoints(tester, binary);
  if (points.size() != kMarks) return {};
  cv::Mat normalized;
  NormalizePatternImage(tester, gray, points, normalized);
  cv::Point corner;
  cv::Point second;
  cv::Point third;
  tester.SortPatternPoints(points, corner, second, third);
  const float scale = static_cast<float>(second.y - corner.y) / kChartSide;
  EdgeRegions regions = {true, {}, {}};
  normalized(PlaceRegion(kVerticalRegion, corner, scale)).convertTo(regions.vertical, CV_32F);
  normalized(PlaceRegion(kHorizontalRegion, corner, scale)).convertTo(regions.horizontal, CV_32F);
  return regions;
}

/// Stands for QVTester::GetSFRFromImage.
inline int GetSFRFromImage(QVTester& tester, const cv::Mat& photo, std::vector<float>& freq,
                           std::vector<float>& sfrVertical, std::vector<float>& sfrHorizontal, float& mtf50Vertical,
                           float& mtf50Horizontal) {
  const EdgeRegions regions = CutEdgeRegions(tester, photo);
  if (!regions.found) return QV_ERROR_PATTERN_NOT_FOUND;
  CalculateSFR(tester, regions.vertical, freq, sfrVertical, mtf50Vertical);
  std::vector<float> same_freq;
  CalculateSFR(tester, regions.horizontal, same_freq, sfrHorizontal, mtf50Horizontal);
  return QV_SUCCESS;
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_CHART_MTF_H_
