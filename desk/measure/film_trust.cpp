#include "desk/measure/film_trust.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <limits>
#include <numeric>
#include <opencv2/core.hpp>
#include <optional>

namespace qv {

namespace {

constexpr double kLostFrom = 1.5;               // median intervals, as the tests have it
const double kOfMedian = std::sqrt(CV_PI / 2);  // its scatter over that of the mean

std::vector<double> IntervalsOf(const std::vector<double>& time) {
  std::vector<double> intervals;
  for (std::size_t i = 1; i < time.size(); ++i) intervals.push_back(time[i] - time[i - 1]);
  return intervals;
}

// The last frames of films that are decoded with a delay have no stamps: they are taken to follow at the median
// interval.
constexpr std::size_t kMostWithout = 4;

// What stamps are whole multiples of, and by how much their errors are moved: milliseconds, as Matroska has them,
// rounded; or 90,000ths of a second, which encoders cut.
struct StampStep {
  double step, moved;
};
StampStep StepOf(const std::vector<double>& time) {
  constexpr double kTolerance = 1e-6;
  const auto stamped = static_cast<std::ptrdiff_t>(std::max(time.size(), kMostWithout + 1) - kMostWithout);
  const bool whole = std::all_of(time.begin(), std::min(time.begin() + stamped, time.end()),
                                 [](double ms) { return std::fabs(ms - std::round(ms)) < kTolerance; });
  return whole ? StampStep{1, 0} : StampStep{1 / 90.0, -0.5 / 90};
}

// How many of the last frames have no stamps, it seems.
std::size_t WithoutStamps(const std::vector<double>& intervals) {
  constexpr double kEqual = 1e-6;
  const double usual = Median(intervals);
  std::size_t count = 0;
  while (count < std::min(kMostWithout, intervals.size()) &&
         std::fabs(intervals[intervals.size() - 1 - count] - usual) < kEqual)
    ++count;
  return count < 2 ? 0 : count;
}

double MeanOf(const std::vector<double>& values) {
  return std::accumulate(values.begin(), values.end(), 0.0) / static_cast<double>(values.size());
}

// By how much `count` median intervals are longer than as many of the film's own, wherever none was lost in them.
std::vector<double> OffOfMedians(const std::vector<double>& intervals, std::size_t count) {
  const double taken = Median(intervals);
  std::vector<double> off;
  for (std::size_t i = 0; count > 0 && i + 2 * count <= intervals.size(); ++i) {
    const std::vector<double> some(intervals.begin() + static_cast<std::ptrdiff_t>(i),
                                   intervals.begin() + static_cast<std::ptrdiff_t>(i + count));
    if (*std::max_element(some.begin(), some.end()) > kLostFrom * taken) continue;
    off.push_back(static_cast<double>(count) * (taken - MeanOf(some)));
  }
  return off;
}

// Of the last frame's time: its stamp's rounding; without one, what the median is off the film's own intervals, which
// are all alike where rounding alone explains how they differ.
Uncertainty OfLastTime(const std::vector<double>& intervals, const StampStep& stamps) {
  std::vector<double> off = OffOfMedians(intervals, WithoutStamps(intervals));
  if (off.empty()) off = {0};
  const auto [least, most] = std::minmax_element(off.begin(), off.end());
  if (*most - *least < 2.5 * stamps.step) off = {MeanOf(off)};
  constexpr int kParts = 40;  // of a step, as likely
  std::vector<double> errors;
  for (const double one : off) {
    for (int i = 0; i < kParts; ++i) errors.push_back(one + stamps.moved + stamps.step * ((i + 0.5) / kParts - 0.5));
  }
  return FromErrors(std::move(errors), kStampTrust);
}

// Of the longest interval: the difference of two roundings, triangular. Where several are the longest but for a step,
// rounding has made it of them: it is too long by as much as it is above their mean.
Uncertainty OfLongest(const std::vector<double>& intervals, double step) {
  const double longest = *std::max_element(intervals.begin(), intervals.end());
  std::vector<double> alike;
  std::copy_if(intervals.begin(), intervals.end(), std::back_inserter(alike),
               [=](double interval) { return interval > longest - 1.5 * step; });
  const auto count = static_cast<double>(alike.size());
  const double half = step * (1 - std::sqrt(1 - kCoverage));
  const double standard = step / std::sqrt(6.0);
  Uncertainty one = {standard, half, half / standard, kStampTrust};
  if (count < 2) return one;
  const double error = longest - MeanOf(alike);
  const double root = std::sqrt(count);
  return OffBy(error, {standard / root, half / root, one.coverage_factor, kStampTrust}, count);
}

// A smooth course between frames: the polynomial through so many of them (Lagrange), at a place counted in frames.
double Through(const std::vector<double>& course, std::ptrdiff_t first, int count, double at) {
  double sum = 0;
  for (int i = 0; i < count; ++i) {
    double weight = 1;
    for (int k = 0; k < count; ++k) {
      if (k != i) weight *= (at - static_cast<double>(first) - k) / (i - k);
    }
    sum += weight * course[first + i];
  }
  return sum;
}

double TimeAt(const std::vector<double>& time, double place) {
  const auto before = std::min(static_cast<std::size_t>(place), time.size() - 2);
  return time[before] + (place - static_cast<double>(before)) * (time[before + 1] - time[before]);
}

// What a smooth pulse is between its frames.
struct Pulse {
  const std::vector<double>& mean;
  const std::vector<double>& time;
  std::ptrdiff_t peak;

