#include "desk/measure/decision.h"

#include <array>
#include <cmath>
#include <limits>

namespace qv {

namespace {

struct RuleRow {
  DecisionRule::Kind kind;
  const char* name;
  int side;  // of the limit, on which the acceptance limit lies: 1 inside, -1 outside
};
constexpr std::array<RuleRow, 3> kRules = {{{DecisionRule::Kind::kSimple, "simple", 0},
                                            {DecisionRule::Kind::kGuarded, "guarded", 1},
                                            {DecisionRule::Kind::kGuardedRejection, "guarded_rejection", -1}}};

const RuleRow& RowOf(DecisionRule::Kind kind) {
  for (const RuleRow& row : kRules) {
    if (row.kind == kind) return row;
  }
  return kRules[0];
}

// Of a normal distribution about 0; all on one side of it where it has no width.
double ShareBelow(double x, double standard) {
  if (standard == 0) return x >= 0 ? 1 : 0;
  return 0.5 * std::erfc(-x / standard / std::sqrt(2.0));
}

}  // namespace

const char* DecisionRule::Name() const { return RowOf(kind).name; }

std::optional<DecisionRule::Kind> ParseDecisionRule(std::string_view word) {
  for (const RuleRow& row : kRules) {
    if (word == row.name) return row.kind;
  }
  return std::nullopt;
}

Decision Decide(double reading, double standard, double expanded, const Tolerance& limits, const DecisionRule& rule) {
  constexpr double kFar = std::numeric_limits<double>::infinity();
  const double min = limits.min.value_or(-kFar);
  const double max = limits.max.value_or(kFar);
  const double guard = RowOf(rule.kind).side * rule.factor * expanded;
  Decision decision = {reading >= min + guard && reading <= max - guard, false, guard, 0};
  if (!std::isfinite(reading)) return {false, false, guard, 0};
  decision.near_limit = expanded > 0 && (std::fabs(reading - min) <= expanded || std::fabs(reading - max) <= expanded);
  const double below = limits.min ? ShareBelow(reading - min, standard) : 1;  // share that lies at min or above
  const double above = limits.max ? ShareBelow(max - reading, standard) : 1;
  const double conforming = below + above - 1;
  decision.wrong_probability = decision.pass ? 1 - conforming : conforming;
  return decision;
}

}  // namespace qv
