// Test 24: brightness over a film, and the flash's pulse in it.

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <limits>
#include <opencv2/videoio.hpp>

#include "desk/base/text.h"
#include "desk/measure/film_course.h"
#include "desk/measure/film_trust.h"
#include "desk/measure/heading.h"
#include "desk/measure/telling.h"
#include "desk/measure/widen.h"

namespace qv {

namespace {

constexpr Method kFrameMeans = {"mean over all pixels of the first channel of each frame",
                                "Exact for the frames as decoded.",
                                "Moved by exposure, flash and clipping; the first channel of a film's frames is blue."};
constexpr Method kWidth = {
    "width of the pulse about the peak at half height, straight lines between the frames",
    "Within {film_pulse} for pulses of three frames and more. Not a number when the peak is less than 5 levels "
    "above the "
    "base.",
    "Moved by an exposure control that answers the flash, by clipping, and by a film that cuts the pulse."};

class FlashFilmFinding : public FilmFinding {
 public:
  using FilmFinding::FilmFinding;

  std::string Report(const Record& record) const override {
    const Phase& phase = record.phase;
    const Reading& peak = *phase.Find("peak");
    const Reading& base = *phase.Find("base");
    const Reading& width = *phase.Find("width");
    std::string text = Format("frames  %.0f\n", phase.Find("frame_count")->value());
    text += Format("peak    %s of 255%s, at %.1f ms\n", ValueText(peak, 2).c_str(), LimitText(peak).c_str(),
                   PeakTime(record));
    text += Format("base    %s of 255%s\n", ValueText(base, 2).c_str(), LimitText(base).c_str());
    text += std::isfinite(width.value()) ? Format("pulse   %s ms at half height", ValueText(width, 1).c_str())
                                         : "pulse   none";
    return text + LimitText(width) + "\n";
  }

 protected:
  std::vector<Plot> Plots(const Record& record) const override {
    Plot plot = OverTime("Mean of the first channel of each frame; gaps are lost frames", "level", 255);
    plot.curves.push_back(Course("mean", record.phase.Find("mean")->values));
    const double peak = record.phase.Find("peak")->value();
    const double base = record.phase.Find("base")->value();
    const double width = record.phase.Find("width")->value();
    plot.levels.push_back({base, "base"});
    AddLimits(plot, *record.phase.Find("peak"), "peak");
    AddLimits(plot, *record.phase.Find("base"), "base");
    if (std::isfinite(width)) {
      plot.levels.push_back({(peak + base) / 2, "half height", false, kInk, Dash::kDotted});
      plot.markers = {{{PeakTime(record), peak},
                       Format("%.1f, %.1f ms wide at half height", peak, width),
                       ToneOf(*record.phase.Find("peak"))}};
    }
    return {plot};
  }

  std::vector<std::string> Shown() const override { return {"peak", "base", "width"}; }

 private:
  double PeakTime(const Record& record) const {
    return time_[static_cast<std::size_t>(record.phase.Find("peak_frame")->value())];
  }
};

// Of a frame as bright as most and of the brightest one.
std::array<ConversionCut, 2> Cuts(const QVTester& tester, QV_RESOURCE_INDEX slot, const Phase& phase) {
  constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();
  constexpr double kSame = 0.01;  // levels: the frame that was sought
  const std::vector<double>& mean = phase.Find("mean")->values;
  const double base = phase.Find("base")->value();
  const auto usual = std::min_element(mean.begin(), mean.end(), [=](double one, double other) {
    return std::fabs(one - base) < std::fabs(other - base);
  });
  const std::array<double, 2> frames = {static_cast<double>(usual - mean.begin()), phase.Find("peak_frame")->value()};
  std::array<ConversionCut, 2> cuts = {{{kUnknown, kUnknown}, {kUnknown, kUnknown}}};
  cv::VideoCapture film;
  cv::Mat frame;
  if (tester.resources_[slot]->OpenVideo(&film) != QV_SUCCESS) return cuts;
  for (std::size_t i = 0; i < frames.size(); ++i) {
    if (!film.set(cv::CAP_PROP_POS_FRAMES, frames[i]) || !film.read(frame)) continue;
    const bool same = std::fabs(cv::mean(frame)[0] - mean[static_cast<std::size_t>(frames[i])]) < kSame;
    if (same && frame.type() == CV_8UC3) cuts[i] = CutOf(frame);
  }
  return cuts;
}

class VideoFlash : public Measurement {
 public:
  const Spec& spec() const override {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    static const Spec spec = {
        "video_flash",
        QV_TEST_VIDEO_FLASH,
        nullptr,
        {{"film", QV_RESOURCE_VIDEO, "Film of a plain target while the flash fires"}},
        {{"frames",
          Parameter::kWhole,
          "N",
          "Frames to read; 0 reads all",
          nullptr,
          0,
          1'000'000,
          {},
          QV_PROPERTY_VIDEO_FLASH_FRAME_COUNT}},
        {{"frame_count", kOne, kWhole, nullptr, kStampMethod, "Frames that were read."},
         {"peak", kGreyLevel, kReal, nullptr, kFrameMeans, "Mean brightness of the brightest frame, 0 to 255."},
         {"peak_frame", kOne, kWhole, nullptr, kFrameMeans, "The brightest frame, counted from 0."},
         {"base", kGreyLevel, kReal, nullptr, kFrameMeans, "Brightness without the flash: the median of all frames."},
         {"width", kMillisecond, kReal, nullptr, kWidth, "How long the flash lasts."},
         {"mean", kGreyLevel, kReal, &kTimeAxis, kFrameMeans, "Mean brightness over time."}},
        false,
        kFilmAdvice};
    return spec;
  }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    if (!RunFilmTest(tester, spec(), request, record)) return std::make_unique<NoFilm>();
    const QVResultData& results = *tester.results_;
    const int count = results.video_flash_frame_count_;
    const std::vector<double> time = Widen(results.video_flash_time_, count);
    Phase& phase = record.phase;
    phase.Add("frame_count", count);
    phase.Add("peak", results.video_flash_peak_);
    phase.Add("peak_frame", results.video_flash_peak_frame_);
    phase.Add("base", results.video_flash_base_);
    phase.Add("width", results.video_flash_width_);
    phase.Add("mean", time, Widen(results.video_flash_mean_, count));
    const auto [base_cut, peak_cut] = Cuts(tester, spec().inputs[0].slot, phase);
    TrustFlash(phase, time, base_cut, peak_cut);
    if (count != tester.prop_video_flash_frame_count_) DoubtCutFilm(record, tester, spec().inputs[0].slot, time);
    return std::make_unique<FlashFilmFinding>(time);
  }
};

}  // namespace

const Measurement& VideoFlashMeasurement() {
  static const VideoFlash flash;
  return flash;
}

}  // namespace qv
