// Runs the benchmarks in turn, single-threaded, and prints the table of ratios at the end.
// With --verbose each benchmark's median is printed too; Google Benchmark's own options come on top.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <map>
#include <opencv2/core.hpp>

#include "benchmarks/ratios.h"

namespace {

std::vector<RatioRow>& Rows() {
  static std::vector<RatioRow> rows;  // made when first used: rows are added before main starts
  return rows;
}

double Median(std::vector<double> values) {
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

class RatioReporter : public benchmark::ConsoleReporter {
 public:
  explicit RatioReporter(bool verbose) : ConsoleReporter(OO_Tabular), verbose_(verbose) {}

  bool ReportContext(const Context& context) override { return !verbose_ || ConsoleReporter::ReportContext(context); }

  void ReportRuns(const std::vector<Run>& runs) override {
    std::vector<Run> shown;
    for (const Run& run : runs) {
      const benchmark::BenchmarkName& name = run.run_name;
      if (run.error_occurred) {
        std::fprintf(stderr, "%s: %s\n", name.str().c_str(), run.error_message.c_str());
        failed_ = true;
      } else if (run.run_type == Run::RT_Iteration) {
        const double seconds = run.cpu_accumulated_time / static_cast<double>(run.iterations);
        times_ms_[name.args.empty() ? name.function_name : name.function_name + "/" + name.args].push_back(1e3 *
                                                                                                           seconds);
      } else if (run.aggregate_name == "median") {
        shown.push_back(run);
      }
    }
    if (verbose_) ConsoleReporter::ReportRuns(shown);
  }

  bool failed() const { return failed_; }

  void Finalize() override {
    std::printf("%-44s %10s  %-44s %10s %8s %8s\n", "row", "ms", "over", "ms", "ratio", "target");
    for (const RatioRow& row : Rows()) PrintRow(row);
  }

 private:
  bool WasRun(const std::string& name) const { return times_ms_.count(name) > 0; }

  void PrintRow(const RatioRow& row) const {
    if (!WasRun(row.subject)) return;
    double yardstick_ms = 0;
    std::string names;
    for (const std::string& name : row.yardsticks) {
      if (!WasRun(name)) return;
      yardstick_ms += Median(times_ms_.at(name));
      names += (names.empty() ? "" : " + ") + name;
    }
    const double subject_ms = Median(times_ms_.at(row.subject));
    const double ratio = subject_ms / yardstick_ms;
    std::printf("%-44s %10.3f  %-44s %10.3f %8.3f %8.3f %s\n", row.row.c_str(), subject_ms, names.c_str(), yardstick_ms,
                ratio, row.target, ratio <= row.target ? "met" : "MISSED");
  }

  bool verbose_;
  bool failed_ = false;                                  // a benchmark could not run
  std::map<std::string, std::vector<double>> times_ms_;  // CPU time of the thread, an entry a repetition
};

}  // namespace

void AddRatio(RatioRow row) { Rows().push_back(std::move(row)); }

int main(int argc, char** argv) {
  // Ours first, so that the user's override them.
  std::vector<char*> arguments = {argv[0]};
  std::string defaults[] = {"--benchmark_repetitions=9", "--benchmark_enable_random_interleaving=true",
                            "--benchmark_min_time=0.02"};
  for (std::string& argument : defaults) arguments.push_back(argument.data());
  bool verbose = false;
  for (int i = 1; i < argc; ++i) {
    if (std::strcmp(argv[i], "--verbose") == 0) {
      verbose = true;
    } else {
      arguments.push_back(argv[i]);
    }
  }
  int count = static_cast<int>(arguments.size());
  benchmark::Initialize(&count, arguments.data());
  if (benchmark::ReportUnrecognizedArguments(count, arguments.data())) return 2;
  cv::setNumThreads(1);
  RatioReporter reporter(verbose);
  benchmark::RunSpecifiedBenchmarks(&reporter);
  benchmark::Shutdown();
  return reporter.failed() ? 1 : 0;
}
