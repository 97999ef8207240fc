#ifndef QVTESTER_DESK_BATCH_WORKER_H_
#define QVTESTER_DESK_BATCH_WORKER_H_

#include <sys/types.h>

#include <chrono>
#include <deque>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "desk/batch/batch.h"
#include "desk/batch/job.h"
#include "desk/batch/plan.h"
#include "desk/results/run.h"

namespace qv {

/// All that a worker needs to know, by the memory that it is forked with.
struct WorkOrder {
  const Plan& plan;
  const BatchOptions& options;
  const std::unordered_map<std::string, std::string>& known;  // key to outcome of runs that need not be measured again
};

/// What a run of this step is filed under.
Filing FilingFor(const WorkOrder& order, const Job& job, const PlanStep& step);

/// The step's request for the job: the manifest's inputs, or the plan's.
Request RequestFor(const Plan& plan, const PlanStep& step, const Job& job);

/// A run that came to no measurement, with its reason in a sentence.
StoredRun RunWithout(const WorkOrder& order, const Job& job, std::size_t step, const std::string& sentence);

/// A step of a job, where a worker begins or has to go on.
struct Todo {
  std::size_t job, first_step;
};

/// A step that a worker has done: its run, or none where the store holds it.
struct StepDone {
  std::size_t job = 0, step = 0;
  std::optional<StoredRun> run;
  std::string known_key = {};
};

/// A forked process that measures one job after another; the next may wait in its line, so that it has something to do
/// while its parent stores runs. It ends with its parent, and when its end of the line closes.
class Worker {
 public:
  explicit Worker(const WorkOrder& order);
  ~Worker();  // kills it
  Worker(const Worker&) = delete;
  Worker& operator=(const Worker&) = delete;

  bool idle() const { return given_.empty(); }
  const std::deque<Todo>& given() const { return given_; }                // at the first it is at work: with this step
  int descriptor() const { return line_; }                                // to poll for reading
  std::chrono::steady_clock::time_point since() const { return since_; }  // when it began its step

  /// Puts off the end of its time.
  void Excuse(std::chrono::steady_clock::duration time) { since_ += time; }

  /// False, and nothing is given, where it has a job and this one is too long to wait in the line.
  bool Give(const Todo& todo, const Job& job);
  /// Takes what has arrived, and adds to `finished` how many jobs are done; false when the process is gone.
  bool Receive(std::vector<StepDone>& done, std::size_t& finished);
  /// Why a process that is gone went: "killed by SIGSEGV (Segmentation fault)". Call after Receive answered false, or
  /// to kill one that hangs.
  std::string End();

 private:
  bool TakeFrame(std::vector<StepDone>& done, std::size_t& finished);

  pid_t process_ = -1;
  int line_ = -1;
  std::deque<Todo> given_;
  std::chrono::steady_clock::time_point since_;
  std::string received_;
  std::size_t taken_ = 0;
  std::optional<StepDone> incomplete_;  // whose record or pictures are still to come
  std::size_t frames_due_ = 0;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BATCH_WORKER_H_
