#include "desk/measure/chart_view.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "chart/points.h"
#include "chart/upright.h"
#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "desk/measure/doubts.h"
#include "desk/measure/residual_trust.h"

namespace qv {

const Method kScanMethod = {"row scan for 1:1:3:1:1 with three cross-checks",
                            "Centres are good to {marks_median} in the median at any turn, and to {marks_largest} at "
                            "worst, by turns of about 30 degrees.",
                            "Moved by threshold and light where they reach a mark's edges, and by modules under 3 px."};

namespace {

// The search counts from pixel corners.
Mark MarkOf(const QVFinderPattern& mark) { return {{mark.x - 0.5, mark.y - 0.5}, mark.estimatedModuleSize}; }

std::string MissSentence(const Miss& miss, const std::string& photo_path, QV_PROPERTY_INDEX threshold_property) {
  std::string sentence = photo_path + ": ";
  for (const std::string& reason : miss.reasons) sentence += (sentence.back() == ' ' ? "" : ", ") + reason;
  if (!miss.threshold) return sentence;
  return sentence + (threshold_property == QV_PROPERTY_BINARY_THR_WORKING
                         ? Format("; tried: --threshold %d finds all three", *miss.threshold)
                         : Format("; tried: property %d at %d finds all three", threshold_property, *miss.threshold));
}

}  // namespace

ChartView LookAtChart(const FoundChart& found) {
  ChartView view;
  view.candidates = found.candidates;
  view.threshold = found.threshold;
  for (const QVFinderPattern& mark : found.marks) view.marks.push_back(MarkOf(mark));
  if (!view.complete()) return view;
  const cv::Point2d right = view.marks[1].centre - view.marks[0].centre;
  const cv::Point2d down = view.marks[2].centre - view.marks[0].centre;
  view.legs = {right, down};
  view.turn_deg = std::atan2(0.0 - right.y, right.x) * 180 / CV_PI;  // never -0
  view.straightened_by_deg = cvRound(std::remainder(found.angle_deg - static_cast<double>(kUprightAngle), 360.0));
  return view;
}

const std::vector<Figure>& ChartFigures() {
  static const std::vector<Figure> figures = {
      {"marks_found", kOne, Number::kWhole, nullptr, kScanMethod, "Finder marks that came back; three are needed."},
      {"mark_candidates", kOne, Number::kWhole, nullptr, kScanMethod,
       "Places that passed as finder marks before the best three were chosen; more than three deserve a look."},
      {"marks", kPixel, Number::kReal, &kColumnAxis, kScanMethod,
       "Centres of the marks that came back, column and row, pixel centres at whole numbers: corner, second, third."},
      {"module_size", kPixel, Number::kReal, nullptr, kScanMethod,
       "Mean module of the marks, a seventh of a mark's width along the scanned rows. Under 3 px marks may be "
       "missed."},
      {"legs_ratio", kOne, Number::kReal, nullptr, kScanMethod,
       "Distance of corner and second mark over that of corner and third; 1 when the chart is seen straight on."},
      {"legs_angle", kDegree, Number::kReal, nullptr, kScanMethod,
       "Angle between the two legs at the corner mark; 90 when the chart is seen straight on."},
      {"chart_turn", kDegree, Number::kReal, nullptr, kScanMethod,
       "Turn of the chart in the photo, counter-clockwise: of the leg from the corner to the second mark."},
      {"straightened_by", kDegree, Number::kWhole, nullptr, kScanMethod,
       "Whole degrees, clockwise, by which the photo was turned upright before it was measured."},
      {"threshold", kGreyLevel, Number::kWhole, nullptr, kScanMethod,
       "Grey level above which a pixel counts as light."},
      {"grey_peak_dark", kGreyLevel, Number::kWhole, nullptr, kBins,
       "After a miss: the commonest level of what is dark in the photo."},
      {"grey_peak_light", kGreyLevel, Number::kWhole, nullptr, kBins,
       "After a miss: the commonest level of what is light in the photo."},
      {"suggested_threshold", kGreyLevel, Number::kWhole, nullptr, kScanMethod,
       "After a miss: a threshold between the grey peaks at which a search found three marks."},
  };
  return figures;
}

Parameter ThresholdParameter() {
  return {"threshold",
          Parameter::kWhole,
          "N",
          "Grey level above which a pixel is light",
          nullptr,
          0,
          255,
          {},
          QV_PROPERTY_BINARY_THR_WORKING};
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
  phase.Add("legs_ratio", view.legs.ratio());
  phase.Add("legs_angle", view.legs.angle_deg());
  phase.Add("chart_turn", view.turn_deg);
  phase.Add("straightened_by", view.straightened_by_deg);
}

void DoubtMarks(Record& record, const FoundChart& found, const ChartView& view, const std::string& photo_path) {
  if (!view.plausible()) {
    record.Say(Doubt::kImplausibleMarks,
               Format("%s: the find is doubtful: the legs between the marks are as %.3f to 1 at %.1f degrees, "
                      "not as 1 to 1 at 90; is the chart seen straight on, and nothing else like a mark?",
                      photo_path.c_str(), view.legs.ratio(), view.legs.angle_deg()),
               "legs_ratio");
  }
  if (LooksMirrored(found)) {
    record.Say(Doubt::kMirrored,
               photo_path +
                   ": the chart is mirrored: its dark rectangle lies on the other side of its marks; regions and "
                   "patches are not where they are looked for",
               "marks");
  }
}

ChartView DescribeChart(Record& record, const FoundChart& found, const std::string& photo_path, const cv::Mat& photo,
                        QV_PROPERTY_INDEX threshold_property) {
  ChartView view = LookAtChart(found);
  AddChartFigures(record.phase, view);
  if (!view.complete()) {
    view.miss = ExplainMiss(view.marks, view.threshold, photo);
    record.phase.Add("grey_peak_dark", view.miss->peaks.dark);
    record.phase.Add("grey_peak_light", view.miss->peaks.light);
    if (view.miss->threshold) record.phase.Add("suggested_threshold", *view.miss->threshold);
    record.Say(Remark::kMiss, "marks_not_found", MissSentence(*view.miss, photo_path, threshold_property),
               "marks_found");
    return view;
  }
  TrustMarks(record.phase, view, photo, record.inputs.at(0).codec);
  DoubtMarks(record, found, view, photo_path);
  if (view.candidates > static_cast<int>(kMarks)) {
    record.Say(Remark::kWarning, "more_candidates",
               Format("%s: %d places passed as finder marks; the three most alike were used", photo_path.c_str(),
                      view.candidates),
               "mark_candidates");
  }
  return view;
}

void DoubtView(Record& record, const ChartView& view, const std::string& photo_path, const char* parts,
               double most_oblique) {
  constexpr double kSkewDeg = 60;  // of the legs' angle that goes with so much of their ratio
  const double ratio = view.legs.ratio();
  const double angle_deg = view.legs.angle_deg();
  const bool straight = std::fabs(ratio - 1) <= most_oblique && std::fabs(angle_deg - 90) <= kSkewDeg * most_oblique;
  if (straight) return;
  record.Say(Doubt::kOblique,
             Format("%s: the chart is seen obliquely: its legs are as %.3f to 1 at %.1f degrees; %s may lie beside "
                    "their places",
                    photo_path.c_str(), ratio, angle_deg, parts),
             "legs_ratio");
}

std::string ReportChart(const ChartView& view) {
  double module = 0;
  for (const Mark& mark : view.marks) module += mark.module_px / static_cast<double>(view.marks.size());
  return Format("marks      %zu found, %.1f px a module; legs %.3f : 1 at %.1f degrees; threshold %d\n",
                view.marks.size(), module, view.legs.ratio(), view.legs.angle_deg(), view.threshold) +
         Format("chart      turned by %.1f degrees counter-clockwise, straightened by %d\n", view.turn_deg,
                view.straightened_by_deg);
}

namespace {

// The colour patches, where the marks put them.
void KeepPatches(Labels& labels, const std::vector<Mark>& marks, const PhotoPlace& place) {
  const cv::Point2d corner = marks[0].centre;
  const cv::Point2d right = (marks[1].centre - corner) / kChartSide;
  const cv::Point2d down = (marks[2].centre - corner) / kChartSide;
  for (int i = 0; i < static_cast<int>(kPatches.size()); ++i) {
    const cv::Point2d middle = corner + PatchCentre(i).x * right + PatchCentre(i).y * down;
    labels.Keep({place(middle + kPatchHalf * (right + down)), place(middle + kPatchHalf * (right - down)),
                 place(middle - kPatchHalf * (right + down)), place(middle - kPatchHalf * (right - down))});
  }
}

struct Ring {
  Mark mark;
  std::string name;
  Tone tone;
};

std::vector<Ring> RingsOf(const ChartView& view) {
  constexpr std::array<const char*, 3> kNames = {"1 corner", "2", "3"};
  std::vector<Ring> rings;
  if (view.complete()) {
    for (std::size_t i = 0; i < view.marks.size(); ++i) {
      rings.push_back({view.marks[i], std::string(kNames.at(i)) + (view.plausible() ? "" : " doubtful"),
                       view.plausible() ? kGood : kDoubtful});
    }
    return rings;
  }
  for (const Mark& mark : view.marks) rings.push_back({mark, "found", kGood});
  if (!view.miss) return rings;
  for (const Mark& mark : view.miss->marks) rings.push_back({mark, view.miss->how, kDoubtful});
  for (const Candidate& candidate : view.miss->candidates) {
    rings.push_back({candidate.mark, candidate.failed.text, kPoor});
  }
  return rings;
}

}  // namespace

void DrawMarks(Picture& picture, Labels& labels, const ChartView& view, const PhotoPlace& place) {
  constexpr double kWidest = 330;  // of a label
  const std::vector<Mark>& marks = view.miss ? view.miss->marks : view.marks;
  if (marks.size() == kMarks) KeepPatches(labels, marks, place);
  const std::vector<Ring> rings = RingsOf(view);
  std::vector<cv::Rect2d> boxes;
  for (const Ring& ring : rings) {
    const double radius = std::max(6.0, 5 * ring.mark.module_px * place.scale);
    const cv::Point2d reach(radius, radius);
    picture.Circle(place(ring.mark.centre), radius, ring.tone, 3);
    boxes.emplace_back(place(ring.mark.centre) - reach, place(ring.mark.centre) + reach);
    labels.Keep(boxes.back());
  }
  for (std::size_t i = 0; i < rings.size(); ++i) {
    labels.Add(picture, Wrapped(rings[i].name, 15, kWidest), boxes[i], rings[i].tone);
  }
}

std::array<cv::Point2d, 4> OnPhoto(const FoundChart& found, const cv::Rect& region) {
  cv::Matx23d photo_from_upright;
  cv::invertAffineTransform(found.turn.map, photo_from_upright);
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

}  // namespace qv
