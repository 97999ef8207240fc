#include <algorithm>
#include <cmath>
#include <iostream>
#include <map>
#include <memory>

#include "desk/base/text.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

struct ShowOptions {
  StoreOptions store;
  std::vector<std::string> unit;
  bool all = false;
};

constexpr std::size_t kRowsShown = 40;

std::string StepOf(const RunRow& row) { return Printable(row.step.empty() ? row.measurement : row.step); }

// A unit's figures, those that did not pass first.
std::string FiguresText(Store& store, const Selection& selection, const RunRow& row) {
  std::map<std::int64_t, Quantity> quantities;
  for (const Quantity& quantity : store.Quantities()) quantities[quantity.id] = quantity;
  std::vector<FigureRow> figures;
  store.EachFigure(selection, [&](const FigureRow& figure) {
    if (figure.run == row.id) figures.push_back(figure);
  });
  const auto rank = [](const FigureRow& figure) {
    return figure.outcome == "FAIL" ? 0 : figure.outcome == "UNSET" ? 1 : figure.outcome == "PASS" ? 2 : 3;
  };
  std::stable_sort(figures.begin(), figures.end(),
                   [&](const FigureRow& a, const FigureRow& b) { return rank(a) < rank(b); });
  std::vector<std::vector<std::string>> lines;
  for (const FigureRow& figure : figures) {
    const Quantity& quantity = quantities.at(figure.quantity);
    lines.push_back({"  " + quantity.name, figure.outcome + (figure.marginal ? ", marginal" : ""),
                     figure.measured             ? ValueText(figure.value, figure.uncertainty, quantity.unit)
                     : figure.outcome == "UNSET" ? "not measured"
                                                 : "a list",
                     BoundsText(figure.bounds)});
  }
  return Table(lines, {false, false, false, false});
}

void ShowRuns(Store& store, const Selection& selection, bool all) {
  Tally runs;
  UnitVerdicts units;
  std::vector<std::vector<std::string>> lines;
  store.EachRow(selection, [&](const RunRow& row) {
    runs.Add(row.outcome);
    units.Add(row, row.outcome);
    lines.push_back({TimeText(row.start_millis), Printable(row.unit), StepOf(row),
                     row.outcome + (row.marginal ? ", marginal" : ""), Printable(row.station), Printable(row.lot)});
  });
  const std::size_t hidden = all || lines.size() <= kRowsShown ? 0 : lines.size() - kRowsShown;
  lines.erase(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(hidden));
  if (hidden > 0) std::cout << hidden << " earlier runs; --all shows them\n";
  lines.insert(lines.begin(), {"start", "unit", "step", "verdict", "station", "lot"});
  std::cout << Table(lines, std::vector<bool>(6, false)) << TallyText(runs, "run") << "\n"
            << TallyText(units.tally(), "unit") << "\n";
}

void ShowUnit(Store& store, const Selection& selection, const std::string& unit) {
  std::vector<RunRow> rows;
  store.EachRow(selection, [&](const RunRow& row) { rows.push_back(row); });
  if (rows.empty()) throw Failure(kWrongUsage, store.name() + ": holds no run of unit " + Printable(unit));
  for (const RunRow& row : rows) {
    std::cout << Printable(row.unit) << "  " << TimeText(row.start_millis) << "  " << StepOf(row) << "  " << row.outcome
              << (row.marginal ? ", marginal" : "") << "\n";
    std::cout << FiguresText(store, {{"key", "=", row.key}}, row);
  }
}

int Show(const ShowOptions& options) {
  Store store(options.store.store, Store::Use::kRead);
  Selection selection = options.store.selection();
  if (options.unit.empty()) {
    ShowRuns(store, selection, options.all);
    return kExitWithinLimits;
  }
  for (const std::string& unit : options.unit) {
    Selection of_unit = selection;
    of_unit.push_back({"unit", "=", unit});
    ShowUnit(store, of_unit, unit);
  }
  return kExitWithinLimits;
}

}  // namespace

CommandBody DeclareShow(Options& command) {
  auto options = std::make_shared<ShowOptions>();
  options->store.DeclareOn(command);
  command.Arguments("UNIT", options->unit, "Units whose figures are shown; without any, the runs are listed", "SERIAL",
                    false);
  command.Flag("--all", options->all, "List every run, not the last 40");
  return [options] { return Show(*options); };
}

}  // namespace qv
