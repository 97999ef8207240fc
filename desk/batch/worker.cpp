#include "desk/batch/worker.h"

#include <malloc.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <limits>
#include <opencv2/core.hpp>

#include "desk/base/clock.h"
#include "desk/base/digest.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/measure/measurement.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

// The line carries frames: eight bytes of length, then the content. Parent to worker: {"job", "first"}. Back: a frame a
// step, {"step", "key", "pictures"} and behind it the record and each picture; a last one, {"done"}.

// Parent and worker would wait for each other if a job did not fit into the line while a run comes back. Linux's lines
// hold over 200 kB.
constexpr std::size_t kMostWaiting = 16384;

bool SendAll(int line, const char* bytes, std::size_t length) {
  while (length > 0) {
    const ssize_t sent = send(line, bytes, length, MSG_NOSIGNAL);
    if (sent < 0 && errno == EINTR) continue;
    if (sent <= 0) return false;
    bytes += sent;
    length -= static_cast<std::size_t>(sent);
  }
  return true;
}

bool SendFrame(int line, const std::string& content) {
  const std::uint64_t length = content.size();
  std::array<char, sizeof length> head;
  std::memcpy(head.data(), &length, sizeof length);
  return SendAll(line, head.data(), head.size()) && SendAll(line, content.data(), content.size());
}

bool ReadAll(int line, char* bytes, std::size_t length) {
  while (length > 0) {
    const ssize_t got = recv(line, bytes, length, 0);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return false;
    bytes += got;
    length -= static_cast<std::size_t>(got);
  }
  return true;
}

bool ReadFrame(int line, std::string& content) {
  std::uint64_t length = 0;
  if (!ReadAll(line, reinterpret_cast<char*>(&length), sizeof length)) return false;
  content.resize(length);
  return ReadAll(line, content.data(), length);
}

std::string Dump(const Json& json) { return json.dump(-1, ' ', false, Json::error_handler_t::replace); }

Json ToJson(const Job& job) {
  return {{"unit", job.unit},       {"inputs", job.inputs},          {"columns", job.columns},
          {"station", job.station}, {"operator", job.operator_name}, {"lot", job.lot}};
}

Job JobFromJson(const Json& json) {
  Job job;
  job.unit = json.at("unit");
  job.inputs = json.at("inputs").get<std::vector<std::string>>();
  job.columns = json.at("columns").get<std::map<std::string, std::string>>();
  job.station = json.at("station");
  job.operator_name = json.at("operator");
  job.lot = json.at("lot");
  return job;
}

const std::string& Or(const std::string& first, const std::string& otherwise) {
  return first.empty() ? otherwise : first;
}

// What a run's key is made of, known without measuring: its inputs' hashes above all.
Record Unmeasured(const WorkOrder& order, const Job& job, const PlanStep& step) {
  Record record;
  record.start_millis = record.end_millis = MillisSinceEpoch();
  record.dut_id = job.unit;
  record.station_id = Or(job.station, order.options.station);
  record.limits = step.limits;
  record.request = Resolved(RequestFor(order.plan, step, job));
  const Spec& spec = FindMeasurement(record.request.measurement)->spec();
  record.test_name = spec.test_name();
  if (spec.test) record.test_index = *spec.test;
  record.phase.name = spec.name;
  record.phase.start_millis = record.phase.end_millis = record.start_millis;
  for (std::size_t i = 0; i < record.request.inputs.size(); ++i) {
    const std::string& path = record.request.inputs[i].name;
    RecordedInput input;
    input.slot = spec.inputs[i].slot;
    input.path = path;
    if (!std::filesystem::is_regular_file(path)) break;  // a pipe may hang whoever reads it
    try {
      input.sha256 = HexDigest(ReadWholeFile(path, kCouldNotMeasure), "SHA256");
    } catch (const Failure&) {
      if (i == 0) break;  // as a measurement does: what can't be read ends the list
    }
    record.inputs.push_back(input);
  }
  return record;
}

std::vector<StoredPicture> PicturesOf(Record& record, KeepPictures keep) {
  const Outcome outcome = record.outcome();
  const bool failure = outcome == Outcome::kFail || outcome == Outcome::kError;
  if (keep == KeepPictures::kNone || (keep == KeepPictures::kFailures && !failure) || !record.finding) return {};
  const std::optional<Picture> picture = record.finding->Draw(record);
  if (!picture) return {};
  StoredPicture stored = {"annotated.png", "image/png", picture->Png()};
  record.phase.attachments.push_back({stored.name, stored.mimetype, stored.name, HexDigest(stored.content, "SHA1")});
  return {std::move(stored)};
}

