#include "tools/store_options.h"

#include <algorithm>
#include <cmath>
#include <iostream>

#include "desk/base/text.h"
#include "desk/measure/figures.h"
#include "desk/measure/limits.h"

namespace qv {

namespace {

// Characters, not bytes.
std::size_t WidthOf(const std::string& text) {
  return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), [](char c) { return (c & 0xC0) != 0x80; }));
}

}  // namespace

void StoreOptions::DeclareOn(Options& command) {
  command.Argument("STORE", store, "A results file, or postgresql://user@host/database");
  command.Texts("--where", where, "Only runs for which this holds (= != < <= > >=); may be given again", "NAME=VALUE");
}

Selection StoreOptions::selection() const {
  Selection selection;
  for (const std::string& word : where) selection.push_back(ParseCondition(word));
  return selection;
}

void WaitOption::DeclareOn(Options& command) {
  command.Number("--wait", seconds, 0, 86400, "Wait so long for a store that is away or locked, at the start or later",
                 "SECONDS");
}

Patience WaitOption::patience() const {
  return {std::chrono::milliseconds(std::llround(1000 * seconds)),
          [](const std::string& sentence) { std::cerr << sentence << '\n'; }};
}

ArchiveLimits ReadArchiveLimits(const std::string& path) {
  const Limits read = ReadLimits(path);
  ArchiveLimits limits = {{}, read.accept_doubts, {}, read.rule};
  const auto bounds_of = [](const Limit& limit) {
    return Bounds{limit.min, limit.max, limit.marginal_min, limit.marginal_max};
  };
  for (const auto& [name, limit] : read.by_name) {
    if (FindFigure(name)->figure->axis == nullptr) {
      limits.by_name[name] = bounds_of(limit);
      continue;
    }
    ListBounds& list = limits.lists[name];
    list.each = bounds_of(limit);
    for (const auto& [number, own] : limit.by_number) list.by_number[number] = bounds_of(own);
  }
  return limits;
}

std::string ValueText(double value, const std::optional<double>& uncertainty, const std::string& unit) {
  std::string text = std::isnan(value) ? "not a number" : Format("%.6g", value);
  if (uncertainty) text += Format(" ± %.2g", 2 * *uncertainty);
  return unit.empty() || unit == "1" ? text : text + " " + unit;
}

std::string TallyText(const Tally& tally, const std::string& what) {
  std::string text = Count(static_cast<std::size_t>(tally.total()), what);
  const char* separator = ": ";
  for (const auto& [outcome, count] : tally.by_outcome) {
    text += separator + std::to_string(count) + " " + outcome;
    separator = ", ";
  }
  return std::isnan(tally.yield()) ? text : text + Format("; yield %.1f %%", 100 * tally.yield());
}

std::string Table(const std::vector<std::vector<std::string>>& lines, const std::vector<bool>& right) {
  std::vector<std::size_t> widths(right.size(), 0);
  for (const auto& line : lines) {
    for (std::size_t i = 0; i < line.size(); ++i) widths[i] = std::max(widths[i], WidthOf(line[i]));
  }
  std::string text;
  for (const auto& line : lines) {
    std::string row;
    for (std::size_t i = 0; i < line.size(); ++i) {
      const std::string fill(widths[i] - WidthOf(line[i]), ' ');
      row += (i == 0 ? "" : "  ") + (right[i] ? fill + line[i] : line[i] + fill);
    }
    row.erase(row.find_last_not_of(' ') + 1);
    text += row + "\n";
  }
  return text;
}

}  // namespace qv
