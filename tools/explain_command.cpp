#include <algorithm>
#include <iostream>
#include <memory>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/figures.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

std::string Explain(const FigureInfo& info) {
  const Figure& figure = *info.figure;
  std::string unit = figure.unit.name;
  if (figure.axis != nullptr) unit += std::string(", over ") + figure.axis->name;
  const double repeatability = Repeatability(figure);
  return info.name + "\n  meaning        " + figure.docstring + "\n  unit           " + unit + "\n  method         " +
         figure.method.name + "\n  accuracy       " + figure.method.accuracy + "\n  influences     " +
         figure.method.moved_by + "\n  same photo     " +
         (repeatability == 0 ? "the same number on every machine\n"
                             : Format("may differ by %g from one machine to another\n", repeatability));
}

}  // namespace

CommandBody DeclareExplain(Options& command) {
  auto names = std::make_shared<std::vector<std::string>>();
  command.Arguments("MEASUREMENT", *names, "Names as records give them, or parts of names; without any, all are listed",
                    "NAME", false);
  return [names] {
    if (names->empty()) {
      for (const FigureInfo& info : AllFigures()) std::cout << info.name << '\n';
    }
    for (const std::string& name : *names) {
      bool found = false;
      for (const FigureInfo& info : AllFigures()) {
        const bool exact = FindFigure(name) != nullptr;
        if (exact ? info.name != name : info.name.find(name) == std::string::npos) continue;
        std::cout << (found ? "\n" : "") << Explain(info);
        found = true;
      }
      if (!found) {
        throw Failure(kWrongUsage, name + ": no measurement has this name; `qvtester explain` lists them");
      }
    }
    return static_cast<int>(kExitWithinLimits);
  };
}

}  // namespace qv
