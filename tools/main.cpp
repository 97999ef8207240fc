#include <cstdlib>

#include "tools/commands.h"
#include "tools/program.h"

int main(int argc, char** argv) {
  qv::WatchForInterrupts();
  setenv("OPENCV_IO_ENABLE_OPENEXR", "1", 0);  // NOLINT(concurrency-mt-unsafe): no other thread reads it yet
  return qv::RunProgram({argv + 1, argv + argc});
}
