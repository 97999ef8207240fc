#include "tools/film_progress.h"

#include <unistd.h>

#include <cstdio>
#include <string>

#include "desk/base/text.h"

namespace qv {

namespace {

constexpr std::chrono::milliseconds kBetween(200);

}  // namespace

FilmProgress::FilmProgress(QVTester& tester, bool quiet) : tester_(tester) {
  if (quiet || isatty(STDERR_FILENO) == 0) return;
  terminal_ = dup(STDERR_FILENO);
  tester.kept_->film_progress = [this](int frames, int promised) { Show(frames, promised); };
}

FilmProgress::~FilmProgress() {
  if (terminal_ < 0) return;
  tester_.kept_->film_progress = nullptr;
  if (shown_) dprintf(terminal_, "\r\x1b[K");
  close(terminal_);
}

void FilmProgress::Show(int frames, int promised) {
  const Clock::time_point now = Clock::now();
  if (now - last_ < kBetween) return;
  last_ = now;
  shown_ = true;
  const double rate = frames / std::chrono::duration<double>(now - begun_).count();
  std::string line = Format("frame %d", frames);
  if (promised > frames) line += Format(" of %d", promised);
  line += Format(", %.0f frames/s", rate);
  if (promised > frames) line += Format(", %.0f s left", (promised - frames) / rate);
  dprintf(terminal_, "\r%s\x1b[K", line.c_str());
}

}  // namespace qv
