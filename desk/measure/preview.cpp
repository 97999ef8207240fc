// Tests 13 and 19: how much two preview frames differ.

#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/frames.h"
#include "desk/measure/grey.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kDifference = {"mean absolute difference of the grey frames over 255",
                                "Exact for the frames as delivered.",
                                "Moved by motion, noise, flicker and exposure between the frames."};

// Noise of both frames over their pixels; it tells of itself in what neighbours differ by on rows and columns, where
// the scene is an edge at most. What noise adds to the difference of all photos alike is part of it.
Uncertainty OfDifference(const cv::Mat& frame, const cv::Mat& map, const CodecSteps& codec) {
  const cv::Matx33f edgeless(1, -2, 1, -2, 4, -2, 1, -2, 1);
  constexpr double kRootOfSquares = 6;
  Uncertainty of_map = OfMeanLevel(map);
  cv::Mat left;
  cv::filter2D(GreyOf(frame), left, CV_32F, edgeless);
  std::vector<double> sizes;
  for (const float one : cv::Mat_<float>(left)) sizes.push_back(std::fabs(one));
  const double noise = 1.4826 * Median(std::move(sizes)) / kRootOfSquares / 255;
  // Sizes of noise alone scatter less than noise: by 1 - 2 / pi of its variance.
  const double moved = cv::countNonZero(map > 2 * std::sqrt(2.0) * noise) / static_cast<double>(map.total());
  const double share = moved + (1 - moved) * (1 - 2 / CV_PI);
  const double standard = std::sqrt(2 * share / static_cast<double>(map.total())) * noise;
  if (codec.luma != 0 || !(standard < of_map.standard)) return of_map;  // a codec hides noise
  return Combined(standard, static_cast<double>(map.total()), 0, kMeanMethod);
}

// The map's colours, largest above, with the grey levels that they stand for.
void DrawColourBar(Picture& picture, cv::Point2d origin, int steps, double largest) {
  constexpr int kNumbers = 4;
  cv::Mat bar(steps, 1, CV_8U);
  for (int i = 0; i < steps; ++i) bar.at<uchar>(i) = static_cast<uchar>(255 - 255 * i / (steps - 1));
  cv::resize(bar, bar, {20, steps}, 0, 0, cv::INTER_NEAREST);
  cv::applyColorMap(bar, bar, cv::COLORMAP_VIRIDIS);
  picture.PlacePhoto(bar, origin, 1);
  for (int i = 0; i <= kNumbers; ++i) {
    const double y = origin.y + steps * i / static_cast<double>(kNumbers);
    picture.Line({{origin.x + 20, y}, {origin.x + 24, y}}, OnPaper(kInk), 1);
    picture.Text(Format("%.0f", largest * (kNumbers - i) / kNumbers), {origin.x + 28, y + 5}, 13, kInk);
  }
  picture.Text("grey levels", {origin.x, origin.y + steps + 24}, 13, kInk);
}

class PreviewFinding : public Finding {
 public:
  PreviewFinding(cv::Mat first, cv::Mat map) : first_(std::move(first)), map_(std::move(map)) {}

  std::string Report(const Record& record) const override {
    const Reading& mean = *record.phase.Find("difference_mean");
    return Format("mean difference  %s of full scale (%.2f grey levels)%s\n", ValueText(mean, 5).c_str(),
                  255 * mean.value(), LimitText(mean).c_str());
  }

