// Tests 16 and 20: the colour patches of a chart photo, beside those of a standard photo.

#include <algorithm>
#include <cmath>
#include <map>
#include <memory>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/base/text.h"
#include "desk/measure/capture_trust.h"
#include "desk/measure/chart_view.h"
#include "desk/measure/cielab.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/patch_values.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kLab = {
    "mean over the patch, sRGB to L*a*b* relative to an implicit white of 1, 1, 1",
    "Within {patches_mean} of the colour as photographed in the mean, {patches_upright} at most on an upright chart, "
    "{patches_turned} on one turned by up to 10 degrees; patch means are cut to whole levels.",
    "Moved by exposure, white balance, light and shading; by clipping."};
constexpr Method kDelta = {"CIE 1976 difference to the standard photo's patch",
                           "As good as the two L*a*b* readings: each within {patches_mean} in the mean.",
                           "Moved by whatever makes the photo's light or colour unlike the standard's."};

constexpr Method kLabD65 = {
    "mean over the patch, sRGB (IEC 61966-2-1) to CIE 1976 L*a*b* relative to D65",
    "Within {patches_mean} of the colour as photographed in the mean; patch means are cut to whole levels.",
    "Moved by exposure, white balance, light and shading; by clipping."};
constexpr Method kDelta2000 = {
    "CIEDE2000 difference (CIE 142-2001) to the standard photo's patch, or to the given values",
    "The formula gives the 34 published pairs to their last digit; as good as the readings.",
    "Moved by whatever makes the photo's light or colour unlike the standard's."};

using PatchColours = std::vector<cv::Point3i>;

void CollectPatches(Phase& phase, const QVCaptureResult& result) {
  std::vector<double> numbers;
  std::array<std::vector<double>, 3> lab;
  for (int i = 0; i < result.capture_lab_count_; ++i) {
    numbers.push_back(result.capture_delta_e_count_ == 0 ? kPatchesWithoutStandard[i] : i);
    for (int k = 0; k < 3; ++k) lab[k].push_back(result.capture_lab_[3 * i + k]);
  }
  phase.Add("lab_l", numbers, lab[0]);
  phase.Add("lab_a", numbers, lab[1]);
  phase.Add("lab_b", numbers, lab[2]);
  const int compared = result.capture_delta_e_count_;
  if (compared == 0) return;
  const std::vector<double> delta(result.capture_delta_e_, result.capture_delta_e_ + compared);
  numbers.resize(delta.size());
  phase.Add("delta_e_76", numbers, delta);
  phase.Add("delta_e_76_mean", std::accumulate(delta.begin(), delta.end(), 0.0) / compared);
  phase.Add("delta_e_76_max", *std::max_element(delta.begin(), delta.end()));
  phase.Add("patches", result.capture_lab_count_);
}

cv::Vec3d LabD65(const cv::Point3i& rgb) { return LabD65OfSrgb(cv::Vec3d(rgb.x, rgb.y, rgb.z)); }

// By CIE, beside the test's own: all patches that were measured, and those that there is something to compare with.
void CollectByCie(Phase& phase, const PatchColours& measured, const std::map<int, cv::Vec3d>& standard) {
  std::vector<double> numbers;
  std::array<std::vector<double>, 3> lab;
  std::vector<double> compared;
  std::vector<double> differences;
  for (std::size_t i = 0; i < measured.size(); ++i) {
    const cv::Vec3d value = LabD65(measured[i]);
    numbers.push_back(static_cast<double>(i));
    for (int k = 0; k < 3; ++k) lab[k].push_back(value[k]);
    const auto other = standard.find(static_cast<int>(i));
    if (other == standard.end()) continue;
    compared.push_back(static_cast<double>(i));
    differences.push_back(DeltaE2000(value, other->second));
  }
  phase.Add("lab_d65_l", numbers, lab[0]);
  phase.Add("lab_d65_a", numbers, lab[1]);
  phase.Add("lab_d65_b", numbers, lab[2]);
  if (compared.empty()) return;
  const double total = std::accumulate(differences.begin(), differences.end(), 0.0);
  phase.Add("delta_e_2000_mean", total / static_cast<double>(differences.size()));
  phase.Add("delta_e_2000_max", *std::max_element(differences.begin(), differences.end()));
  phase.Add("delta_e_2000", compared, differences);
}

