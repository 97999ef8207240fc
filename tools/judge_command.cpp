#include <cmath>
#include <iostream>
#include <memory>
#include <optional>

#include "desk/base/text.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

struct JudgeOptions {
  StoreOptions store;
  std::string limits, against;
  bool all = false;
};

std::string YieldText(const Tally& tally) {
  return std::isnan(tally.yield()) ? "-" : Format("%.2f %%", 100 * tally.yield());
}

std::string YieldTable(const Judgement& judgement) {
  std::vector<std::vector<std::string>> lines = {{"step", "figure", "judged", "yield before", "after"}};
  for (const JudgedFigure& figure : judgement.figures) {
    const std::int64_t judged = figure.after.total() - figure.after.of("MEASURED");
    lines.push_back({Printable(figure.step.empty() ? "-" : figure.step), figure.name, std::to_string(judged),
                     YieldText(figure.before), YieldText(figure.after)});
  }
  return Table(lines, {false, false, true, true, true});
}

std::string ChangeTable(const Judgement& judgement, std::size_t most) {
  std::vector<std::vector<std::string>> lines = {{"unit", "step", "figure", "value", "before", "after"}};
  for (const Change& change : judgement.changes) {
    if (lines.size() > most) break;
    lines.push_back({Printable(change.unit), Printable(change.step.empty() ? change.measurement : change.step),
                     change.figure.empty() ? "(the run)" : change.figure,
                     std::isnan(change.value) ? "" : Format("%.6g", change.value), change.before, change.after});
  }
  std::string text = Table(lines, {false, false, false, true, false, false});
  const std::size_t left = judgement.changes.size() - (lines.size() - 1);
  return left == 0 ? text : text + "... and " + std::to_string(left) + " more; --all shows them\n";
}

int Judge(const JudgeOptions& options) {
  const ArchiveLimits now = ReadArchiveLimits(options.limits);
  std::optional<ArchiveLimits> against;
  if (!options.against.empty()) against = ReadArchiveLimits(options.against);
  Store store(options.store.store, Store::Use::kRead);
  const Judgement judgement = JudgeAgain(store, options.store.selection(), now, against ? &*against : nullptr);
  for (const std::string& name : judgement.idle_limits) {
    std::cerr << "warning: " << name << ": no run measures it\n";
  }
  std::cout << "before  " << TallyText(judgement.runs_before, "run") << "\nafter   "
            << TallyText(judgement.runs_after, "run") << "\nbefore  " << TallyText(judgement.units_before, "unit")
            << "\nafter   " << TallyText(judgement.units_after, "unit") << "\n\n"
            << YieldTable(judgement) << "\n"
            << Count(judgement.changes.size(), "verdict") << " changed\n";
  if (!judgement.changes.empty()) std::cout << ChangeTable(judgement, options.all ? SIZE_MAX : 40);
  if (judgement.runs_after.of("ERROR") > 0) return kExitCouldNotMeasure;
  return judgement.runs_after.of("FAIL") > 0 ? kExitLimitBroken : kExitWithinLimits;
}

}  // namespace

CommandBody DeclareJudge(Options& command) {
  auto options = std::make_shared<JudgeOptions>();
  options->store.DeclareOn(command);
  command.Text("--limits", options->limits, "Judge by this limits file", "FILE", true);
  command.Text("--against", options->against, "Compare with what this limits file says, not with the stored verdicts",
               "FILE");
  command.Flag("--all", options->all, "Show every verdict that changed, not the first 40");
  return [options] { return Judge(*options); };
}

}  // namespace qv
