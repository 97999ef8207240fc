#include <csignal>
#include <cstdlib>

#include "tools/commands.h"
#include "tools/program.h"

int main(int argc, char** argv) {
  qv::WatchForInterrupts();
  std::signal(SIGXFSZ, SIG_IGN);  // a file that may not grow is a failed write, like a full disk, and not the end
  // NOLINTBEGIN(concurrency-mt-unsafe): no other thread reads them yet
  setenv("OPENCV_IO_ENABLE_OPENEXR", "1", 0);
  unsetenv("OPENCV_FFMPEG_CAPTURE_OPTIONS");  // may let a film open other files, and the network
  // NOLINTEND(concurrency-mt-unsafe)
  return qv::RunProgram({argv + 1, argv + argc});
}
