#ifndef QVTESTER_DESK_MEASURE_DECISION_H_
#define QVTESTER_DESK_MEASURE_DECISION_H_

#include <optional>
#include <string_view>

// Verdicts that know how far a reading may be trusted (JCGM 106:2012).

namespace qv {

struct DecisionRule {
  enum class Kind {
    kSimple,            // the reading itself is held against the limit
    kGuarded,           // a unit passes when it surely keeps to the limit: its buyer's risk is small
    kGuardedRejection,  // and fails when it surely breaks it: its maker's risk is small
  };
  Kind kind = Kind::kSimple;
  double factor = 1;  // of the expanded uncertainty, by which the acceptance limit is moved

  const char* Name() const;
};

/// Of "simple", "guarded", "guarded_rejection"; nothing for any other word.
std::optional<DecisionRule::Kind> ParseDecisionRule(std::string_view word);

struct Tolerance {
  std::optional<double> min, max;
};

struct Decision {
  bool pass;
  bool near_limit;           // within the expanded uncertainty of a limit, where either verdict may be wrong
  double guard_band;         // by which the acceptance limit lies inside the limit; negative: outside
  double wrong_probability;  // that the unit is not as the verdict says
};

/// Holds a reading against its limits. `standard` and `expanded` are those of its uncertainty, 0 where there is none;
/// a reading that is no number fails for certain.
Decision Decide(double reading, double standard, double expanded, const Tolerance& limits, const DecisionRule& rule);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_DECISION_H_
