#include "tools/program.h"

#include <android/log.h>
#include <fcntl.h>
#include <openssl/evp.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <mutex>
#include <sstream>
#include <thread>

namespace {

std::vector<std::string> command_line;

std::vector<LogLine> log_lines;
bool show_log_lines = false;

std::mutex scratch_mutex;
std::string scratch_path;  // empty while there is none

void RemoveScratch() {
  std::error_code ignored;
  if (!scratch_path.empty()) std::filesystem::remove_all(scratch_path, ignored);
  scratch_path.clear();
}

void CollectLogLine(const __android_logger_data* /*where*/, const char* message) {
  std::string text = message;
  const std::string tag = "[OKAPI] ";
  if (text.compare(0, tag.size(), tag) == 0) text.erase(0, tag.size());
  while (!text.empty() && (text.back() == '\n' || text.back() == '\r')) text.pop_back();
  if (show_log_lines) std::cerr << text << '\n';
  log_lines.push_back({MillisSinceEpoch(), text});
}

}  // namespace

std::string Format(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  va_list again;
  va_copy(again, arguments);
  const int length = std::vsnprintf(nullptr, 0, format, arguments);
  va_end(arguments);
  std::string text(static_cast<std::size_t>(std::max(length, 0)), '\0');
  std::vsnprintf(text.data(), text.size() + 1, format, again);
  va_end(again);
  return text;
}

std::int64_t MillisSinceEpoch() {
  using std::chrono::system_clock;
  return std::chrono::duration_cast<std::chrono::milliseconds>(system_clock::now().time_since_epoch()).count();
}

std::string LowerExtension(const std::string& path) {
  std::string extension = std::filesystem::path(path).extension();
  for (char& c : extension) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return extension;
}

std::string ReadWholeFile(const std::string& path, ExitStatus status) {
  if (std::filesystem::is_directory(path)) throw Failure(status, path + ": is a directory");
  std::ifstream file(path, std::ios::binary);
  if (!file) throw Failure(status, path + ": can't be read (" + std::strerror(errno) + ")");
  return {std::istreambuf_iterator<char>(file), {}};
}

void WriteWholeFile(const std::string& path, const std::string& content) {
  if (path == "-") {
    std::cout << content << std::flush;
    if (!std::cout) throw Failure(kInternalFault, "standard output can't be written");
    return;
  }
  std::ofstream file(path, std::ios::binary);
  file << content << std::flush;
  if (!file) throw Failure(kWrongUsage, path + ": can't be written (" + std::strerror(errno) + ")");
}

const std::vector<std::string>& CommandLine() { return command_line; }

void SetCommandLine(std::vector<std::string> words) { command_line = std::move(words); }

std::string HexDigest(const std::string& content, const char* algorithm) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  EVP_Digest(content.data(), content.size(), digest, &length, EVP_get_digestbyname(algorithm), nullptr);
  std::string text;
  for (unsigned int i = 0; i < length; ++i) text += Format("%02x", digest[i]);
  return text;
}

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

ScratchFolder::~ScratchFolder() {
  const std::lock_guard<std::mutex> lock(scratch_mutex);
  RemoveScratch();
}

const std::string& ScratchFolder::path() {
  const std::lock_guard<std::mutex> lock(scratch_mutex);
  if (scratch_path.empty()) {
    std::string pattern = (std::filesystem::temp_directory_path() / "qvtester-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
      throw Failure(kInternalFault, pattern + ": no temporary folder can be made (" + std::strerror(errno) + ")");
    }
    scratch_path = pattern;
  }
  return scratch_path;
}

void WatchForInterrupts() {
  static sigset_t interrupts;
  sigemptyset(&interrupts);
  sigaddset(&interrupts, SIGINT);
  sigaddset(&interrupts, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &interrupts, nullptr);
  std::thread([] {
    int signal = 0;
    sigwait(&interrupts, &signal);
    const std::lock_guard<std::mutex> lock(scratch_mutex);
    RemoveScratch();
    std::_Exit(128 + signal);
  }).detach();
}
