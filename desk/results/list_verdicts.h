#ifndef QVTESTER_DESK_RESULTS_LIST_VERDICTS_H_
#define QVTESTER_DESK_RESULTS_LIST_VERDICTS_H_

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "desk/results/judge.h"

namespace qv {

/// A run's list under limits for lists.
struct ListVerdict {
  std::string name, unit, before, after;
};

/// By run. The values of lists stand in the records alone, so these are read: only runs of measurements whose lists are
/// limited. Before is what the record says, or what `against` would.
std::map<std::int64_t, std::vector<ListVerdict>> VerdictsOnLists(Store& store, const Selection& selection,
                                                                 const ArchiveLimits& now,
                                                                 const ArchiveLimits* against);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_LIST_VERDICTS_H_
