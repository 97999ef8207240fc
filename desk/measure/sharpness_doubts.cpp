// What would make a sharpness figure wrong without a word.

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/doubts.h"
#include "desk/measure/edge_resampling.h"
#include "desk/measure/sharpness.h"

namespace qv {

namespace {

constexpr double kMostOff = 0.05;     // of the noiseless figure
constexpr double kLeastReach = 0.94;  // of the light side over the dark one

constexpr Method kNoiselessMethod = {
    "the test's own measure of the region's edge spread alone",
    "Within {own_noiseless} of what a photo without noise gives in nine of ten, up to 2 % noise.",
    "Moved by focus, motion, sharpening and denoising; not by noise, nor by light "
    "that falls evenly across the region."};

// A curve that bends below white leaves no pile. No doubt, since a lens that blurs unlike to both sides looks the same.
void WarnOfShoulder(Record& record, const cv::Mat& photo, const SharpnessRegion& region, const char* name) {
  const std::optional<double> reach = LightSideReach(photo, region.outline);
  if (!reach || *reach >= kLeastReach) return;
  record.Say(
      Remark::kWarning, "flattened_light",
      Format("%s: the light side of the %s region looks flattened: its edge comes to the paper in %.2f of the way "
             "that it takes from the dark, and may look sharper than it is; use less light, or a camera setting "
             "that leaves light levels as they are",
             record.inputs[0].path.c_str(), name, *reach),
      std::string("mtf50_") + name);
}

void DoubtLevels(Record& record, const cv::Mat& photo, const SharpnessRegion& region, const char* name) {
  const std::optional<LevelPile> pile = FindLevelPile(photo, region.outline);
  if (!pile) return WarnOfShoulder(record, photo, region, name);
  constexpr const char* kChannels[] = {"blue", "green", "red"};
  record.Say(
      Doubt::kClipped,
      Format("%s: the %s region is clipped: %.0f %% of its %s side lies at level %d of %s, so the edge looks sharper "
             "than it is; use %s",
             record.inputs[0].path.c_str(), name, 100 * pile->share, pile->top ? "light" : "dark", pile->level,
             photo.channels() == 1 ? "grey" : kChannels[pile->channel],
             pile->top ? "less light or a shorter exposure" : "more light, or a camera setting that keeps its blacks"),
      std::string("mtf50_") + name);
}

struct Cause {
  Doubt doubt;
  const char* sentence;
};

// Seen obliquely, a region lies beside its place, and may hold more than its edge.
Cause LightCause(bool oblique) {
  return {Doubt::kUnevenLight, oblique
                                   ? "the light falls across it, or, seen obliquely, the region holds more than its "
                                     "edge; face the chart straight on, and light it evenly"
                                   : "the light falls across it; light the chart evenly"};
}

// Of a difference that even light leaves. What a region holds beside its edge is no noise, and no median helps.
Cause NoiseCause(bool oblique, const SharpnessRegion& region, const std::function<double(const cv::Mat&)>& read,
                 double difference) {
  if (oblique && (ShowsMoreThanEdge(region.pixels) || !(ResampleEdge(region.pixels, read).expanded >= difference))) {
    return {Doubt::kOblique, "the chart is seen obliquely; face it straight on"};
  }
  return {Doubt::kNoise, "noise moved the reading; take several photos, and the median"};
}

bool IsOblique(const Record& record) {
  return std::any_of(record.remarks.begin(), record.remarks.end(),
                     [](const Remark& remark) { return remark.name() == Info(Doubt::kOblique).name; });
}

// The figure of the edge alone says what noise and uneven light have made of it.
void DoubtReading(Record& record, const SharpnessRegion& region, const char* name) {
  QVTester tester;
  const auto read = [&](const cv::Mat& levels) {
    float mtf50 = 0;
    tester.CalculateMTF(levels, mtf50);
    return static_cast<double>(mtf50);
  };
  const std::string figure = std::string("mtf50_") + name;
  const double value = record.phase.Find(figure)->value();
  const NoiselessReading noiseless = ReadNoiseless(region.pixels, read, value, kMostOff);
  record.phase.Add(std::string("mtf50_noiseless_") + name, noiseless.value);
  const char* const path = record.inputs[0].path.c_str();
  if (value <= 0) {
    record.Say(
        Doubt::kImpossibleFigure,
        Format("%s: an MTF50 of %.4f of the %s region is none: the curve starts below one half", path, value, name),
        figure);
    return;
  }
  if (!std::isfinite(noiseless.low) || !std::isfinite(noiseless.high)) {
    record.Say(
        Doubt::kNoPlainEdge,
        Format("%s: the %s region does not show one edge with room to both sides, and its MTF50 of %.4f can't be "
               "vouched for; is the chart seen straight on, and sharp?",
               path, name, value),
        figure);
    return;
  }
  if (value >= noiseless.low * (1 - kMostOff) && value <= noiseless.high * (1 + kMostOff)) return;
  // Of both causes the one that accounts for more.
  const bool uneven = std::fabs(noiseless.in_its_light - noiseless.value) > std::fabs(value - noiseless.value) / 2;
  const Cause cause = uneven ? LightCause(IsOblique(record))
                             : NoiseCause(IsOblique(record), region, read, std::fabs(value - noiseless.value));
  record.Say(cause.doubt,
             Format("%s: the %s region reads %.4f Nyquist, and its edge without noise and in even light %.4f: %s", path,
                    name, value, noiseless.value, cause.sentence),
             figure);
}

}  // namespace

std::vector<Figure> DoubtFigures() {
  return {{"mtf50_noiseless_vertical", kNyquist, Number::kReal, nullptr, kNoiselessMethod,
           "What the test's own MTF50 of the vertical region would be without the photo's noise and in even light."},
          {"mtf50_noiseless_horizontal", kNyquist, Number::kReal, nullptr, kNoiselessMethod,
           "What the test's own MTF50 of the horizontal region would be without the photo's noise and in even light."}};
}

void DoubtSharpness(Record& record, const SharpnessFinding& finding) {
  for (std::size_t i = 0; i < finding.regions.size(); ++i) {
    if (!std::isfinite(record.phase.Find(std::string("mtf50_") + kRegionNames[i])->value())) continue;
    DoubtLevels(record, finding.photo, finding.regions[i], kRegionNames[i]);
    DoubtReading(record, finding.regions[i], kRegionNames[i]);
  }
}

}  // namespace qv
