#ifndef QVTESTER_TOOLS_COMMANDS_H_
#define QVTESTER_TOOLS_COMMANDS_H_

#include <string>
#include <vector>

#include "tools/measure_command.h"
#include "tools/options.h"

namespace qv {

// Each declares its options and hands back what runs once they are parsed.
CommandBody DeclareBatch(Options& command);
CommandBody DeclareChart(Options& command);
CommandBody DeclareExplain(Options& command);
CommandBody DeclareExport(Options& command);
CommandBody DeclareImport(Options& command);
CommandBody DeclareJudge(Options& command);
CommandBody DeclareList(Options& command);
CommandBody DeclarePlan(Options& command);
CommandBody DeclareReport(Options& command);
CommandBody DeclareRun(Options& command);
CommandBody DeclareShow(Options& command);
CommandBody DeclareSimulate(Options& command);
CommandBody DeclareStudy(Options& command);
CommandBody DeclareVerify(Options& command);

// What single measuring commands add.
std::shared_ptr<CommandExtra> MakeTruthComparison();
std::shared_ptr<CommandExtra> MakeProductOutput();

/// Parses the words after the program's name and runs their command; answers the exit status. Throws what the command
/// throws.
int RunCommand(const std::vector<std::string>& words);

}  // namespace qv

#endif  // QVTESTER_TOOLS_COMMANDS_H_
