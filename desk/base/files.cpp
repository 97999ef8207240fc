#include "desk/base/files.h"

#include <fcntl.h>
#include <linux/magic.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <mutex>

#include "desk/base/failure.h"
#include "desk/base/text.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

std::mutex scratch_mutex;
std::string scratch_path;  // empty while there is none
std::string aside_path;    // of the file that is just being written

void RemoveScratch() {
  std::error_code ignored;
  if (!scratch_path.empty()) fs::remove_all(scratch_path, ignored);
  scratch_path.clear();
}

// A file descriptor that is closed when it goes.
class Descriptor {
 public:
  explicit Descriptor(int number) : number_(number) {}
  ~Descriptor() {
    if (number_ >= 0) close(number_);
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  int number() const { return number_; }

 private:
  int number_;
};

std::string Reason() { return std::strerror(errno); }

// Opens without waiting for the other end of a pipe; what is neither file nor pipe is refused.
int OpenToRead(const std::string& path, const std::string& shown, FailureKind kind) {
  const int file = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) {
    throw Failure(kind, errno == ENOENT ? shown + ": no such file" : shown + ": can't be read (" + Reason() + ")");
  }
  struct stat status = {};
  const bool known = fstat(file, &status) == 0;
  if (known && (S_ISREG(status.st_mode) || S_ISFIFO(status.st_mode))) {
    fcntl(file, F_SETFL, fcntl(file, F_GETFL) & ~O_NONBLOCK);  // a pipe with a writer may be slow
    return file;
  }
  close(file);
  throw Failure(kind, shown + (S_ISDIR(status.st_mode) ? ": is a directory" : ": is no regular file"));
}

// All of the content, or false with errno.
bool WriteAll(int file, const std::string& content) {
  for (std::size_t done = 0; done < content.size();) {
    const ssize_t wrote = write(file, content.data() + done, content.size() - done);
    if (wrote < 0 && errno == EINTR) continue;
    if (wrote <= 0) return false;
    done += static_cast<std::size_t>(wrote);
  }
  return true;
}

// Where a path leads: through links, also when the file itself does not exist yet.
fs::path Followed(const std::string& path) {
  std::error_code error;
  const fs::path followed = fs::weakly_canonical(fs::absolute(path), error);
  return error ? fs::path(path) : followed;
}

std::string FolderOf(const fs::path& path) { return path.has_parent_path() ? path.parent_path().string() : "."; }

// Made in the folder where the file is to be, under a name that nothing else has.
class FileAside {
 public:
  explicit FileAside(const fs::path& target) {
    const std::lock_guard<std::mutex> lock(scratch_mutex);
    std::string pattern = FolderOf(target) + "/.qvtester-XXXXXX";
    file_ = mkostemp(pattern.data(), O_CLOEXEC);
    if (file_ >= 0) aside_path = path_ = pattern;
  }
  ~FileAside() {
    const std::lock_guard<std::mutex> lock(scratch_mutex);
    if (file_ >= 0) close(file_);
    if (!path_.empty()) unlink(path_.c_str());
    aside_path.clear();
  }
  FileAside(const FileAside&) = delete;
  FileAside& operator=(const FileAside&) = delete;

  int file() const { return file_; }

  bool Become(const fs::path& target) {
    const std::lock_guard<std::mutex> lock(scratch_mutex);
    if (rename(path_.c_str(), target.c_str()) != 0) return false;
    path_.clear();
    return true;
  }

 private:
  int file_ = -1;
  std::string path_;
};

// The rights that a file written in place would have.
mode_t RightsFor(const fs::path& target) {
  struct stat status = {};
  if (stat(target.c_str(), &status) == 0) return status.st_mode & 07777U;
  const mode_t mask = umask(0);
  umask(mask);
  return 0666U & ~mask;
}

// Whether the path names a device or this process's end of a shell's pipe: written as it is, there is nothing to keep.
bool IsPlainStream(const std::string& path) {
  struct stat status = {};
  if (stat(path.c_str(), &status) != 0) return false;
  struct statfs system = {};
  return S_ISCHR(status.st_mode) ||
         (S_ISFIFO(status.st_mode) && statfs(path.c_str(), &system) == 0 && system.f_type == PIPEFS_MAGIC);
}

// A named pipe would be waited for, a disk overwritten, and what goes to standard output by itself be lost or mixed up.
void RefuseOtherThings(const std::string& path) {
  struct stat status = {};
  if (stat(path.c_str(), &status) != 0) return;
  for (const int stream : {STDOUT_FILENO, STDERR_FILENO}) {
    struct stat taken = {};
    const bool same = fstat(stream, &taken) == 0 && taken.st_dev == status.st_dev && taken.st_ino == status.st_ino;
    if (!same || S_ISCHR(status.st_mode)) continue;
    throw Failure(kWrongUsage,
                  Printable(path) + (stream == STDOUT_FILENO ? ": is where standard output goes; - names it"
                                                             : ": is where standard error goes"));
  }
  if (S_ISREG(status.st_mode) || IsPlainStream(path)) return;
  throw Failure(kWrongUsage, Printable(path) + (S_ISDIR(status.st_mode) ? ": is a directory" : ": is no regular file"));
}

