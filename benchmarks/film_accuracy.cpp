// How true the figures of films are: simulated films of known truth, encoded as H.264, measured by the library. Prints
// the tables that docs/video.md quotes; everything is drawn from fixed seeds.

#include <android/log.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <string>
#include <vector>

#include "desk/base/files.h"
#include "desk/simulation/film.h"
#include "qvtester/tester.h"

namespace {

constexpr int kFilms = 20;         // a row
constexpr int kWithoutStamps = 6;  // frames at the end whose stamps OpenCV may not read, and one more

// Encodes the film and loads it.
void Load(QVTester& tester, const qv::SimulationOptions& options, const qv::FilmStyle& style, const qv::Film& film) {
  const std::string content = qv::EncodeFilm(film, style, "film.mp4");
  qv::ScratchFolder scratch;
  std::string path = scratch.path() + "/film.mp4";
  qv::WriteWholeFile(path, content);
  tester.Initialize();
  if (tester.SetResource(QV_RESOURCE_VIDEO, path.data()) != QV_SUCCESS) std::abort();
  const QV_TEST_INDEX test = options.scene == "film-focus"   ? QV_TEST_VIDEO_AUTOFOCUS
                             : options.scene == "film-flash" ? QV_TEST_VIDEO_FLASH
                                                             : QV_TEST_VIDEO_PLAY;
  const int code = tester.RunTest(test, false);
  if (code != QV_SUCCESS) std::printf("a film of %s: code %d\n", options.scene.c_str(), code);
}

struct Spread {
  std::vector<double> errors;

  double Mean() const {
    double sum = 0;
    for (const double error : errors) sum += error;
    return sum / static_cast<double>(errors.size());
  }
  double Largest() const {
    double largest = 0;
    for (const double error : errors) largest = std::isnan(error) ? INFINITY : std::max(largest, std::fabs(error));
    return largest;
  }
};

qv::SimulationOptions Options(const char* scene, cv::Size size, int film) {
  qv::SimulationOptions options;
  options.scene = scene;
  options.camera.size = size;
  options.camera.noise_percent = 1;
  options.camera.seed = static_cast<std::uint64_t>(film) + 1;
  return options;
}

void PrintSettling() {
  std::printf(
      "\n| frames/s | films | error of the settling time, mean, ms | largest, ms | one interval, ms | within it |\n");
  std::printf("|---|---|---|---|---|---|\n");
  for (const double rate : {30.0, 60.0}) {
    cv::RNG random(1);
    Spread spread;
    for (int i = 0; i < kFilms; ++i) {
      qv::SimulationOptions options = Options("film-focus", {640, 540}, i);
      options.camera.noise_percent = 0.5;
      options.camera.blur_px = random.uniform(0.7, 1.2);
      qv::FilmStyle style;
      style.rate = rate;
      style.frames = static_cast<int>(1.6 * rate);
      style.sweep_ms = random.uniform(300.0, 600.0);
      style.overshoot_px = random.uniform(1.5, 2.5);
      style.return_ms = random.uniform(300.0, 500.0);
      const qv::Film film = qv::SimulateFilm(options, style);
      QVTester tester;
      Load(tester, options, style, film);
      spread.errors.push_back(tester.results_->video_af_settle_time_ - film.truth["settle_time_ms"].get<double>());
    }
    const auto within = std::count_if(spread.errors.begin(), spread.errors.end(),
                                      [=](double error) { return std::fabs(error) <= 1000 / rate; });
    std::printf("| %g | %d | %.1f | %.1f | %.1f | %d |\n", rate, kFilms, spread.Mean(), spread.Largest(), 1000 / rate,
                static_cast<int>(within));
  }
}

void PrintPulses() {
  std::printf("\n| pulse, frames | films | error of the width, mean | largest |\n|---|---|---|---|\n");
  for (const double frames : {3.0, 6.0, 12.0}) {
    cv::RNG random(2);
    Spread spread;
    for (int i = 0; i < kFilms; ++i) {
      const qv::SimulationOptions options = Options("film-flash", {160, 120}, i);
      qv::FilmStyle style;
      style.frames = 60;
      style.pulse_ms = frames * 1000 / style.rate;
      style.pulse_at_ms = random.uniform(900.0, 1100.0);
      style.base = random.uniform(0.1, 0.5);
      QVTester tester;
      Load(tester, options, style, qv::SimulateFilm(options, style));
      spread.errors.push_back(100 * (tester.results_->video_flash_width_ / style.pulse_ms - 1));
    }
    std::printf("| %g | %d | %.1f %% | %.1f %% |\n", frames, kFilms, spread.Mean(), spread.Largest());
  }
}

void PrintLostFrames() {
  std::printf(
      "\n| times of frames | films | frames lost | found | false | films told right |\n|---|---|---|---|---|---|\n");
  struct Row {
    const char* name;
    double rate, jitter;
  };
  for (const Row& row :
       {Row{"30 frames/s", 30, 0}, Row{"60 frames/s", 60, 0}, Row{"30 frames/s, up to 15 % off", 30, 0.15}}) {
    cv::RNG random(3);
    int lost = 0;
    int found = 0;
    int wrong = 0;
    int right = 0;
    for (int i = 0; i < kFilms; ++i) {
      const qv::SimulationOptions options = Options("film-chart", {320, 260}, i);
      qv::FilmStyle style;
      style.rate = row.rate;
      style.jitter = row.jitter;
      style.turn_deg_s = 5;
      style.frames = 60;
      for (int frame = 1; i > 0 && frame < style.frames - kWithoutStamps; ++frame) {  // the first film loses none
        if (random.uniform(0.0, 1.0) < 0.08) style.lost.push_back(frame);
      }
      QVTester tester;
      Load(tester, options, style, qv::SimulateFilm(options, style));
      const int truth = static_cast<int>(style.lost.size());
      const int seen = tester.results_->video_play_.frames_lost_;
      lost += truth;
      found += std::min(seen, truth);
      wrong += std::max(seen - truth, 0);
      right += seen == truth ? 1 : 0;
    }
    std::printf("| %s | %d | %d | %d | %d | %d |\n", row.name, kFilms, lost, found, wrong, right);
  }
}

}  // namespace

int main() {
  __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
  PrintSettling();
  PrintPulses();
  PrintLostFrames();
  return 0;
}
