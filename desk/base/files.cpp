#include "desk/base/files.h"

#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <mutex>

#include "desk/base/failure.h"

namespace qv {

namespace {

std::mutex scratch_mutex;
std::string scratch_path;  // empty while there is none

void RemoveScratch() {
  std::error_code ignored;
  if (!scratch_path.empty()) std::filesystem::remove_all(scratch_path, ignored);
  scratch_path.clear();
}

}  // namespace

std::string LowerExtension(const std::string& path) {
  std::string extension = std::filesystem::path(path).extension();
  for (char& c : extension) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return extension;
}

std::string ReadWholeFile(const std::string& path, FailureKind kind) {
  if (std::filesystem::is_directory(path)) throw Failure(kind, path + ": is a directory");
  std::ifstream file(path, std::ios::binary);
  if (!file) throw Failure(kind, path + ": can't be read (" + std::strerror(errno) + ")");
  return {std::istreambuf_iterator<char>(file), {}};
}

void WriteWholeFile(const std::string& path, const std::string& content) {
  std::ofstream file(path, std::ios::binary);
  file << content << std::flush;
  if (!file) throw Failure(kWrongUsage, path + ": can't be written (" + std::strerror(errno) + ")");
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

void ScratchFolder::RemoveForGood() {
  scratch_mutex.lock();  // and never unlocked
  RemoveScratch();
}

}  // namespace qv