bool SendRun(int line, std::size_t step, const std::string& key, const Json& record,
             const std::vector<StoredPicture>& pictures) {
  Json head = {{"step", step}, {"key", key}, {"pictures", Json::array()}};
  for (const StoredPicture& picture : pictures) {
    head["pictures"].push_back({{"name", picture.name}, {"mimetype", picture.mimetype}});
  }
  bool sent = SendFrame(line, Dump(head)) && SendFrame(line, TextOf(record));
  for (const StoredPicture& picture : pictures) sent = sent && SendFrame(line, picture.content);
  return sent;
}

// One step; false when the parent is gone. `ended` says that the plan wants no more steps.
bool DoStep(int line, const WorkOrder& order, const Job& job, std::size_t i, bool& ended) {
  const PlanStep& step = order.plan.steps[i];
  const Filing filing = FilingFor(order, job, step);
  if (!order.known.empty()) {
    const std::string key = RunKey(Unmeasured(order, job, step).ToJson(), filing);
    if (order.known.count(key) != 0) return SendFrame(line, Dump({{"step", i}, {"key", key}}));
  }
  Record record =
      MeasureStep(step, RequestFor(order.plan, step, job), job.unit, Or(job.station, order.options.station));
  const std::vector<StoredPicture> pictures = PicturesOf(record, order.options.pictures);
  const Json json = record.ToJson();
  ended = order.plan.stop_on_error && record.outcome() == Outcome::kError;
  return SendRun(line, i, RunKey(json, filing), json, pictures);
}

bool DoJob(int line, const WorkOrder& order, const Json& given) {
  const Job job = JobFromJson(given.at("job"));
  bool ended = false;
  for (std::size_t i = given.at("first"); i < order.plan.steps.size() && !ended; ++i) {
    try {
      if (!DoStep(line, order, job, i, ended)) return false;
    } catch (const Failure& e) {  // of this unit alone: its name leads out of the folder, say
      const StoredRun run = RunWithout(order, job, i, e.what());
      ended = order.plan.stop_on_error;
      if (!SendRun(line, i, run.key, run.record, {})) return false;
    }
  }
  return SendFrame(line, Dump({{"done", true}}));
}

// A worker keeps the memory of one photo for the next: fresh pages cost more than the arithmetic on them.
void KeepMemory() {
  mallopt(M_MMAP_MAX, 0);
  mallopt(M_TRIM_THRESHOLD, std::numeric_limits<int>::max());
}

[[noreturn]] void Work(int line, const WorkOrder& order) {
  KeepMemory();
  cv::setNumThreads(1);
  int status = 0;
  try {
    for (std::string frame; ReadFrame(line, frame);) {
      if (!DoJob(line, order, Json::parse(frame))) break;
    }
  } catch (const std::bad_alloc&) {
    status = ENOMEM;
  } catch (const std::exception&) {
    status = 1;
  }
  _exit(status);  // nothing of the parent's is torn down
}

// Signals as the parent found them; the parent's files closed but for its own line and the standard ones.
void BecomeWorker(int line, pid_t parent) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(0);
  for (const int signal : {SIGTERM, SIGPIPE}) std::signal(signal, SIG_DFL);
  std::signal(SIGINT, SIG_IGN);  // a terminal sends it to all: the parent decides
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
  if (line > STDERR_FILENO + 1) close_range(STDERR_FILENO + 1, static_cast<unsigned>(line) - 1, 0);
  close_range(static_cast<unsigned>(line) + 1, ~0U, 0);
}

std::string HowItEnded(int status) {
  if (WIFSIGNALED(status)) {
    const int signal = WTERMSIG(status);
    const char* const name = sigabbrev_np(signal);
    return Format("killed by %s%s (%s)", name == nullptr ? "" : "SIG",
                  name == nullptr ? std::to_string(signal).c_str() : name, strsignal(signal));
  }
  if (WEXITSTATUS(status) == ENOMEM) return "out of memory";
  return Format("ended with status %d", WEXITSTATUS(status));
}

}  // namespace

Filing FilingFor(const WorkOrder& order, const Job& job, const PlanStep& step) {
  return {Or(job.operator_name, order.options.operator_name), Or(job.lot, order.options.lot), order.plan.name,
          step.name, job.columns};
}

Request RequestFor(const Plan& plan, const PlanStep& step, const Job& job) {
  Request request = RequestFor(plan, step, job.unit);
  if (!job.inputs.empty()) request.inputs.assign(job.inputs.begin(), job.inputs.end());
  return request;
}

