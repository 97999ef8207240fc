#include "desk/batch/batch.h"

#include <poll.h>

#include <algorithm>
#include <chrono>
#include <deque>
#include <memory>
#include <unordered_map>

#include "desk/base/text.h"
#include "desk/batch/worker.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kRunsAtOnce = 64;  // stored in one transaction
constexpr auto kStoredAfter = std::chrono::milliseconds(500);
constexpr int kPollMillis = 200;

struct Todo {
  std::size_t job, first_step;
};

class Running {
 public:
  Running(const Plan& plan, std::vector<Job> jobs, FolderWatch* watch, Store& store, const BatchOptions& options)
      : order_{plan, options, known_}, jobs_(std::move(jobs)), watch_(watch), store_(store) {
    store.EachRow(RunsOf(plan), [&](const RunRow& run) {
      if (run.result_code != QV_ERROR_INTERNAL) known_[run.key] = run.outcome;  // what a fault ended is tried again
    });
    for (std::size_t i = 0; i < jobs_.size(); ++i) todo_.push_back({i, 0});
    progress_.jobs = jobs_.size();
    const auto least = static_cast<std::size_t>(std::max(options.workers, 1));
    workers_.resize(watch == nullptr ? std::min(least, std::max<std::size_t>(jobs_.size(), 1)) : least);
  }

  BatchProgress Run(const std::function<void(const BatchProgress&)>& told, const std::function<bool()>& stop) {
    while (Busy() && !stop()) {
      HandOut();
      Wait();
      TakeArrivals();
      const std::size_t before = progress_.jobs_done;
      for (std::unique_ptr<Worker>& worker : workers_) {
        if (worker && !worker->idle()) Attend(worker);
      }
      if (pending_.size() >= kRunsAtOnce || Clock::now() - stored_ > kStoredAfter) Flush();
      if (progress_.jobs_done != before) told(Progress());
    }
    Flush();
    return Progress();
  }

 private:
  bool Busy() const {
    return watch_ != nullptr || !todo_.empty() ||
           std::any_of(workers_.begin(), workers_.end(), [](const auto& worker) { return worker && !worker->idle(); });
  }

  const BatchProgress& Progress() {
    progress_.seconds = std::chrono::duration<double>(Clock::now() - start_).count();
    return progress_;
  }

  void HandOut() {
    for (std::unique_ptr<Worker>& worker : workers_) {
      if (todo_.empty()) return;
      if (!worker) worker = std::make_unique<Worker>(order_);
      if (!worker->idle()) continue;
      worker->Give(todo_.front().job, jobs_[todo_.front().job], todo_.front().first_step);
      todo_.pop_front();
    }
  }

  void Wait() {
    std::vector<pollfd> waited;
    for (const std::unique_ptr<Worker>& worker : workers_) {
      if (worker && !worker->idle()) waited.push_back({worker->descriptor(), POLLIN, 0});
    }
    if (watch_ != nullptr) waited.push_back({watch_->descriptor(), POLLIN, 0});
    poll(waited.data(), waited.size(), kPollMillis);
  }

  void TakeArrivals() {
    if (watch_ == nullptr) return;
    for (Job& job : watch_->Arrived()) {
      todo_.push_back({jobs_.size(), 0});
      jobs_.push_back(std::move(job));
    }
    progress_.jobs = jobs_.size();
  }

  void Attend(std::unique_ptr<Worker>& worker) {
    std::vector<StepDone> done;
    bool finished = false;
    const bool open = worker->Receive(done, finished);
    const std::size_t job = worker->job();
    for (StepDone& step : done) Keep(job, std::move(step));
    if (finished) ++progress_.jobs_done;
    if (open && !finished && !TimedOut(*worker)) return;
    if (open && finished) return;
    const std::size_t step = worker->next_step();
    const std::string why = open ? Format("measuring took longer than %g s (--timeout)", order_.options.timeout_seconds)
                                 : "the process that measured it was " + worker->End();
    worker.reset();  // another takes its place when there is something to do
    if (!finished) Abandon(job, step, why);
  }

  bool TimedOut(const Worker& worker) const {
    return std::chrono::duration<double>(Clock::now() - worker.since()).count() > order_.options.timeout_seconds;
  }

  // The step is an ERROR; those behind it are measured by another worker.
  void Abandon(std::size_t job, std::size_t step, const std::string& why) {
    if (step < order_.plan.steps.size()) Keep(job, {step, RunWithout(order_, jobs_[job], step, why)});
    if (step + 1 < order_.plan.steps.size() && !order_.plan.stop_on_error) {
      todo_.push_front({job, step + 1});
    } else {
      ++progress_.jobs_done;
    }
  }

  void Keep(std::size_t job, StepDone&& done) {
    if (!done.run) {
      ++progress_.known;
      ++progress_.outcomes[known_.at(done.known_key)];
      progress_.keys.push_back(done.known_key);
      return;
    }
    done.run->filing = FilingFor(order_, jobs_[job], order_.plan.steps.at(done.step));
    ++progress_.runs;
    ++progress_.outcomes[TextAt(done.run->record, "outcome")];
    progress_.keys.push_back(done.run->key);
    pending_.push_back(std::move(*done.run));
  }

  void Flush() {
    stored_ = Clock::now();
    if (pending_.empty()) return;
    store_.Put(pending_);
    pending_.clear();
    // While the store was waited for, nobody listened to the workers: that time is not theirs.
    for (const std::unique_ptr<Worker>& worker : workers_) {
      if (worker) worker->Excuse(Clock::now() - stored_);
    }
  }

  std::unordered_map<std::string, std::string> known_;
  WorkOrder order_;
  std::vector<Job> jobs_;
  FolderWatch* watch_;
  Store& store_;
  std::deque<Todo> todo_;
  std::vector<std::unique_ptr<Worker>> workers_;
  std::vector<StoredRun> pending_;
  BatchProgress progress_;
  Clock::time_point start_ = Clock::now(), stored_ = start_;
};

}  // namespace

Selection RunsOf(const Plan& plan) {
  if (!plan.name.empty()) return {{"plan", "=", plan.name}};
  return {{"measurement", "=", plan.steps.at(0).request.measurement}};
}

BatchProgress RunBatch(const Plan& plan, const std::vector<Job>& jobs, FolderWatch* watch, Store& store,
                       const BatchOptions& options, const std::function<void(const BatchProgress&)>& progress,
                       const std::function<bool()>& stop) {
  return Running(plan, jobs, watch, store, options).Run(progress, stop);
}

}  // namespace qv
