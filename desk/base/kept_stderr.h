#ifndef QVTESTER_DESK_BASE_KEPT_STDERR_H_
#define QVTESTER_DESK_BASE_KEPT_STDERR_H_

#include <mutex>
#include <string>
#include <vector>

namespace qv {

/// While it lives, what anybody in the process writes to standard error, decoders above all, is kept back. One at a
/// time: another thread's waits.
class KeptStderr {
 public:
  KeptStderr();
  ~KeptStderr();
  KeptStderr(const KeptStderr&) = delete;
  KeptStderr& operator=(const KeptStderr&) = delete;

  /// The lines that were kept back.
  std::vector<std::string> Lines() const;

 private:
  std::unique_lock<std::mutex> lock_;
  int saved_ = -1;
  int kept_ = -1;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_KEPT_STDERR_H_
