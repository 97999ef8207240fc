#include "tools/program.h"

#include <atomic>
#include <csignal>
#include <cstdlib>
#include <iostream>
#include <thread>

#include "desk/base/failure.h"
#include "desk/base/files.h"

namespace qv {

namespace {

std::vector<std::string> command_line;
std::atomic<bool> finishes_first = false;
std::atomic<int> interrupted_by = 0;

}  // namespace

const std::vector<std::string>& CommandLine() { return command_line; }

void SetCommandLine(std::vector<std::string> words) { command_line = std::move(words); }

void WriteOutput(const std::string& path, const std::string& content) {
  if (path == "-") {
    std::cout << content << std::flush;
    if (!std::cout) throw Failure(kInternalFault, "standard output can't be written");
    return;
  }
  WriteWholeFile(path, content);
}

void WatchForInterrupts() {
  static sigset_t interrupts;
  sigemptyset(&interrupts);
  sigaddset(&interrupts, SIGINT);
  sigaddset(&interrupts, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &interrupts, nullptr);
  std::thread([] {
    int signal = 0;
    sigwait(&interrupts, &signal);
    if (finishes_first) {
      interrupted_by = signal;
      sigwait(&interrupts, &signal);
    }
    ScratchFolder::RemoveForGood();
    std::_Exit(128 + signal);
  }).detach();
}

void FinishWhenInterrupted() { finishes_first = true; }

int InterruptedStatus() { return interrupted_by == 0 ? 0 : 128 + interrupted_by; }

}  // namespace qv
