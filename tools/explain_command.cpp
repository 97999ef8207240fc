#include <algorithm>
#include <iostream>
#include <memory>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/figures.h"
#include "desk/measure/uncertainty.h"
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
         figure.method.name + "\n  accuracy       " + Accuracy(figure.method) + "\n  influences     " +
         figure.method.moved_by + "\n  same photo     " +
         (repeatability == 0 ? "the same number on every machine\n"
                             : Format("may differ by %g from one machine to another\n", repeatability));
}

// How far figures may be trusted is told by method: many figures share one.
void ExplainUncertainty() {
  std::cout
      << "A record's `uncertainty` holds a figure's standard uncertainty, and the expanded one within which the true "
         "value\nlies 95 times in 100 (JCGM 100), by one of these methods:\n";
  for (const UncertaintyMethod& method : UncertaintyMethods()) {
    std::cout << '\n' << method.name << "\n  " << method.text << '\n';
  }
}

}  // namespace

CommandBody DeclareExplain(Options& command) {
  auto names = std::make_shared<std::vector<std::string>>();
  command.Arguments("MEASUREMENT", *names,
                    "Names as records give them, or parts of names; without any, all are listed; \"uncertainty\": how "
                    "far they may be trusted",
                    "NAME", false);
  return [names] {
    if (names->empty()) {
      for (const FigureInfo& info : AllFigures()) std::cout << info.name << '\n';
    }
    for (const std::string& name : *names) {
      if (name == "uncertainty") {
        ExplainUncertainty();
        continue;
      }
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
