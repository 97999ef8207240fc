#ifndef QVTESTER_DESK_MEASURE_TRUST_TABLE_H_
#define QVTESTER_DESK_MEASURE_TRUST_TABLE_H_

#include "desk/measure/figures.h"

namespace qv {

/// How a real figure's uncertainty is found, or why a single photo tells none. Of several photos of one unit
/// (--repeat) all have one.
struct TrustLaw {
  const char* method;  // of UncertaintyMethods(); null: none
  const char* reason;  // why there is none, a clause; null where there is a method
  bool on_request;     // costs too much to be always told
};

/// Null for whole numbers, and for a figure that the table lacks.
const TrustLaw* LawOf(const FigureInfo& info);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_TRUST_TABLE_H_
