#ifndef QVTESTER_DESK_BATCH_BATCH_H_
#define QVTESTER_DESK_BATCH_BATCH_H_

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "desk/batch/job.h"
#include "desk/batch/plan.h"
#include "desk/results/store.h"

namespace qv {

enum class KeepPictures { kNone, kFailures, kAll };

struct BatchOptions {
  int workers = 1;
  double timeout_seconds = 60;  // for one step of one unit
  KeepPictures pictures = KeepPictures::kNone;
  std::string station, operator_name, lot;  // of jobs that name none
};

struct BatchProgress {
  std::size_t jobs = 0, jobs_done = 0;          // units; with a watched folder, those that have arrived
  std::size_t runs = 0;                         // measured and stored in this batch
  std::size_t known = 0;                        // steps whose run was in the store before
  std::map<std::string, std::size_t> outcomes;  // of all these runs, by word
  std::vector<std::string> keys;                // of all these runs
  double seconds = 0;
};

/// The runs of a plan, or of a measurement that no plan asks for: none other can be the same run.
Selection RunsOf(const Plan& plan);

/// Measures all jobs by the plan in worker processes of their own and stores every run as it comes; what the store
/// holds already is not measured again. A worker that dies, hangs or is killed costs the step it was at an ERROR that
/// names the signal, and nothing else. With a watch it goes on with what arrives, until `stop` answers true.
///
/// `progress` is told after each unit. Call it from a process whose other threads, if any, hold no lock; workers are
/// forked, and end with it. Throws Failure where the store is lost: what was committed is whole, and the same call goes
/// on.
BatchProgress RunBatch(
    const Plan& plan, const std::vector<Job>& jobs, FolderWatch* watch, Store& store, const BatchOptions& options,
    const std::function<void(const BatchProgress&)>& progress,
    const std::function<bool()>& stop = [] { return false; });

}  // namespace qv

#endif  // QVTESTER_DESK_BATCH_BATCH_H_
