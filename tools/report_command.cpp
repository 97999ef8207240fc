#include <algorithm>
#include <filesystem>
#include <iostream>
#include <memory>

#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/results/archive.h"
#include "desk/results/report.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

struct ReportOptions {
  StoreOptions store;
  std::string unit, lot, output, junit, plot, title;
  std::string pictures = "all";
};

// A record's own pictures, where they still lie beside it.
void AddAttachments(StoredRun& run, const std::string& path) {
  const std::filesystem::path folder = std::filesystem::path(path).parent_path();
  for (const Json& phase : run.record["phases"]) {
    if (!phase.is_object() || !phase.contains("attachments") || !phase["attachments"].is_object()) continue;
    for (const auto& [name, attachment] : phase["attachments"].items()) {
      // Only beside the record: a record from elsewhere must not make a report of this machine's files.
      const std::filesystem::path file = folder / std::filesystem::path(name).filename();
      std::error_code none;
      if (!std::filesystem::is_regular_file(file, none)) continue;
      run.pictures.push_back({name, TextAt(attachment, "mimetype"), ReadWholeFile(file, kWrongUsage)});
    }
  }
}

void Fill(Report& report, const ReportOptions& options) {
  const std::string& source = options.store.store;
  if (LowerExtension(source) == ".json") {
    if (!options.store.where.empty() || !options.unit.empty() || !options.lot.empty()) {
      throw Failure(kWrongUsage,
                    Printable(source) + ": a record is one run; --where, --unit and --lot choose among a store's");
    }
    StoredRun run = ParseRun(ReadWholeFile(source, kWrongUsage), Printable(source));
    if (run.pictures.empty()) AddAttachments(run, source);
    report.Add(run);
    return;
  }
  Selection selection = options.store.selection();
  if (!options.unit.empty()) selection.push_back({"unit", "=", options.unit});
  if (!options.lot.empty()) selection.push_back({"lot", "=", options.lot});
  Store store(source, Store::Use::kRead);
  store.EachRun(selection, options.pictures != "none", [&](const RunRow&, StoredRun&& run) { report.Add(run); });
  if (report.runs() == 0) throw Failure(kWrongUsage, store.name() + ": no run is chosen");
}

std::string TitleOf(const ReportOptions& options) {
  if (!options.title.empty()) return options.title;
  std::string title = options.store.store.find("://") == std::string::npos
                          ? std::filesystem::path(options.store.store).filename().string()
                          : "results";
  if (!options.unit.empty()) title += ", unit " + options.unit;
  if (!options.lot.empty()) title += ", lot " + options.lot;
  for (const std::string& where : options.store.where) title += ", " + where;
  return title;
}

int MakeReport(const ReportOptions& options) {
  if (options.output.empty() && options.junit.empty() && options.plot.empty()) {
    throw Failure(kWrongUsage, "nothing to write: name a page (-o), --junit or --plot");
  }
  if (!options.plot.empty() && options.plot != "-" && LowerExtension(options.plot) != ".svg") {
    throw Failure(kWrongUsage, Printable(options.plot) + ": the plot is an SVG: name a .svg file");
  }
  CheckOutputs({{"the store", options.store.store}},
               {{"the page", options.output}, {"the test results", options.junit}, {"the plot", options.plot}});
  Report report(TitleOf(options), options.pictures == "all"        ? Report::Pictures::kAll
                                  : options.pictures == "failures" ? Report::Pictures::kFailures
                                                                   : Report::Pictures::kNone);
  Fill(report, options);
  if (!options.output.empty()) WriteOutput(options.output, report.Html());
  if (!options.junit.empty()) WriteOutput(options.junit, report.JUnit());
  if (!options.plot.empty()) WriteOutput(options.plot, report.Plot());
  std::cerr << "a report of " << Count(report.runs(), "run") << "\n";
  return kExitWithinLimits;
}

}  // namespace

CommandBody DeclareReport(Options& command) {
  auto options = std::make_shared<ReportOptions>();
  options->store.DeclareOn(command);
  command.Text("-o,--output", options->output, "Write the page, one HTML file that needs nothing else", "HTML");
  command.Text("--unit", options->unit, "Only this unit", "SERIAL");
  command.Text("--lot", options->lot, "Only this lot", "LOT");
  command.Choice("--pictures", options->pictures, {"all", "failures", "none"}, "Which runs' pictures the page holds",
                 "WHICH");
  command.Text("--title", options->title, "The page's title, in place of the store's name", "TEXT");
  command.Text("--junit", options->junit, "Write the verdicts as JUnit XML, for a CI server", "XML");
  command.Text("--plot", options->plot, "Draw curves and distributions, for a document", "SVG");
  return [options] { return MakeReport(*options); };
}

}  // namespace qv
