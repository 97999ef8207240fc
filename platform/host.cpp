// A Linux host's stand-in for a device's properties: one small file a key, replaced atomically.

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>

#include "platform/files.h"
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

using platform::Descriptor;

// Opens a directory below another (or a path), making it where it is missing. Only this user's own will do, no link,
// and none that others may write to.
Descriptor OpenOwn(int parent, const char* name) {
  mkdirat(parent, name, S_IRWXU);
  Descriptor directory(openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat status = {};
  if (!directory.valid() || fstat(directory.get(), &status) != 0 || status.st_uid != geteuid() ||
      (status.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
    return Descriptor(-1);
  }
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
  if (IsKey(key)) {
    const Descriptor store = OpenStore();
    const Descriptor file(openat(store.get(), key, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct stat status = {};
    if (file.valid() && fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode)) {
      const ssize_t length = read(file.get(), value, kPropertyValueMax - 1);
      if (length > 0) {
        value[length] = '\0';
        return static_cast<int>(length);
      }
    }
  }
  return DefaultTo(value, default_value);
}

int property_set(const char* key, const char* value) {
  const std::size_t length = std::strlen(value);
  if (!IsKey(key) || length >= kPropertyValueMax) return -1;
  const Descriptor store = OpenStore();
  return store.valid() && ReplaceFile(store, key, value, length, S_IRUSR | S_IWUSR) ? 0 : -1;
}

std::string PreviewFolder() { return PreviewDirectory().empty() ? "/data/ozrlog" : PreviewDirectory(); }

}  // namespace platform

int SetHostPropertyStore(const char* directory) { return Put(StoreDirectory(), directory); }

int SetHostPreviewFolder(const char* directory) { return Put(PreviewDirectory(), directory); }
