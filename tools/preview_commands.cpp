#include <algorithm>
#include <memory>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "desk/measure/chart_view.h"
#include "tools/commands.h"
#include "tools/measure.h"

namespace qv {

namespace {

constexpr double kHead = 44;

double FitScale(const cv::Mat& photo, double side) { return std::min(1.0, side / std::max(photo.cols, photo.rows)); }

// The difference map beside the first frame; the map's own largest value is its lightest colour.
std::string AnnotatePreview(const Record& record, const QVPreviewResult& result, const cv::Mat& first) {
  constexpr double kSide = 760;
  const double scale = FitScale(first, kSide);
  const double width = first.cols * scale;
  Picture picture(cvRound(2 * width + 120), cvRound(first.rows * scale + kHead + 20));
  const Measurement& mean = *record.phase.Find("difference_mean");
  picture.Text(Format("%s: mean difference %.5f of full scale, %s", record.test_name.c_str(), mean.value(),
                      Name(record.outcome())),
               {12, 28}, 18, kInk);
  picture.PlacePhoto(first, {0, kHead}, scale);

  const cv::Mat map(result.preview_diff_rows_, result.preview_diff_cols_, CV_32F, result.preview_diff_map_);
  cv::Mat levels;
  cv::patchNaNs(map, 0);  // identical frames: no difference anywhere
  map.convertTo(levels, CV_8U, 255);
  cv::Mat colours;
  cv::applyColorMap(levels, colours, cv::COLORMAP_VIRIDIS);
  const double left = width + 8;
  picture.PlacePhoto(colours, {left, kHead}, scale);

  constexpr int kSteps = 200;
  cv::Mat bar(kSteps, 1, CV_8U);
  for (int i = 0; i < kSteps; ++i) bar.at<uchar>(i) = static_cast<uchar>(255 - 255 * i / (kSteps - 1));
  cv::resize(bar, bar, {20, kSteps}, 0, 0, cv::INTER_NEAREST);
  cv::applyColorMap(bar, bar, cv::COLORMAP_VIRIDIS);
  const double bar_left = left + width + 12;
  picture.PlacePhoto(bar, {bar_left, kHead + 20}, 1);
  picture.Text("largest", {bar_left + 26, kHead + 30}, 13, kInk);
  picture.Text("none", {bar_left + 26, kHead + 20 + kSteps}, 13, kInk);
  return picture.Png();
}

struct TargetOptions : MeasureOptions {
  std::string frame;
  int camera = 0;
};

// The centre as the check takes it: the middle of the longest side.
cv::Point2d TargetCentre(const ChartView& view) {
  cv::Point2d centre;
  double longest = 0;
  for (std::size_t i = 0; i < view.marks.size(); ++i) {
    const cv::Point2d a = view.marks[i].centre;
    const cv::Point2d b = view.marks[(i + 1) % view.marks.size()].centre;
    if (cv::norm(a - b) <= longest) continue;
    longest = cv::norm(a - b);
    centre = (a + b) / 2;
  }
  return centre;
}

}  // namespace

CommandBody DeclarePreview(Options& command) {
  struct Options : MeasureOptions {
    std::string first, second;
    bool front = false;
  };
  auto options = std::make_shared<Options>();
  command.Argument("FIRST", options->first, "First preview frame");
  command.Argument("SECOND", options->second, "Second preview frame, of the same size");
  command.Flag("--front", options->front, "The front camera's preview (test 19)");
  options->DeclareRawOn(command);
  options->DeclareOn(command);
  return [options] {
    const bool front = options->front;
    const QV_RESOURCE_INDEX slot = front ? QV_RESOURCE_FRONT_PREVIEW_FIRST_FRAME : QV_RESOURCE_PREVIEW_FIRST_FRAME;
    const QV_TEST_INDEX test = front ? QV_TEST_CAMERA_PREVIEW_2 : QV_TEST_CAMERA_PREVIEW;
    auto held = std::make_shared<QVPreviewResult>();
    Measuring m;
    m.phase = front ? "camera_preview_front" : "camera_preview";
    m.test_name = front ? "QV_TEST_CAMERA_PREVIEW_2" : "QV_TEST_CAMERA_PREVIEW";
    m.test_index = test;
    m.inputs = {{slot, options->first}, {static_cast<QV_RESOURCE_INDEX>(slot + 1), options->second}};
    m.run = [test] { return RunTest(test, false); };
    m.collect = [front, held](Phase& phase, const QVResultData& results) {
      *held = front ? results.preview_front_ : results.preview_main_;
      if (held->preview_diff_map_ != nullptr) phase.Add("difference_mean", held->preview_diff_mean_);
    };
    m.look = [held](Record& record) {
      if (held->preview_diff_map_ != nullptr || record.phase.code != QV_SUCCESS) return;
      record.cannot_judge = true;  // the test answers 1 all the same
      record.details.push_back(Format("%s and %s: the frames are of different sizes, %d x %d and %d x %d",
                                      record.inputs[0].path.c_str(), record.inputs[1].path.c_str(),
                                      record.inputs[0].width, record.inputs[0].height, record.inputs[1].width,
                                      record.inputs[1].height));
    };
    m.report = [](const Record& record) {
      const Measurement& mean = *record.phase.Find("difference_mean");
      return Format("mean difference  %.5f of full scale (%.2f grey levels)%s\n", mean.value(), 255 * mean.value(),
                    LimitText(mean).c_str());
    };
    m.annotate = [held, slot](const Record& record) { return AnnotatePreview(record, *held, SlotPhoto(slot)); };
    return Measure(*options, m);
  };
}

CommandBody DeclareCircles(Options& command) {
  auto options = std::make_shared<TargetOptions>();
  command.Argument("FRAME", options->frame, "Preview frame that shows the chart; - is standard input");
  command.Choice("--camera", options->camera, {0, 2}, "0: main camera, 2: second rear camera", "N");
  options->DeclareThresholdOn(command);
  options->DeclareRawOn(command);
  options->DeclarePublishOn(command);
  options->DeclareOn(command);
  return [options] {
    auto view = std::make_shared<ChartView>();
    Measuring m;
    m.phase = "circle_check";
    m.test_name = "CheckPatternCircles";
    m.inputs = {{QV_RESOURCE_CHART_PHOTO, options->frame}};
    m.run = [options] { return CheckPatternCircles(options->camera); };
    m.look = [view](Record& record) {
      if (record.phase.code != QV_SUCCESS && record.phase.code != QV_DONE) return;
      *view = DescribeChart(record, record.inputs[0].path, SlotPhoto(QV_RESOURCE_CHART_PHOTO));
      const cv::Point2d centre = TargetCentre(*view);
      if (view->complete()) record.phase.Add("centre", {centre.x}, {centre.y});
    };
    m.report = [view, options](const Record& record) {
      const Measurement& centre = *record.phase.Find("centre");
      std::string text =
          ReportChart(*view) + Format("centre     column %.1f, row %.1f\n", centre.axis[0], centre.values[0]);
      if (options->publish) text += "published  t82.vi_* in the shared property store\n";
      return text;
    };
    m.publishes = true;
    m.annotates_misses = true;
    m.annotate = [view](const Record& record) {
      const cv::Mat frame = SlotPhoto(QV_RESOURCE_CHART_PHOTO);
      const double scale = FitScale(frame, 1080);
      Picture picture(std::max(700, cvRound(frame.cols * scale)), cvRound(frame.rows * scale + kHead));
      picture.Text(Format("Target check: %zu of 3 marks, threshold %d", view->marks.size(), view->threshold), {12, 28},
                   18, kInk);
      const PhotoPlace place = picture.PlacePhoto(frame, {0, kHead}, scale);
      DrawMarks(picture, *view, place);
      if (const Measurement* m = record.phase.Find("centre")) {
        const cv::Point2d at = place({m->axis[0], m->values[0]});
        picture.Line({at - cv::Point2d(14, 0), at + cv::Point2d(14, 0)}, kGood, 3);
        picture.Line({at - cv::Point2d(0, 14), at + cv::Point2d(0, 14)}, kGood, 3);
        picture.Text("centre", at + cv::Point2d(0, 34), 16, kGood, Align::kCentre, true);
      }
      return picture.Png();
    };
    return Measure(*options, m);
  };
}

}  // namespace qv
