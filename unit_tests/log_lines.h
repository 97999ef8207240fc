#ifndef QVTESTER_UNIT_TESTS_LOG_LINES_H_
#define QVTESTER_UNIT_TESTS_LOG_LINES_H_

#include <android/log.h>

#include <string>
#include <vector>

// While one lives, log lines come here instead of standard error, each as "[OKAPI] text\r\n". One at a time.
class LogLines {
 public:
  LogLines() {
    lines_.clear();
    __android_log_set_minimum_priority(ANDROID_LOG_DEBUG);
    __android_log_set_logger([](const __android_logger_data*, const char* message) { lines_.emplace_back(message); });
  }
  ~LogLines() { __android_log_set_logger(__android_log_stderr_logger); }
  LogLines(const LogLines&) = delete;
  LogLines& operator=(const LogLines&) = delete;

  static const std::vector<std::string>& All() { return lines_; }

  // The lines' texts, one after the other.
  static std::string Text() {
    std::string text;
    for (const std::string& line : Texts()) text += line + "\n";
    return text;
  }

  // The lines' texts, without tag and line end.
  static std::vector<std::string> Texts() {
    std::vector<std::string> texts;
    const std::size_t tag = std::string("[OKAPI] ").size();
    for (const std::string& line : lines_) texts.push_back(line.substr(tag, line.size() - tag - 2));
    return texts;
  }

 private:
  inline static std::vector<std::string> lines_;
};

#endif  // QVTESTER_UNIT_TESTS_LOG_LINES_H_
