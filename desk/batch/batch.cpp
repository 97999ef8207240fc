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
constexpr std::size_t kJobsGiven = 2;    // to a worker: one to measure, one for when it is done
constexpr auto kStoredAfter = std::chrono::milliseconds(500);
constexpr int kPollMillis = 200;

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

  // Who has nothing to do comes first. Near the end nobody gets a second job that another could begin at once.
  void HandOut() {
    for (std::size_t held = 0; held < kJobsGiven; ++held) {
      for (std::unique_ptr<Worker>& worker : workers_) {
        if (todo_.empty() || (held > 0 && todo_.size() < workers_.size())) return;
        if (!worker) worker = std::make_unique<Worker>(order_);
        if (worker->given().size() > held) continue;
        if (worker->Give(todo_.front(), jobs_[todo_.front().job])) todo_.pop_front();
      }
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
    const bool open = worker->Receive(done, progress_.jobs_done);
    for (StepDone& step : done) Keep(std::move(step));
    if (open && (worker->idle() || !TimedOut(*worker))) return;
    std::deque<Todo> given = worker->given();
    const std::string why = open ? Format("measuring took longer than %g s (--timeout)", order_.options.timeout_seconds)
                                 : "the process that measured it was " + worker->End();
    worker.reset();  // another takes its place when there is something to do
    if (given.empty()) return;
    todo_.insert(todo_.begin(), given.begin() + 1, given.end());
    Abandon(given.front(), why);
  }

  bool TimedOut(const Worker& worker) const {
    return std::chrono::duration<double>(Clock::now() - worker.since()).count() > order_.options.timeout_seconds;
  }

  // The step is an ERROR; those behind it are measured by another worker.
  void Abandon(const Todo& at, const std::string& why) {
    const std::size_t steps = order_.plan.steps.size();
    if (at.first_step < steps) {
      Keep({at.job, at.first_step, RunWithout(order_, jobs_[at.job], at.first_step, why)});
    }
    if (at.first_step + 1 < steps && !order_.plan.stop_on_error) {
      todo_.push_front({at.job, at.first_step + 1});
    } else {
      ++progress_.jobs_done;
    }
  }

  // A key that is known stands for a run that is stored, or about to be: a manifest may name a photo twice.
  void Keep(StepDone&& done) {
    if (done.run) {
      const std::string outcome = TextAt(done.run->record, "outcome");
      const bool fault = WholeAt(FirstOf(MemberOf(done.run->record, "phases")), "result_code") == QV_ERROR_INTERNAL;
      if (fault || known_.emplace(done.run->key, outcome).second) {
        done.run->filing = FilingFor(order_, jobs_[done.job], order_.plan.steps.at(done.step));
        ++progress_.runs;
        ++progress_.outcomes[outcome];
        progress_.keys.push_back(done.run->key);
        pending_.push_back(std::move(*done.run));
        return;
      }
      done.known_key = done.run->key;
    }
    ++progress_.known;
    ++progress_.outcomes[known_.at(done.known_key)];
    progress_.keys.push_back(done.known_key);
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
