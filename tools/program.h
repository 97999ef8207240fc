#ifndef QVTESTER_TOOLS_PROGRAM_H_
#define QVTESTER_TOOLS_PROGRAM_H_

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

// What every command shares: exit status, messages, and what the library and its decoders print on the side.

enum ExitStatus { kWithinLimits = 0, kLimitBroken = 1, kWrongUsage = 2, kCouldNotMeasure = 3, kInternalFault = 4 };

/// Ends the program with a sentence on standard error.
class Failure : public std::runtime_error {
 public:
  Failure(ExitStatus status, const std::string& sentence) : std::runtime_error(sentence), status(status) {}
  ExitStatus status;
};

/// printf into a string.
std::string Format(const char* format, ...) __attribute__((format(printf, 1, 2)));

std::int64_t MillisSinceEpoch();

/// "photo.JPG" gives ".jpg".
std::string LowerExtension(const std::string& path);

/// Whole content of a file; throws Failure(status) with a sentence when it can't be read.
std::string ReadWholeFile(const std::string& path, ExitStatus status);
/// Writes a file as a whole ("-" is standard output); throws Failure when it can't.
void WriteWholeFile(const std::string& path, const std::string& content);

/// The words after the program's name.
const std::vector<std::string>& CommandLine();
void SetCommandLine(std::vector<std::string> words);

/// Lower-case hexadecimal digest; `algorithm` as OpenSSL names it ("SHA256", "SHA1").
std::string HexDigest(const std::string& content, const char* algorithm);

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

/// A directory below the system's temporary one, made when first asked for, removed with all it holds; also when the
/// program is interrupted. One at a time.
class ScratchFolder {
 public:
  ScratchFolder() = default;
  ~ScratchFolder();
  ScratchFolder(const ScratchFolder&) = delete;
  ScratchFolder& operator=(const ScratchFolder&) = delete;
  const std::string& path();
};

/// From here on an interrupt removes the scratch folder and ends the program with status 130. Call before any thread is
/// started.
void WatchForInterrupts();

#endif  // QVTESTER_TOOLS_PROGRAM_H_