  // The difference map beside the first frame; the map's largest value is its lightest colour.
  std::optional<Picture> Draw(const Record& record) const override {
    if (!record.measured()) return std::nullopt;
    constexpr int kSteps = 200;
    const double scale = FitScale(first_, 760);
    const double width = first_.cols * scale;
    const double whole = std::max(2 * width + 110, 640.0);
    const Reading& mean = *record.phase.Find("difference_mean");
    const Heading heading(record, record.test_name, whole, {"difference_mean"});
    const double top = heading.height() + 24;
    Picture picture(cvRound(whole), cvRound(std::max(first_.rows * scale, kSteps + 40.0) + top));
    heading.Draw(picture);
    picture.Text("first frame", {4, top - 8}, 13, kInk);
    picture.PlacePhoto(first_, {0, top}, scale);
    double largest = 0;
    cv::minMaxLoc(map_, nullptr, &largest);
    cv::Mat colours;
    map_.convertTo(colours, CV_8U, largest > 0 ? 255 / largest : 0);
    cv::applyColorMap(colours, colours, cv::COLORMAP_VIRIDIS);
    picture.Text(Format("difference to the second, mean %.5f: ", mean.value()) + VerdictText(mean),
                 {width + 12, top - 8}, 13, mean.limit.given() ? ToneOf(mean) : kInk);
    picture.PlacePhoto(colours, {width + 8, top}, scale);
    DrawColourBar(picture, {2 * width + 20, top + 8}, kSteps, 255 * largest);
    return picture;
  }

 private:
  cv::Mat first_;
  cv::Mat map_;  // CV_32F, 0 to 1
};

class Preview : public Measurement {
 public:
  Preview(const char* name, QV_TEST_INDEX test, QV_RESOURCE_INDEX first_slot, QVPreviewResult QVResultData::*result)
      : result_(result) {
    spec_.name = name;
    spec_.test = test;
    spec_.inputs = {
        {"first", first_slot, "First preview frame"},
        {"second", static_cast<QV_RESOURCE_INDEX>(first_slot + 1), "Second preview frame, of the same size"}};
    spec_.parameters = {RawParameter()};
    spec_.figures = {{"difference_mean", kOne, Number::kReal, nullptr, kDifference,
                      "Mean difference of the two frames, 0 to 1: how much the preview moves."}};
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    cv::Mat map;
    if (const QVResultData* results = RunNumberedTest(tester, spec_, request, record.phase)) {
      const QVPreviewResult& result = results->*result_;
      if (result.preview_diff_map_ != nullptr) {
        map = cv::Mat(result.preview_diff_rows_, result.preview_diff_cols_, CV_32F, result.preview_diff_map_).clone();
        cv::patchNaNs(map, 0);  // identical frames: no difference anywhere
        const cv::Mat frame = SlotPhoto(tester, spec_.inputs[0].slot);
        record.phase.Add("difference_mean", result.preview_diff_mean_)
            .Trust({OfDifference(frame, map, record.inputs.at(0).codec)});
      } else {
        SayFramesDiffer(record);
      }
    }
    return std::make_unique<PreviewFinding>(SlotPhoto(tester, spec_.inputs[0].slot), map);
  }

 private:
  // The test answers 1 all the same.
  static void SayFramesDiffer(Record& record) {
    const RecordedInput& first = record.inputs[0];
    const RecordedInput& second = record.inputs[1];
    record.Say(Remark::kNoJudgement, "frames_of_different_sizes",
               Format("%s and %s: the frames are of different sizes, %d x %d and %d x %d", first.path.c_str(),
                      second.path.c_str(), first.width, first.height, second.width, second.height));
  }

  QVPreviewResult QVResultData::*result_;
  Spec spec_;
};

}  // namespace

Parameter RawParameter() {
  return {"raw", Parameter::kSize, "WxH", "Frames are raw NV21 of this size, not picture files"};
}

const Measurement& PreviewMeasurement(bool front) {
  static const Preview main("camera_preview", QV_TEST_CAMERA_PREVIEW, QV_RESOURCE_PREVIEW_FIRST_FRAME,
                            &QVResultData::preview_main_);
  static const Preview second("camera_preview_front", QV_TEST_CAMERA_PREVIEW_2, QV_RESOURCE_FRONT_PREVIEW_FIRST_FRAME,
                              &QVResultData::preview_front_);
  return front ? second : main;
}

const Measurement& VideoPreviewMeasurement() {
  static const Preview video("video_preview", QV_TEST_VIDEO_PREVIEW, QV_RESOURCE_VIDEO_PREVIEW_FIRST_FRAME,
                             &QVResultData::preview_video_);
  return video;
}

}  // namespace qv
