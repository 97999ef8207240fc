#include "benchmarks/trials.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstdio>
#include <thread>

#include "desk/measure/promises.h"

void ForEachTrial(int trials, const std::function<void(int)>& run) {
  std::atomic<int> next = 0;
  std::vector<std::thread> threads;
  for (unsigned i = 0; i < std::max(1U, std::thread::hardware_concurrency()); ++i) {
    threads.emplace_back([&] {
      for (int trial = next++; trial < trials; trial = next++) run(trial);
    });
  }
  for (std::thread& thread : threads) thread.join();
}

double Quantile(std::vector<double> values, double share) {
  values.erase(std::remove_if(values.begin(), values.end(), [](double value) { return std::isnan(value); }),
               values.end());
  if (values.empty()) return NAN;
  std::sort(values.begin(), values.end());
  return values[static_cast<std::size_t>(std::lround(share * static_cast<double>(values.size() - 1)))];
}

namespace {

bool checking = false;
bool quick = false;
bool all_kept = true;

bool Take(std::vector<std::string>& words, const char* word) {
  const auto found = std::find(words.begin(), words.end(), word);
  if (found == words.end()) return false;
  words.erase(found);
  return true;
}

}  // namespace

void TakeCheckOptions(std::vector<std::string>& words) {
  checking = Take(words, "--check");
  quick = Take(words, "--quick");
}

int Trials(int full, int few) { return quick ? few : full; }

void Hold(const char* promise, double measured) {
  if (!checking) return;
  const qv::Promise& row = qv::FindPromise(promise);
  const bool kept = qv::IsKept(row, measured);
  all_kept = all_kept && kept;
  std::printf("promise %s %s: %.3g%s, promised is %g%s (%s)\n", promise, kept ? "kept" : "BROKEN", measured, row.unit,
              row.value, row.unit, row.of);
  std::fflush(stdout);
}

bool IsChecking() { return checking; }

bool AllKept() { return all_kept; }

double Mean(const std::vector<double>& values) {
  double sum = 0;
  for (const double value : values) sum += value;
  return sum / static_cast<double>(values.size());
}

double ShareBelow(const std::vector<double>& values, double limit) {
  return 100.0 * static_cast<double>(std::count_if(values.begin(), values.end(), [=](double v) { return v < limit; })) /
         static_cast<double>(values.size());
}

qv::SimulationOptions SceneOptions(const char* scene, cv::Size size, double noise_percent, std::uint64_t seed) {
  qv::SimulationOptions options;
  options.scene = scene;
  options.camera.size = size;
  options.camera.noise_percent = noise_percent;
  options.camera.seed = seed;
  return options;
}

double SpotDepth(double distance_px, double diameter_px, bool soft) {
  if (soft) return std::exp2(-4 * distance_px * distance_px / (diameter_px * diameter_px));
  return std::clamp(diameter_px / 2 - distance_px + 0.5, 0.0, 1.0);
}