constexpr double kColumn = 290;  // of the swatches, picture pixels

void Swatch(Picture& picture, const cv::Rect2d& area, const cv::Point3i& colour) {
  picture.FillRectangle(area, {colour.x / 255.0, colour.y / 255.0, colour.z / 255.0});
}

class CaptureFinding : public Finding {
 public:
  std::string Report(const Record& record) const override;
  std::optional<Picture> Draw(const Record& record) const override;

  ChartView view;
  cv::Mat photo;                                     // that was searched last
  std::vector<std::array<cv::Point2d, 4>> outlines;  // of the patches on the photo
  PatchColours measured, standard;

 private:
  void DrawPatch(Picture& picture, const Record& record, std::size_t i, cv::Point2d swatches) const;
};

// A difference of the patch of this number; blank where there is none.
std::string DifferenceText(const Reading* differences, double number) {
  if (differences == nullptr) return "";
  for (std::size_t i = 0; i < differences->values.size(); ++i) {
    if (differences->axis[i] == number) return Format("  %12.2f", differences->values[i]);
  }
  return std::string(14, ' ');
}

std::string CaptureFinding::Report(const Record& record) const {
  const Phase& phase = record.phase;
  std::string text = ReportChart(view);
  const Reading* const delta = phase.Find("delta_e_76");
  const Reading* const cie = phase.Find("delta_e_2000");
  text += "patch  drawn as        L*      a*      b*";
  text += delta != nullptr ? "    delta E 76" : "";
  text += cie != nullptr ? "     CIEDE2000" : "";
  text += delta == nullptr && cie == nullptr ? "   (no standard to compare with)\n" : "\n";
  const Reading& l = *phase.Find("lab_l");
  for (std::size_t i = 0; i < l.values.size(); ++i) {
    const auto number = static_cast<std::size_t>(l.axis[i]);
    text += Format("%5zu  %-11s  %6.2f  %6.2f  %6.2f", number, kPatches[number].name, l.values[i],
                   phase.Find("lab_a")->values[i], phase.Find("lab_b")->values[i]);
    text += DifferenceText(delta, l.axis[i]) + DifferenceText(cie, l.axis[i]) + "\n";
  }
  for (const char* figure : {"delta_e_76_mean", "delta_e_76_max", "delta_e_2000_mean", "delta_e_2000_max"}) {
    const Reading* m = phase.Find(figure);
    if (m == nullptr) continue;
    const std::string value = m->values.empty() ? "not measured" : ValueText(*m, 2);
    text += Format("%-17s %s%s\n", figure, value.c_str(), LimitText(*m).c_str());
  }
  for (const Reading& m : phase.readings) {
    if (m.info->figure->axis == nullptr || !m.limit.given()) continue;
    text += Format("%-17s%s\n", m.info->figure->name, LimitText(m).c_str());
  }
  return text;
}

void CaptureFinding::DrawPatch(Picture& picture, const Record& record, std::size_t i, cv::Point2d swatches) const {
  picture.Text(std::to_string(i), swatches + cv::Point2d(18, 34), 14, kInk, Align::kRight);
  const Reading* const delta = record.phase.Find("delta_e_76");
  const bool compared = delta != nullptr && i < standard.size() && i < delta->values.size();
  if (compared) Swatch(picture, {swatches.x + 26, swatches.y + 4, 84, 52}, standard[i]);
  Swatch(picture, {swatches.x + 38, swatches.y + 14, 60, 32}, measured[i]);
  if (!compared) return;
  PlaceWords words("", kInk);
  words.AddEntry(delta, i);
  words.AddExtreme(record.phase.Find("delta_e_76_max"), true, *delta, i);
  cv::Point2d at = swatches + cv::Point2d(120, 20);
  picture.Text(Format("dE %.1f", delta->values[i]), at, 14, words.tone());
  for (const std::string& line : Wrapped(words.Verdict(), 13, kColumn - 130)) {
    picture.Text(line, at += cv::Point2d(0, 17), 13, words.tone());
  }
}

