#include "desk/base/log_lines.h"

#include <android/log.h>

#include <atomic>
#include <iostream>
#include <mutex>

#include "desk/base/clock.h"

namespace qv {

namespace {

std::atomic<bool> show = false;
thread_local std::vector<LogLine>* collected = nullptr;

// The log has one logger for all threads: the first collector sets ours, the last takes it back.
std::mutex collectors_mutex;
int collectors = 0;
int priority_before = ANDROID_LOG_DEFAULT;

void CollectLogLine(const __android_logger_data* /*where*/, const char* message) {
  if (collected == nullptr) return;
  std::string text = message;
  const std::string tag = "[OKAPI] ";
  if (text.compare(0, tag.size(), tag) == 0) text.erase(0, tag.size());
  while (!text.empty() && (text.back() == '\n' || text.back() == '\r')) text.pop_back();
  if (show) std::cerr << text << '\n';
  collected->push_back({MillisSinceEpoch(), text});
}

}  // namespace

LogCollector::LogCollector() : outer_(collected) {
  collected = &lines_;
  const std::lock_guard<std::mutex> lock(collectors_mutex);
  if (collectors++ > 0) return;
  priority_before = __android_log_set_minimum_priority(ANDROID_LOG_DEBUG);
  __android_log_set_logger(CollectLogLine);
}

LogCollector::~LogCollector() {
  collected = outer_;
  const std::lock_guard<std::mutex> lock(collectors_mutex);
  if (--collectors > 0) return;
  __android_log_set_logger(__android_log_stderr_logger);
  __android_log_set_minimum_priority(priority_before);
}

void ShowLogLines() { show = true; }

}  // namespace qv
