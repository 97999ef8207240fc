#include "desk/measure/sharpness.h"

#include <array>
#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/edge_resampling.h"
#include "desk/measure/iso_mtf.h"
#include "desk/measure/load.h"
#include "desk/measure/telling.h"

namespace qv {

const Method kSfrMethod = {
    "slanted edge, oversampling 1, real part",
    "Reads low by a known law, {own_low_0.3} at a blur of 0.3 px, {own_low_0.8} at 0.8 px, {own_low_3.0} at 3 px, and "
    "lies within that law by {own_law} without noise; with 1 to 2 % noise single readings jump, up or down: those are "
    "doubted; a turned chart reads up to {own_turned} lower for being straightened.",
    "Moved by focus, motion, sharpening and denoising; by the turn of the chart, which is straightened; "
    "by the parity of the region's width, hence by the distance."};

namespace {

constexpr Method kIso = {
    "slanted edge (ISO 12233:2014) in linear light, oversampling 4, magnitude, derivative and bin width corrected",
    "Mean error within {iso_plain} without noise, {iso_noisy} with 2 % noise, {iso_very_noisy} with 5 % noise, "
    "{iso_srgb} on edges bowed by 1 px, {iso_uneven} in light that falls by 40 % across the region, and {iso_jpeg} "
    "after JPEG of quality 75 from a blur of 0.5 px on.",
    "Moved by focus, motion, sharpening and denoising; by a transfer that is not the photo's (--transfer); reads far "
    "too high where the paper is clipped; there is none where the edge lies along the pixel grid, and none (nan) where "
    "the response doesn't fall so far below twice the Nyquist frequency."};

constexpr Unit kShare = {"one", "C62", "1", 1e-3};

// The figures of one region, beside the curve.
struct IsoRow {
  std::array<const char*, 2> names;  // vertical, horizontal
  Unit unit;
  double IsoFigures::*figure;
  std::array<const char*, 2> docstrings;
};
#define QV_ISO_ROW(name, unit, figure, what)                             \
  {                                                                      \
    {name "_vertical", name "_horizontal"}, unit, &IsoFigures::figure, { \
      what " vertical region.", what " horizontal region."               \
    }                                                                    \
  }
constexpr IsoRow kIsoRows[] = {
    QV_ISO_ROW("mtf50_iso", kNyquist, mtf50, "MTF50 after ISO 12233, from the photo as it was taken, of the"),
    QV_ISO_ROW("mtf30_iso", kNyquist, mtf30,
               "Lowest frequency at which the response by ISO 12233 falls to 0.3, of the"),
    QV_ISO_ROW("mtf10_iso", kNyquist, mtf10,
               "Lowest frequency at which the response by ISO 12233 falls to 0.1, of the"),
    QV_ISO_ROW(
        "mtf50p_iso", kNyquist, mtf50p,
        "Frequency at which the response by ISO 12233 falls to half of its peak: moved less by sharpening. Of the"),
    QV_ISO_ROW("response_peak", kShare, peak, "Highest response by ISO 12233; above 1 by sharpening. Of the"),
    QV_ISO_ROW("edge_width", kPixel, edge_width, "Pixels in which the edge rises from 10 to 90 % of its step, of the"),
    QV_ISO_ROW("overshoot", kShare, overshoot,
               "How far the edge goes beyond its plateaus, as a share of its step; by sharpening. Of the"),
};
#undef QV_ISO_ROW
constexpr std::array<const char*, 2> kIsoCurves = {"sfr_iso_vertical", "sfr_iso_horizontal"};

std::vector<SharpnessRegion> RegionsOf(const FoundChart& found) {
  return {{OnPhoto(found, found.vertical), found.vertical_pixels},
          {OnPhoto(found, found.horizontal), found.horizontal_pixels}};
}

void WarnOfIso(Record& record, const IsoMtf& iso, std::size_t i) {
  const char* const path = record.inputs[0].path.c_str();
  const char* const name = kRegionNames[i];
  if (iso.figures.peak > kSharpenedPeak || iso.figures.overshoot > kSharpenedOvershoot) {
    record.Say(
        Remark::kWarning, "sharpened",
        Format("%s: the %s region was sharpened in the camera: its response peaks at %.2f and its edge overshoots "
               "by %.0f %%; MTF50 tells of the sharpening as well as of the lens, MTF50P less so",
               path, name, iso.figures.peak, 100 * iso.figures.overshoot),
        std::string("overshoot_") + name);
  }
  if (iso.reason == nullptr) return;
  record.Say(Remark::kWarning, "no_iso_figure",
             Format("%s: no MTF50 after ISO 12233 of the %s region: %s", path, name, iso.reason), kIsoRows[0].names[i]);
}

// The standard's figures of a region, in the photo as it was taken.
void AddIsoFigures(Record& record, const cv::Mat& gray, const SharpnessRegion& region, std::size_t i) {
  const Transfer transfer = *ParseTransfer(record.request.parameters.at("transfer").get<std::string>());
  const IsoMtf iso = MeasureIsoMtf(gray, region.outline, transfer, record.inputs.at(0).codec);
  for (const IsoRow& row : kIsoRows) {
    record.phase.Add(row.names[i], iso.figures.*row.figure).Trust({UncertaintyOf(iso, row.figure)});
  }
  std::vector<double> frequencies(iso.response.size());
  for (std::size_t k = 0; k < frequencies.size(); ++k) frequencies[k] = static_cast<double>(k) * kIsoStep;
  if (!frequencies.empty()) record.phase.Add(kIsoCurves[i], frequencies, iso.response);
  WarnOfIso(record, iso, i);
}

// Of the test's own figure, by the region's own noise.
void AddOwnUncertainty(Record& record, const SharpnessRegion& region, std::size_t i) {
  QVTester tester;
  const auto read = [&](const cv::Mat& pixels) { return ReadOwnMtf50(tester, pixels); };
  record.phase.Find(std::string("mtf50_") + kRegionNames[i])->Trust({ResampleEdge(region.pixels, read)});
}

}  // namespace

double ReadOwnMtf50(QVTester& tester, const cv::Mat& pixels) {
  std::vector<float> freq;
  std::vector<float> sfr;
  float mtf50 = 0;
  cv::Mat levels;
  pixels.convertTo(levels, CV_32F);
  tester.CalculateSFR(levels, freq, sfr, mtf50);
  return mtf50;
}

InputSpec SharpnessInput() { return {"photo", QV_RESOURCE_CHART_PHOTO, "Photo of the sharpness chart"}; }

std::vector<Parameter> SharpnessParameters() {
  return {
      ThresholdParameter(),
      {"pixel_pitch", Parameter::kReal, "UM", "Pixel pitch of the sensor, for figures in lp/mm", nullptr, 0.01, 1000},
      {"transfer", Parameter::kTransfer, "T",
       "How levels stand for light, for the figures of ISO 12233: srgb, linear, or gamma:G with G from 0.1 to 10",
       "srgb"},
      {"uncertainty", Parameter::kFlag, "",
       "Tell how far the test's own MTF50 may be trusted, too: 50 more readings of each region", false}};
}

std::vector<Figure> SharpnessFigures(const std::vector<Figure>& more) {
  std::vector<Figure> figures = {
      {"mtf50_vertical", kNyquist, Number::kReal, nullptr, kSfrMethod,
       "Frequency at which the SFR of the vertical region falls to one half."},
      {"mtf50_horizontal", kNyquist, Number::kReal, nullptr, kSfrMethod,
       "Frequency at which the SFR of the horizontal region falls to one half."},
  };
  for (std::size_t i = 0; i < kRegionNames.size(); ++i) {
    for (const IsoRow& row : kIsoRows) {
      figures.push_back({row.names[i], row.unit, Number::kReal, nullptr, kIso, row.docstrings[i]});
    }
    figures.push_back({kIsoCurves[i], kOne, Number::kReal, &kFrequencyAxis, kIso,
                       "Response by ISO 12233 over frequency in units of Nyquist."});
  }
  for (const Figure& figure : DoubtFigures()) figures.push_back(figure);
  for (const Figure& figure : more) figures.push_back(figure);
  for (const Figure& figure : ChartFigures()) figures.push_back(figure);
  return figures;
}

std::unique_ptr<Finding> LookAtSharpness(const QVTester& tester, Record& record) {
  auto finding = std::make_unique<SharpnessFinding>();
  const FoundChart& found = tester.kept_->chart;
  finding->photo = SlotPhoto(tester, QV_RESOURCE_CHART_PHOTO);
  if (!found.searched) return finding;
  finding->view = DescribeChart(record, found, record.inputs[0].path, finding->photo);
  if (record.phase.code != QV_SUCCESS) return finding;
  finding->regions = RegionsOf(found);
  DoubtView(record, finding->view, record.inputs[0].path, "regions", 0.025);
  for (std::size_t i = 0; i < kRegionNames.size(); ++i) {
    AddIsoFigures(record, found.gray, finding->regions[i], i);
    if (record.request.parameters.value("uncertainty", false)) AddOwnUncertainty(record, finding->regions[i], i);
  }
  for (const char* region : kRegionNames) {
    const std::string figure = std::string("mtf50_") + region;
    if (std::isfinite(record.phase.Find(figure)->value())) continue;
    record.Say(Remark::kNoJudgement, "no_mtf50",
               Format("%s: the %s region gives no MTF50; does it show an edge?", record.inputs[0].path.c_str(), region),
               figure);
  }
  DoubtSharpness(record, *finding);
  return finding;
}

std::string SharpnessFinding::Report(const Record& record) const {
  std::string text = ReportChart(view);
  const Json pitch = record.request.parameters.value("pixel_pitch", Json(0));
  for (const auto& [figure, label] : {std::pair("mtf50_", "MTF50    "), {"mtf50_iso_", "MTF50 ISO"}}) {
    for (const char* region : kRegionNames) {
      const Reading& m = *record.phase.Find(std::string(figure) + region);
      text += Format("%s  %-10s  %s%s\n", label, region,
                     FrequencyText(m, record.inputs[0].height, pitch.get<double>()).c_str(), LimitText(m).c_str());
    }
  }
  for (const char* region : kRegionNames) {
    const auto value = [&](const char* figure, int decimals) {
      const Reading& m = *record.phase.Find(std::string(figure) + "_" + region);
      return ValueText(m, decimals) + LimitText(m);
    };
    if (!std::isfinite(record.phase.Find(std::string("mtf50_iso_") + region)->value())) continue;
    text += Format("by ISO     %-10s  MTF30 %s  MTF10 %s  MTF50P %s Nyquist\n", region, value("mtf30_iso", 4).c_str(),
                   value("mtf10_iso", 4).c_str(), value("mtf50p_iso", 4).c_str()) +
            Format("edge       %-10s  10-90 %% in %s px  overshoot %s  peak of the response %s\n", region,
                   value("edge_width", 3).c_str(), value("overshoot", 3).c_str(), value("response_peak", 3).c_str());
  }
  return text;
}

}  // namespace qv
