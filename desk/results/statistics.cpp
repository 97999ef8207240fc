#include "desk/results/statistics.h"

#include <algorithm>
#include <boost/math/distributions/chi_squared.hpp>
#include <boost/math/distributions/normal.hpp>
#include <cmath>
#include <limits>

#include "desk/base/failure.h"

namespace qv {

namespace {

constexpr double kTail = 0.025;  // on each side of a 95 % interval

bool Inside(double value, const Bounds& bounds) {
  return std::isfinite(value) && !(bounds.min && value < *bounds.min) && !(bounds.max && value > *bounds.max);
}

// Probability of a normal value within the bounds.
double ShareWithin(double mean, double deviation, const Bounds& bounds) {
  if (deviation <= 0) return Inside(mean, bounds) ? 1 : 0;
  const boost::math::normal normal(mean, deviation);
  return (bounds.max ? cdf(normal, *bounds.max) : 1) - (bounds.min ? cdf(normal, *bounds.min) : 0);
}

}  // namespace

void Moments::Add(double value) {
  if (!std::isfinite(value)) {
    ++not_finite_;
    return;
  }
  ++count_;
  const double off = value - mean_;
  mean_ += off / static_cast<double>(count_);
  squares_ += off * (value - mean_);
  min_ = count_ == 1 ? value : std::min(min_, value);
  max_ = count_ == 1 ? value : std::max(max_, value);
}

double Moments::deviation() const {
  if (count_ < 2) return std::numeric_limits<double>::quiet_NaN();
  return std::sqrt(squares_ / static_cast<double>(count_ - 1));
}

Capability CapabilityOf(const Moments& moments, const Bounds& bounds) {
  Capability result;
  const double s = moments.deviation();
  if (!(s > 0) || (!bounds.min && !bounds.max)) return result;
  const auto degrees = static_cast<double>(moments.count() - 1);
  if (bounds.min && bounds.max) {
    const boost::math::chi_squared spread(degrees);
    const double cp = (*bounds.max - *bounds.min) / (6 * s);
    result.cp = Interval{cp, cp * std::sqrt(quantile(spread, kTail) / degrees),
                         cp * std::sqrt(quantile(complement(spread, kTail)) / degrees)};
  }
  double cpk = std::numeric_limits<double>::infinity();
  if (bounds.min) cpk = std::min(cpk, (moments.mean() - *bounds.min) / (3 * s));
  if (bounds.max) cpk = std::min(cpk, (*bounds.max - moments.mean()) / (3 * s));
  const double z = quantile(complement(boost::math::normal(), kTail));
  const double half = z * std::sqrt(1 / (9 * (degrees + 1)) + cpk * cpk / (2 * degrees));
  result.cpk = Interval{cpk, cpk - half, cpk + half};
  return result;
}

LimitsEffect EffectOf(const std::vector<UncertainValue>& readings, const Bounds& bounds) {
  Moments moments;
  double squares = 0;
  bool known = !readings.empty();
  for (const UncertainValue& reading : readings) {
    moments.Add(reading.value);
    squares += reading.uncertainty * reading.uncertainty;
    known = known && reading.uncertainty > 0;
  }
  const auto all = static_cast<double>(readings.size());
  const double variance = moments.deviation() * moments.deviation();
  const double true_variance = std::max(0.0, variance - squares / all);
  LimitsEffect effect;
  double accepts = 0;
  double rejects = 0;
  for (const UncertainValue& reading : readings) {
    const bool inside = Inside(reading.value, bounds);
    effect.yield += (inside ? 1 : 0) / all;
    if (!known || !std::isfinite(reading.value)) continue;
    // What is true, given the reading: normal, between the reading and the mean.
    const double error = reading.uncertainty * reading.uncertainty;
    const double weight = true_variance / (true_variance + error);
    const double within =
        ShareWithin(moments.mean() + weight * (reading.value - moments.mean()), std::sqrt(weight * error), bounds);
    (inside ? accepts : rejects) += (inside ? 1 - within : within) / all;
  }
  if (known && moments.count() > 1) {
    effect.false_accepts = accepts;
    effect.false_rejects = rejects;
  }
  return effect;
}

Bounds ProposeBounds(const Moments& moments, double cpk, const Bounds& sides) {
  Bounds bounds;
  const double reach = 3 * cpk * moments.deviation();
  const bool both = !sides.min && !sides.max;
  if (sides.min || both) bounds.min = moments.mean() - reach;
  if (sides.max || both) bounds.max = moments.mean() + reach;
  return bounds;
}

LabelStudy StudyLabels(const std::vector<double>& good, const std::vector<double>& bad) {
  if (good.empty() || bad.empty()) throw Failure(kWrongUsage, "no good or no bad unit has this figure");
  std::vector<std::pair<double, bool>> readings;  // value, bad
  for (const double value : good) readings.emplace_back(value, false);
  for (const double value : bad) readings.emplace_back(value, true);
  for (const auto& [value, is_bad] : readings) {
    if (!std::isfinite(value)) throw Failure(kWrongUsage, "a labelled unit has a value that is not finite");
  }
  std::sort(readings.begin(), readings.end());
  LabelStudy study;
  study.good = static_cast<std::int64_t>(good.size());
  study.bad = static_cast<std::int64_t>(bad.size());

  // Pairs in which the bad unit reads lower: the area under the curve, by ranks.
  double lower = 0;
  std::int64_t bad_below = 0;
  std::int64_t good_below = 0;
  struct Below {
    double value;
    std::int64_t good, bad;            // strictly below
    std::int64_t good_here, bad_here;  // at the value
  };
  std::vector<Below> steps;
  for (std::size_t i = 0; i < readings.size();) {
    Below step = {readings[i].first, good_below, bad_below, 0, 0};
    for (; i < readings.size() && readings[i].first == step.value; ++i)
      ++(readings[i].second ? step.bad_here : step.good_here);
    lower += static_cast<double>(step.good_here) *
             (static_cast<double>(bad_below) + 0.5 * static_cast<double>(step.bad_here));
    good_below += step.good_here;
    bad_below += step.bad_here;
    steps.push_back(step);
  }
  lower /= static_cast<double>(study.good) * static_cast<double>(study.bad);
  study.low_is_bad = lower >= 0.5;
  study.area = study.low_is_bad ? lower : 1 - lower;
  for (const Below& step : steps) {
    const LimitTrial trial =
        study.low_is_bad ? LimitTrial{step.value, study.bad - step.bad, step.good}
                         : LimitTrial{step.value, step.bad + step.bad_here, study.good - step.good - step.good_here};
    study.trials.push_back(trial);
  }
  return study;
}

}  // namespace qv