// Patches outlined, their numbers beside them on the photo; next to it, measured inside the standard's colour, and the
// difference.
std::optional<Picture> CaptureFinding::Draw(const Record& record) const {
  constexpr std::size_t kRows = 12;
  constexpr double kRow = 62;
  constexpr double kLegend = 28;
  if (!ShowsPhoto(record.phase.code)) return std::nullopt;
  const double scale = FitScale(photo, 1000);
  const double width = photo.cols * scale;
  const double swatches = width + 16;
  const Heading heading(record, record.test_name, swatches + 2 * kColumn,
                        {"delta_e_76_mean", "delta_e_76_max", "delta_e_2000_mean", "delta_e_2000_max"});
  const double top = heading.height();
  Picture picture(cvRound(swatches + 2 * kColumn), cvRound(std::max(photo.rows * scale, kRows * kRow + kLegend) + top));
  heading.Draw(picture);
  const PhotoPlace place = picture.PlacePhoto(photo, {0, top}, scale);
  Labels labels({0, top, width, photo.rows * scale});
  DrawMarks(picture, labels, view, place);
  if (record.phase.code != QV_SUCCESS) return picture;
  std::vector<std::vector<cv::Point2d>> places;
  for (const auto& outline : outlines) {
    places.emplace_back();
    for (const cv::Point2d& corner : outline) places.back().push_back(place(corner));
    picture.Line(places.back(), kGood, 2, true);
    labels.Keep(places.back());
  }
  for (std::size_t i = 0; i < measured.size(); ++i) {
    labels.Add(picture, {std::to_string(i)}, BoxAbout(places[i]), kGood, 13);
    const std::size_t column = i / kRows;
    const cv::Point2d at(static_cast<double>(column) * kColumn, static_cast<double>(i % kRows) * kRow + kLegend);
    DrawPatch(picture, record, i, cv::Point2d(swatches, top) + at);
  }
  picture.Text(standard.empty() ? "measured" : "measured, framed by the standard", {swatches, top + 18}, 14, kInk);
  return picture;
}

// Mean colour inside an outline, shrunk to so much of its size about its middle.
cv::Scalar MeanInside(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline, double size) {
  const cv::Point2d middle = (outline[0] + outline[1] + outline[2] + outline[3]) / 4;
  std::vector<cv::Point> corners;
  for (const cv::Point2d& corner : outline) corners.emplace_back(middle + (corner - middle) * size);
  const cv::Rect bounds = cv::boundingRect(corners) & cv::Rect({}, photo.size());
  if (bounds.empty()) return {};
  for (cv::Point& corner : corners) corner -= bounds.tl();
  cv::Mat inside(bounds.size(), CV_8UC1, cv::Scalar(0));
  cv::fillConvexPoly(inside, corners, cv::Scalar(255));
  return cv::mean(photo(bounds), inside);
}

constexpr double kMostOblique = 0.015;  // of the legs' ratio from 1

// A patch whose middle is of another colour than the whole has a neighbour in it.
void DoubtEvenness(Record& record, const cv::Mat& photo, const std::vector<std::array<cv::Point2d, 4>>& outlines,
                   const std::string& photo_path) {
  constexpr double kInner = 0.5;
  constexpr double kMostOff = 8;  // levels of a channel; the mean colour is then off by some 3 (CIE 1976)
  double worst = 0;
  std::size_t which = 0;
  for (std::size_t i = 0; i < outlines.size(); ++i) {
    const cv::Scalar off = MeanInside(photo, outlines[i], kInner) - MeanInside(photo, outlines[i], 1);
    const double most = std::max({std::fabs(off[0]), std::fabs(off[1]), std::fabs(off[2])});
    if (most <= worst) continue;
    worst = most;
    which = i;
  }
  if (worst <= kMostOff) return;
  record.Say(
      Doubt::kUnevenPatches,
      Format("%s: patch %zu is not of one colour: its middle differs from its mean by %.1f levels in a channel; is the "
             "chart seen straight on, and clean?",
             photo_path.c_str(), which, worst),
      "lab_l");
}

