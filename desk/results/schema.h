#ifndef QVTESTER_DESK_RESULTS_SCHEMA_H_
#define QVTESTER_DESK_RESULTS_SCHEMA_H_

#include <string>
#include <vector>

// The tables of a store, for every database alike (docs/results.md says what is in them).

namespace qv {

/// Each brings a store from the version before to the next; a new store takes all of them. "{id}" stands for the
/// database's own word for a number that counts itself up. Versions that were released are never edited.
const std::vector<std::vector<std::string>>& SchemaSteps();

inline int SchemaVersion() { return static_cast<int>(SchemaSteps().size()); }

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_SCHEMA_H_
