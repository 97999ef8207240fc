#include <algorithm>
#include <array>
#include <climits>
#include <cstdint>
#include <memory>
#include <numeric>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "desk/drawing/plot.h"
#include "tools/commands.h"
#include "tools/measure.h"

namespace qv {

namespace {

constexpr int kBins = 256;
constexpr double kDarkestToJudge = 126;  // the blob search sees nothing in photos whose mean is below
constexpr double kCornerPx = 20;

struct DustOptions : MeasureOptions {
  std::string photo, reference;
  bool front = false;
  int step = 0;
  std::array<int, kBins> histogram = {};  // the reference; the tester reads it here

  QV_RESOURCE_INDEX slot() const { return front ? QV_RESOURCE_FRONT_DUST_PHOTO : QV_RESOURCE_DUST_PHOTO; }
};

[[noreturn]] void RefuseReference(const std::string& path) {
  throw Failure(kWrongUsage, path + ": neither a dust record nor 256 whole numbers");
}

// From the histogram of a dust record, or from 256 whole numbers, as a JSON list or bare.
std::array<int, kBins> ReadReference(const std::string& path) {
  const std::string text = ReadWholeFile(path, kWrongUsage);
  std::vector<std::int64_t> counts;
  const Json json = Json::parse(text, nullptr, false);
  if (json.is_object()) {
    const Json phases = json.value("phases", Json::array());
    const Json measurements = phases.empty() ? Json::object() : phases[0].value("measurements", Json::object());
    for (const char* name : {"lens_dust_histogram", "lens_dust_front_histogram"}) {
      if (!measurements.contains(name)) continue;
      for (const Json& bin : measurements[name].value("measured_value", Json::array())) {
        if (bin.is_array() && bin.size() == 2 && bin[1].is_number_integer())
          counts.push_back(bin[1].get<std::int64_t>());
      }
    }
  } else if (json.is_array()) {
    for (const Json& bin : json) {
      if (!bin.is_number_integer()) RefuseReference(path);
      counts.push_back(bin.get<std::int64_t>());
    }
  } else {
    std::istringstream words(text);
    for (std::int64_t count = 0; words >> count;) counts.push_back(count);
    if (!words.eof()) RefuseReference(path);
  }
  std::array<int, kBins> histogram = {};
  if (counts.size() != kBins) RefuseReference(path);
  for (std::size_t i = 0; i < kBins; ++i) {
    if (counts[i] < 0 || counts[i] > INT32_MAX) RefuseReference(path);
    histogram[i] = static_cast<int>(counts[i]);
  }
  return histogram;
}

// The blobs that were counted: the first five outside the corners.
std::vector<cv::KeyPoint> CountedBlobs(QVTester& tester, int count) {
  std::vector<cv::KeyPoint> blobs;
  for (const cv::KeyPoint& blob : tester.kept_->blobs.keypoints) {
    if (static_cast<int>(blobs.size()) == count) break;
    if (tester.isValidLocation(tester.kept_->blobs.image.cols, tester.kept_->blobs.image.rows, blob.pt))
      blobs.push_back(blob);
  }
  return blobs;
}

void Collect(Phase& phase, const QVResultData& results, const DustOptions& options) {
  const int* const bins = options.front ? results.dust_hist_front_ : results.dust_hist_main_;
  std::vector<double> levels(kBins);
  std::iota(levels.begin(), levels.end(), 0);
  const std::vector<double> counts(bins, bins + kBins);
  const double pixels = std::accumulate(counts.begin(), counts.end(), 0.0);
  const double mean = std::inner_product(levels.begin(), levels.end(), counts.begin(), 0.0) / pixels;
  phase.Add("mean_level", mean);
  phase.Add("histogram", levels, counts);
  if (!options.reference.empty()) {
    phase.Add("histogram_difference", options.front ? results.dust_hist_diff_front_ : results.dust_hist_diff_main_);
  }
  if (mean < kDarkestToJudge) return;
  const int count = options.front ? results.dust_blob_count_front_ : results.dust_blob_count_main_;
  phase.Add("blob_count", count);
  std::vector<double> columns;
  std::vector<double> rows;
  for (const cv::KeyPoint& blob : CountedBlobs(*theTester, count)) {
    columns.push_back(blob.pt.x);
    rows.push_back(blob.pt.y);
  }
  phase.Add("blobs", columns, rows);
}

std::string Report(const Record& record) {
  const Phase& phase = record.phase;
  const Measurement& count = *phase.Find("blob_count");
  std::string text =
      Format("blobs      %.0f%s%s\n", count.value(), count.value() == 5 ? " or more" : "", LimitText(count).c_str());
  const Measurement& blobs = *phase.Find("blobs");
  for (std::size_t i = 0; i < blobs.values.size(); ++i) {
    text += Format("           column %.0f, row %.0f\n", blobs.axis[i], blobs.values[i]);
  }
  text += Format("mean level %.2f of 255\n", phase.Find("mean_level")->value());
  if (const Measurement* m = phase.Find("histogram_difference")) {
    text += Format("histogram  differs from the reference by %.0f pixels%s\n", m->value(), LimitText(*m).c_str());
  }
  return text;
}

std::string Annotate(const Record& record, const DustOptions& options) {
  constexpr double kPhoto = 1080;
  constexpr double kHead = 44;
  constexpr double kPlot = 460;
  const cv::Mat photo = SlotPhoto(options.slot());
  const double scale = std::min(1.0, kPhoto / std::max(photo.cols, photo.rows));
  const double width = photo.cols * scale;
  Picture picture(cvRound(width + kPlot + 10), cvRound(std::max(photo.rows * scale, 400.0) + kHead));
  const Measurement* const count = record.phase.Find("blob_count");
  picture.Text(count != nullptr && count->outcome != Outcome::kUnset
                   ? Format("%s: %.0f blobs, %s", record.test_name.c_str(), count->value(), Name(record.outcome()))
                   : record.test_name + ": too dark to judge",
               {12, 28}, 18, kInk);
  const PhotoPlace place = picture.PlacePhoto(photo, {0, kHead}, scale);
  for (const cv::Point corner : {cv::Point(0, 0), {1, 0}, {0, 1}, {1, 1}}) {
    const cv::Point2d at(corner.x * (photo.cols - kCornerPx) - 0.5, corner.y * (photo.rows - kCornerPx) - 0.5);
    picture.Line({place(at), place(at + cv::Point2d(kCornerPx, 0)), place(at + cv::Point2d(kCornerPx, kCornerPx)),
                  place(at + cv::Point2d(0, kCornerPx))},
                 kFaint, 1.5, true);
  }
  if (count != nullptr && count->outcome != Outcome::kUnset) {
    for (const cv::KeyPoint& blob : CountedBlobs(*theTester, static_cast<int>(count->value()))) {
      picture.Circle(place(blob.pt), std::max(10.0, blob.size * scale), kPoor, 2.5);
    }
  }

  Plot plot;
  plot.title = options.reference.empty() ? "Grey levels" : "Grey levels; the line is the reference";
  plot.x_label = "grey level";
  plot.y_label = "share of pixels, %";
  plot.x_max = 255;
  plot.bars = true;
  const std::vector<double>& counts = record.phase.Find("histogram")->values;
  const double pixels = std::accumulate(counts.begin(), counts.end(), 0.0);
  const double reference_pixels = std::accumulate(options.histogram.begin(), options.histogram.end(), 0.0);
  plot.y_max = 1;
  for (int i = 0; i < kBins; ++i) {
    plot.curve.emplace_back(i, 100 * counts[i] / pixels);
    plot.y_max = std::max(plot.y_max, 105 * counts[i] / pixels);
    if (reference_pixels > 0) plot.second_curve.emplace_back(i, 100 * options.histogram[i] / reference_pixels);
  }
  DrawPlot(picture, plot, {width + 10, kHead, kPlot, 380});
  return picture.Png();
}

}  // namespace

CommandBody DeclareDust(Options& command) {
  auto options = std::make_shared<DustOptions>();
  command.Argument("PHOTO", options->photo, "Photo of a plain, evenly lit target; - is standard input");
  command.Text("--reference", options->reference, "Histogram to compare with: an earlier dust record, or 256 numbers",
               "FILE");
  command.Flag("--front", options->front, "The front camera (test 21)");
  command.Whole("--step", options->step, INT_MIN, INT_MAX, "Step number, which names the property that is published",
                "N");
  options->DeclarePublishOn(command);
  options->DeclareOn(command);
  return [options] {
    const QV_TEST_INDEX test = options->front ? QV_TEST_LENS_DUST_2 : QV_TEST_LENS_DUST;
    if (!options->reference.empty()) options->histogram = ReadReference(options->reference);
    Measuring m;
    m.phase = options->front ? "lens_dust_front" : "lens_dust";
    m.test_name = options->front ? "QV_TEST_LENS_DUST_2" : "QV_TEST_LENS_DUST";
    m.test_index = test;
    m.prepare = [options] {
      SetStep(options->step);
      if (options->reference.empty()) return;
      SetProperty(options->front ? QV_PROPERTY_FRONT_DUST_HISTOGRAM : QV_PROPERTY_DUST_HISTOGRAM,
                  options->histogram.data());
    };
    m.publishes = true;
    m.inputs = {{options->slot(), options->photo}};
    m.run = [test] { return RunTest(test, false); };
    m.collect = [options](Phase& phase, const QVResultData& results) { Collect(phase, results, *options); };
    m.look = [](Record& record) {
      const Measurement* mean = record.phase.Find("mean_level");
      if (mean == nullptr || mean->value() >= kDarkestToJudge) return;
      record.cannot_judge = true;
      record.details.push_back(
          Format("%s: too dark to judge: the mean grey level is %.0f, and blobs are seen from %.0f "
                 "up; use more light or a longer exposure",
                 record.inputs[0].path.c_str(), mean->value(), kDarkestToJudge));
    };
    m.report = Report;
    m.annotate = [options](const Record& record) { return Annotate(record, *options); };
    return Measure(*options, m);
  };
}

}  // namespace qv
