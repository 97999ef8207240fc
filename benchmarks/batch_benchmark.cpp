// A batch beside what no form of it can do without, its gain from more workers, and its workers' memory. By CPU time
// and by the time that workers wait for something to do, since the machine may be shared.   batch_benchmark
#include <malloc.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <functional>
#include <limits>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <string>
#include <thread>
#include <vector>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/batch/batch.h"
#include "desk/measure/measure.h"
#include "desk/measure/uncertainty.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

constexpr int kPhotos = 12, kUnits = 96, kRounds = 5, kManyPhotos = 10000;

double Seconds(const rusage& usage) {
  const auto of = [](const timeval& time) { return static_cast<double>(time.tv_sec) + 1e-6 * time.tv_usec; };
  return of(usage.ru_utime) + of(usage.ru_stime);
}

// CPU seconds of this process and of those it started and saw end.
double CpuSeconds() {
  rusage own, children;
  getrusage(RUSAGE_SELF, &own);
  getrusage(RUSAGE_CHILDREN, &children);
  return Seconds(own) + Seconds(children);
}

// In a process of its own, which keeps memory as a worker does.
double CpuOf(const std::function<void()>& work) {
  const double before = CpuSeconds();
  const pid_t process = fork();
  if (process == 0) {
    mallopt(M_MMAP_MAX, 0);
    mallopt(M_TRIM_THRESHOLD, std::numeric_limits<int>::max());
    cv::setNumThreads(1);
    work();
    _exit(0);
  }
  waitpid(process, nullptr, 0);
  return CpuSeconds() - before;
}

double Least(const std::vector<double>& values) { return *std::min_element(values.begin(), values.end()); }

Request RequestOf(const std::string& measurement, const std::string& path) {
  Request request;
  request.measurement = measurement;
  if (!path.empty()) request.inputs = {path};
  return request;
}

BatchProgress Batch(
    const std::string& measurement, const std::vector<Job>& jobs, int workers,
    const std::function<void(const BatchProgress&)>& told = [](const BatchProgress&) {}) {
  ScratchFolder folder;
  Store store(folder.path() + "/results.db", Store::Use::kWrite);
  BatchOptions options;
  options.workers = workers;
  return RunBatch(PlanOf(RequestOf(measurement, ""), {}), jobs, nullptr, store, options, told);
}

// Photos of 12 megapixels, each with noise of its own and of several units.
std::vector<Job> TakePhotos(const TemporaryFolder& folder) {
  ChartView view;
  view.size = {4000, 3000};
  view.scale = 0.28;
  const cv::Mat chart = DrawChart(view);
  cv::RNG random(1);
  std::vector<Job> jobs;
  cv::Mat noise(chart.size(), CV_16SC3), photo;
  for (int i = 0; i < kPhotos; ++i) {
    random.fill(noise, cv::RNG::NORMAL, 0, 2);
    cv::add(chart, noise, photo, cv::noArray(), CV_8U);
    const std::string path = folder.Write("sn" + std::to_string(i) + ".jpg", photo);
    for (int unit = i; unit < kUnits; unit += kPhotos) {
      jobs.emplace_back().unit = std::to_string(unit);
      jobs.back().inputs = {path};
    }
  }
  return jobs;
}

void MeasureByTheLibrary(const std::vector<Job>& jobs) {
  for (const Job& job : jobs) {
    QVTester tester;
    tester.Initialize();
    if (tester.SetResource(QV_RESOURCE_CHART_PHOTO, std::string(job.inputs[0]).data()) != 1 ||
        tester.RunTest(QV_TEST_CAMERA_AUTOFOCUS, false) != 1)
      std::fprintf(stderr, "%s is not measured\n", job.inputs[0].c_str());
  }
}

void MeasureByTheDesk(const std::vector<Job>& jobs) {
  for (const Job& job : jobs) {
    QVTester tester;
    Measure(tester, RequestOf("camera_autofocus", job.inputs[0]), {});
  }
}

void LoadAll(const std::vector<Job>& jobs) {
  for (const Job& job : jobs) QVResource().SetImage(std::string(job.inputs[0]).data());
}

void ReadAll(const std::vector<Job>& jobs) {
  for (const Job& job : jobs) cv::imread(job.inputs[0], cv::IMREAD_COLOR | cv::IMREAD_IGNORE_ORIENTATION);
}

