#include "desk/measure/chart_view.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "qvtester/api.h"

namespace qv {

namespace {

constexpr double kSmallestModulePx = 3;
constexpr double kLeastContrast = 20;  // grey levels between the two peaks

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

// Levels of the photo as the tests weigh them: the first channel is taken for red.
cv::Mat Gray(const cv::Mat& photo) {
  cv::Mat gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  return gray;
}

// The commonest level, neighbours counted in, on each side of the level that parts dark from light best (Otsu's).
struct GreyHistogram {
  GreyPeaks peaks;
  int parting;
};

GreyHistogram LookAtLevels(const cv::Mat& gray) {
  cv::Mat light;
  const int parting = cvRound(cv::threshold(gray, light, 0, 255, cv::THRESH_BINARY | cv::THRESH_OTSU));
  std::array<double, 256> counts = {};
  for (int i = 0; i < gray.rows; ++i) {
    const auto* row = gray.ptr<uchar>(i);
    for (int j = 0; j < gray.cols; ++j) ++counts[row[j]];
  }
  const auto commonest = [&](int first, int last) {
    constexpr int kNeighbours = 4;  // to each side, nearer ones weigh more
    int best = -1;                  // nothing there
    double most = 0;
    for (int level = first; level <= last; ++level) {
      double sum = 0;
      for (int k = std::max(first, level - kNeighbours); k <= std::min(last, level + kNeighbours); ++k) {
        sum += counts[k] * (1 + kNeighbours - std::abs(k - level));
      }
      if (sum <= most) continue;
      most = sum;
      best = level;
    }
    return static_cast<double>(best);
  };
  const double dark = commonest(0, parting);
  const double bright = commonest(std::min(parting + 1, 255), 255);
  return {{dark < 0 ? bright : dark, bright < 0 ? dark : bright}, parting};  // one level alone is both
}

std::string MissSentence(const Miss& miss, const std::string& photo_path, QV_PROPERTY_INDEX threshold_property) {
  std::string sentence = photo_path + ": ";
  for (const std::string& reason : miss.reasons) sentence += (sentence.back() == ' ' ? "" : ", ") + reason;
  if (!miss.threshold) return sentence;
  return sentence + (threshold_property == QV_PROPERTY_BINARY_THR_WORKING
                         ? Format("; tried: --threshold %d finds all three", *miss.threshold)
                         : Format("; tried: property %d at %d finds all three", threshold_property, *miss.threshold));
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

ChartView LookAtChart(QVTester& tester, int threshold) {
  ChartView view;
  view.candidates = tester.startSize;
  view.threshold = threshold;
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
  view.turn_deg = std::atan2(0.0 - right.y, right.x) * 180 / CV_PI;  // never -0
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

Miss ExplainMiss(const ChartView& view, const cv::Mat& photo) {
  Miss miss;
  const char* const counts[] = {"no finder mark was", "1 of 3 finder marks was", "2 of 3 finder marks were"};
  miss.reasons.push_back(Format("%s found", counts[std::min<std::size_t>(view.marks.size(), 2)]));

  const cv::Mat gray = Gray(photo);
  const GreyHistogram levels = LookAtLevels(gray);
  miss.peaks = levels.peaks;
  const auto [dark, light] = levels.peaks;
  const double margin = (light - dark) / 8;
  if (light - dark < kLeastContrast) {
    miss.reasons.push_back(Format("the picture has hardly any contrast (grey peaks at %.0f and %.0f)", dark, light));
  } else if (view.threshold < dark + margin || view.threshold > light - margin) {
    miss.reasons.push_back(
        Format("the threshold of %d is far from the middle of the picture's grey peaks at %.0f and %.0f",
               view.threshold, dark, light));
  }
  for (const Mark& mark : view.marks) {
    if (mark.module_px >= kSmallestModulePx) continue;
    miss.reasons.push_back(
        Format("the marks are small (%.1f pixels a module; %.0f are needed)", mark.module_px, kSmallestModulePx));
    break;
  }

  for (const int threshold : {cvRound((dark + light) / 2), levels.parting, cvRound((3 * dark + light) / 4),
                              cvRound((dark + 3 * light) / 4)}) {
    if (threshold == view.threshold) continue;
    QVTester trial;
    trial.GetFinderPoints(gray > threshold);
    const ChartView found = LookAtChart(trial, threshold);
    if (!found.complete() || !found.plausible()) continue;
    miss.threshold = threshold;
    miss.marks = found.marks;
    break;
  }
  return miss;
}

ChartView DescribeChart(Record& record, const std::string& photo_path, const cv::Mat& photo,
                        QV_PROPERTY_INDEX threshold_property) {
  int threshold = 0;
  theTester->GetProperty(threshold_property, &threshold);
  ChartView view = LookAtChart(*theTester, threshold);
  AddChartFigures(record.phase, view);
  if (!view.complete()) {
    view.miss = ExplainMiss(view, photo);
    record.phase.Add("grey_peak_dark", view.miss->peaks.dark);
    record.phase.Add("grey_peak_light", view.miss->peaks.light);
    if (view.miss->threshold) record.phase.Add("suggested_threshold", *view.miss->threshold);
    record.details.push_back(MissSentence(*view.miss, photo_path, threshold_property));
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

void DrawMarks(Picture& picture, const ChartView& view, const PhotoPlace& place) {
  const auto ring = [&](const Mark& mark, const std::string& name, Colour colour) {
    const double radius = std::max(6.0, 5 * mark.module_px * place.scale);
    picture.Circle(place(mark.centre), radius, colour, 3);
    picture.Text(name, place(mark.centre) + cv::Point2d(0, radius + 20), 16, colour, Align::kCentre, true);
  };
  if (view.complete()) {
    constexpr const char* kNames[] = {"1 corner", "2", "3"};
    for (std::size_t i = 0; i < view.marks.size(); ++i) {
      ring(view.marks[i], std::string(kNames[i]) + (view.plausible() ? "" : " doubtful"),
           view.plausible() ? kGood : kDoubtful);
    }
    return;
  }
  if (!view.miss) return;
  for (const Mark& mark : view.miss->marks) {
    ring(mark, Format("found at threshold %d", *view.miss->threshold), kDoubtful);
  }
  for (const Mark& mark : view.marks) ring(mark, "candidate", kPoor);
  cv::Point2d line = place.origin + cv::Point2d(10, 24);
  for (const std::string& reason : view.miss->reasons) {
    picture.Text(reason, line, 16, kPoor, Align::kLeft, true);
    line.y += 24;
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

std::array<cv::Rect, 2> MeasuredRegions(const UprightPhoto& upright) {
  const float scale = static_cast<float>(upright.second.y - upright.corner.y) / kChartSide;
  return {PlaceRegion(kVerticalRegion, upright.corner, scale), PlaceRegion(kHorizontalRegion, upright.corner, scale)};
}

std::array<RegionView, 2> LookAtRegions(QVTester& tester, const cv::Mat& photo) {
  const UprightPhoto upright = Straighten(tester, Gray(photo));
  const std::array<cv::Rect, 2> regions = MeasuredRegions(upright);
  std::array<RegionView, 2> views;
  for (std::size_t i = 0; i < views.size(); ++i) {
    views[i].outline = upright.OnPhoto(regions[i]);
    upright.picture(regions[i]).convertTo(views[i].pixels, CV_32F);
    views[i].pixels = tester.ConvertToVertical(views[i].pixels);
    views[i].edge_profile = EdgeProfile(tester, views[i].pixels);
  }
  return views;
}

}  // namespace qv
