#ifndef QVTESTER_DESK_BASE_MEMORY_FILE_H_
#define QVTESTER_DESK_BASE_MEMORY_FILE_H_

#include <string>

namespace qv {

/// A file in memory with this content: what is read by its path is what was handed in, whatever becomes of the file
/// that it came from.
class MemoryFile {
 public:
  explicit MemoryFile(const std::string& content);
  ~MemoryFile();
  MemoryFile(const MemoryFile&) = delete;
  MemoryFile& operator=(const MemoryFile&) = delete;

  /// Valid in this process, while it lives.
  std::string path() const { return "/proc/self/fd/" + std::to_string(fd_); }

 private:
  int fd_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_MEMORY_FILE_H_
