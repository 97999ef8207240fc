#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <iostream>
#include <iterator>
#include <memory>
#include <thread>
#include <unordered_set>

#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/batch/batch.h"
#include "desk/measure/measurement.h"
#include "desk/measure/properties.h"
#include "desk/results/report.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

struct BatchWanted {
  std::string what, inputs, store, limits, junit, pictures = "failures", shard = "1/1";
  std::vector<std::string> parameters, properties;
  bool watch = false, quiet = false;
  WaitOption wait;
  int workers = static_cast<int>(std::max(1U, std::thread::hardware_concurrency()));
  BatchOptions options;
};

// "threshold=110": as the measurement's own command takes it.
void AddParameter(Request& request, const std::string& words) {
  const Spec& spec = FindMeasurement(request.measurement)->spec();
  const std::string name = words.substr(0, words.find('='));
  std::vector<std::string> names;
  for (const Parameter& parameter : spec.parameters) {
    if (name == parameter.name && name != words) {
      request.parameters[name] = Parsed(parameter, words.substr(name.size() + 1));
      return;
    }
    names.emplace_back(parameter.name);
  }
  for (const InputSpec& input : spec.inputs) {
    if (input.optional && name == input.name && name != words) {
      request.parameters[name] = words.substr(name.size() + 1);
      return;
    }
    if (input.optional) names.emplace_back(input.name);
  }
  throw Failure(kWrongUsage, "--parameter " + Printable(words) + ": " + spec.name +
                                 " takes NAME=VALUE of its own parameters" + DidYouMean(name, names));
}

// A plan's file, or a plan of one measurement with its parameters, properties and limits.
Plan PlanFor(const BatchWanted& wanted) {
  if (FindMeasurement(wanted.what) == nullptr) {
    if (!fs::exists(wanted.what)) {
      std::vector<std::string> names;
      for (const Measurement* known : Measurements()) names.emplace_back(known->spec().name);
      throw Failure(kWrongUsage, Printable(wanted.what) + ": neither a measurement nor a plan's file" +
                                     DidYouMean(wanted.what, names));
    }
    if (!wanted.limits.empty() || !wanted.parameters.empty() || !wanted.properties.empty()) {
      throw Failure(kWrongUsage, "--limits, --parameter and --set go with a measurement; a plan holds its own");
    }
    return ReadPlan(wanted.what);
  }
  Request request;
  request.measurement = wanted.what;
  for (const std::string& words : wanted.parameters) AddParameter(request, words);
  for (const std::string& words : wanted.properties) AddProperty(request.properties, words);
  return PlanOf(request, wanted.limits.empty() ? Limits() : ReadLimits(wanted.limits));
}

std::vector<Job> JobsFor(const BatchWanted& wanted, Plan& plan) {
  const bool single = plan.name.empty();
  if (fs::is_directory(wanted.inputs)) {
    if (single) return JobsOfPhotos(wanted.inputs);
    plan.unit_folder = wanted.inputs;
    return JobsOfUnits(wanted.inputs);
  }
  const bool stdin_given = wanted.inputs == "-";
  const std::string text = stdin_given ? std::string(std::istreambuf_iterator<char>(std::cin), {})
                                       : ReadWholeFile(wanted.inputs, kWrongUsage);
  const std::string name = stdin_given ? "standard input" : Printable(wanted.inputs);
  std::vector<Job> jobs = JobsOfManifest(text, name, stdin_given ? "" : fs::path(wanted.inputs).parent_path().string());
  const bool pathless = std::all_of(jobs.begin(), jobs.end(), [](const Job& job) { return job.inputs.empty(); });
  if (single && !jobs.empty() && pathless) {
    throw Failure(kWrongUsage, name + ": no row has a path: a measurement needs the column \"path\"");
  }
  return jobs;
}

std::string Verdicts(const BatchProgress& progress) {
  std::string text;
  for (const auto& [outcome, count] : progress.outcomes) text += Format("  %s %zu", outcome.c_str(), count);
  return text;
}

std::string Duration(double seconds) {
  const auto whole = std::llround(seconds);
  return Format("%lld:%02lld:%02lld", whole / 3600, whole / 60 % 60, whole % 60);
}

// One line that is written over again and again; on a terminal only.
void ShowProgress(const BatchProgress& progress) {
  const double rate = static_cast<double>(progress.jobs_done) / std::max(progress.seconds, 1e-3);
  const auto left = static_cast<double>(progress.jobs - progress.jobs_done);
  std::cerr << Format("\r%zu/%zu  %.1f/s  %s left%s\x1b[K", progress.jobs_done, progress.jobs, rate,
                      Duration(left / std::max(rate, 1e-3)).c_str(), Verdicts(progress).c_str())
            << std::flush;
}

int StatusOf(const BatchProgress& progress) {
  if (progress.outcomes.count("ERROR") != 0) return kExitCouldNotMeasure;
  return progress.outcomes.count("FAIL") != 0 ? kExitLimitBroken : kExitWithinLimits;
}

