#include "tools/chart_view.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "qvtester/api.h"

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
  view.turn_deg = std::atan2(-right.y, right.x) * 180 / CV_PI;
  view.straightened_by_deg = cvRound(std::remainder(tester.GetPatternAngle(points) - 315.0, 360.0));
  return view;
}

bool ChartView::plausible() const {
  return legs_ratio >= 0.9 && legs_ratio <= 1.1 && std::fabs(legs_angle_deg - 90) <= 5;
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
  phase.Add("straightened_by", view.straightened_by_deg);
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

ChartView DescribeChart(Record& record, const std::string& photo_path, const cv::Mat& photo) {
  ChartView view = LookAtChart(*theTester);
  AddChartFigures(record.phase, view);
  if (!view.complete()) {
    std::string sentence = photo_path + ": ";
    for (const std::string& reason : ExplainMiss(view, photo)) {
      sentence += (sentence.back() == ' ' ? "" : ", ") + reason;
    }
    record.details.push_back(sentence);
    return view;
  }
  if (!view.plausible()) {
    record.doubtful = true;
    record.details.push_back(
        Format("%s: the find is doubtful: the legs between the marks are as %.3f to 1 at %.1f degrees, "
               "not as 1 to 1 at 90; is the chart seen straight on, and nothing else like a mark?",
               photo_path.c_str(), view.legs_ratio, view.legs_angle_deg));
  }
  if (view.candidates > 3) {
    record.details.push_back(Format("%s: %d places passed as finder marks; the three most alike were used",
                                    photo_path.c_str(), view.candidates));
  }
  return view;
}

std::string ReportChart(const ChartView& view) {
  double module = 0;
  for (const Mark& mark : view.marks) module += mark.module_px / static_cast<double>(view.marks.size());
  return Format("marks      %zu found, %.1f px a module; legs %.3f : 1 at %.1f degrees; threshold %d\n",
                view.marks.size(), module, view.legs_ratio, view.legs_angle_deg, view.threshold) +
         Format("chart      turned by %.1f degrees counter-clockwise, straightened by %d\n", view.turn_deg,
                view.straightened_by_deg);
}

void DrawMarks(Picture& picture, const ChartView& view, const PhotoPlace& place, Colour colour) {
  constexpr const char* kNames[] = {"1 corner", "2", "3"};
  for (std::size_t i = 0; i < view.marks.size(); ++i) {
    const Mark& mark = view.marks[i];
    const double radius = std::max(6.0, 5 * mark.module_px * place.scale);
    picture.Circle(place(mark.centre), radius, colour, 3);
    picture.Text(view.complete() ? kNames[i] : "candidate", place(mark.centre) + cv::Point2d(0, radius + 20), 16,
                 colour, Align::kCentre, true);
  }
}

std::array<cv::Point2d, 4> UprightPhoto::OnPhoto(const cv::Rect& region) const {
  const double left = region.x - 0.5;
  const double top = region.y - 0.5;
  const cv::Vec3d corners[] = {{left, top, 1},
                               {left + region.width, top, 1},
                               {left + region.width, top + region.height, 1},
                               {left, top + region.height, 1}};
  std::array<cv::Point2d, 4> outline;
  for (std::size_t i = 0; i < outline.size(); ++i) {
    const cv::Vec2d p = photo_from_upright * corners[i];
    outline[i] = {p[0], p[1]};
  }
  return outline;
}

UprightPhoto Straighten(QVTester& tester, const cv::Mat& photo) {
  UprightPhoto upright;
  std::vector<cv::Point> points = FoundPoints(tester);
  const float rotation = 315.0f - tester.GetPatternAngle(points);
  tester.NormalizePatternImage(photo, points, upright.picture);
  tester.SortPatternPoints(points, upright.corner, upright.second, upright.third);
  const float middle = static_cast<float>(upright.picture.cols) * 0.5f;
  cv::invertAffineTransform(cv::getRotationMatrix2D({middle, middle}, rotation, 1.0), upright.photo_from_upright);
  return upright;
}

std::array<RegionView, 2> LookAtRegions(QVTester& tester, const cv::Mat& photo) {
  cv::Mat gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  const UprightPhoto upright = Straighten(tester, gray);
  const float scale = static_cast<float>(upright.second.y - upright.corner.y) / kChartSide;
  std::array<RegionView, 2> views;
  for (std::size_t i = 0; i < views.size(); ++i) {
    const cv::Rect region = PlaceRegion(i == 0 ? kVerticalRegion : kHorizontalRegion, upright.corner, scale);
    views[i].outline = upright.OnPhoto(region);
    upright.picture(region).convertTo(views[i].pixels, CV_32F);
    views[i].pixels = tester.ConvertToVertical(views[i].pixels);
    views[i].edge_profile = EdgeProfile(tester, views[i].pixels);
  }
  return views;
}
