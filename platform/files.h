#ifndef QVTESTER_PLATFORM_FILES_H_
#define QVTESTER_PLATFORM_FILES_H_

#include <sys/types.h>
#include <unistd.h>

#include <cstddef>
#include <string>
#include <vector>

namespace platform {

/// An open file or folder, closed when it goes.
class Descriptor {
 public:
  explicit Descriptor(int fd) : fd_(fd) {}
  ~Descriptor() {
    if (fd_ >= 0) close(fd_);
  }
  Descriptor(Descriptor&& other) noexcept : fd_(other.fd_) { other.fd_ = -1; }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  Descriptor& operator=(Descriptor&&) = delete;
  int get() const { return fd_; }
  bool valid() const { return fd_ >= 0; }

 private:
  int fd_;
};

/// Writes a file of an open folder, the one writer of this library: aside, under a random name that no other process
/// has, then renamed, so that a reader sees the former content or the new one. A link in its place is replaced, not
/// followed; any other thing that is no file is left, and so is nothing else. False when it can't be written.
bool ReplaceFile(const Descriptor& folder, const std::string& name, const void* data, std::size_t length, mode_t mode);

/// Writes a preview frame's file into the preview folder. False when it can't be written.
bool WritePreview(const std::string& name, const std::vector<unsigned char>& bytes);

}  // namespace platform

#endif  // QVTESTER_PLATFORM_FILES_H_
