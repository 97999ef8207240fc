#ifndef QVTESTER_TOOLS_COMMANDS_H_
#define QVTESTER_TOOLS_COMMANDS_H_

#include <string>
#include <vector>

#include "tools/measure_command.h"
#include "tools/options.h"

namespace qv {

// What single measuring commands add.
std::shared_ptr<CommandExtra> MakeTruthComparison();
std::shared_ptr<CommandExtra> MakeProductOutput();

/// Parses the words after the program's name and runs their command; answers the exit status. What ends it is said on
/// standard error, in one line that a terminal may see.
int RunProgram(const std::vector<std::string>& words);

}  // namespace qv

#endif  // QVTESTER_TOOLS_COMMANDS_H_
