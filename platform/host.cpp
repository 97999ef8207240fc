// A Linux host's stand-in for a device's properties: one small file a key, replaced atomically.

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>

#include "platform/preview_folder.h"
#include "platform/properties.h"
#include "qvtester/host_properties.h"

namespace {

std::string& StoreDirectory() {
  static std::string directory;  // empty: the default
  return directory;
}

std::string& PreviewDirectory() {
  static std::string directory;
  return directory;
}

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

// Opens a directory below another (or a path), making it where it is missing. Only this user's own will do, no link.
Descriptor OpenOwn(int parent, const char* name) {
  mkdirat(parent, name, S_IRWXU);
  Descriptor directory(openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat status = {};
  if (!directory.valid() || fstat(directory.get(), &status) != 0 || status.st_uid != geteuid()) return Descriptor(-1);
  return directory;
}

Descriptor OpenStore() {
  if (!StoreDirectory().empty()) return OpenOwn(AT_FDCWD, StoreDirectory().c_str());
  const std::string own = "/dev/shm/qvtester-" + std::to_string(geteuid());
  const Descriptor folder = OpenOwn(AT_FDCWD, own.c_str());
  return folder.valid() ? OpenOwn(folder.get(), "properties") : Descriptor(-1);
}

// A key names a file of the store and nothing else; like a device's, it does not start with a dot.
bool IsKey(const char* key) { return *key != '\0' && *key != '.' && std::strchr(key, '/') == nullptr; }

bool WriteAll(int fd, const char* data, std::size_t length) {
  while (length > 0) {
    const ssize_t written = write(fd, data, length);
    if (written <= 0) return false;
    data += written;
    length -= static_cast<std::size_t>(written);
  }
  return true;
}

int Put(std::string& place, const char* directory) {
  if (directory != nullptr && *directory == '\0') return QV_ERROR_INVALID_ARGUMENT;
  place = directory == nullptr ? "" : directory;
  // A name that ends in a slash or a dot would be looked up behind a link.
  while (place.size() > 1 && (place.back() == '/' || place.substr(place.size() - 2) == "/.")) place.pop_back();
  return QV_SUCCESS;
}

}  // namespace

namespace platform {

int property_get(const char* key, char* value, const char* default_value) {
  ssize_t length = 0;
  if (IsKey(key)) {
    const Descriptor store = OpenStore();
    const Descriptor file(openat(store.get(), key, O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    if (file.valid()) length = std::max<ssize_t>(read(file.get(), value, kPropertyValueMax - 1), 0);
  }
  if (length == 0 && default_value != nullptr) {
    length = static_cast<ssize_t>(std::min<std::size_t>(std::strlen(default_value), kPropertyValueMax - 1));
    std::memcpy(value, default_value, static_cast<std::size_t>(length));
  }
  value[length] = '\0';
  return static_cast<int>(length);
}

int property_set(const char* key, const char* value) {
  const std::size_t length = std::strlen(value);
  if (!IsKey(key) || length >= kPropertyValueMax) return -1;
  const Descriptor store = OpenStore();
  if (!store.valid()) return -1;
  // Written aside and renamed: a reader sees the old value or the new one.
  const std::string fresh = ".fresh-" + std::to_string(getpid());
  const Descriptor file(
      openat(store.get(), fresh.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, S_IRUSR | S_IWUSR));
  if (!file.valid()) return -1;
  if (WriteAll(file.get(), value, length) && renameat(store.get(), fresh.c_str(), store.get(), key) == 0) return 0;
  unlinkat(store.get(), fresh.c_str(), 0);
  return -1;
}

std::string PreviewFolder() { return PreviewDirectory().empty() ? "/data/ozrlog" : PreviewDirectory(); }

}  // namespace platform

int SetHostPropertyStore(const char* directory) { return Put(StoreDirectory(), directory); }

int SetHostPreviewFolder(const char* directory) { return Put(PreviewDirectory(), directory); }
