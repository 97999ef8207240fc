#ifndef QVTESTER_TOOLS_PROGRAM_H_
#define QVTESTER_TOOLS_PROGRAM_H_

#include <string>
#include <vector>

#include "desk/base/failure.h"

// What every command shares: exit status, command line and standard output.

namespace qv {

enum ExitStatus {
  kExitWithinLimits = 0,
  kExitLimitBroken = 1,
  kExitWrongUsage = 2,
  kExitCouldNotMeasure = 3,
  kExitInternalFault = 4
};

constexpr ExitStatus StatusOf(FailureKind kind) {
  switch (kind) {
    case kWrongUsage: return kExitWrongUsage;
    case kCouldNotMeasure: return kExitCouldNotMeasure;
    default: return kExitInternalFault;
  }
}

/// The words after the program's name.
const std::vector<std::string>& CommandLine();
void SetCommandLine(std::vector<std::string> words);

/// Writes a file as a whole ("-" is standard output); throws Failure when it can't.
void WriteOutput(const std::string& path, const std::string& content);

/// From here on an interrupt removes the scratch folder and ends the program with status 130. Call before any thread is
/// started.
void WatchForInterrupts();
/// From here on the first interrupt is only told by InterruptedStatus; the second ends the program.
void FinishWhenInterrupted();
/// The status to end with once interrupted (130); 0 before.
int InterruptedStatus();

}  // namespace qv

#endif  // QVTESTER_TOOLS_PROGRAM_H_
