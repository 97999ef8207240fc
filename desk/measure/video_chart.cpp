// Tests 25 and 26: frames and time stamps of a film, and the chart in it.

#include <algorithm>
#include <limits>

#include "desk/base/text.h"
#include "desk/measure/chart_view.h"
#include "desk/measure/film_course.h"
#include "desk/measure/film_trust.h"
#include "desk/measure/telling.h"
#include "desk/measure/widen.h"

namespace qv {

namespace {

class ChartFilmFinding : public FilmFinding {
 public:
  using FilmFinding::FilmFinding;

  std::string Report(const Record& record) const override {
    const auto line = [&](const char* label, const char* figure, const char* form) {
      const Reading& m = *record.phase.Find(figure);
      return label + std::to_string(static_cast<long long>(m.value())) + form + LimitText(m) + "\n";
    };
    const Reading& rate = *record.phase.Find("mean_rate");
    const Reading& gap = *record.phase.Find("longest_gap");
    std::string text = line("frames   ", "frame_count", "");
    text += line("promised ", "frames_promised", " by the container");
    text += line("lost     ", "frames_lost", Places().c_str());
    text += line("bad      ", "frames_bad", " could not be decoded");
    text += Format("rate     %s frames/s%s, longest gap %s ms%s\n", ValueText(rate, 3).c_str(), LimitText(rate).c_str(),
                   ValueText(gap, 1).c_str(), LimitText(gap).c_str());
    const bool one = record.phase.Find("found_count")->value() == 1;
    return text +
           line("chart    ", "found_count", one ? " frame shows its three marks" : " frames show its three marks");
  }

 protected:
  std::vector<Plot> Plots(const Record& record) const override {
    std::vector<double> intervals(time_.size(), std::numeric_limits<double>::quiet_NaN());
    for (std::size_t i = 1; i < time_.size(); ++i) intervals[i] = time_[i] - time_[i - 1];
    Plot timing =
        OverTime("Interval to the frame before; red where frames are lost", "interval, ms", 1.3 * Highest(intervals));
    timing.curves.push_back(Course("interval", intervals));
    AddLimits(timing, *record.phase.Find("longest_gap"), "longest gap");
    for (const FilmGap& gap : gaps_) {
      timing.markers.push_back({{time_[gap.after], intervals[gap.after]}, Format("%d lost", gap.lost), kPoor});
    }
    if (timing.markers.size() > 12) {
      for (Plot::Marker& marker : timing.markers) marker.text.clear();  // they would cover each other
    }
    std::vector<double> angles = record.phase.Find("angle")->values;
    for (double& angle : angles) angle = angle < 0 ? std::numeric_limits<double>::quiet_NaN() : angle;
    Plot turning = OverTime("Angle of the chart, 315 is upright; none where it was not found", "angle, degrees", 360);
    turning.curves.push_back(BrokenAtFullTurns(Course("angle", angles)));
    return {timing, turning};
  }

  std::vector<std::string> Shown() const override {
    return {"frames_lost", "frames_bad", "mean_rate", "longest_gap", "found_count"};
  }

 private:
  // From 359 degrees on to 0 the chart has hardly turned.
  static Plot::Curve BrokenAtFullTurns(Plot::Curve curve) {
    constexpr double kNone = std::numeric_limits<double>::quiet_NaN();
    for (std::size_t i = 1; i < curve.points.size(); ++i) {
      if (std::fabs(curve.points[i].y - curve.points[i - 1].y) <= 180) continue;
      if (!std::isfinite(curve.points[i].y) || !std::isfinite(curve.points[i - 1].y)) continue;
      curve.points.insert(curve.points.begin() + static_cast<std::ptrdiff_t>(i), {kNone, kNone});
    }
    return curve;
  }

