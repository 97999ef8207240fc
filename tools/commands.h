#ifndef QVTESTER_TOOLS_COMMANDS_H_
#define QVTESTER_TOOLS_COMMANDS_H_

#include <string>
#include <vector>

#include "tools/options.h"

namespace qv {

// Each declares its options and hands back what runs once they are parsed.
CommandBody DeclareAutofocus(Options& command);
CommandBody DeclareCapture(Options& command);
CommandBody DeclareChart(Options& command);
CommandBody DeclareCircles(Options& command);
CommandBody DeclareDots(Options& command);
CommandBody DeclareDust(Options& command);
CommandBody DeclareExplain(Options& command);
CommandBody DeclareFlash(Options& command);
CommandBody DeclareList(Options& command);
CommandBody DeclareMtf(Options& command);
CommandBody DeclarePreview(Options& command);
CommandBody DeclareRegister(Options& command);
CommandBody DeclareSimulate(Options& command);
CommandBody DeclareVerify(Options& command);

/// Parses the words after the program's name and runs their command; answers the exit status. Throws what the command
/// throws.
int RunCommand(const std::vector<std::string>& words);

}  // namespace qv

#endif  // QVTESTER_TOOLS_COMMANDS_H_
