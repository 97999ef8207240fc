#ifndef QVTESTER_DESK_RESULTS_STATISTICS_H_
#define QVTESTER_DESK_RESULTS_STATISTICS_H_

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "desk/results/run.h"

// What is computed of many readings of one figure. Everything in double, one pass, in the order given.

namespace qv {

/// Count, mean, deviation and extremes, by Welford's recurrence. What is not finite is counted apart and enters
/// nothing.
class Moments {
 public:
  void Add(double value);

  std::int64_t count() const { return count_; }
  std::int64_t not_finite() const { return not_finite_; }
  double mean() const { return mean_; }
  /// Of a sample, with n - 1; NaN for fewer than two values.
  double deviation() const;
  double min() const { return min_; }
  double max() const { return max_; }

 private:
  std::int64_t count_ = 0, not_finite_ = 0;
  double mean_ = 0, squares_ = 0, min_ = 0, max_ = 0;
};

struct Interval {
  double value = 0, low = 0, high = 0;  // with its 95 % bounds
};

/// How the spread sits between the limits, for values that are normally distributed.
struct Capability {
  std::optional<Interval> cp;   // (max - min) / 6 s; bounds from the chi-square distribution of s; needs both limits
  std::optional<Interval> cpk;  // distance of the mean to the nearer limit / 3 s; bounds by Bissell's approximation
};
/// Nothing with fewer than two values, without a spread or without limits.
Capability CapabilityOf(const Moments& moments, const Bounds& bounds);

/// One reading of a gauge study.
struct GaugeReading {
  std::string part, operator_name;
  double value = 0;
};

struct VarianceRow {
  double sum_of_squares = 0, mean_square = 0;
  int degrees = 0;
  double f = 0, p = 0;  // of the last row: not used
};

struct GaugeComponent {
  const char* name = nullptr;
  double deviation = 0;             // standard deviation
  double percent_of_total = 0;      // of the total deviation
  double percent_contribution = 0;  // of the total variance
};

/// Gauge repeatability and reproducibility by analysis of variance, as AIAG's manual (Measurement Systems Analysis, 4th
/// edition) does it: parts and operators crossed, both random. Where the interaction's p exceeds 0.25 it is pooled with
/// repeatability. Negative components are zero.
struct GaugeStudy {
  int parts = 0, operators = 0, trials = 0;
  VarianceRow part, operators_row, interaction, repeatability, total;
  bool pooled = false;
  GaugeComponent equipment, appraiser, interaction_part, gauge, part_to_part, all;
  int distinct_categories = 0;      // 1.41 x parts' deviation / gauge's, cut to a whole number, at least 1
  double percent_of_tolerance = 0;  // 6 x gauge's deviation / (max - min); NaN without both limits
};

/// Throws Failure (wrong usage) unless every operator measured every part equally often, at least two of each, at least
/// twice; a value that is not finite is refused too.
GaugeStudy StudyGauge(const std::vector<GaugeReading>& readings, const Bounds& bounds);

/// A reading and its standard uncertainty.
struct UncertainValue {
  double value = 0, uncertainty = 0;
};

/// What limits would have done to these readings. False accepts and rejects are expected numbers: the true values are
/// taken to be normally distributed about their mean, with the readings' variance less the mean squared uncertainty,
/// and each reading's error to be normal with its uncertainty (JCGM 106).
struct LimitsEffect {
  double yield = 0;                                    // share of readings within
  std::optional<double> false_accepts, false_rejects;  // shares of all readings; nothing where uncertainty is not known
};
LimitsEffect EffectOf(const std::vector<UncertainValue>& readings, const Bounds& bounds);

/// Limits that the readings' mean and deviation would meet at this Cpk, on the sides that `sides` has (both where it
/// has none).
Bounds ProposeBounds(const Moments& moments, double cpk, const Bounds& sides);

/// A limit tried on units known to be good and bad.
struct LimitTrial {
  double limit = 0;
  std::int64_t escapes = 0, false_rejects = 0;
};
struct LabelStudy {
  bool low_is_bad = false;  // the limit is a minimum
  std::int64_t good = 0, bad = 0;
  double area = 0;                 // probability that a bad unit reads worse than a good one; ties count half
  std::vector<LimitTrial> trials;  // by limit, ascending; a limit at each reading, and between readings the one below
};
/// Throws Failure (wrong usage) without a good and a bad unit, or with a value that is not finite.
LabelStudy StudyLabels(const std::vector<double>& good, const std::vector<double>& bad);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_STATISTICS_H_