// The verdicts of this batch's runs, those that were there before among them.
void WriteJUnit(const BatchWanted& wanted, const Plan& plan, Store& store, const BatchProgress& done) {
  const std::unordered_set<std::string> keys(done.keys.begin(), done.keys.end());
  Report report(plan.name.empty() ? wanted.what : plan.name, Report::Pictures::kNone);
  store.EachRun(RunsOf(plan), false, [&](const RunRow& row, StoredRun&& run) {
    if (keys.count(row.key) != 0) report.Add(run);
  });
  WriteOutput(wanted.junit, report.JUnit());
}

void Tell(const Store& store, const BatchProgress& done) {
  std::cout << Format("%s: %s, %s stored, %zu there before; %.1f s\n", store.name().c_str(),
                      Count(done.jobs_done, "unit").c_str(), Count(done.runs, "run").c_str(), done.known, done.seconds)
            << Verdicts(done).substr(std::min<std::size_t>(2, Verdicts(done).size())) << '\n';
}

KeepPictures PicturesOf(const BatchWanted& wanted) {
  if (wanted.pictures == "none") return KeepPictures::kNone;
  return wanted.pictures == "all" ? KeepPictures::kAll : KeepPictures::kFailures;
}

int RunIt(BatchWanted& wanted) {
  Plan plan = PlanFor(wanted);
  std::unique_ptr<FolderWatch> watch;
  if (wanted.watch) {
    if (!plan.name.empty() || !fs::is_directory(wanted.inputs)) {
      throw Failure(kWrongUsage, "--watch takes a measurement and a folder into which photos arrive");
    }
    watch = std::make_unique<FolderWatch>(wanted.inputs);  // before the folder is read, so that none is missed
  }
  const Shard shard = ParseShard(wanted.shard);
  const std::vector<Job> jobs = ShareOf(shard, JobsFor(wanted, plan));
  if (watch) watch->Take(shard);
  if (jobs.empty() && !wanted.watch && shard.count == 1) {
    throw Failure(kWrongUsage, Printable(wanted.inputs) + ": holds " + (plan.name.empty() ? "no photo" : "no unit"));
  }
  CheckOutputs({{"the inputs", wanted.inputs}, {"the plan", wanted.what}},
               {{"the store", wanted.store.find("://") == std::string::npos ? wanted.store : ""},
                {"the test results", wanted.junit}});
  wanted.options.workers = wanted.workers;
  wanted.options.pictures = PicturesOf(wanted);
  Store store(wanted.store, Store::Use::kWrite, wanted.wait.patience());
  FinishWhenInterrupted();
  const bool terminal = isatty(STDERR_FILENO) != 0 && !wanted.quiet;
  const auto show = [&](const BatchProgress& progress) {
    if (terminal) ShowProgress(progress);
  };
  const BatchProgress done =
      RunBatch(plan, jobs, watch.get(), store, wanted.options, show, [] { return InterruptedStatus() != 0; });
  if (terminal) std::cerr << '\n';
  if (!wanted.junit.empty()) WriteJUnit(wanted, plan, store, done);
  if (!wanted.quiet) Tell(store, done);
  return InterruptedStatus() != 0 ? InterruptedStatus() : StatusOf(done);
}

}  // namespace

CommandBody DeclareBatch(Options& command) {
  const auto wanted = std::make_shared<BatchWanted>();
  command.Argument("MEASUREMENT|PLAN", wanted->what, "A measurement's name, or a plan's file");
  command.Argument("DIR|MANIFEST", wanted->inputs,
                   "A folder of photos (of a plan: of units); a CSV or JSONL file of inputs; - is standard input");
  command.Text("-o,--output", wanted->store, "The store: a SQLite file, or postgresql://...", "STORE", true);
  command.Whole("-j,--jobs", wanted->workers, 1, 1024, "Worker processes", "N");
  command.Text("--limits", wanted->limits, "Judge a measurement's figures by this limits file", "FILE");
  command.Texts("--parameter", wanted->parameters, "Set one of the measurement's parameters", "NAME=VALUE");
  command.Texts("--set", wanted->properties, "Set a property, by number or name", "PROPERTY=VALUE");
  command.Choice("--pictures", wanted->pictures, {"all", "failures", "none"}, "Of which runs to keep a picture",
                 "WHICH");
  command.Number("--timeout", wanted->options.timeout_seconds, 0.1, 86400, "Give up a measurement after this long",
                 "SECONDS");
  wanted->wait.DeclareOn(command);
  command.Text("--shard", wanted->shard, "Take the K-th of N shares of the inputs", "K/N");
  command.Flag("--watch", wanted->watch, "Go on with photos as they arrive, until interrupted");
  command.Text("--station", wanted->options.station, "Name of the station", "ID");
  command.Text("--operator", wanted->options.operator_name, "Who measures", "NAME");
  command.Text("--lot", wanted->options.lot, "What the units belong to", "NAME");
  command.Text("--junit", wanted->junit, "Write the verdicts as JUnit XML, for a CI server", "XML");
  command.Flag("--quiet", wanted->quiet, "Print nothing but errors");
  return [wanted] { return RunIt(*wanted); };
}

}  // namespace qv
