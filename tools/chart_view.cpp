#include "tools/chart_view.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

namespace {

constexpr double kSmallestModulePx = 3;

// The points that the search handed out: row in x, column in y.
std::vector<cv::Point> FoundPoints(const QVTester& tester) {
  std::vector<cv::Point> points;
  for (const QVFinderPattern& mark : tester.possibleCenters) {
    if (points.size() < 3) points.emplace_back(mark.getY(), mark.getX());
  }
  return points;
}

Mark MarkAt(const QVTester& tester, cv::Point point) {
  for (const QVFinderPattern& mark : tester.possibleCenters) {
    // The search counts from pixel corners.
    if (cv::Point(mark.getY(), mark.getX()) == point) {
      return {{mark.x - 0.5, mark.y - 0.5}, mark.estimatedModuleSize};
    }
  }
  return {};
}

struct GreyPeaks {
  double dark, light;
};

// Means of the two classes that Otsu's threshold makes of the picture.
GreyPeaks FindGreyPeaks(const cv::Mat& photo) {
  cv::Mat gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  cv::Mat light;
  cv::threshold(gray, light, 0, 255, cv::THRESH_BINARY | cv::THRESH_OTSU);
  return {cv::mean(gray, light == 0)[0], cv::mean(gray, light)[0]};
}

std::vector<double> EdgeProfile(QVTester& tester, const cv::Mat& region) {
  // The line through each row's steepest place is enough to draw the profile by.
  cv::Mat derivative;
  float taps[] = {0.5f, -0.5f};
  tester.GetFirstDerivative(region, region.rows, region.cols, taps, 2, derivative);
  derivative = cv::abs(derivative);
  cv::Mat loc(region.rows, 1, CV_32F);
  for (int i = 0; i < region.rows; ++i)
    loc.at<float>(i) = tester.GetCentroid(derivative.row(i).mul(derivative.row(i)).t());
  float slope = 0;
  float offset = 0;
  tester.FindEdge(loc, region.rows, &slope, &offset);
  const cv::Mat profile = tester.ProjectData(region, slope, offset, 1);
  return {profile.begin<float>(), profile.end<float>()};
}

}  // namespace

ChartView LookAtChart(QVTester& tester) {
  ChartView view;
  view.candidates = tester.startSize;
  view.threshold = tester.prop_binary_thr_working_;
  std::vector<cv::Point> points = FoundPoints(tester);
  if (points.size() != 3) {
    for (const cv::Point& point : points) view.marks.push_back(MarkAt(tester, point));
    return view;
  }
  std::array<cv::Point, 3> ordered;
  tester.SortPatternPoints(points, ordered[0], ordered[1], ordered[2]);
  for (const cv::Point& point : ordered) view.marks.push_back(MarkAt(tester, point));
  const cv::Point2d right = view.marks[1].centre - view.marks[0].centre;
  const cv::Point2d down = view.marks[2].centre - view.marks[0].centre;
  view.legs_ratio = cv::norm(right) / cv::norm(down);
  view.legs_angle_deg = std::acos(right.dot(down) / cv::norm(right) / cv::norm(down)) * 180 / CV_PI;
  view.turn_deg = std::remainder(tester.GetPatternAngle(points) - 315.0, 360.0);
  return view;
}

void AddChartFigures(Phase& phase, const ChartView& view) {
  phase.Add("marks_found", static_cast<double>(view.marks.size()));
  phase.Add("mark_candidates", view.candidates);
  phase.Add("threshold", view.threshold);
  if (view.marks.empty()) return;
  std::vector<double> columns;
  std::vector<double> rows;
  for (const Mark& mark : view.marks) {
    columns.push_back(mark.centre.x);
    rows.push_back(mark.centre.y);
  }
  phase.Add("marks", columns, rows);
  phase.Add("module_size", std::accumulate(view.marks.begin(), view.marks.end(), 0.0, [](double sum, const Mark& mark) {
                             return sum + mark.module_px;
                           }) / static_cast<double>(view.marks.size()));
  if (!view.complete()) return;
  phase.Add("legs_ratio", view.legs_ratio);
  phase.Add("legs_angle", view.legs_angle_deg);
  phase.Add("chart_turn", view.turn_deg);
}

std::vector<std::string> ExplainMiss(const ChartView& view, const cv::Mat& photo) {
  std::vector<std::string> reasons;
  const char* const counts[] = {"no finder mark was", "1 of 3 finder marks was", "2 of 3 finder marks were"};
  reasons.push_back(Format("%s found", counts[std::min<std::size_t>(view.marks.size(), 2)]));

  const GreyPeaks peaks = FindGreyPeaks(photo);
  const double margin = (peaks.light - peaks.dark) / 8;
  if (peaks.light - peaks.dark < 20) {
    reasons.push_back(
        Format("the picture has hardly any contrast (grey peaks at %.0f and %.0f)", peaks.dark, peaks.light));
  } else if (view.threshold < peaks.dark + margin || view.threshold > peaks.light - margin) {
    reasons.push_back(Format("the threshold of %d is far from the middle of the picture's grey peaks at %.0f and %.0f",
                             view.threshold, peaks.dark, peaks.light));
  }
  for (const Mark& mark : view.marks) {
    if (mark.module_px >= kSmallestModulePx) continue;
    reasons.push_back(
        Format("the marks are small (%.1f pixels a module; %.0f are needed)", mark.module_px, kSmallestModulePx));
    break;
  }
  return reasons;
}

std::array<RegionView, 2> LookAtRegions(QVTester& tester, const cv::Mat& photo) {
  std::vector<cv::Point> points = FoundPoints(tester);
  const float rotation = 315.0f - tester.GetPatternAngle(points);
  cv::Mat gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  cv::Mat upright;
  tester.NormalizePatternImage(gray, points, upright);
  cv::Point corner;
  cv::Point second;
  cv::Point third;
  tester.SortPatternPoints(points, corner, second, third);
  const float scale = static_cast<float>(second.y - corner.y) / kChartSide;

  const float middle = static_cast<float>(upright.cols) * 0.5f;
  cv::Matx23d back;
  cv::invertAffineTransform(cv::getRotationMatrix2D({middle, middle}, rotation, 1.0), back);
  std::array<RegionView, 2> views;
  for (std::size_t i = 0; i < views.size(); ++i) {
    const cv::Rect region = PlaceRegion(i == 0 ? kVerticalRegion : kHorizontalRegion, corner, scale);
    const double left = region.x - 0.5;
    const double top = region.y - 0.5;
    const cv::Point2d corners[] = {{left, top},
                                   {left + region.width, top},
                                   {left + region.width, top + region.height},
                                   {left, top + region.height}};
    for (std::size_t k = 0; k < 4; ++k) {
      const cv::Vec2d p = back * cv::Vec3d(corners[k].x, corners[k].y, 1);
      views[i].outline[k] = {p[0], p[1]};
    }
    upright(region).convertTo(views[i].pixels, CV_32F);
    views[i].pixels = tester.ConvertToVertical(views[i].pixels);
    views[i].edge_profile = EdgeProfile(tester, views[i].pixels);
  }
  return views;
}
