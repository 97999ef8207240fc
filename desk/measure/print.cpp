// Test 29: a print against photos of good ones.

#include <algorithm>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "chart/image_list.h"
#include "desk/base/text.h"
#include "desk/measure/areas.h"
#include "desk/measure/grey.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/residual_trust.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kRegistration = {
    "three best feature matches, refined by the enhanced correlation of both pictures",
    "Under 0.3 px in {refined_within} of the cases where the three matches come within 10 px; by over 1 px, and not "
    "told by the correlation, {prints_untold}.",
    "Moved by strokes that repeat, by a print that shows little, by a photo far out of focus."};
constexpr Method kDeparture = {
    "black and white about the mean, against its rebuild from the good prints' mean and first principal components",
    "Areas under 3 px a side are dropped by the opening. Of extra ink of 4 px and more from a contrast of 0.4 "
    "{prints_extra} is found, of missing ink of 8 px and more at full contrast {prints_missing}; up to {prints_false} "
    "false areas a print.",
    "Moved by the ground's share of the picture, which sets the mean; by uneven light; by good prints that are few or "
    "all alike."};

constexpr double kLowestCorrelation = 0.8;
constexpr double kMostUnseen = 0.005;  // of the good print's strokes

// Of the strokes, which are the rarer of black and white in the first good print.
double UnseenShare(const cv::Mat& map, const QVTester::ImageList& list, cv::Size photo) {
  const cv::Size frame = list.gray.front().size();
  cv::Mat strokes = list.matrix.row(0).reshape(1, frame.height) > 0;
  if (2 * cv::countNonZero(strokes) > frame.area()) cv::bitwise_not(strokes, strokes);
  cv::Mat seen;
  cv::warpAffine(cv::Mat(photo, CV_8U, cv::Scalar(255)), seen, map, frame, cv::INTER_NEAREST | cv::WARP_INVERSE_MAP,
                 cv::BORDER_CONSTANT, cv::Scalar(0));
  const double all = cv::countNonZero(strokes);
  return all == 0 ? 0 : 1 - cv::countNonZero(strokes & seen) / all;
}

struct Print {
  cv::Mat photo, straight;  // the photo, and the same in the good print's frame
  cv::Mat map;              // 2 x 3, CV_64F
  double unseen_share = 0;
  Areas areas;
};

void Collect(Phase& phase, const QVResultData& results, const Print& print) {
  phase.Add("rms", results.print_rms_);
  phase.Add("correlation", results.print_correlation_);
  phase.Add("unseen_share", print.unseen_share);
  const std::vector<double> matrix(print.map.begin<double>(), print.map.end<double>());
  std::vector<double> numbers(matrix.size());
  std::iota(numbers.begin(), numbers.end(), 0);
  phase.Add("matrix", numbers, matrix);
  AddAreas(phase, print.areas);
}

void Look(Record& record, const Print& print) {
  const char* const path = record.inputs[0].path.c_str();
  const double correlation = record.phase.Find("correlation")->value();
  if (!(correlation >= kLowestCorrelation)) {
    const std::string how = std::isnan(correlation)
                                ? "the registration did not converge"
                                : Format("it correlates with the good print by %.2f only", correlation);
    record.Say(Doubt::kNotRegistered,
               Format("%s: doubtful: %s: is it the same print, upright, sharp and in even light?", path, how.c_str()),
               "correlation");
  }
  if (print.unseen_share > kMostUnseen) {
    record.Say(Doubt::kPrintCutOff,
               Format("%s: doubtful: %.1f %% of the good print's strokes lie outside this photo and were not judged",
                      path, 100 * print.unseen_share),
               "unseen_share");
  }
}

class PrintFinding : public Finding {
 public:
  std::string Report(const Record& record) const override {
    const auto line = [&](const char* name, int decimals, const char* figure, const char* unit = "") {
      const Reading& reading = *record.phase.Find(figure);
      return Format("%-12s ", name) + ValueText(reading, decimals) + unit + LimitText(reading) + "\n";
    };
    return line("departure", 4, "rms", " of the binary range, root mean square") +
           line("correlation", 4, "correlation") + line("areas", 0, "area_count") + AreaLines(print.areas, "pixels");
  }

