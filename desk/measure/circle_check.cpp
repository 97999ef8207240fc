// The chart's three marks in a preview frame, and its centre.

#include <algorithm>

#include "desk/base/text.h"
#include "desk/measure/chart_view.h"
#include "desk/measure/frames.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

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

class CircleFinding : public Finding {
 public:
  std::string Report(const Record& record) const override {
    const Reading& centre = *record.phase.Find("centre");
    std::string text =
        ReportChart(view) + Format("centre     column %.1f, row %.1f\n", centre.axis[0], centre.values[0]);
    if (record.request.publish) text += "published  t82.vi_* in the shared property store\n";
    return text;
  }

  std::optional<Picture> Draw(const Record& record) const override {
    if (!ShowsPhoto(record.phase.code)) return std::nullopt;
    const double scale = FitScale(frame, 1080);
    const double width = std::max(700.0, frame.cols * scale);
    const Heading heading(record,
                          Format("Target check: %zu of 3 marks, threshold %d", view.marks.size(), view.threshold),
                          width, {"module_size", "legs_ratio", "chart_turn"});
    Picture picture(cvRound(width), cvRound(frame.rows * scale + heading.height()));
    heading.Draw(picture);
    const PhotoPlace place = picture.PlacePhoto(frame, {0, heading.height()}, scale);
    Labels labels({0, heading.height(), frame.cols * scale, frame.rows * scale});
    DrawMarks(picture, labels, view, place);
    if (const Reading* m = record.phase.Find("centre")) {
      const cv::Point2d at = place({m->axis[0], m->values[0]});
      const cv::Rect2d cross(at - cv::Point2d(14, 14), at + cv::Point2d(14, 14));
      picture.Line({{cross.x, at.y}, {cross.br().x, at.y}}, kGood, 3);
      picture.Line({{at.x, cross.y}, {at.x, cross.br().y}}, kGood, 3);
      labels.Keep(cross);
      PlaceWords words(Format("centre (%.1f, %.1f)", m->axis[0], m->values[0]));
      words.AddEntry(m, 0);
      labels.Add(picture, words.Lines(), cross, words.tone());
    }
    return picture;
  }

  ChartView view;
  cv::Mat frame;
};

class CircleCheck : public Measurement {
 public:
  CircleCheck() {
    spec_.name = "circle_check";
    spec_.routine = "CheckPatternCircles";
    spec_.inputs = {{"frame", QV_RESOURCE_CHART_PHOTO, "Preview frame that shows the chart"}};
    spec_.parameters = {{"camera",
                         Parameter::kWhole,
                         "N",
                         "Whose frame: 0 is the main camera's, 2 the second rear camera's",
                         0,
                         0,
                         2,
                         {"0", "2"}},
                        ThresholdParameter(),
                        RawParameter()};
    std::vector<Figure> figures = ChartFigures();
    figures.push_back({"centre", kPixel, Number::kReal, &kColumnAxis, kScanMethod,
                       "The chart's centre, column and row: the middle of the longest side between the three marks."});
    spec_.figures = std::move(figures);
    spec_.publishes = true;
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    const int camera = request.parameters.at("camera");
    RunRoutine(record.phase, spec_.routine, [&] { return tester.CheckPatternCircles(camera); });
    auto finding = std::make_unique<CircleFinding>();
    finding->frame = SlotPhoto(tester, QV_RESOURCE_CHART_PHOTO);
    const int code = record.phase.code;
    if (code != QV_SUCCESS && code != QV_DONE) return finding;
    finding->view = DescribeChart(record, tester.kept_->chart, record.inputs[0].path, finding->frame);
    const cv::Point2d centre = TargetCentre(finding->view);
    if (finding->view.complete()) record.phase.Add("centre", {centre.x}, {centre.y});
    return finding;
  }

 private:
  Spec spec_;
};

}  // namespace

const Measurement& CircleCheckMeasurement() {
  static const CircleCheck circle_check;
  return circle_check;
}

}  // namespace qv
