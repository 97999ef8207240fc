// Test 23: sharpness over a film, and when the focus settles.

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/chart_view.h"
#include "desk/measure/film_course.h"
#include "desk/measure/film_trust.h"
#include "desk/measure/heading.h"
#include "desk/measure/sharpness.h"
#include "desk/measure/telling.h"
#include "desk/measure/widen.h"

namespace qv {

namespace {

constexpr Method kSettling = {
    "running median of five measured frames, within 10 % of the median of the last fifth",
    "Within {film_settling} of the first frame in which the focus has come to stay, at up to 1 % noise.",
    "Moved by the frame rate, by noise, and by a film that ends before the lens has come to rest."};

class FocusFinding : public FilmFinding {
 public:
  using FilmFinding::FilmFinding;

  std::string Report(const Record& record) const override {
    const Phase& phase = record.phase;
    const Reading& best = *phase.Find("best_mtf50");
    const Reading& last = *phase.Find("final_mtf50");
    const Reading& settle = *phase.Find("settle_time");
    const auto frame = static_cast<std::size_t>(phase.Find("best_frame")->value());
    std::string text = Format("frames       %.0f, the chart measured in %.0f\n", phase.Find("frame_count")->value(),
                              phase.Find("measured_count")->value());
    text += Format("MTF50 best   %s Nyquist  %.4f c/p%s, in frame %zu at %.1f ms\n", ValueText(best, 4).c_str(),
                   best.value() / 2, LimitText(best).c_str(), frame, time_[frame]);
    text += Format("MTF50 final  %s Nyquist  %.4f c/p%s\n", ValueText(last, 4).c_str(), last.value() / 2,
                   LimitText(last).c_str());
    text += std::isfinite(settle.value()) ? Format("settled      at %s ms", ValueText(settle, 1).c_str())
                                          : "settled      never";
    return text + LimitText(settle) + "\n";
  }

 protected:
  std::vector<Plot> Plots(const Record& record) const override {
    const auto& vertical = record.phase.Find("mtf50_vertical")->values;
    const auto& horizontal = record.phase.Find("mtf50_horizontal")->values;
    Plot plot = OverTime("MTF50 over the film; gaps are lost frames", "MTF50, Nyquist",
                         1.2 * std::max(Highest(vertical), Highest(horizontal)));
    plot.curves.push_back(Course("vertical region", vertical));
    plot.curves.push_back(Course("horizontal region", horizontal, 1));
    const double level = record.phase.Find("final_mtf50")->value();
    const double settle = record.phase.Find("settle_time")->value();
    plot.levels.push_back({level, "final level"});
    AddLimits(plot, *record.phase.Find("settle_time"), "settled", true);
    AddLimits(plot, *record.phase.Find("best_mtf50"), "best");
    AddLimits(plot, *record.phase.Find("final_mtf50"), "final");
    if (std::isfinite(settle)) {
      plot.markers = {
          {{settle, level}, Format("settled at %.1f ms", settle), ToneOf(*record.phase.Find("settle_time"))}};
    }
    return {plot};
  }

  std::vector<std::string> Shown() const override { return {"best_mtf50", "final_mtf50", "settle_time"}; }
};

class VideoFocus : public Measurement {
 public:
  const Spec& spec() const override {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    static const Spec spec = {
        "video_autofocus",
        QV_TEST_VIDEO_AUTOFOCUS,
        nullptr,
        {{"film", QV_RESOURCE_VIDEO, "Film of the chart while the lens finds its focus"}},
        {ThresholdParameter()},
        {{"frame_count", kOne, kWhole, nullptr, kStampMethod, "Frames that could be decoded."},
         {"found_count", kOne, kWhole, nullptr, kScanMethod, "Frames that show the chart's three marks."},
         {"measured_count", kOne, kWhole, nullptr, kSfrMethod, "Frames that gave both figures."},
         {"best_frame", kOne, kWhole, nullptr, kSfrMethod, "The sharpest frame, counted from 0."},
         {"best_mtf50", kNyquist, kReal, nullptr, kSfrMethod, "Mean MTF50 of both regions in the sharpest frame."},
         {"final_mtf50", kNyquist, kReal, nullptr, kSfrMethod,
          "Mean MTF50 of both regions at the end: the median of the last fifth of the measured frames."},
         {"settle_time", kMillisecond, kReal, nullptr, kSettling,
          "When sharpness has come near its final level to stay, from the first frame; not a number when it never "
          "has."},
         {"mtf50_vertical", kNyquist, kReal, &kTimeAxis, kSfrMethod, "MTF50 of the vertical region over time."},
         {"mtf50_horizontal", kNyquist, kReal, &kTimeAxis, kSfrMethod, "MTF50 of the horizontal region over time."}},
        false,
        kFilmAdvice};
    return spec;
  }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    if (!RunFilmTest(tester, spec(), request, record)) {
      if (record.phase.code == QV_ERROR_PATTERN_NOT_FOUND) {
        record.Say(Remark::kMiss, "chart_not_found",
                   record.inputs[0].path + ": the chart was measured in none of the film's frames");
      }
      return std::make_unique<NoFilm>();
    }
    const QVResultData& results = *tester.results_;
    const int count = results.video_af_frame_count_;
    const std::vector<double> time = Widen(results.video_af_time_, count);
    const std::vector<double> vertical = Widen(results.video_af_mtf50_vertical_, count);
    Phase& phase = record.phase;
    phase.Add("frame_count", count);
    phase.Add("found_count", results.video_af_found_count_);
    phase.Add("measured_count", static_cast<double>(std::count_if(vertical.begin(), vertical.end(),
                                                                  [](double value) { return std::isfinite(value); })));
    phase.Add("best_frame", results.video_af_best_frame_);
    phase.Add("best_mtf50", results.video_af_best_mtf50_);
    phase.Add("final_mtf50", results.video_af_final_mtf50_);
    phase.Add("settle_time", results.video_af_settle_time_);
    phase.Add("mtf50_vertical", time, vertical);
    phase.Add("mtf50_horizontal", time, Widen(results.video_af_mtf50_horizontal_, count));
    TrustFocus(phase, time);
    DoubtCutFilm(record, tester, spec().inputs[0].slot, time);
    return std::make_unique<FocusFinding>(time);
  }
};

}  // namespace

const Measurement& VideoFocusMeasurement() {
  static const VideoFocus focus;
  return focus;
}

}  // namespace qv
