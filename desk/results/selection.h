#ifndef QVTESTER_DESK_RESULTS_SELECTION_H_
#define QVTESTER_DESK_RESULTS_SELECTION_H_

#include <cstdint>
#include <string>
#include <vector>

namespace qv {

/// A name, a comparison and a value: "lot=A17", "time>=2026-11-01", "camera_autofocus_mtf50_vertical<0.3".
struct Condition {
  std::string name;
  std::string comparison;  // one of = != < <= > >=
  std::string value;
};

/// Which runs; all conditions hold. None: all runs.
using Selection = std::vector<Condition>;

/// Takes a word apart; throws Failure (wrong usage) where it holds no comparison or no name.
Condition ParseCondition(const std::string& word);

/// Milliseconds since the epoch of "2026-11-21", "2026-11-21T08:30" or "2026-11-21T08:30:15" (UTC); throws Failure
/// (wrong usage).
std::int64_t ParseTime(const std::string& text);
/// "2026-11-21T08:30:15Z".
std::string TimeText(std::int64_t millis);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_SELECTION_H_