  std::optional<Picture> Draw(const Record& record) const override {
    if (record.phase.code != QV_SUCCESS) return std::nullopt;
    const double scale = FitScale(print.straight, 1280);
    const double width = std::max(640.0, print.straight.cols * scale);
    const double height = print.straight.rows * scale;
    const Heading heading(record, "Print, in the good one's frame", width, {"area_count", "rms", "correlation"});
    Picture picture(cvRound(width), cvRound(height + heading.height()));
    heading.Draw(picture);
    Labels labels({0, heading.height(), width, height});
    DrawAreas(picture, labels, picture.PlacePhoto(print.straight, {0, heading.height()}, scale), print.areas,
              record.phase);
    return picture;
  }

  cv::Mat Product() const override { return print.straight; }

  Print print;
};

class TouchPanelPrint : public Measurement {
 public:
  TouchPanelPrint() {
    spec_.name = "touch_panel_print";
    spec_.test = QV_TEST_TOUCH_PANEL_PRINT;
    spec_.inputs = {{"photo", QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO, "Photo of the print"},
                    {"samples", QV_RESOURCE_IMAGE_LIST,
                     "Folder with photos of good prints, taken in the order of their "
                     "names; the first one's frame is kept"}};
    spec_.inputs[1].list = true;
    spec_.parameters = {{"components",
                         Parameter::kWhole,
                         "N",
                         "Principal components of the good prints that a print may follow",
                         nullptr,
                         1,
                         10'000,
                         {},
                         QV_PROPERTY_LIST_COMPONENTS}};
    for (const Parameter& parameter : AreaParameters()) spec_.parameters.push_back(parameter);
    spec_.figures = {
        {"rms", kOne, Number::kReal, nullptr, kDeparture,
         "Root mean square departure from what good prints can be, over the range from black to white."},
        {"correlation", kOne, Number::kReal, nullptr, kRegistration,
         "Of the photo and the first good print, once registered: 1 at best; none where it did not converge."},
        {"unseen_share", kOne, Number::kReal, nullptr, kRegistration,
         "Share of the good print's strokes that lies outside the photo and was not judged."},
        {"matrix", kOne, Number::kReal, &kMatrixAxis, kRegistration,
         "a, b, c, d, e, f: column = a x + b y + c and row = d x + e y + f in the photo, for column x and row y of the "
         "first good print."}};
    for (const Figure& figure : AreaFigures(kDeparture)) spec_.figures.push_back(figure);
    spec_.advice = "are the photo and the samples pictures of one print, of 8 bits a channel?";
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    auto finding = std::make_unique<PrintFinding>();
    const QVResultData* const results = RunNumberedTest(tester, spec_, request, record.phase);
    if (results == nullptr) return finding;
    Print& print = finding->print;
    print.photo = SlotPhoto(tester, spec_.inputs[0].slot);
    print.map = tester.print_map_.clone();
    const QVTester::ImageList& list = tester.kept_->image_list;
    const cv::Size reference = list.gray.front().size();
    print.unseen_share = UnseenShare(print.map, list, print.photo.size());
    cv::warpAffine(print.photo, print.straight, print.map, reference, cv::INTER_LINEAR | cv::WARP_INVERSE_MAP,
                   cv::BORDER_CONSTANT, cv::Scalar::all(128));
    print.areas = AreasOf(results->print_error_count_, results->print_error_areas_, results->print_error_pixels_);
    Collect(record.phase, *results, print);
    cv::Mat smoothed = GreyOf(print.photo);
    cv::medianBlur(smoothed, smoothed, kMedianAperture);  // as the good prints are
    TrustRefinedMap(record.phase, list.gray.front(), smoothed, print.map);
    Look(record, print);
    return finding;
  }

 private:
  Spec spec_;
};

}  // namespace

const Measurement& PrintMeasurement() {
  static const TouchPanelPrint print;
  return print;
}

}  // namespace qv
