#include "platform/files.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cstdio>
#include <random>

#include "platform/preview_folder.h"

namespace platform {

namespace {

std::string RandomName() {
  std::random_device random;
  char name[48];
  std::snprintf(name, sizeof(name), ".fresh-%08x%08x%08x%08x", random(), random(), random(), random());
  return name;
}

bool WriteAll(int fd, const void* data, std::size_t length) {
  const auto* at = static_cast<const char*>(data);
  while (length > 0) {
    const ssize_t written = write(fd, at, length);
    if (written <= 0) return false;
    at += written;
    length -= static_cast<std::size_t>(written);
  }
  return true;
}

}  // namespace

bool ReplaceFile(const Descriptor& folder, const std::string& name, const void* data, std::size_t length, mode_t mode) {
  struct stat there = {};
  if (fstatat(folder.get(), name.c_str(), &there, AT_SYMLINK_NOFOLLOW) == 0 && !S_ISREG(there.st_mode) &&
      !S_ISLNK(there.st_mode)) {
    return false;
  }
  const std::string fresh = RandomName();
  const Descriptor file(openat(folder.get(), fresh.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, mode));
  if (!file.valid()) return false;
  if (WriteAll(file.get(), data, length) && renameat(folder.get(), fresh.c_str(), folder.get(), name.c_str()) == 0) {
    return true;
  }
  unlinkat(folder.get(), fresh.c_str(), 0);
  return false;
}

bool WritePreview(const std::string& name, const std::vector<unsigned char>& bytes) {
  const Descriptor folder(open(PreviewFolder().c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  return folder.valid() && ReplaceFile(folder, name, bytes.data(), bytes.size(), 0666);
}

}  // namespace platform