  bool HasAbout(std::ptrdiff_t first, int count) const {
    return first >= 0 && first + count <= static_cast<std::ptrdiff_t>(mean.size());
  }
  double Top() const {
    constexpr int kFrames = 5;
    constexpr int kSteps = 100;  // a frame
    if (!HasAbout(peak - kFrames / 2, kFrames)) return mean[peak];
    double top = mean[peak];
    for (int i = -kSteps / 2; i <= kSteps / 2; ++i) {
      const double at = static_cast<double>(peak) + i / static_cast<double>(kSteps);
      top = std::max(top, Through(mean, peak - kFrames / 2, kFrames, at));
    }
    return top;
  }
  // The last frame on the side of `step` that is at the level or above, with one beyond it; none where the film ends.
  std::optional<std::ptrdiff_t> LastAbove(double level, int step) const {
    for (std::ptrdiff_t i = peak; HasAbout(i + step, 1); i += step) {
      if (mean[i + step] < level) return i;
    }
    return std::nullopt;
  }
  // When it crosses the level after this frame: by the polynomial through four.
  double Crossing(double level, std::ptrdiff_t inside, int step) const {
    const std::ptrdiff_t first = std::min(inside, inside + step) - 1;
    const int frames = HasAbout(first, 4) ? 4 : 2;
    const auto within = static_cast<double>(inside);
    double low = 0;
    double high = 1;
    constexpr int kHalvings = 30;
    for (int i = 0; i < kHalvings; ++i) {
      const double middle = (low + high) / 2;
      const bool above = Through(mean, frames == 4 ? first : first + 1, frames, within + step * middle) >= level;
      (above ? low : high) = middle;
    }
    return TimeAt(time, within + step * low);
  }
  double Slope(std::ptrdiff_t inside, int step) const {
    return std::fabs((mean[inside + step] - mean[inside]) / (time[inside + step] - time[inside]));
  }
};

// Of the width by straight lines at half the highest frame's height: against the smooth pulse, and by the frames' own
// scatter, at the two flanks and, alike for both, at the height; cuts differ by `apart` between their levels.
void TrustWidth(Reading& width, const Pulse& pulse, double base, double of_frame, double of_base, double apart,
                double degrees) {
  const double level = (pulse.Top() + base) / 2;
  const double seen_level = (pulse.mean[pulse.peak] + base) / 2;
  double flanks = 0;  // squares
  double reach = 0;   // of the height, ms a level
  double smooth = 0;
  for (const int step : {-1, 1}) {
    const auto inside = pulse.LastAbove(level, step);
    const auto seen = pulse.LastAbove(seen_level, step);
    if (!inside || !seen) return;  // cut by the film's end
    const double slope = pulse.Slope(*seen, step);
    flanks += 2.0 / 3 * (of_frame * of_frame + apart * apart) / (slope * slope);  // of two frames' weighed mean
    reach += 1 / slope;
    smooth += step * pulse.Crossing(level, *inside, step);
  }
  const double scatter =
      std::sqrt(flanks + (of_frame * of_frame + of_base * of_base + 2 * apart * apart) / 4 * reach * reach);
  width.Trust({OffBy(width.value() - smooth, Combined(scatter, degrees, 0, kCourseMethod), degrees)});
}

// Levels a step: of luma, of the chroma that blue and that red have, and of both that green has (BT.601).
constexpr double kOfLuma = 255.0 / 219;
constexpr double kBlue = 2.017232;
constexpr double kRed = 1.596027;
constexpr double kGreenByBlue = -0.391762;
constexpr double kGreenByRed = -0.812968;

// What the decoder's cuts to whole levels have taken off a pixel's blue; not a number where no luma and chroma give it.
double CutOfPixel(const cv::Vec3b& bgr) {
  const double grey = 0.114 * bgr[0] + 0.587 * bgr[1] + 0.299 * bgr[2];
  const int near_blue = cvRound((bgr[0] - grey) / kBlue);
  const int near_red = cvRound((bgr[2] - grey) / kRed);
  for (const int i : {0, 1, -1}) {
    for (const int k : {0, 1, -1}) {
      const int blue = near_blue + i;
      const int red = near_red + k;
      const int of_luma = bgr[0] - cvFloor(kBlue * blue);
      if (bgr[2] - cvFloor(kRed * red) != of_luma) continue;
      if (bgr[1] - cvFloor(kGreenByBlue * blue) - cvFloor(kGreenByRed * red) != of_luma) continue;
      const double luma = std::ceil(of_luma / kOfLuma - 1e-9) * kOfLuma;
      if (luma >= of_luma + 1) continue;
      return luma - of_luma + kBlue * blue - std::floor(kBlue * blue);
    }
  }
  return std::numeric_limits<double>::quiet_NaN();
}

}  // namespace

ConversionCut CutOf(const cv::Mat& frame) {
  constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();
  constexpr int kLooks = 20'000;  // pixels, which tell the mean to 0.004 levels
  const int step = std::max(1, cvFloor(std::sqrt(static_cast<double>(frame.total()) / kLooks)));
  double sum = 0;
  double known = 0;
  double looked = 0;
  double squares = 0;
  for (int row = 0; row < frame.rows; row += step) {
    for (int column = 0; column + 1 < frame.cols; column += step) {
      const auto& pixel = frame.at<cv::Vec3b>(row, column);
      const auto [least, most] = std::minmax({pixel[0], pixel[1], pixel[2]});
      if (least == 0 || most == 255) continue;  // clipped
      const double cut = CutOfPixel(pixel);
      ++looked;
      if (std::isnan(cut)) continue;
      ++known;
      sum += cut;
      squares += std::pow(pixel[1] - frame.at<cv::Vec3b>(row, column + 1)[1], 2);
    }
  }
  constexpr double kMost = 0.99;
  if (known == 0 || known < kMost * looked) return {kUnknown, kUnknown, kUnknown};
  // Steps of luma come back to the same part of a level after so many levels; noise wider than a step takes off what
  // rounding to steps does to the mean.
  constexpr double kPeriod = kOfLuma / (kOfLuma - 1);
  const double noise = squares / known / 2;  // of a pixel, squared
  const auto left = [=](double step) {
    return step / std::sqrt(12.0) * std::exp(-2 * CV_PI * CV_PI * noise / step / step);
  };
  return {sum / known, left(kPeriod) / kPeriod, left(kOfLuma)};
}

void TrustTimes(Phase& phase, const std::vector<double>& time) {
  const std::vector<double> intervals = IntervalsOf(time);
  if (intervals.empty() || !(time.back() > 0)) return;
  const StampStep stamps = StepOf(time);
  Reading& rate = *phase.Find("mean_rate");
  const Uncertainty last = OfLastTime(intervals, stamps);
  const double share = rate.value() / time.back();
  rate.Trust({{share * last.standard, share * last.expanded, last.coverage_factor, kStampTrust}});
  phase.Find("longest_gap")->Trust({OfLongest(intervals, stamps.step)});
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

void TrustFlash(Phase& phase, const std::vector<double>& time, const ConversionCut& base_cut,
                const ConversionCut& peak_cut) {
  constexpr double kConverted = 1 / 1.7320508;  // levels, type B, of decoders whose cuts aren't known: up to one
  constexpr double kCoded = 0.2;                // levels: encoders code means of 4 x 4 pixels in steps of some 0.7
  constexpr double kQuiet = 0.1;                // of the pulse's height
  constexpr std::size_t kFewest = 8;
  const std::vector<double>& mean = phase.Find("mean")->values;
  const double peak = phase.Find("peak")->value();
  const double base = phase.Find("base")->value();
  std::vector<double> quiet;
  std::copy_if(mean.begin(), mean.end(), std::back_inserter(quiet),
               [=](double level) { return level < base + kQuiet * (peak - base); });
  const std::vector<double>& told = quiet.size() < kFewest ? mean : quiet;
  const double frame = OfFrame(told).standard;
  const auto degrees = static_cast<double>(told.size()) / 2;
  const double of_base = frame * kOfMedian / std::sqrt(std::max(1.0, static_cast<double>(quiet.size())));
  const bool known = std::isfinite(base_cut.mean) && std::isfinite(peak_cut.mean);
  const double apart = known ? std::max(base_cut.apart, peak_cut.apart) : kConverted;
  const auto of_level = [&](double scatter, double cut, double between) {
    return OffBy(known ? cut : 0, Combined(scatter, degrees, known ? between : kConverted, kCourseMethod), degrees);
  };
  phase.Find("peak")->Trust({of_level(frame, peak_cut.mean, std::hypot(kCoded, peak_cut.rounded))});
  phase.Find("base")->Trust({of_level(of_base, base_cut.mean, std::hypot(kCoded, base_cut.rounded))});
  std::vector<Uncertainty> of_frames;
  for (const double level : mean) {
    const double share = peak > base ? (level - base) / (peak - base) : 0;
    of_frames.push_back(
        of_level(frame, base_cut.mean + share * (peak_cut.mean - base_cut.mean), std::hypot(base_cut.rounded, apart)));
  }
  phase.Find("mean")->Trust(std::move(of_frames));
  const auto at = static_cast<std::ptrdiff_t>(phase.Find("peak_frame")->value());
  Reading& width = *phase.Find("width");
  if (std::isfinite(width.value())) TrustWidth(width, {mean, time, at}, base, frame, of_base, apart, degrees);
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
