// How true the figures of films are: simulated films of known truth, encoded as H.264, measured by the library. Prints
// the tables that docs/video.md quotes; everything is drawn from fixed seeds.
//   film_accuracy [--check [--quick]]     --check: exit status 1 where a promise is broken

#include <android/log.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "benchmarks/trials.h"
#include "desk/simulation/film.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"

namespace {

constexpr int kWithoutStamps = 6;         // frames at the end whose stamps OpenCV may not read, and one more
constexpr double kStampMs = 1000 / 90e3;  // what stamps are multiples of

// Encodes the film and runs the test of its scene.
void Measure(QVTester& tester, const qv::SimulationOptions& options, const qv::FilmStyle& style, qv::Film film) {
  static std::mutex one_at_a_time;  // scratch folders are
  static int number = 0;
  static const TemporaryFolder folder;
  std::map<int, cv::Mat> frames;
  for (const int frame : film.kept) frames[frame] = film.frame(frame);
  film.frame = [&](int frame) { return frames.at(frame); };
  std::string path;
  {
    const std::lock_guard<std::mutex> lock(one_at_a_time);
    path = folder.Write(std::to_string(++number) + ".mp4", qv::EncodeFilm(film, style, "film.mp4"));
  }
  tester.Initialize();
  if (tester.SetResource(QV_RESOURCE_VIDEO, path.data()) != QV_SUCCESS) std::abort();
  const QV_TEST_INDEX test = options.scene == "film-focus"   ? QV_TEST_VIDEO_AUTOFOCUS
                             : options.scene == "film-flash" ? QV_TEST_VIDEO_FLASH
                                                             : QV_TEST_VIDEO_PLAY;
  const int code = tester.RunTest(test, false);
  if (code != QV_SUCCESS) std::printf("a film of %s: code %d\n", options.scene.c_str(), code);
  std::filesystem::remove(path);
}

double Largest(const std::vector<double>& errors) {
  double largest = 0;
  for (const double error : errors) largest = std::isnan(error) ? INFINITY : std::max(largest, std::fabs(error));
  return largest;
}

// One value a film.
template <typename Trial>
std::vector<double> ForEachFilm(int films, Trial&& trial) {
  std::vector<double> values(films);
  cv::parallel_for_(cv::Range(0, films), [&](const cv::Range& range) {
    for (int i = range.start; i < range.end; ++i) values[i] = trial(i);
  });
  return values;
}

qv::SimulationOptions Options(const char* scene, cv::Size size, int film) {
  qv::SimulationOptions options;
  options.scene = scene;
  options.camera.size = size;
  options.camera.noise_percent = 1;
  options.camera.seed = static_cast<std::uint64_t>(film) + 1;
  return options;
}

// Seeds in a row would begin alike.
cv::RNG RandomOf(int film) { return {0x9E3779B97F4A7C15 * (static_cast<std::uint64_t>(film) + 1)}; }

double SettlingError(int i, double rate, double noise_percent) {
  cv::RNG random = RandomOf(i);
  qv::SimulationOptions options = Options("film-focus", {640, 540}, i);
  options.camera.noise_percent = noise_percent;
  options.camera.blur_px = random.uniform(0.7, 1.2);
  qv::FilmStyle style;
  style.rate = rate;
  style.frames = static_cast<int>(1.6 * rate);
  style.sweep_ms = random.uniform(300.0, 600.0);
  style.overshoot_px = random.uniform(1.5, 2.5);
  style.return_ms = random.uniform(300.0, 500.0);
  const qv::Film film = qv::SimulateFilm(options, style);
  QVTester tester;
  Measure(tester, options, style, film);
  return tester.results_->video_af_settle_time_ - film.truth["settle_time_ms"].get<double>();
}

void PrintSettling(int films, const std::vector<double>& noises) {
  std::printf(
      "\n| frames/s | noise | films | error of the settling time, mean, ms | largest, ms | one interval, ms | within "
      "it "
      "|\n|---|---|---|---|---|---|---|\n");
  double furthest = 0;  // in intervals
  for (const double rate : {30.0, 60.0}) {
    for (const double noise : noises) {
      const auto errors = ForEachFilm(films, [&](int i) { return SettlingError(i, rate, noise); });
      const auto within = std::count_if(errors.begin(), errors.end(),
                                        [=](double error) { return std::fabs(error) <= 1000 / rate + kStampMs; });
      std::printf("| %g | %g %% | %d | %.1f | %.1f | %.1f | %d |\n", rate, noise, films, Mean(errors), Largest(errors),
                  1000 / rate, static_cast<int>(within));
      furthest = std::max(furthest, std::max(0.0, Largest(errors) - kStampMs) * rate / 1000);
    }
  }
  Hold("film_settling", furthest);
}

// In frames.
double WidthError(int i, double frames) {
  cv::RNG random = RandomOf(i);
  const qv::SimulationOptions options = Options("film-flash", {160, 120}, i);
  qv::FilmStyle style;
  style.frames = 60;
  style.pulse_ms = frames * 1000 / style.rate;
  style.pulse_at_ms = random.uniform(900.0, 1100.0);
  style.base = random.uniform(0.1, 0.5);
  QVTester tester;
  Measure(tester, options, style, qv::SimulateFilm(options, style));
  return (tester.results_->video_flash_width_ / style.pulse_ms - 1) * frames;
}

void PrintPulses(int films) {
  std::printf("\n| pulse, frames | films | error of the width, mean | largest |\n|---|---|---|---|\n");
  double furthest = 0;  // in frames
  for (const double frames : {3.0, 6.0, 12.0}) {
    const auto errors = ForEachFilm(films, [&](int i) { return WidthError(i, frames); });
    std::printf("| %g | %d | %.1f %% | %.1f %% |\n", frames, films, 100 * Mean(errors) / frames,
                100 * Largest(errors) / frames);
    furthest = std::max(furthest, Largest(errors));
  }
  Hold("film_pulse", furthest);
}

struct LostFrames {
  int lost = 0, seen = 0;
};

LostFrames LoseFrames(int i, double rate, double jitter) {
  cv::RNG random = RandomOf(i);
  const qv::SimulationOptions options = Options("film-chart", {320, 260}, i);
  qv::FilmStyle style;
  style.rate = rate;
  style.jitter = jitter;
  style.turn_deg_s = 5;
  style.frames = 60;
  for (int frame = 1; i > 0 && frame < style.frames - kWithoutStamps; ++frame) {  // the first film loses none
    if (random.uniform(0.0, 1.0) < 0.08) style.lost.push_back(frame);
  }
  QVTester tester;
  Measure(tester, options, style, qv::SimulateFilm(options, style));
  return {static_cast<int>(style.lost.size()), tester.results_->video_play_.frames_lost_};
}

void PrintLostFrames(int films) {
  std::printf(
      "\n| times of frames | films | frames lost | found | false | films told right |\n|---|---|---|---|---|---|\n");
  struct Row {
    const char* name;
    double rate, jitter;
  };
  int all_told = 0;
  int all = 0;
  for (const Row& row :
       {Row{"30 frames/s", 30, 0}, Row{"60 frames/s", 60, 0}, Row{"30 frames/s, up to 15 % off", 30, 0.15}}) {
    int lost = 0;
    int found = 0;
    int wrong = 0;
    std::vector<LostFrames> trials(films);
    const auto right = ForEachFilm(films, [&](int i) {
      trials[i] = LoseFrames(i, row.rate, row.jitter);
      return trials[i].seen == trials[i].lost ? 1 : 0;
    });
    for (const LostFrames& trial : trials) {
      lost += trial.lost;
      found += std::min(trial.seen, trial.lost);
      wrong += std::max(trial.seen - trial.lost, 0);
    }
    const auto told = static_cast<int>(std::count(right.begin(), right.end(), 1));
    std::printf("| %s | %d | %d | %d | %d | %d |\n", row.name, films, lost, found, wrong, told);
    all_told += told;
    all += films;
  }
  Hold("film_lost", 100.0 * all_told / all);
}

}  // namespace

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
  const int films = Trials(20, 2);
  PrintSettling(films, films < 20 ? std::vector<double>{1} : std::vector<double>{0.5, 1});
  PrintPulses(films);
  PrintLostFrames(films);
  return AllKept() ? 0 : 1;
}
