#ifndef QVTESTER_DESK_BASE_LOG_LINES_H_
#define QVTESTER_DESK_BASE_LOG_LINES_H_

#include <cstdint>
#include <string>
#include <vector>

namespace qv {

struct LogLine {
  std::int64_t millis;
  std::string text;  // without tag and line end
};

/// While it lives, the library's log lines of this thread are collected, and nobody else's are shown.
class LogCollector {
 public:
  LogCollector();
  ~LogCollector();
  LogCollector(const LogCollector&) = delete;
  LogCollector& operator=(const LogCollector&) = delete;

  std::vector<LogLine>& lines() { return lines_; }

 private:
  std::vector<LogLine> lines_;
  std::vector<LogLine>* outer_;
};

/// From here on, collected lines are also shown on standard error as they come.
void ShowLogLines();

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_LOG_LINES_H_