// In turn, and the median of each round's ratios. The own time of measuring is what it takes beyond its loading.
void CompareWithItsParts(const std::vector<Job>& jobs) {
  std::vector<double> read, loaded, library, measured, batch, over_parts, over_measured;
  for (int round = 0; round < kRounds; ++round) {
    read.push_back(CpuOf([&] { ReadAll(jobs); }));
    loaded.push_back(CpuOf([&] { LoadAll(jobs); }));
    library.push_back(CpuOf([&] { MeasureByTheLibrary(jobs); }));
    measured.push_back(CpuOf([&] { MeasureByTheDesk(jobs); }));
    batch.push_back(CpuOf([&] { Batch("camera_autofocus", jobs, 1); }));
    over_parts.push_back(batch.back() / (read.back() + measured.back() - loaded.back()));
    over_measured.push_back(batch.back() / measured.back());
  }
  const double own = 1000 / static_cast<double>(jobs.size());
  const auto print = [&](const char* what, const std::vector<double>& seconds) {
    std::printf("%-62s %7.1f ms a photo\n", what, own * Median(seconds));
  };
  print("cv::imread", read);
  print("loading", loaded);
  print("loading and the test's own routine", library);
  print("measuring: that, the input's hash, all figures, doubts", measured);
  print("a batch of one worker, with its store", batch);
  std::printf("%-62s %7.3f (target 1.05); %.3f of measuring\n", "of imread and measuring beyond its loading",
              Median(over_parts), Median(over_measured));
  std::fflush(stdout);  // before workers are forked
}

std::vector<pid_t> Children() {
  std::vector<pid_t> pids;
  std::ifstream children("/proc/self/task/" + std::to_string(getpid()) + "/children");
  for (pid_t child = 0; children >> child;) pids.push_back(child);
  return pids;
}

// Seconds that this process's children were at work, or would have been had nobody else had the machine's cores.
double ChildrensWork() {
  double seconds = 0;
  for (const pid_t child : Children()) {
    double running = 0, kept_waiting = 0;
    std::ifstream("/proc/" + std::to_string(child) + "/schedstat") >> running >> kept_waiting;
    seconds += 1e-9 * (running + kept_waiting);
  }
  return seconds;
}

struct Scaling {
  double cpu_seconds, seconds, busy;  // busy: share of its time that a worker had something to do
};

Scaling RunWorkers(const std::vector<Job>& jobs, int workers) {
  Scaling scaling = {};
  const std::size_t last = jobs.size() - static_cast<std::size_t>(workers);  // from here on they run out of photos
  const double before = CpuSeconds();
  scaling.seconds = Batch("camera_autofocus", jobs, workers, [&](const BatchProgress& progress) {
                      if (progress.jobs_done == last) scaling.busy = ChildrensWork() / (workers * progress.seconds);
                    }).seconds;
  scaling.cpu_seconds = CpuSeconds() - before;
  return scaling;
}

void CompareWorkers(const std::vector<Job>& jobs) {
  std::vector<double> alone;
  const auto cores = static_cast<int>(std::thread::hardware_concurrency());
  for (int workers = 1; workers <= cores; workers *= 2) {
    std::vector<double> cpu, seconds, busy;
    for (int round = 0; round < kRounds; ++round) {
      const Scaling scaling = RunWorkers(jobs, workers);
      cpu.push_back(scaling.cpu_seconds);
      seconds.push_back(scaling.seconds);
      busy.push_back(scaling.busy);
    }
    if (workers == 1) alone = cpu;
    const double dearer = Median(cpu) / Median(alone);
    std::printf(
        "%-62s %7.2f s; %.3f of the CPU time, busy for %.3f: on cores of its own %.2f of %d times as fast "
        "(target 0.9)\n",
        Format("%d worker(s)", workers).c_str(), Least(seconds), dearer, Median(busy), Median(busy) / dearer, workers);
    std::fflush(stdout);
  }
}

// Resident memory of this process's children, the most that one has, MB.
double ChildrensMemory() {
  double most = 0;
  for (const pid_t child : Children()) {
    double size = 0, resident = 0;
    std::ifstream("/proc/" + std::to_string(child) + "/statm") >> size >> resident;
    most = std::max(most, resident * static_cast<double>(sysconf(_SC_PAGESIZE)) / 1e6);
  }
  return most;
}

void WatchMemory(const TemporaryFolder& folder) {
  Job job;
  ChartView view;
  view.size = {500, 500};
  view.scale = 0.05;
  job.inputs = {folder.Write("small.jpg", DrawChart(view))};
  std::vector<Job> jobs(kManyPhotos, job);
  for (std::size_t i = 0; i < jobs.size(); ++i) jobs[i].unit = std::to_string(i);
  double early = 0, late = 0;
  const BatchProgress done = Batch("camera_autofocus", jobs, 2, [&](const BatchProgress& progress) {
    if (progress.jobs_done == kManyPhotos / 10) early = ChildrensMemory();
    if (progress.jobs_done + 10 == kManyPhotos) late = ChildrensMemory();
  });
  std::printf("%-62s %7.1f MB, %.3f of that after %d (target 1.05); %.0f photos/s\n",
              Format("a worker's memory after %d small photos", kManyPhotos).c_str(), late, late / early,
              kManyPhotos / 10, kManyPhotos / done.seconds);
}

}  // namespace
}  // namespace qv

int main() {
  try {
    const TemporaryFolder folder;
    const std::vector<qv::Job> jobs = qv::TakePhotos(folder);
    qv::CompareWithItsParts(jobs);
    qv::CompareWorkers(jobs);
    qv::WatchMemory(folder);
    return 0;
  } catch (const std::exception& e) {
    std::fprintf(stderr, "%s\n", e.what());
    return 1;
  }
}
