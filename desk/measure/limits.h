#ifndef QVTESTER_DESK_MEASURE_LIMITS_H_
#define QVTESTER_DESK_MEASURE_LIMITS_H_

#include <map>
#include <optional>
#include <set>
#include <string>

#include "desk/base/json.h"
#include "desk/measure/decision.h"
#include "desk/measure/figures.h"

namespace qv {

/// What a value must keep to; beyond the marginal bounds it passes, marked.
struct Limit {
  std::optional<double> min, max, marginal_min, marginal_max;
  bool given() const { return min || max || marginal_min || marginal_max; }
};

/// Of a figure: of its value, or of each entry of a list, but for those that have a limit of their own.
struct FigureLimit : Limit {
  std::map<int, Limit> by_number;  // of a list whose entries are numbered: patches, areas

  bool given() const { return Limit::given() || !by_number.empty(); }
  const Limit& Of(double number) const;
};

struct Limits {
  std::string name, revision;
  DecisionRule rule;
  std::map<std::string, FigureLimit> by_name;
  std::set<std::string> accept_doubts;  // names of doubts that this plant lives with

  bool given() const { return !by_name.empty(); }
};

/// What a limits file calls the entries of a list over this axis: "patches"; empty where they have no numbers.
std::string EntriesName(const Unit& axis);

/// Reads a limits file; throws Failure (wrong usage) that names the file and what is wrong with it.
Limits ReadLimits(const std::string& path);

/// The same from a document; `where` names it in sentences.
Limits LimitsFromJson(const Json& json, const std::string& where);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LIMITS_H_
