#ifndef QVTESTER_DESK_BASE_FILES_H_
#define QVTESTER_DESK_BASE_FILES_H_

#include <functional>
#include <string>
#include <vector>

#include "desk/base/failure.h"

namespace qv {

/// The longest file that is read: far beyond a photo of 200 megapixels in 16 bits.
inline constexpr std::size_t kMostFileBytes = std::size_t{4} << 30;

/// "photo.JPG" gives ".jpg".
std::string LowerExtension(const std::string& path);

/// Whole content of a regular file or a pipe; throws Failure of this kind with a sentence when it can't be read. Never
/// waits for a pipe without a writer, nor reads a device; a longer file than `most` is refused.
std::string ReadWholeFile(const std::string& path, FailureKind kind, std::size_t most = kMostFileBytes);

/// The one way anything is written: aside in the same folder, flushed to the disk, renamed, so that what was there
/// stays until the new file is whole, and no half file is ever left. A link is followed; a device, or a shell's pipe
/// below /dev/fd, is written as it is. Throws Failure: wrong usage when the place can't be written or is a named pipe,
/// which is never waited for; an internal fault when the disk filled up meanwhile.
void WriteWholeFile(const std::string& path, const std::string& content);

/// The same for what is too long to be held at once: `produce` hands its parts to the sink, in order.
using Sink = std::function<void(const std::string& part)>;
void WriteWholeFile(const std::string& path, const std::function<void(const Sink&)>& produce);

/// A file that is read or to be written, and what it is for: "the photo", "the record".
struct NamedFile {
  std::string what, path;
};

/// Before anything is measured: throws Failure (wrong usage) unless every output can be written, is no input and no
/// other output ("-", standard output, among them). Empty paths are left out.
void CheckOutputs(const std::vector<NamedFile>& inputs, const std::vector<NamedFile>& outputs);

/// A directory below the system's temporary one, made when first asked for, removed with all it holds. One at a time.
class ScratchFolder {
 public:
  ScratchFolder() = default;
  ~ScratchFolder();
  ScratchFolder(const ScratchFolder&) = delete;
  ScratchFolder& operator=(const ScratchFolder&) = delete;
  const std::string& path();

  /// Removes it for good, with a file that is just being written, and lets none be made any more: for a program that is
  /// about to end, from any thread.
  static void RemoveForGood();
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_FILES_H_
