#ifndef QVTESTER_DESK_MEASURE_MEASURE_H_
#define QVTESTER_DESK_MEASURE_MEASURE_H_

#include "desk/measure/limits.h"
#include "desk/measure/record.h"
#include "desk/measure/request.h"
#include "qvtester/tester.h"

namespace qv {

/// Measures: loads the tester's slots, sets its properties, runs, judges. The tester should be new: it is initialised
/// here, but its properties and all that it found before stay with it.
///
/// Prints nothing and writes nothing; system properties reach the store that the host has set only if the request says
/// publish (if not, the default store is set afterwards). What could not be measured is a record that says why. Throws
/// Failure for what only the caller can have done wrong: a request that can't be run (Resolved).
/// Several threads may measure pictures at once, each with a tester of its own; files are decoded one at a time, since
/// what decoders complain of goes to the process's standard error.
Record Measure(QVTester& tester, const Request& request, const Limits& limits = {});

/// The same by a new tester.
Record MeasureAnew(const Request& request, const Limits& limits = {});

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_MEASURE_H_
