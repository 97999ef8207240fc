#ifndef QVTESTER_DESK_MEASURE_FRAMES_H_
#define QVTESTER_DESK_MEASURE_FRAMES_H_

#include "desk/measure/measurement.h"

namespace qv {

/// The size of raw frames, as all measurements of preview frames take it.
Parameter RawParameter();

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_FRAMES_H_
