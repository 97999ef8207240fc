#include "desk/base/memory_file.h"

#include <sys/mman.h>
#include <unistd.h>

#include "desk/base/failure.h"

namespace qv {

MemoryFile::MemoryFile(const std::string& content) : fd_(memfd_create("input", MFD_CLOEXEC)) {
  std::size_t written = 0;
  while (fd_ >= 0 && written < content.size()) {
    const ssize_t more = write(fd_, content.data() + written, content.size() - written);
    if (more <= 0) break;
    written += static_cast<std::size_t>(more);
  }
  if (fd_ >= 0 && written == content.size()) return;
  if (fd_ >= 0) close(fd_);
  throw Failure(kInternalFault, "no memory for an input of " + std::to_string(content.size()) + " bytes");
}

MemoryFile::~MemoryFile() { close(fd_); }

}  // namespace qv