std::vector<std::array<cv::Point2d, 4>> PatchOutlines(const FoundChart& found) {
  std::vector<std::array<cv::Point2d, 4>> outlines;
  const PatchGrid grid = PlacePatches(found.corner, found.second, found.third);
  for (const cv::Point& centre : grid.centres) {
    outlines.push_back(
        OnPhoto(found, cv::Rect(centre.y - grid.half, centre.x - grid.half, 2 * grid.half, 2 * grid.half)));
  }
  return outlines;
}

// A patch beside its place in the standard photo makes the difference as wrong as one in the other. The test keeps the
// standard's colours and not where they lay: it runs once more, on the standard as its photo.
void DoubtStandard(Record& record, const cv::Mat& standard, int threshold) {
  QVTester beside;
  beside.Initialize();
  auto photo = std::make_unique<QVResource>();
  if (photo->SetImage(standard) != QV_SUCCESS) return;
  beside.resources_[QV_RESOURCE_CHART_PHOTO] = std::move(photo);
  beside.prop_binary_thr_working_ = threshold;
  if (beside.RunTest(QV_TEST_CAMERA_CAPTURE, false) != QV_SUCCESS) return;
  const FoundChart& found = beside.kept_->chart;
  const ChartView view = LookAtChart(found);
  const std::string& path = record.inputs[1].path;
  DoubtMarks(record, found, view, path);
  DoubtView(record, view, path, "patches", kMostOblique);
  DoubtEvenness(record, standard, PatchOutlines(found), path);
}

class Capture : public Measurement {
 public:
  explicit Capture(bool front) : front_(front) {
    spec_.name = front ? "camera_capture_front" : "camera_capture";
    spec_.test = front ? QV_TEST_CAMERA_CAPTURE_2 : QV_TEST_CAMERA_CAPTURE;
    spec_.inputs = {{"photo", front ? QV_RESOURCE_FRONT_CHART_PHOTO : QV_RESOURCE_CHART_PHOTO, "Photo of the chart"},
                    {"standard", front ? QV_RESOURCE_FRONT_CHART_STANDARD : QV_RESOURCE_CHART_STANDARD,
                     "Photo of the same chart by a good camera, to compare with", true}};
    spec_.parameters = {
        ThresholdParameter(),
        {"reference", Parameter::kPatches, "FILE",
         "Patch values to compare with, in place of a standard photo: an earlier capture record, or lines of "
         "number, L*, a*, b* (D65)"}};
    spec_.figures = Figures();
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    if (const QVResultData* results = RunNumberedTest(tester, spec_, request, record.phase)) {
      CollectPatches(record.phase, front_ ? results->capture_front_ : results->capture_main_);
    }
    auto finding = std::make_unique<CaptureFinding>();
    const FoundChart& found = tester.kept_->chart;
    // The test ends at the standard photo, before it looks at the other, when it can't be measured.
    const bool missed_standard = record.inputs.size() > 1 && !StandardOf(tester).is_extracted;
    const std::size_t searched = missed_standard ? 1 : 0;
    record.refused = searched;
    finding->photo = SlotPhoto(tester, spec_.inputs[searched].slot);
    const int code = record.phase.code;
    if (code == QV_SUCCESS || code == QV_ERROR_PATTERN_NOT_FOUND || code == QV_ERROR_NO_PATCHES) {
      finding->view = DescribeChart(record, found, record.inputs[searched].path, finding->photo,
                                    missed_standard ? QV_PROPERTY_STANDARD_BINARY_THR : QV_PROPERTY_BINARY_THR_WORKING);
    }
    if (code != QV_SUCCESS) return finding;
    DoubtView(record, finding->view, record.inputs[0].path, "patches", kMostOblique);
    TakePatches(*finding, tester);
    DoubtEvenness(record, finding->photo, finding->outlines, record.inputs[0].path);
    if (record.inputs.size() > 1) {
      DoubtStandard(record, SlotPhoto(tester, spec_.inputs[1].slot), tester.prop_param_86_);
    }
    CollectByCie(record.phase, finding->measured, GivenOrStandard(*finding, request, record));
    std::map<int, cv::Vec3d> given;
    if (request.parameters.contains("reference")) given = ReferencePatches(request.parameters["reference"]);
    TrustPatches(record.phase, {finding->photo, finding->outlines, finding->measured, finding->standard,
                                std::move(given), record.inputs.at(0).codec});
    return finding;
  }

