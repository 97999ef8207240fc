#include "desk/base/side_output.h"

#include <android/log.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <iostream>
#include <sstream>

#include "desk/base/clock.h"

namespace qv {

namespace {

std::vector<LogLine> log_lines;
bool show_log_lines = false;

void CollectLogLine(const __android_logger_data* /*where*/, const char* message) {
  std::string text = message;
  const std::string tag = "[OKAPI] ";
  if (text.compare(0, tag.size(), tag) == 0) text.erase(0, tag.size());
  while (!text.empty() && (text.back() == '\n' || text.back() == '\r')) text.pop_back();
  if (show_log_lines) std::cerr << text << '\n';
  log_lines.push_back({MillisSinceEpoch(), text});
}

}  // namespace

SideOutput::SideOutput(bool verbose) {
  log_lines.clear();
  show_log_lines = verbose;
  __android_log_set_minimum_priority(ANDROID_LOG_DEBUG);
  __android_log_set_logger(CollectLogLine);
  if (verbose) return;
  kept_ = memfd_create("stderr", MFD_CLOEXEC);
  if (kept_ < 0) return;
  std::cerr.flush();
  saved_stderr_ = fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 0);
  dup2(kept_, STDERR_FILENO);
}

SideOutput::~SideOutput() {
  __android_log_set_logger(__android_log_stderr_logger);
  if (kept_ < 0) return;
  std::cerr.flush();
  dup2(saved_stderr_, STDERR_FILENO);
  close(saved_stderr_);
  close(kept_);
}

const std::vector<LogLine>& SideOutput::Lines() { return log_lines; }

std::vector<std::string> SideOutput::TakeChatter() {
  std::vector<std::string> lines;
  if (kept_ < 0) return lines;
  std::cerr.flush();
  const std::int64_t end = lseek(kept_, 0, SEEK_END);
  std::string text(static_cast<std::size_t>(end - taken_), '\0');
  const ssize_t got = pread(kept_, text.data(), text.size(), taken_);
  text.resize(static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
  taken_ = end;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) {
    if (!line.empty()) lines.push_back(line);
  }
  return lines;
}

}  // namespace qv
