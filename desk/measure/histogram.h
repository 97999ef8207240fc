#ifndef QVTESTER_DESK_MEASURE_HISTOGRAM_H_
#define QVTESTER_DESK_MEASURE_HISTOGRAM_H_

#include "desk/base/json.h"
#include "tests/camera/lens_dust.h"

namespace qv {

/// 256 whole numbers: as they come, from the histogram of a dust record's file, or from a file that lists them, as JSON
/// or bare. Throws Failure (wrong usage) for anything else.
Json CheckedHistogram(const Json& value);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_HISTOGRAM_H_
