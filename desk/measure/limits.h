#ifndef QVTESTER_DESK_MEASURE_LIMITS_H_
#define QVTESTER_DESK_MEASURE_LIMITS_H_

#include <map>
#include <optional>
#include <string>

#include "desk/measure/decision.h"

namespace qv {

/// What a figure must keep to; beyond the marginal bounds it passes, marked.
struct Limit {
  std::optional<double> min, max, marginal_min, marginal_max;
  bool given() const { return min || max || marginal_min || marginal_max; }
};

struct Limits {
  std::string name, revision;
  DecisionRule rule;
  std::map<std::string, Limit> by_name;

  bool given() const { return !by_name.empty(); }
};

/// Reads a limits file; throws Failure (wrong usage) that names the file and what is wrong with it.
Limits ReadLimits(const std::string& path);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LIMITS_H_