 private:
  static std::vector<Figure> Figures() {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    std::vector<Figure> figures = {
        {"patches", kOne, kWhole, nullptr, kLab, "Patches measured; 24 when the whole ring is in view."},
        {"lab_l", kOne, kReal, &kPatchAxis, kLab, "L* of each patch."},
        {"lab_a", kOne, kReal, &kPatchAxis, kLab, "a* of each patch."},
        {"lab_b", kOne, kReal, &kPatchAxis, kLab, "b* of each patch."},
        {"delta_e_76", kOne, kReal, &kPatchAxis, kDelta, "Colour difference of each patch to the standard photo's."},
        {"delta_e_76_mean", kOne, kReal, nullptr, kDelta, "Mean colour difference over the patches."},
        {"delta_e_76_max", kOne, kReal, nullptr, kDelta, "Largest colour difference of a patch."},
        {"lab_d65_l", kOne, kReal, &kPatchAxis, kLabD65, "L* of each patch, by CIE relative to D65."},
        {"lab_d65_a", kOne, kReal, &kPatchAxis, kLabD65, "a* of each patch, by CIE relative to D65."},
        {"lab_d65_b", kOne, kReal, &kPatchAxis, kLabD65, "b* of each patch, by CIE relative to D65."},
        {"delta_e_2000", kOne, kReal, &kPatchAxis, kDelta2000, "CIEDE2000 difference of each patch to the standard's."},
        {"delta_e_2000_mean", kOne, kReal, nullptr, kDelta2000, "Mean CIEDE2000 difference over the patches."},
        {"delta_e_2000_max", kOne, kReal, nullptr, kDelta2000, "Largest CIEDE2000 difference of a patch."},
    };
    for (const Figure& figure : ChartFigures()) figures.push_back(figure);
    return figures;
  }

  const QVTester::ColorStandard& StandardOf(const QVTester& tester) const {
    return front_ ? tester.kept_->standard_front : tester.kept_->standard_main;
  }

  // The values given, else those of the standard photo.
  static std::map<int, cv::Vec3d> GivenOrStandard(const CaptureFinding& finding, const Request& request,
                                                  Record& record) {
    std::map<int, cv::Vec3d> standard;
    for (std::size_t i = 0; i < finding.standard.size(); ++i)
      standard[static_cast<int>(i)] = LabD65(finding.standard[i]);
    if (!request.parameters.contains("reference")) return standard;
    if (!standard.empty()) {
      record.Say(Remark::kWarning, "two_standards",
                 "delta_e_2000 compares with the values given, delta_e_76 with the standard photo", "delta_e_2000");
    }
    return ReferencePatches(request.parameters["reference"]);
  }

  void TakePatches(CaptureFinding& finding, const QVTester& tester) const {
    const FoundChart& found = tester.kept_->chart;
    finding.measured = found.patches;
    finding.standard = StandardOf(tester).patches;
    finding.outlines = PatchOutlines(found);
    finding.outlines.resize(std::min(finding.outlines.size(), found.patches.size()));
  }

  bool front_;
  Spec spec_;
};

}  // namespace

const Measurement& CaptureMeasurement(bool front) {
  static const Capture main(false);
  static const Capture second(true);
  return front ? second : main;
}

}  // namespace qv
