#include <filesystem>
#include <iostream>
#include <memory>

#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/batch/plan.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

// Other outputs are made anew each time; a plan is written once, and then a person's work.
void RefuseToReplace(const std::string& path) {
  if (std::filesystem::is_regular_file(path)) {
    throw Failure(kWrongUsage,
                  Printable(path) + ": is there already, and a new plan would take its place; name another");
  }
}

}  // namespace

CommandBody DeclarePlan(Options& command) {
  struct Wanted {
    std::vector<std::string> files;
    bool make = false;
    std::string output = "-";
  };
  const auto wanted = std::make_shared<Wanted>();
  command.Arguments("PLAN", wanted->files, "The plan's file", "FILE", false);
  command.Flag("--new", wanted->make, "Write a plan to start from");
  command.Text("-o,--output", wanted->output, "Where --new writes it; - is standard output", "FILE");
  return [wanted]() -> int {
    if (wanted->make != wanted->files.empty() || wanted->files.size() > 1) {
      throw Failure(kWrongUsage, "plan takes one file to check, or --new");
    }
    if (wanted->make) {
      if (wanted->output != "-") {
        CheckOutputs({}, {{"the plan", wanted->output}});
        RefuseToReplace(wanted->output);
      }
      WriteOutput(wanted->output, NewPlan());
    } else {
      std::cout << Describe(ReadPlan(wanted->files[0]));
    }
    return kExitWithinLimits;
  };
}

}  // namespace qv
