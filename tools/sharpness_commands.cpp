#include <algorithm>
#include <cmath>
#include <memory>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "desk/drawing/plot.h"
#include "desk/measure/chart_view.h"
#include "desk/measure/iso_mtf.h"
#include "desk/simulation/camera.h"
#include "desk/simulation/method_law.h"
#include "tools/commands.h"
#include "tools/measure.h"
#include "tools/options.h"

namespace qv {

namespace {

constexpr const char* kRegionNames[] = {"vertical", "horizontal"};
constexpr double kMostClipped = 0.01;  // of a region's pixels

struct SharpnessOptions : MeasureOptions {
  std::string photo, truth;
};

std::vector<double> Widen(const float* values, int count) { return {values, values + count}; }

std::string ReportSharpness(const Record& record, const ChartView& view, double pitch) {
  std::string text = ReportChart(view);
  for (const char* region : kRegionNames) {
    const Measurement& m = *record.phase.Find(std::string("mtf50_") + region);
    text += Format("MTF50      %-10s  %s%s\n", region, FrequencyText(m.value(), record.inputs[0].height, pitch).c_str(),
                   LimitText(m).c_str());
  }
  for (const char* region : kRegionNames) {
    const Measurement& m = *record.phase.Find(std::string("mtf50_iso_") + region);
    text += Format("MTF50 ISO  %-10s  %s%s\n", region, FrequencyText(m.value(), record.inputs[0].height, pitch).c_str(),
                   LimitText(m).c_str());
  }
  return text;
}

// The standard's figures of the same two regions, in the photo as it was taken.
void AddIsoFigures(Record& record, const cv::Mat& photo) {
  cv::Mat gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  const UprightPhoto upright = Straighten(*theTester, gray);
  const std::array<cv::Rect, 2> regions = MeasuredRegions(upright);
  for (std::size_t i = 0; i < regions.size(); ++i) {
    const IsoMtf iso = MeasureIsoMtf(gray, upright.OnPhoto(regions[i]), {Transfer::Kind::kLinear, 1});
    record.phase.Add(std::string("mtf50_iso_") + kRegionNames[i], iso.figures.mtf50);
    const cv::Mat region = upright.picture(regions[i]);
    if (cv::countNonZero(region == 255) > kMostClipped * static_cast<double>(region.total())) {
      record.details.push_back(
          Format("%s: the paper of the %s region is clipped at level 255, so the edge looks sharper "
                 "than it is; use less light or a shorter exposure",
                 record.inputs[0].path.c_str(), kRegionNames[i]));
    }
    if (iso.reason == nullptr) continue;
    record.details.push_back(Format("%s: no MTF50 after ISO 12233 of the %s region: %s", record.inputs[0].path.c_str(),
                                    kRegionNames[i], iso.reason));
  }
}

// Columns across the edge, whose parity bounds what the method can read; from the axis of the curve, 2 k / npix.
int ColumnsAcross(const Record& record, int otherwise) {
  const Measurement* curve = record.phase.Find("sfr_vertical");
  return curve == nullptr ? otherwise : cvRound(2 / curve->axis.at(1));
}

Json ReadTruth(const std::string& path) {
  Json truth = Json::parse(ReadWholeFile(path, kWrongUsage), nullptr, false);
  if (truth.is_discarded()) throw Failure(kWrongUsage, path + ": not the truth of a simulated photo");
  return truth;
}

// True figure, what this method makes of it, and what was measured, side by side. Straightening a turned chart
// interpolates between pixels, which costs a further sinc^2 along the way.
std::string CompareWithTruth(const Record& record, const ChartView& view, const Json& truth, const std::string& path) {
  try {
    const int npix = ColumnsAcross(record, truth.at("npix"));
    const Json& parameters = truth.at("parameters");
    CameraModel lens;
    lens.blur_px = parameters.at("blur_px");
    lens.defocus_px = parameters.at("defocus_px");
    lens.smear_px = {parameters.at("smear_px").at("x"), parameters.at("smear_px").at("y")};
    std::string text = "MTF50, Nyquist       true   expected of the method   measured   by ISO 12233\n";
    for (const char* region : kRegionNames) {
      const Json& edge = truth.at("mtf50").at(region);
      const double angle = edge.at("edge_direction_deg").get<double>() * CV_PI / 180;
      const auto response = [&](double f) {
        const double interpolated = view.straightened_by_deg == 0 ? 1 : method_law::Sinc(f);
        return LensResponse(lens, f, {-std::sin(angle), std::cos(angle)}) * interpolated * interpolated;
      };
      const auto [low, high] = method_law::MeasuredMtf50(response, npix);
      text += Format("  %-14s   %.4f      %.4f to %.4f       %.4f         %.4f\n", region,
                     edge.at("mtf50_nyquist").get<double>(), low, high,
                     record.phase.Find(std::string("mtf50_") + region)->value(),
                     record.phase.Find(std::string("mtf50_iso_") + region)->value());
    }
    return text +
           Format(
               "  (expected of a region %d pixels across, straightened by %d degrees; noise moves single readings)\n",
               npix, view.straightened_by_deg);
  } catch (const Json::exception& e) {
    throw Failure(kWrongUsage, path + ": not the truth of a simulated chart photo (" + e.what() + ")");
  }
}

// The photo with its marks in order, both regions where they lie, and each region's curves beside it.
std::string AnnotateSharpness(const Record& record, const ChartView& view) {
  constexpr double kPhoto = 1080;
  constexpr double kPlotWidth = 420;
  constexpr double kPlotsHeight = 760;
  constexpr double kHead = 44;
  constexpr double kLeastWidth = 760;  // that a miss's reasons have room in
  const cv::Mat photo = SlotPhoto(QV_RESOURCE_CHART_PHOTO);
  const double scale = std::min(1.0, kPhoto / std::max(photo.cols, photo.rows));
  const double width = photo.cols * scale;
  const bool measured = record.phase.code == QV_SUCCESS;
  const double height = std::max(photo.rows * scale, measured ? kPlotsHeight : 0);
  Picture picture(cvRound(measured ? width + 2 * kPlotWidth + 16 : std::max(width, kLeastWidth)),
                  cvRound(height + kHead));
  const PhotoPlace place = picture.PlacePhoto(photo, {0, kHead}, scale);

  picture.Text(measured ? Format("%s: %s, chart turned by %.1f degrees, threshold %d", record.test_name.c_str(),
                                 Name(record.outcome()), view.turn_deg, view.threshold)
                        : Format("%s: code %d, %zu of 3 marks, threshold %d", record.test_name.c_str(),
                                 record.phase.code, view.marks.size(), view.threshold),
               {12, 28}, 18, kInk);
  DrawMarks(picture, view, place);
  if (!measured) return picture.Png();

  const std::array<RegionView, 2> regions = LookAtRegions(*theTester, photo);
  for (std::size_t i = 0; i < regions.size(); ++i) {
    const RegionView& region = regions[i];
    const Measurement& mtf50 = *record.phase.Find(std::string("mtf50_") + kRegionNames[i]);
    const Colour colour = mtf50.outcome == Outcome::kFail ? kPoor : mtf50.marginal ? kDoubtful : kGood;
    const char* const word = !mtf50.limit.given()              ? ""
                             : mtf50.outcome == Outcome::kFail ? ", poor"
                             : mtf50.marginal                  ? ", marginal"
                                                               : ", good";
    std::vector<cv::Point2d> outline;
    for (const cv::Point2d& corner : region.outline) outline.push_back(place(corner));
    picture.Line(outline, colour, 3, true);
    // Off the edges: above the one region, below the other.
    cv::Point2d label = (outline[0] + outline[2]) / 2;
    for (const cv::Point2d& corner : outline)
      label.y = i == 0 ? std::max(label.y, corner.y) : std::min(label.y, corner.y);
    label.y += i == 0 ? 22 : -54;
    picture.Text(kRegionNames[i], label, 16, colour, Align::kCentre, true);
    const auto figure = [](double value) { return std::isfinite(value) ? Format("%.3f", value) : "none"; };
    picture.Text(Format("MTF50 %s Nyquist%s", figure(mtf50.value()).c_str(), word), label + cv::Point2d(0, 22), 16,
                 colour, Align::kCentre, true);
    const double iso = record.phase.Find(std::string("mtf50_iso_") + kRegionNames[i])->value();
    picture.Text("ISO 12233: " + figure(iso), label + cv::Point2d(0, 44), 16, colour, Align::kCentre, true);

    const double left = width + 16 + static_cast<double>(i) * kPlotWidth;
    Plot profile;
    profile.title =
        Format("Edge profile, %s region (%d x %d px)", kRegionNames[i], region.pixels.cols, region.pixels.rows);
    profile.x_label = "across the edge, pixels";
    profile.y_label = "grey level";
    profile.x_max = static_cast<double>(region.edge_profile.size());
    profile.y_max = 255;
    for (std::size_t k = 0; k < region.edge_profile.size(); ++k) {
      profile.curve.emplace_back(static_cast<double>(k), region.edge_profile[k]);
    }
    DrawPlot(picture, profile, {left, kHead, kPlotWidth, 330});

    const Measurement* curve = record.phase.Find(std::string("sfr_") + kRegionNames[i]);
    if (curve == nullptr) continue;
    Plot response;
    response.title = Format("SFR, %s region", kRegionNames[i]);
    response.x_label = "frequency, fraction of Nyquist";
    response.second_x_label = "cycles per pixel";
    response.second_x_factor = 0.5;
    response.y_label = "response";
    response.y_max = 1.1;
    response.horizontal_lines = {0.5};
    for (std::size_t k = 0; k < curve->values.size(); ++k)
      response.curve.emplace_back(curve->axis[k], curve->values[k]);
    response.markers = {{{mtf50.value(), 0.5}, Format("MTF50 %.4f Nyquist", mtf50.value()), colour}};
    DrawPlot(picture, response, {left, kHead + 340, kPlotWidth, 400});
  }
  return picture.Png();
}

CommandBody DeclareSharpness(Options& command, const Measuring& test) {
  auto options = std::make_shared<SharpnessOptions>();
  command.Argument("PHOTO", options->photo, "Photo of the sharpness chart; - is standard input");
  options->DeclareThresholdOn(command);
  command.Number("--pixel-pitch", options->pixel_pitch_um, 0.01, 1000,
                 "Pixel pitch of the sensor, for figures in lp/mm", "UM");
  command.Text("--truth", options->truth, "Truth of a simulated photo, to compare with", "FILE");
  options->DeclareOn(command);
  return [options, test] {
    const Json truth = options->truth.empty() ? Json() : ReadTruth(options->truth);
    auto view = std::make_shared<ChartView>();
    Measuring m = test;
    m.inputs = {{QV_RESOURCE_CHART_PHOTO, options->photo}};
    m.look = [view](Record& record) {
      if (theTester->startSize == 0 && record.phase.code == QV_ERROR_UNUSABLE_INPUT) return;
      const cv::Mat photo = SlotPhoto(QV_RESOURCE_CHART_PHOTO);
      *view = DescribeChart(record, record.inputs[0].path, photo);
      if (record.phase.code == QV_SUCCESS) AddIsoFigures(record, photo);
      for (const char* region : kRegionNames) {
        const Measurement* mtf50 = record.phase.Find(std::string("mtf50_") + region);
        if (mtf50 == nullptr || std::isfinite(mtf50->value())) continue;
        record.cannot_judge = true;
        record.details.push_back(
            Format("%s: the %s region gives no MTF50; does it show an edge?", record.inputs[0].path.c_str(), region));
      }
    };
    m.report = [view, options, truth](const Record& record) {
      const std::string report = ReportSharpness(record, *view, options->pixel_pitch_um);
      return truth.is_null() ? report : report + CompareWithTruth(record, *view, truth, options->truth);
    };
    m.annotates_misses = true;
    m.annotate = [view](const Record& record) { return AnnotateSharpness(record, *view); };
    return Measure(*options, m);
  };
}

}  // namespace

CommandBody DeclareAutofocus(Options& command) {
  Measuring m;
  m.phase = "camera_autofocus";
  m.test_name = "QV_TEST_CAMERA_AUTOFOCUS";
  m.test_index = QV_TEST_CAMERA_AUTOFOCUS;
  m.run = [] { return RunTest(QV_TEST_CAMERA_AUTOFOCUS, false); };
  m.collect = [](Phase& phase, const QVResultData& results) {
    const std::vector<double> freq = Widen(results.af_sfr_first_, results.af_sfr_count_);
    phase.Add("mtf50_vertical", results.af_sfr_scalar1_);
    phase.Add("mtf50_horizontal", results.af_sfr_scalar2_);
    phase.Add("sfr_vertical", freq, Widen(results.af_sfr_second_, results.af_sfr_count_));
    phase.Add("sfr_horizontal", freq, Widen(results.af_sfr_third_, results.af_sfr_count_));
  };
  return DeclareSharpness(command, m);
}

CommandBody DeclareMtf(Options& command) {
  auto figures = std::make_shared<std::array<float, 2>>();
  Measuring m;
  m.phase = "mtf_check";
  m.test_name = "CheckMTF";
  m.run = [figures] { return CheckMTF(figures->data(), figures->data() + 1); };
  m.collect = [figures](Phase& phase, const QVResultData& /*unused*/) {
    phase.Add("mtf50_vertical", (*figures)[0]);
    phase.Add("mtf50_horizontal", (*figures)[1]);
  };
  return DeclareSharpness(command, m);
}

}  // namespace qv
