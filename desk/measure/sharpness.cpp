#include "desk/measure/sharpness.h"

#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/iso_mtf.h"
#include "desk/measure/load.h"
#include "desk/measure/telling.h"

namespace qv {

const Method kSfrMethod = {
    "slanted edge, oversampling 1, real part",
    "Reads low by a known law, 40 % at a blur of 0.5 px to 4 % at 3 px, and lies within that law by 2 % without noise; "
    "with 1 to 2 % noise single readings jump upwards by up to half in blurs under 1.2 px.",
    "Moved by focus, motion, sharpening and denoising; by the turn of the chart, whose straightening costs up to 12 %; "
    "by the parity of the region's width, hence by the distance."};

namespace {

constexpr Method kIso = {"slanted edge (ISO 12233), oversampling 4, magnitude, derivative and bin width corrected",
                         "Mean error 0.1 % without noise and under 0.8 % with 2 % noise, at blurs of 0.3 to 3 px.",
                         "Moved by focus, motion, sharpening and denoising; reads far too high where the paper is "
                         "clipped at level 255; there is none where the edge lies along the pixel grid."};

constexpr int kTopLevel = 255;
constexpr double kMostClipped = 0.01;  // of a region's pixels

std::vector<SharpnessRegion> RegionsOf(const FoundChart& found) {
  return {{OnPhoto(found, found.vertical), found.vertical_pixels},
          {OnPhoto(found, found.horizontal), found.horizontal_pixels}};
}

// The standard's figure of a region, in the photo as it was taken.
void AddIsoFigure(Record& record, const cv::Mat& gray, const SharpnessRegion& region, const std::string& name) {
  const IsoMtf iso = MeasureIsoMtf(gray, region.outline, {Transfer::Kind::kLinear, 1});
  const std::string figure = "mtf50_iso_" + name;
  record.phase.Add(figure, iso.figures.mtf50);
  const char* const path = record.inputs[0].path.c_str();
  if (cv::countNonZero(region.pixels == kTopLevel) > kMostClipped * static_cast<double>(region.pixels.total())) {
    record.Say(Remark::kWarning, "clipped",
               Format("%s: the paper of the %s region is clipped at level %d, so the edge looks sharper "
                      "than it is; use less light or a shorter exposure",
                      path, name.c_str(), kTopLevel),
               figure);
  }
  if (iso.reason == nullptr) return;
  record.Say(Remark::kWarning, "no_iso_figure",
             Format("%s: no MTF50 after ISO 12233 of the %s region: %s", path, name.c_str(), iso.reason), figure);
}

}  // namespace

InputSpec SharpnessInput() { return {"photo", QV_RESOURCE_CHART_PHOTO, "Photo of the sharpness chart"}; }

std::vector<Parameter> SharpnessParameters() {
  return {
      ThresholdParameter(),
      {"pixel_pitch", Parameter::kReal, "UM", "Pixel pitch of the sensor, for figures in lp/mm", nullptr, 0.01, 1000}};
}

std::vector<Figure> SharpnessFigures(const std::vector<Figure>& more) {
  std::vector<Figure> figures = {
      {"mtf50_vertical", kNyquist, Number::kReal, nullptr, kSfrMethod,
       "Frequency at which the SFR of the vertical region falls to one half."},
      {"mtf50_horizontal", kNyquist, Number::kReal, nullptr, kSfrMethod,
       "Frequency at which the SFR of the horizontal region falls to one half."},
      {"mtf50_iso_vertical", kNyquist, Number::kReal, nullptr, kIso,
       "MTF50 of the vertical region after ISO 12233, from the photo as it was taken."},
      {"mtf50_iso_horizontal", kNyquist, Number::kReal, nullptr, kIso,
       "MTF50 of the horizontal region after ISO 12233, from the photo as it was taken."},
  };
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
  for (std::size_t i = 0; i < kRegionNames.size(); ++i) {
    AddIsoFigure(record, found.gray, finding->regions[i], kRegionNames[i]);
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
      text +=
          Format("%s  %-10s  %s%s\n", label, region,
                 FrequencyText(m.value(), record.inputs[0].height, pitch.get<double>()).c_str(), LimitText(m).c_str());
    }
  }
  return text;
}

}  // namespace qv
