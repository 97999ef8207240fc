#ifndef QVTESTER_TOOLS_COMMANDS_H_
#define QVTESTER_TOOLS_COMMANDS_H_

#include <CLI/CLI.hpp>
#include <functional>
#include <string>
#include <vector>

namespace qv {

/// A command's body; answers the exit status.
using CommandBody = std::function<int()>;

// Each declares its options on the command-line parser's object and hands back what runs once they are parsed.
CommandBody DeclareAutofocus(CLI::App& command);
CommandBody DeclareCapture(CLI::App& command);
CommandBody DeclareChart(CLI::App& command);
CommandBody DeclareCircles(CLI::App& command);
CommandBody DeclareDots(CLI::App& command);
CommandBody DeclareDust(CLI::App& command);
CommandBody DeclareExplain(CLI::App& command);
CommandBody DeclareFlash(CLI::App& command);
CommandBody DeclareList(CLI::App& command);
CommandBody DeclareMtf(CLI::App& command);
CommandBody DeclarePreview(CLI::App& command);
CommandBody DeclareRegister(CLI::App& command);
CommandBody DeclareSimulate(CLI::App& command);
CommandBody DeclareVerify(CLI::App& command);

/// Parses the words after the program's name and runs their command; answers the exit status. Throws what the command
/// throws.
int RunCommand(const std::vector<std::string>& words);

}  // namespace qv

#endif  // QVTESTER_TOOLS_COMMANDS_H_
