#ifndef QVTESTER_DESK_RESULTS_JUDGE_H_
#define QVTESTER_DESK_RESULTS_JUDGE_H_

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "desk/measure/decision.h"
#include "desk/results/store.h"

// An archive judged again, without measuring.

namespace qv {

/// Of a list: what each entry must keep to, but for those with bounds of their own.
struct ListBounds {
  Bounds each;
  std::map<int, Bounds> by_number;
};

/// Limits as an archive is judged by them: bounds by the figures' names, and the doubts that are accepted.
struct ArchiveLimits {
  std::map<std::string, Bounds> by_name;
  std::set<std::string> accepted_doubts;
  std::map<std::string, ListBounds> lists = {};
  DecisionRule rule = {};  // by which each value is held against its bounds; guard bands are the records' own
};

/// "PASS" or "FAIL"; what is not finite fails.
const char* VerdictOf(double value, const Bounds& bounds);

/// How many of each.
struct Tally {
  std::map<std::string, std::int64_t> by_outcome;

  void Add(const std::string& outcome) { ++by_outcome[outcome]; }
  std::int64_t of(const std::string& outcome) const;
  std::int64_t total() const;
  /// PASS among all that were judged (PASS, FAIL, ERROR, UNSET); NaN when none was.
  double yield() const;
};

struct JudgedFigure {
  std::string step, name, unit;
  Tally before, after;
};

struct Change {
  std::string unit, step, measurement;
  std::string figure;  // empty: the run's own verdict
  double value = 0;    // of a figure that was measured
  std::string before, after;
};

struct Judgement {
  Tally runs_before, runs_after;
  Tally units_before, units_after;  // of each unit, the worst of its latest runs of each step
  std::vector<JudgedFigure> figures;
  std::vector<Change> changes;
  std::vector<std::string> idle_limits;  // limits on what no run of the archive measures
};

/// Judges by `now` as a measurement would: a list that lacks an entry with bounds of its own is UNSET, and a run is an
/// ERROR where the rule asks for an uncertainty that its record does not hold. Before is what the store holds, or what
/// `against` would say. Throws Failure (wrong usage) where no run measures anything that `now` limits.
Judgement JudgeAgain(Store& store, const Selection& selection, const ArchiveLimits& now, const ArchiveLimits* against);

/// The verdict on units whose runs come in: of each unit, the worst of the latest runs of each plan, step, measurement.
class UnitVerdicts {
 public:
  void Add(const RunRow& row, const std::string& outcome);
  Tally tally() const;

 private:
  struct Latest {
    std::int64_t start = 0;
    std::string outcome;
  };
  std::map<std::string, std::map<std::string, Latest>> units_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_JUDGE_H_
