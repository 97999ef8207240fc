#ifndef QVTESTER_DESK_BASE_SIDE_OUTPUT_H_
#define QVTESTER_DESK_BASE_SIDE_OUTPUT_H_

#include <cstdint>
#include <string>
#include <vector>

// What the library and its decoders print on the side.

namespace qv {

struct LogLine {
  std::int64_t millis;
  std::string text;  // without tag and line end
};

/// While it lives, the library's log lines are collected, and what decoders write to standard error is kept back.
class SideOutput {
 public:
  /// verbose: log lines are shown as they come, and nothing is kept back.
  explicit SideOutput(bool verbose);
  ~SideOutput();
  SideOutput(const SideOutput&) = delete;
  SideOutput& operator=(const SideOutput&) = delete;

  static const std::vector<LogLine>& Lines();
  /// What was kept back since the last call: the lines that decoders wrote.
  std::vector<std::string> TakeChatter();

 private:
  int saved_stderr_ = -1;
  int kept_ = -1;
  std::int64_t taken_ = 0;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_SIDE_OUTPUT_H_