[[noreturn]] void RefuseToWrite(const std::string& path) {
  const bool filled_up = errno == ENOSPC || errno == EDQUOT || errno == EIO || errno == EFBIG;
  throw Failure(filled_up ? kInternalFault : kWrongUsage, Printable(path) + ": can't be written (" + Reason() + ")");
}

void CheckWritable(const std::string& path) {
  RefuseOtherThings(path);
  if (access(path.c_str(), F_OK) == 0 && access(path.c_str(), W_OK) != 0) RefuseToWrite(path);
  if (!IsPlainStream(path) && FileAside(Followed(path)).file() < 0) RefuseToWrite(path);
}

bool SameFile(const std::string& a, const std::string& b) {
  if (a == "-" || b == "-") return a == b;
  std::error_code error;
  return fs::equivalent(a, b, error) || Followed(a) == Followed(b);
}

}  // namespace

std::string LowerExtension(const std::string& path) {
  std::string extension = fs::path(path).extension();
  for (char& c : extension) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return extension;
}

std::string ReadWholeFile(const std::string& path, FailureKind kind, std::size_t most) {
  const std::string shown = Printable(path);
  const Descriptor file(OpenToRead(path, shown, kind));
  struct stat status = {};
  fstat(file.number(), &status);
  constexpr std::size_t kStep = std::size_t{1} << 16;
  const std::size_t expected = S_ISREG(status.st_mode) ? static_cast<std::size_t>(status.st_size) : 0;
  std::string content(std::min(expected, most) + 1, '\0');  // and one byte more, to see the end
  std::size_t length = 0;
  for (;;) {
    const ssize_t got = read(file.number(), content.data() + length, content.size() - length);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) throw Failure(kind, shown + ": can't be read (" + Reason() + ")");
    if (got == 0) break;
    length += static_cast<std::size_t>(got);
    if (length > most) throw Failure(kind, Format("%s: longer than %zu MB", shown.c_str(), most >> 20));
    if (length == content.size()) content.resize(std::max(content.size() * 2, kStep));
  }
  content.resize(length);
  return content;
}

void WriteWholeFile(const std::string& path, const std::string& content) {
  WriteWholeFile(path, [&](const Sink& sink) { sink(content); });
}

void WriteWholeFile(const std::string& path, const std::function<void(const Sink&)>& produce) {
  const auto write_to = [&](int file) {
    produce([&](const std::string& part) {
      if (!WriteAll(file, part)) RefuseToWrite(path);
    });
  };
  RefuseOtherThings(path);
  if (IsPlainStream(path)) {
    const Descriptor file(open(path.c_str(), O_WRONLY | O_CLOEXEC));
    if (file.number() < 0) RefuseToWrite(path);
    write_to(file.number());
    return;
  }
  const fs::path target = Followed(path);
  FileAside aside(target);
  if (aside.file() < 0 || fchmod(aside.file(), RightsFor(target)) != 0) RefuseToWrite(path);
  write_to(aside.file());
  if (fsync(aside.file()) != 0 || !aside.Become(target)) RefuseToWrite(path);
}

void CheckOutputs(const std::vector<NamedFile>& inputs, const std::vector<NamedFile>& outputs) {
  for (std::size_t i = 0; i < outputs.size(); ++i) {
    const NamedFile& output = outputs[i];
    if (output.path.empty()) continue;
    const std::string shown = output.path == "-" ? "standard output" : Printable(output.path);
    for (const NamedFile& input : inputs) {
      if (!input.path.empty() && input.path != "-" && SameFile(output.path, input.path)) {
        throw Failure(kWrongUsage, shown + ": " + output.what + " would overwrite " + input.what);
      }
    }
    for (std::size_t k = 0; k < i; ++k) {
      if (!outputs[k].path.empty() && SameFile(output.path, outputs[k].path)) {
        throw Failure(kWrongUsage, shown + ": can't take both " + outputs[k].what + " and " + output.what);
      }
    }
    if (output.path != "-") CheckWritable(output.path);
  }
}

ScratchFolder::~ScratchFolder() {
  const std::lock_guard<std::mutex> lock(scratch_mutex);
  RemoveScratch();
}

const std::string& ScratchFolder::path() {
  const std::lock_guard<std::mutex> lock(scratch_mutex);
  if (scratch_path.empty()) {
    std::string pattern = (fs::temp_directory_path() / "qvtester-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
      throw Failure(kInternalFault, pattern + ": no temporary folder can be made (" + Reason() + ")");
    }
    scratch_path = pattern;
  }
  return scratch_path;
}

void ScratchFolder::RemoveForGood() {
  scratch_mutex.lock();  // and never unlocked
  RemoveScratch();
  if (!aside_path.empty()) unlink(aside_path.c_str());
}

}  // namespace qv
