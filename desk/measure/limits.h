#ifndef QVTESTER_DESK_MEASURE_LIMITS_H_
#define QVTESTER_DESK_MEASURE_LIMITS_H_

#include <map>
#include <optional>
#include <set>
#include <string>

#include "desk/base/json.h"
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
  std::set<std::string> accept_doubts;  // names of doubts that this plant lives with

  bool given() const { return !by_name.empty(); }
};

/// Reads a limits file; throws Failure (wrong usage) that names the file and what is wrong with it.
Limits ReadLimits(const std::string& path);

/// The same from a document; `where` names it in sentences.
Limits LimitsFromJson(const Json& json, const std::string& where);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LIMITS_H_
