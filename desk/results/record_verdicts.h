#ifndef QVTESTER_DESK_RESULTS_RECORD_VERDICTS_H_
#define QVTESTER_DESK_RESULTS_RECORD_VERDICTS_H_

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "desk/results/judge.h"

namespace qv {

/// Under one set of limits. Nothing may be said of the run where the rule asks for a guard band that nobody knows.
struct RecordVerdict {
  std::string outcome;
  bool unknown_band = false;
};

/// A run's list, or a value under a rule that moves the acceptance limit.
struct RecordVerdicts {
  std::string name, unit;
  bool list = false;
  RecordVerdict before, after;
};

/// By run. The values of lists and the expanded uncertainties stand in the records alone, so these are read: only runs
/// of measurements of which these are asked for. Before is what the record says, or what `against` would.
std::map<std::int64_t, std::vector<RecordVerdicts>> VerdictsOnRecords(Store& store, const Selection& selection,
                                                                      const ArchiveLimits& now,
                                                                      const ArchiveLimits* against);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_RECORD_VERDICTS_H_
