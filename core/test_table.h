#ifndef QVTESTER_CORE_TEST_TABLE_H_
#define QVTESTER_CORE_TEST_TABLE_H_

#include <array>
#include <iterator>

#include "core/result_arrays.h"
#include "qvtester/tester.h"

// The rows of QV_TESTS as data. A test that names no slot is refused by validation; one without a routine answers -97
// after validation.

inline constexpr int kNoSlot = -1;
using Slots = std::array<int, 3>;  // padded with kNoSlot

struct QVTest {
  QV_TEST_INDEX index;
  const char* name;
  Slots needs;
  Slots releases;
  void (*frees)(QVResultData& r);  // null: the test leaves no arrays
  int (*routine)(QVTester& tester, bool fake_mode);
};

constexpr Slots Of(int first = kNoSlot, int second = kNoSlot, int third = kNoSlot) { return {first, second, third}; }

#define ROW(test, number, ...) QVTest{test, #test, __VA_ARGS__},
#define NEEDS(...) Of(__VA_ARGS__)
#define RELEASES(...) Of(__VA_ARGS__)
#define FREES(...) [](QVResultData& r) { Free(__VA_ARGS__); }
#define NO_ARRAYS nullptr
#define RUNS(call) [](QVTester& tester, [[maybe_unused]] bool fake_mode) { return tester.call; }
#define RUNS_QUIETLY(call)                   \
  [](QVTester& tester, bool /*fake_mode*/) { \
    tester.call;                             \
    return static_cast<int>(QV_SUCCESS);     \
  }
#define NO_ROUTINE nullptr
inline constexpr QVTest kTests[] = {QV_TESTS(ROW)};
#undef NO_ROUTINE
#undef RUNS_QUIETLY
#undef RUNS
#undef NO_ARRAYS
#undef FREES
#undef RELEASES
#undef NEEDS
#undef ROW

constexpr bool TestsAreInOrder() {
  for (std::size_t i = 0; i < std::size(kTests); ++i) {
    if (kTests[i].index != static_cast<int>(i)) return false;
  }
  return true;
}
static_assert(TestsAreInOrder(), "row i is test i");

#endif  // QVTESTER_CORE_TEST_TABLE_H_
