#include "desk/measure/film_trust.h"

#include <algorithm>
#include <cmath>
#include <opencv2/core.hpp>

namespace qv {

namespace {

const double kOfMedian = std::sqrt(CV_PI / 2);  // its scatter over that of the mean

std::vector<double> IntervalsOf(const std::vector<double>& time) {
  std::vector<double> intervals;
  for (std::size_t i = 1; i < time.size(); ++i) intervals.push_back(time[i] - time[i - 1]);
  return intervals;
}

// The step of the stamps: of whole milliseconds, as Matroska has them, or of a 90,000th of a second.
double StampStep(const std::vector<double>& time) {
  constexpr double kTolerance = 1e-6;
  const bool whole =
      std::all_of(time.begin(), time.end(), [](double ms) { return std::fabs(ms - std::round(ms)) < kTolerance; });
  return whole ? 1 : 1 / 90.0;
}

// Of the last stamp, where the film has none for its last frames and they were taken to follow at the median interval:
// as far as intervals are from that, and four times what the stamps' step rounds it by.
double OffAtEnd(const std::vector<double>& intervals, double step) {
  const double usual = Median(intervals);
  constexpr double kEqual = 1e-6;
  const auto follows = [&](std::size_t i) { return std::fabs(intervals[i] - usual) < kEqual; };
  if (intervals.size() < 3 || !follows(intervals.size() - 1) || !follows(intervals.size() - 2)) return 0;
  std::vector<double> off;
  for (const double interval : intervals) off.push_back(std::fabs(interval - usual));
  return std::hypot(1.4826 * Median(off), 4 * step / 2 / std::sqrt(3.0));
}

// How fast the brightness goes through this level next to the peak, on the side of `step`; levels a ms.
double SlopeAt(const std::vector<double>& mean, const std::vector<double>& time, std::size_t peak, double level,
               int step) {
  const auto count = static_cast<std::ptrdiff_t>(mean.size());
  for (auto i = static_cast<std::ptrdiff_t>(peak); i + step >= 0 && i + step < count; i += step) {
    if (mean[i + step] < level) return std::fabs((mean[i + step] - mean[i]) / (time[i + step] - time[i]));
  }
  return 0;
}

}  // namespace

void TrustTimes(Phase& phase, const std::vector<double>& time) {
  const std::vector<double> intervals = IntervalsOf(time);
  if (intervals.empty() || !(time.back() > 0)) return;
  const double step = StampStep(time);
  const double off = std::hypot(step / std::sqrt(6.0), OffAtEnd(intervals, step));  // of two stamps, both rectangular
  Reading& rate = *phase.Find("mean_rate");
  rate.Trust({Combined(0, 1, rate.value() * off / time.back(), kStampTrust)});
  phase.Find("longest_gap")->Trust({Combined(0, 1, off, kStampTrust)});
}

Uncertainty OfFrame(const std::vector<double>& course) {
  std::vector<double> known;
  std::copy_if(course.begin(), course.end(), std::back_inserter(known),
               [](double value) { return std::isfinite(value); });
  constexpr std::size_t kFewest = 5;
  if (known.size() < kFewest) return FromErrors({}, kCourseMethod);
  Uncertainty u = OfMeanLevel(cv::Mat(known).reshape(1, 1));
  const double root = std::sqrt(static_cast<double>(known.size()));
  return {u.standard * root, u.expanded * root, u.coverage_factor, kCourseMethod};
}

void TrustFlash(Phase& phase, const std::vector<double>& time) {
  const std::vector<double>& mean = phase.Find("mean")->values;
  const Uncertainty frame = OfFrame(mean);
  const double peak = phase.Find("peak")->value();
  const double base = phase.Find("base")->value();
  const auto quiet = std::count_if(mean.begin(), mean.end(), [=](double level) { return level < (peak + base) / 2; });
  const double of_base = kOfMedian / std::sqrt(std::max(1.0, static_cast<double>(quiet)));
  // Type B, of all frames alike: colours between luma and chroma of whole levels, and back, are off by up to one.
  constexpr double kConverted = 1 / 1.7320508;
  const auto freedom = static_cast<double>(mean.size()) / 2;
  const auto of_level = [&](double share) {
    return Combined(share * frame.standard, freedom, kConverted, kCourseMethod);
  };
  phase.Find("peak")->Trust({of_level(1)});
  phase.Find("base")->Trust({of_level(of_base)});
  phase.Find("mean")->Trust(std::vector<Uncertainty>(mean.size(), of_level(1)));

  const auto at = static_cast<std::size_t>(phase.Find("peak_frame")->value());
  const double height = frame.standard / 2 * std::hypot(1, of_base);  // of the level half-way
  double squares = 0;
  for (const int step : {-1, 1}) {
    const double slope = SlopeAt(mean, time, at, (peak + base) / 2, step);
    if (slope == 0) return;  // cut by the film's end
    squares += std::pow(std::hypot(frame.standard, height) / slope, 2);
  }
  // Type B: peak and flanks lie between frames, up to 0.4 intervals over the pulse's own number of them.
  Reading& width = *phase.Find("width");
  const double interval = Median(IntervalsOf(time));
  const double between = 0.4 / std::sqrt(3.0) * interval * interval / width.value();
  width.Trust({Combined(std::sqrt(squares), static_cast<double>(mean.size()), between, kCourseMethod)});
}

void TrustFocus(Phase& phase, const std::vector<double>& time) {
  std::vector<double> level = phase.Find("mtf50_vertical")->values;
  const std::vector<double>& other = phase.Find("mtf50_horizontal")->values;
  for (const char* course : {"mtf50_vertical", "mtf50_horizontal"}) {
    Reading& reading = *phase.Find(course);
    reading.Trust(std::vector<Uncertainty>(reading.values.size(), OfFrame(reading.values)));
  }
  for (std::size_t i = 0; i < level.size(); ++i) level[i] = (level[i] + other[i]) / 2;
  const Uncertainty frame = OfFrame(level);
  phase.Find("best_mtf50")->Trust({frame});
  const auto measured = std::count_if(level.begin(), level.end(), [](double value) { return std::isfinite(value); });
  constexpr double kApart = 1.5;  // a codec makes neighbouring frames alike: they count by two thirds
  const double of_last = kOfMedian / std::sqrt(std::max(1.0, std::ceil(static_cast<double>(measured) / 5) / kApart));
  phase.Find("final_mtf50")
      ->Trust({{frame.standard * of_last, frame.expanded * of_last, frame.coverage_factor, kCourseMethod}});
  constexpr double kInterval = 1.1;  // of which 95 % are a frame to either side, and its stamp's step
  phase.Find("settle_time")->Trust({Rectangular(kInterval * Median(IntervalsOf(time)), kStampTrust)});
}

}  // namespace qv