StoredRun RunWithout(const WorkOrder& order, const Job& job, std::size_t step, const std::string& sentence) {
  const PlanStep& planned = order.plan.steps.at(step);
  StoredRun run;
  run.filing = FilingFor(order, job, planned);
  Record record;
  try {
    record = Unmeasured(order, job, planned);
  } catch (const Failure&) {
    record.dut_id = job.unit;
    record.station_id = Or(job.station, order.options.station);
    record.limits = planned.limits;
    record.request.measurement = planned.request.measurement;
    record.phase.name = planned.request.measurement;
  }
  record.phase.code = QV_ERROR_INTERNAL;
  record.Say(Remark::kMiss, "not_measured", sentence);
  record.Judge();
  run.record = record.ToJson();
  run.key = RunKey(run.record, run.filing);
  return run;
}

Worker::Worker(const WorkOrder& order) {
  std::array<int, 2> ends;
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0) {
    throw Failure(kInternalFault, std::string("a worker can't be started (") + std::strerror(errno) + ")");
  }
  const pid_t parent = getpid();
  process_ = fork();
  if (process_ == 0) {
    BecomeWorker(ends[1], parent);
    Work(ends[1], order);
  }
  close(ends[1]);
  line_ = ends[0];
  if (process_ < 0) {
    close(line_);
    throw Failure(kInternalFault, std::string("a worker can't be started (") + std::strerror(errno) + ")");
  }
}

Worker::~Worker() { End(); }

bool Worker::Give(const Todo& todo, const Job& job) {
  const std::string frame = Dump({{"job", ToJson(job)}, {"first", todo.first_step}});
  if (!idle() && frame.size() > kMostWaiting) return false;
  if (idle()) since_ = std::chrono::steady_clock::now();
  given_.push_back(todo);
  SendFrame(line_, frame);  // a worker that is gone is seen by Receive
  return true;
}

bool Worker::TakeFrame(std::vector<StepDone>& done, std::size_t& finished) {
  std::uint64_t length = 0;
  if (received_.size() - taken_ < sizeof length) return false;
  std::memcpy(&length, received_.data() + taken_, sizeof length);
  if (received_.size() - taken_ - sizeof length < length) return false;
  std::string content = received_.substr(taken_ + sizeof length, length);
  taken_ += sizeof length + length;
  if (incomplete_ && incomplete_->run->text.empty()) {
    incomplete_->run->record = Json::parse(content);
    incomplete_->run->text = std::move(content);
    --frames_due_;
  } else if (incomplete_) {
    std::vector<StoredPicture>& pictures = incomplete_->run->pictures;
    pictures[pictures.size() - frames_due_--].content = std::move(content);
  } else {
    Json head = Json::parse(content);
    if (head.contains("done")) {
      given_.pop_front();
      ++finished;
      return true;
    }
    StepDone step;
    step.job = given_.front().job;
    step.step = head.at("step");
    if (!head.contains("pictures")) {
      step.known_key = head.at("key");
    } else {
      StoredRun& run = step.run.emplace();
      run.key = head.at("key");
      for (const Json& picture : head.at("pictures"))
        run.pictures.push_back({picture.at("name"), picture.at("mimetype"), ""});
      frames_due_ = 1 + run.pictures.size();
    }
    incomplete_ = std::move(step);
  }
  if (frames_due_ > 0) return true;
  given_.front().first_step = incomplete_->step + 1;
  since_ = std::chrono::steady_clock::now();
  done.push_back(std::move(*incomplete_));
  incomplete_.reset();
  return true;
}

bool Worker::Receive(std::vector<StepDone>& done, std::size_t& finished) {
  bool open = true;
  std::array<char, 65536> buffer;
  for (;;) {
    const ssize_t got = recv(line_, buffer.data(), buffer.size(), MSG_DONTWAIT);
    if (got < 0 && errno == EINTR) continue;
    if (got > 0) {
      received_.append(buffer.data(), static_cast<std::size_t>(got));
      continue;
    }
    open = got < 0 && (errno == EAGAIN || errno == EWOULDBLOCK);
    break;
  }
  while (TakeFrame(done, finished)) {}
  received_.erase(0, taken_);
  taken_ = 0;
  return open;
}

std::string Worker::End() {
  if (process_ < 0) return "";
  int status = 0;
  // One that is just dying is let die, so that its own signal is told.
  if (waitpid(process_, &status, WNOHANG) == 0) {
    usleep(10000);
    if (waitpid(process_, &status, WNOHANG) == 0) {
      kill(process_, SIGKILL);
      waitpid(process_, &status, 0);
    }
  }
  process_ = -1;
  close(line_);
  return HowItEnded(status);
}

}  // namespace qv
