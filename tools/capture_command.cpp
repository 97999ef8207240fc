#include <algorithm>
#include <array>
#include <memory>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "desk/measure/chart_view.h"
#include "tools/commands.h"
#include "tools/measure.h"

namespace qv {

namespace {

constexpr std::array<int, 4> kWithoutStandard = {12, 13, 14, 9};

struct CaptureOptions : MeasureOptions {
  std::string photo, standard;
  bool front = false;

  QV_RESOURCE_INDEX photo_slot() const { return front ? QV_RESOURCE_FRONT_CHART_PHOTO : QV_RESOURCE_CHART_PHOTO; }
  QV_RESOURCE_INDEX standard_slot() const {
    return front ? QV_RESOURCE_FRONT_CHART_STANDARD : QV_RESOURCE_CHART_STANDARD;
  }
};

// Whether the test ended at the standard photo, before it looked at the other.
bool MissedStandard(const CaptureOptions& options) {
  const auto& standard = options.front ? theTester->kept_->standard_front : theTester->kept_->standard_main;
  return !options.standard.empty() && !standard.is_extracted;
}

void CollectPatches(Phase& phase, const QVCaptureResult& result) {
  std::vector<double> numbers;
  std::array<std::vector<double>, 3> lab;
  for (int i = 0; i < result.capture_lab_count_; ++i) {
    numbers.push_back(result.capture_delta_e_count_ == 0 ? kWithoutStandard[i] : i);
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

std::string Report(const Record& record, const ChartView& view) {
  const Phase& phase = record.phase;
  std::string text = ReportChart(view);
  const Measurement* const delta = phase.Find("delta_e_76");
  text += delta != nullptr ? "patch  drawn as        L*      a*      b*   delta E 76\n"
                           : "patch  drawn as        L*      a*      b*   (no standard photo to compare with)\n";
  const Measurement& l = *phase.Find("lab_l");
  for (std::size_t i = 0; i < l.values.size(); ++i) {
    const auto number = static_cast<std::size_t>(l.axis[i]);
    text += Format("%5zu  %-11s  %6.2f  %6.2f  %6.2f", number, kPatches[number].name, l.values[i],
                   phase.Find("lab_a")->values[i], phase.Find("lab_b")->values[i]);
    text += delta != nullptr && i < delta->values.size() ? Format("       %6.2f\n", delta->values[i]) : "\n";
  }
  for (const char* figure : {"delta_e_76_mean", "delta_e_76_max"}) {
    const Measurement* m = phase.Find(figure);
    if (m != nullptr) text += Format("%-16s %.2f%s\n", figure, m->value(), LimitText(*m).c_str());
  }
  return text;
}

using PatchColours = std::vector<cv::Point3i>;

// The standard's patches, sampled anew for their looks.
PatchColours StandardColours(QVTester& tester, const cv::Mat& standard) {
  if (standard.empty()) return {};
  cv::Mat gray;
  cv::cvtColor(standard, gray, cv::COLOR_RGB2GRAY);
  cv::threshold(gray, gray, tester.prop_param_86_, 255, cv::THRESH_BINARY);
  std::vector<cv::Point> points = tester.GetFinderPoints(gray);
  cv::Mat upright;
  tester.NormalizePatternImage(standard, points, upright);
  return tester.GetColorPatchRGB(upright, points);
}

void Swatch(Picture& picture, const cv::Rect2d& area, const cv::Point3i& colour) {
  picture.FillRectangle(area, {colour.x / 255.0, colour.y / 255.0, colour.z / 255.0});
}

// Patches outlined and numbered on the photo; beside it, measured inside the standard's colour, and the difference.
std::string Annotate(const Record& record, const ChartView& view, const CaptureOptions& options) {
  constexpr double kPhoto = 1000;
  constexpr double kHead = 44;
  constexpr double kRow = 62;
  constexpr double kColumn = 230;
  const cv::Mat photo = SlotPhoto(MissedStandard(options) ? options.standard_slot() : options.photo_slot());
  const double scale = std::min(1.0, kPhoto / std::max(photo.cols, photo.rows));
  const double width = photo.cols * scale;
  Picture picture(cvRound(width + 2 * kColumn + 20), cvRound(std::max(photo.rows * scale, 12 * kRow) + kHead));
  picture.Text(Format("%s: %s", record.test_name.c_str(), Name(record.outcome())), {12, 28}, 18, kInk);
  const PhotoPlace place = picture.PlacePhoto(photo, {0, kHead}, scale);
  DrawMarks(picture, view, place);
  if (record.phase.code != QV_SUCCESS) return picture.Png();

  const UprightPhoto upright = Straighten(*theTester, photo);
  const PatchGrid grid = PlacePatches(upright.corner, upright.second, upright.third);
  const PatchColours measured =
      theTester->GetColorPatchRGB(upright.picture, {upright.corner, upright.second, upright.third});
  const PatchColours standard = StandardColours(*theTester, SlotPhoto(options.standard_slot()));
  const Measurement* const delta = record.phase.Find("delta_e_76");
  for (std::size_t i = 0; i < measured.size(); ++i) {
    const cv::Rect region(grid.centres[i].y - grid.half, grid.centres[i].x - grid.half, 2 * grid.half, 2 * grid.half);
    std::vector<cv::Point2d> outline;
    for (const cv::Point2d& corner : upright.OnPhoto(region)) outline.push_back(place(corner));
    picture.Line(outline, kGood, 2, true);
    picture.Text(std::to_string(i), (outline[0] + outline[2]) / 2 + cv::Point2d(0, 6), 15, kGood, Align::kCentre, true);

    const std::size_t column = i / 12;
    const cv::Point2d at(width + 16 + static_cast<double>(column) * kColumn,
                         kHead + static_cast<double>(i % 12) * kRow);
    picture.Text(std::to_string(i), at + cv::Point2d(18, 34), 14, kInk, Align::kRight);
    const bool compared = delta != nullptr && i < standard.size() && i < delta->values.size();
    if (compared) Swatch(picture, {at.x + 26, at.y + 4, 84, 52}, standard[i]);
    Swatch(picture, {at.x + 38, at.y + 14, 60, 32}, measured[i]);
    if (compared) picture.Text(Format("dE %.1f", delta->values[i]), at + cv::Point2d(120, 34), 14, kInk);
  }
  picture.Text(standard.empty() ? "measured" : "measured, framed by the standard", {width + 16, 28}, 14, kInk);
  return picture.Png();
}

}  // namespace

CommandBody DeclareCapture(Options& command) {
  auto options = std::make_shared<CaptureOptions>();
  command.Argument("PHOTO", options->photo, "Photo of the chart; - is standard input");
  command.Text("--standard", options->standard, "Photo of the same chart by a good camera, to compare with", "PHOTO");
  command.Flag("--front", options->front, "The front camera (test 20)");
  options->DeclareThresholdOn(command);
  options->DeclareOn(command);
  return [options] {
    const QV_TEST_INDEX test = options->front ? QV_TEST_CAMERA_CAPTURE_2 : QV_TEST_CAMERA_CAPTURE;
    auto view = std::make_shared<ChartView>();
    Measuring m;
    m.phase = options->front ? "camera_capture_front" : "camera_capture";
    m.test_name = options->front ? "QV_TEST_CAMERA_CAPTURE_2" : "QV_TEST_CAMERA_CAPTURE";
    m.test_index = test;
    m.inputs = {{options->photo_slot(), options->photo}};
    if (!options->standard.empty()) m.inputs.push_back({options->standard_slot(), options->standard});
    m.run = [test] { return RunTest(test, false); };
    m.collect = [options](Phase& phase, const QVResultData& results) {
      CollectPatches(phase, options->front ? results.capture_front_ : results.capture_main_);
    };
    m.look = [view, options](Record& record) {
      const int code = record.phase.code;
      if (code != QV_SUCCESS && code != QV_ERROR_PATTERN_NOT_FOUND && code != QV_ERROR_NO_PATCHES) return;
      *view = MissedStandard(*options)
                  ? DescribeChart(record, record.inputs[1].path, SlotPhoto(options->standard_slot()),
                                  QV_PROPERTY_STANDARD_BINARY_THR)
                  : DescribeChart(record, record.inputs[0].path, SlotPhoto(options->photo_slot()));
    };
    m.report = [view](const Record& record) { return Report(record, *view); };
    m.annotates_misses = true;
    m.annotate = [view, options](const Record& record) { return Annotate(record, *view, *options); };
    return Measure(*options, m);
  };
}

}  // namespace qv