  std::string Places() const {
    std::string places;
    for (std::size_t i = 0; i < gaps_.size() && i < 5; ++i) {
      places += Format("%s %d after frame %d", i == 0 ? ":" : ",", gaps_[i].lost, gaps_[i].before);
    }
    return places + (gaps_.size() > 5 ? ", ..." : "");
  }
};

class VideoChart : public Measurement {
 public:
  explicit VideoChart(bool record) : record_(record) {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    spec_.name = record ? "video_record" : "video_play";
    spec_.test = record ? QV_TEST_VIDEO_RECORD : QV_TEST_VIDEO_PLAY;
    spec_.inputs = {{"film", record ? QV_RESOURCE_RECORDED_VIDEO : QV_RESOURCE_VIDEO,
                     record ? "Film of the chart that the phone has recorded" : "Film of the phone that plays one"}};
    spec_.parameters = {ThresholdParameter()};
    spec_.advice = kFilmAdvice;
    spec_.figures = {
        {"frame_count", kOne, kWhole, nullptr, kStampMethod, "Frames that could be decoded."},
        {"frames_promised", kOne, kWhole, nullptr, kStampMethod,
         "Frames that the container promises; 0 where it says nothing."},
        {"frames_lost", kOne, kWhole, nullptr, kStampMethod,
         "Frames missing in gaps of more than 1.5 times the median interval."},
        {"frames_bad", kOne, kWhole, nullptr, kStampMethod, "Frames that could not be decoded."},
        {"mean_rate", kPerSecond, kReal, nullptr, kStampMethod, "Frames a second, from first to last."},
        {"longest_gap", kMillisecond, kReal, nullptr, kStampMethod, "Longest interval between two frames."},
        {"found_count", kOne, kWhole, nullptr, kScanMethod, "Frames that show the chart's three marks."},
        {"mark_count", kOne, kWhole, &kTimeAxis, kScanMethod, "Marks found over time."},
        {"angle", kDegree, kReal, &kTimeAxis, kScanMethod, "Angle of the chart over time; -1 without three marks."},
        {"corner_row", kPixel, kReal, &kTimeAxis, kScanMethod, "Row of the corner mark over time; -1 without three."},
        {"corner_column", kPixel, kReal, &kTimeAxis, kScanMethod, "Column of the corner mark over time."}};
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    const bool found = RunFilmTest(tester, spec_, request, record);
    const QVVideoChartResult& result = record_ ? tester.results_->video_record_ : tester.results_->video_play_;
    if (result.frame_count_ == 0) return std::make_unique<NoFilm>();
    AddFigures(record.phase, result);
    SayWhatIsOdd(record, result, found);
    const std::vector<double> time = Widen(result.time_, result.frame_count_);
    DoubtCutFilm(record, tester, spec_.inputs[0].slot, time);
    return std::make_unique<ChartFilmFinding>(time);
  }

 private:
  static void AddFigures(Phase& phase, const QVVideoChartResult& result) {
    const int count = result.frame_count_;
    const std::vector<double> time = Widen(result.time_, count);
    phase.Add("frame_count", count);
    phase.Add("frames_promised", result.frames_promised_);
    phase.Add("frames_lost", result.frames_lost_);
    phase.Add("frames_bad", result.frames_bad_);
    phase.Add("mean_rate", result.mean_rate_);
    phase.Add("longest_gap", result.longest_gap_);
    TrustTimes(phase, time);
    phase.Add("found_count", result.found_count_);
    phase.Add("mark_count", time, Widen(result.mark_count_, count));
    phase.Add("angle", time, Widen(result.angle_, count));
    phase.Add("corner_row", time, Widen(result.corner_row_, count));
    phase.Add("corner_column", time, Widen(result.corner_column_, count));
  }

  static void SayWhatIsOdd(Record& record, const QVVideoChartResult& result, bool found) {
    const std::string& path = record.inputs[0].path;
    const long long read = static_cast<long long>(result.frame_count_) + result.frames_bad_;
    if (!found) {
      record.Say(Remark::kMiss, "chart_not_found",
                 Format("%s: none of %d frames shows the chart's three marks; %d lost, %d could not be decoded",
                        path.c_str(), result.frame_count_, result.frames_lost_, result.frames_bad_));
    }
    if (result.frames_promised_ > read + result.frames_lost_) {
      record.Say(Remark::kWarning, "film_cut",
                 Format("%s: the container promises %d frames, and only %lld are there; is the film cut?", path.c_str(),
                        result.frames_promised_, read),
                 "frames_promised");
    } else if (result.frames_promised_ > 0 && result.frames_promised_ < result.frame_count_) {
      record.Say(Remark::kWarning, "film_in_fragments",
                 Format("%s: the container promises %d frames, and %d were read; of a film in fragments the rest may "
                        "not have been",
                        path.c_str(), result.frames_promised_, result.frame_count_),
                 "frames_promised");
    } else if (result.frames_promised_ == 0) {
      record.Say(Remark::kWarning, "no_promise",
                 path +
                     ": the file promises no number of frames, as bare streams do; these hold no time stamps either, "
                     "and frames that they lost can't be seen",
                 "frames_lost");
    }
  }

  bool record_;
  Spec spec_;
};

}  // namespace

const Measurement& VideoChartMeasurement(bool record) {
  static const VideoChart recorded(true);
  static const VideoChart played(false);
  return record ? recorded : played;
}

}  // namespace qv
