#ifndef QVTESTER_DESK_MEASURE_REPEATS_H_
#define QVTESTER_DESK_MEASURE_REPEATS_H_

#include <vector>

#include "desk/measure/record.h"

namespace qv {

/// Several runs on one unit as one record, not judged yet: the first, with medians in place of its values, their
/// spread, and how far they may be trusted by it. A figure that one of the runs lacks is left out; what one of them
/// could not measure was not measured. Photos with the same pixels judge nothing.
void JoinRepeats(Record& first, const std::vector<Record>& others);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_REPEATS_H_
