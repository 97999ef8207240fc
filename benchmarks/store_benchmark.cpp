// The results store: how long runs take to be stored, and a million figures to be judged and studied. No ratios: what
// counts is the wait.   store_benchmark [FOLDER]
#include <chrono>
#include <cstdio>
#include <ctime>
#include <string>
#include <vector>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/results/judge.h"
#include "desk/results/report.h"
#include "desk/results/study.h"

namespace qv {
namespace {

constexpr int kFigures = 20;

// A record of 20 figures; `padding` bytes of log make it as long as a photo's.
Json RecordOf(int run, std::size_t padding) {
  Json measurements = Json::object();
  for (int i = 0; i < kFigures; ++i) {
    const std::string name = Format("bench_figure_%02d", i);
    measurements[name] = {{"name", name},
                          {"outcome", "PASS"},
                          {"measured_value", i + run * 1e-6},
                          {"units", {{"name", "pixel"}, {"code", "E37"}, {"suffix", "px"}}},
                          {"method", "counted"},
                          {"docstring", "A figure."},
                          {"uncertainty", {{"standard", 0.01}}},
                          {"limits", {{"min", i - 1.0}, {"max", i + 1.0}}}};
  }
  Json record = {{"schema", "qvtester-record-1"},
                 {"dut_id", Format("SN%06d", run)},
                 {"station_id", "bench"},
                 {"start_time_millis", 1795000000000 + run},
                 {"end_time_millis", 1795000000040 + run},
                 {"outcome", "PASS"},
                 {"outcome_details", Json::array()},
                 {"marginal", false},
                 {"metadata", {{"library_version", "1"}, {"limits", {{"name", "l"}, {"revision", "1"}}}}},
                 {"inputs", Json::array({{{"slot", 17}, {"path", "a.png"}, {"sha256", Format("%064d", run)}}})},
                 {"log_records", Json::array()}};
  record["phases"] = Json::array({{{"name", "bench"}, {"result_code", 1}, {"measurements", measurements}}});
  for (std::size_t i = 0; i < padding; i += 100) {
    record["log_records"].push_back({{"message", Format("[Bench] finder point : %zu of run %d", i, run)}});
  }
  return record;
}

template <typename Work>
void Time(const char* what, Work&& work) {
  const auto began = std::chrono::steady_clock::now();
  const std::clock_t cpu = std::clock();
  work();
  const double wall = std::chrono::duration<double>(std::chrono::steady_clock::now() - began).count();
  std::printf("%-62s %7.2f s, CPU %7.2f s\n", what, wall, static_cast<double>(std::clock() - cpu) / CLOCKS_PER_SEC);
  std::fflush(stdout);
}

void Fill(Store& store, int runs, std::size_t padding) {
  std::vector<StoredRun> batch;
  for (int run = 0; run < runs; ++run) {
    batch.emplace_back().record = RecordOf(run, padding);
    if (batch.size() < 200 && run + 1 < runs) continue;
    store.Put(batch);
    batch.clear();
  }
}

int Main(const std::string& folder) {
  {
    Store store(folder + "/runs.db", Store::Use::kWrite);
    std::vector<StoredRun> runs(10000);
    for (int i = 0; i < 10000; ++i) runs[static_cast<std::size_t>(i)].record = RecordOf(i, 26000);
    std::printf("a record has %zu bytes\n", runs[0].record.dump().size());
    Time("store 10,000 runs of 20 figures, 200 a transaction", [&] {
      for (std::size_t i = 0; i < runs.size(); i += 200) {
        store.Put({std::make_move_iterator(runs.begin() + static_cast<std::ptrdiff_t>(i)),
                   std::make_move_iterator(runs.begin() + static_cast<std::ptrdiff_t>(i + 200))});
      }
    });
    Report report("bench", Report::Pictures::kNone);
    Time("read them again for a report",
         [&] { store.EachRun({}, false, [&](const RunRow&, StoredRun&& run) { report.Add(run); }); });
    Time("make its page", [&] { std::printf("%.1f MB  ", static_cast<double>(report.Html().size()) / 1e6); });
  }
  Store store(folder + "/figures.db", Store::Use::kWrite);
  Fill(store, 50000, 0);
  ArchiveLimits limits;
  for (int i = 0; i < kFigures; ++i) limits.by_name[Format("bench_figure_%02d", i)] = {i - 1.0, i + 0.04, {}, {}};
  Time("judge 1,000,000 figures",
       [&] { std::printf("%zu verdicts change  ", JudgeAgain(store, {}, limits, nullptr).changes.size()); });
  Time("study 1,000,000 figures", [&] { StudyFigures(store, {}, {}, {}, false); });
  Time("study them and keep each reading", [&] { StudyFigures(store, {}, {}, {}, true); });
  return 0;
}

}  // namespace
}  // namespace qv

int main(int argc, char** argv) {
  try {
    qv::ScratchFolder scratch;
    return qv::Main(argc > 1 ? argv[1] : scratch.path());
  } catch (const std::exception& e) {
    std::fprintf(stderr, "%s\n", e.what());
    return 1;
  }
}
