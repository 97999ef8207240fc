#include <algorithm>
#include <cmath>
#include <filesystem>
#include <iostream>
#include <memory>

#include "desk/base/digest.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/batch/plan.h"
#include "desk/measure/measurement.h"
#include "desk/measure/telling.h"
#include "desk/results/report.h"
#include "desk/results/store.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

struct RunWanted {
  std::string plan, unit, station, operator_name, lot, store, records, pictures, junit;
  WaitOption wait;
  bool quiet = false;
};

// A line of the table: one figure of one step.
struct TableRow {
  int rank;  // failures first
  std::string step, figure, verdict, value, limit;
};

int RankOf(Outcome outcome) {
  switch (outcome) {
    case Outcome::kFail: return 0;
    case Outcome::kUnset: return 1;
    case Outcome::kPass: return 2;
    default: return 3;
  }
}

std::string TableValue(const Reading& reading) {
  if (!std::isfinite(reading.value())) return "none";
  std::string text = Format("%.6g", reading.value());
  if (reading.uncertainties.size() == 1) {
    text = Format("%.4f \u00b1 %.2g", reading.value(), reading.uncertainty().expanded);
  }
  const std::string suffix = reading.info->figure->unit.suffix;
  return suffix == "1" ? text : text + " " + suffix;
}

void AddLines(const PlanStep& step, const Record& record, std::vector<TableRow>& lines) {
  for (const Reading& reading : record.phase.readings) {
    if (reading.info->figure->axis != nullptr && !reading.limit.given()) continue;  // curves are in the record
    const std::string value = reading.info->figure->axis != nullptr ? "a list" : TableValue(reading);
    lines.push_back({RankOf(reading.outcome), step.name, reading.info->name,
                     std::string(Name(reading.outcome)) + (reading.marginal ? ", marginal" : ""), value,
                     LimitWords(reading)});
  }
}

void PrintTable(std::vector<TableRow> lines) {
  std::stable_sort(lines.begin(), lines.end(), [](const TableRow& a, const TableRow& b) { return a.rank < b.rank; });
  const std::vector<std::string TableRow::*> columns = {&TableRow::verdict, &TableRow::figure, &TableRow::value,
                                                        &TableRow::limit, &TableRow::step};
  std::vector<std::size_t> widths;
  for (const auto column : columns) {
    std::size_t widest = 0;
    for (const TableRow& line : lines) widest = std::max(widest, TextWidth(line.*column));
    widths.push_back(widest);
  }
  for (const TableRow& line : lines) {
    std::string text;
    for (std::size_t i = 0; i < columns.size(); ++i) {
      const std::string shown = Printable(line.*columns[i]);
      text += shown + std::string(widths[i] + 2 - std::min(widths[i] + 2, TextWidth(shown)), ' ');
    }
    text.erase(text.find_last_not_of(' ') + 1);
    std::cout << text << '\n';
  }
}

// The step's name as part of a file's.
std::string FileName(const std::string& step) {
  std::string name = step;
  for (char& c : name) {
    if (std::isalnum(static_cast<unsigned char>(c)) == 0 && c != '-') c = '_';
  }
  return name + ".png";
}

std::vector<StoredPicture> Pictures(const PlanStep& step, Record& record) {
  const std::optional<Picture> picture = record.finding ? record.finding->Draw(record) : std::nullopt;
  if (!picture) return {};
  StoredPicture stored = {FileName(step.name), "image/png", picture->Png()};
  record.phase.attachments.push_back({stored.name, stored.mimetype, stored.name, HexDigest(stored.content, "SHA1")});
  return {std::move(stored)};
}

class PlanRun {
 public:
  explicit PlanRun(const RunWanted& wanted) : wanted_(wanted), plan_(ReadPlan(wanted.plan)) {}

  int Go() {
    Check();
    // Opened first: a store that can't be written is known before anything is measured.
    if (!wanted_.store.empty())
      store_ = std::make_unique<Store>(wanted_.store, Store::Use::kWrite, wanted_.wait.patience());
    for (const PlanStep& step : plan_.steps) {
      if (ended_) {
        std::cerr << Printable(step.name) << ": not run, since an earlier step could not measure\n";
      } else {
        Do(step);
      }
    }
    return Finish();
  }

