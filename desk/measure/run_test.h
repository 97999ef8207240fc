#ifndef QVTESTER_DESK_MEASURE_RUN_TEST_H_
#define QVTESTER_DESK_MEASURE_RUN_TEST_H_

#include "desk/base/clock.h"
#include "desk/measure/guarded.h"
#include "desk/measure/measurement.h"
#include "desk/measure/record.h"

namespace qv {

/// Calls a routine of the library and notes its code and when it was done. True with code 1: its results may be read.
template <typename Call>
bool RunRoutine(Phase& phase, const char* name, Call&& call) {
  phase.code = Guarded(name, call);
  phase.end_millis = MillisSinceEpoch();
  return phase.code == QV_SUCCESS;
}

/// Runs the row's numbered test. Its results with code 1; null otherwise.
const QVResultData* RunNumberedTest(QVTester& tester, const Spec& spec, const Request& request, Phase& phase);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_RUN_TEST_H_
