#ifndef QVTESTER_DESK_BASE_FILES_H_
#define QVTESTER_DESK_BASE_FILES_H_

#include <string>

#include "desk/base/failure.h"

namespace qv {

/// "photo.JPG" gives ".jpg".
std::string LowerExtension(const std::string& path);

/// Whole content of a file; throws Failure of this kind with a sentence when it can't be read.
std::string ReadWholeFile(const std::string& path, FailureKind kind);

/// Writes a file as a whole; throws Failure when it can't.
void WriteWholeFile(const std::string& path, const std::string& content);

/// A directory below the system's temporary one, made when first asked for, removed with all it holds. One at a time.
class ScratchFolder {
 public:
  ScratchFolder() = default;
  ~ScratchFolder();
  ScratchFolder(const ScratchFolder&) = delete;
  ScratchFolder& operator=(const ScratchFolder&) = delete;
  const std::string& path();

  /// Removes it for good and lets none be made any more: for a program that is about to end, from any thread.
  static void RemoveForGood();
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_FILES_H_
