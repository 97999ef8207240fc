#ifndef QVTESTER_TOOLS_FILM_PROGRESS_H_
#define QVTESTER_TOOLS_FILM_PROGRESS_H_

#include <chrono>

#include "qvtester/tester.h"

namespace qv {

/// While it lives, a line on standard error tells how far a film has been read, with rate and time left; on a terminal
/// only. Where standard error leads when this is made counts.
class FilmProgress {
 public:
  FilmProgress(QVTester& tester, bool quiet);
  ~FilmProgress();
  FilmProgress(const FilmProgress&) = delete;
  FilmProgress& operator=(const FilmProgress&) = delete;

 private:
  using Clock = std::chrono::steady_clock;

  void Show(int frames, int promised);

  QVTester& tester_;
  int terminal_ = -1;
  bool shown_ = false;
  Clock::time_point begun_ = Clock::now(), last_ = begun_;
};

}  // namespace qv

#endif  // QVTESTER_TOOLS_FILM_PROGRESS_H_