 private:
  void Check() const {
    std::vector<NamedFile> inputs = {{"the plan", wanted_.plan}};
    for (const PlanStep& step : plan_.steps) {
      for (const Input& input : RequestFor(plan_, step, wanted_.unit).inputs)
        inputs.push_back({"an input", input.name});
    }
    inputs.push_back({"the store", wanted_.store});
    std::vector<NamedFile> outputs = {{"the records", wanted_.records}, {"the test results", wanted_.junit}};
    for (const PlanStep& step : plan_.steps) {
      if (!wanted_.pictures.empty()) outputs.push_back({"a picture", wanted_.pictures + "/" + FileName(step.name)});
    }
    std::error_code failed;
    if (!wanted_.pictures.empty()) fs::create_directories(wanted_.pictures, failed);
    if (failed)
      throw Failure(kWrongUsage, Printable(wanted_.pictures) + ": can't be made a folder: " + failed.message());
    CheckOutputs(inputs, outputs);
  }

  void Do(const PlanStep& step) {
    Record record = MeasureStep(step, RequestFor(plan_, step, wanted_.unit), wanted_.unit, wanted_.station);
    record.command = CommandLine();
    const bool drawn = !wanted_.pictures.empty() || store_ != nullptr;
    StoredRun run;
    if (drawn) run.pictures = Pictures(step, record);
    run.filing = {wanted_.operator_name, wanted_.lot, plan_.name, step.name, {}};
    run.record = record.ToJson();
    if (record.outcome() == Outcome::kError) {
      for (const Remark& remark : record.remarks)
        std::cerr << Printable(step.name) << ": " << Printable(remark.sentence()) << '\n';
      ended_ = plan_.stop_on_error;
    }
    AddLines(step, record, lines_);
    worst_ = std::max(worst_, StatusOf(record.outcome()));
    verdicts_ += Format("%s%s %s", verdicts_.empty() ? "" : "; ", Printable(step.name).c_str(), Name(record.outcome()));
    for (const StoredPicture& picture : run.pictures) {
      if (!wanted_.pictures.empty()) WriteWholeFile(wanted_.pictures + "/" + picture.name, picture.content);
    }
    records_ += run.record.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n";
    runs_.push_back(std::move(run));
  }

  int Finish() {
    // Said only when what was asked for is kept.
    if (store_) store_->Put(runs_);
    if (!wanted_.records.empty()) WriteOutput(wanted_.records, records_);
    if (!wanted_.junit.empty()) WriteJUnit();
    if (!wanted_.quiet && wanted_.records != "-") {
      PrintTable(lines_);
      std::cout << Printable(wanted_.unit) << ": " << verdicts_ << '\n';
    }
    return worst_;
  }

  void WriteJUnit() const {
    Report report(plan_.name, Report::Pictures::kNone);
    for (const StoredRun& run : runs_) report.Add(run);
    WriteOutput(wanted_.junit, report.JUnit());
  }

  static int StatusOf(Outcome outcome) {
    if (outcome == Outcome::kError) return kExitCouldNotMeasure;
    return outcome == Outcome::kFail ? kExitLimitBroken : kExitWithinLimits;
  }

  RunWanted wanted_;
  Plan plan_;
  std::unique_ptr<Store> store_;
  std::vector<StoredRun> runs_;
  std::vector<TableRow> lines_;
  std::string records_, verdicts_;
  int worst_ = kExitWithinLimits;
  bool ended_ = false;
};

}  // namespace

CommandBody DeclareRun(Options& command) {
  const auto wanted = std::make_shared<RunWanted>();
  command.Argument("PLAN", wanted->plan, "The plan's file");
  command.Text("--unit", wanted->unit, "Serial number of the unit", "SERIAL", true);
  command.Text("--station", wanted->station, "Name of the station", "ID");
  command.Text("--operator", wanted->operator_name, "Who measures", "NAME");
  command.Text("--lot", wanted->lot, "What the unit belongs to", "NAME");
  command.Text("-o,--output", wanted->store, "Keep the runs in this store: a SQLite file, or postgresql://...",
               "STORE");
  wanted->wait.DeclareOn(command);
  command.Text("--json", wanted->records, "Write the records, one a line; - is standard output", "FILE");
  command.Text("--annotate", wanted->pictures, "Write a picture of each step into this folder", "DIR");
  command.Text("--junit", wanted->junit, "Write the verdicts as JUnit XML, for a CI server", "XML");
  command.Flag("--quiet", wanted->quiet, "Print nothing but errors");
  return [wanted] {
    if (wanted->unit.empty()) throw Failure(kWrongUsage, "--unit: an empty serial number");
    return PlanRun(*wanted).Go();
  };
}

}  // namespace qv
