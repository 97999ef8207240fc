#ifndef QVTESTER_DESK_BASE_CLOCK_H_
#define QVTESTER_DESK_BASE_CLOCK_H_

#include <chrono>
#include <cstdint>

namespace qv {

inline std::int64_t MillisSinceEpoch() {
  using std::chrono::system_clock;
  return std::chrono::duration_cast<std::chrono::milliseconds>(system_clock::now().time_since_epoch()).count();
}

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_CLOCK_H_
