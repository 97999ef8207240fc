#ifndef QVTESTER_DESK_MEASURE_WIDEN_H_
#define QVTESTER_DESK_MEASURE_WIDEN_H_

#include <vector>

namespace qv {

/// An array of the result block as a record holds it.
template <typename T>
std::vector<double> Widen(const T* values, int count) {
  return {values, values + count};
}

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_WIDEN_H_
