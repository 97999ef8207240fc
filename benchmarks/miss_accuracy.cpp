// Whether a chart that is not found is told the true reason: photos of the chart with one fault each, and of other
// things.
//   miss_accuracy [--check] [--quick] [--show]     --check: exit status 1 where a promise is broken; --show: each miss

#include <algorithm>
#include <array>
#include <cstdio>
#include <functional>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "benchmarks/trials.h"
#include "chart/chart_layout.h"
#include "desk/measure/chart_view.h"
#include "desk/simulation/simulation.h"

namespace qv {
namespace {

struct Try {
  SimulationOptions options;
  cv::RNG random;
  double degree;  // 0 to 1: how much of the fault

  cv::Mat Photo() const { return Sense(options.camera, Simulate(options).levels[0], 8); }
};

struct ChartFault {
  const char* name;
  std::vector<MissCause> causes;  // that are true of it
  std::function<cv::Mat(Try&)> photo;
};

std::array<cv::Point2d, 3> MarkPlaces(const SimulationOptions& options) {
  const cv::Matx33d map = PhotoFromScene(options.camera, SfrChartBounds());
  std::array<cv::Point2d, 3> places;
  for (std::size_t i = 0; i < places.size(); ++i) {
    const cv::Vec3d p = map * cv::Vec3d(kMarkCentres[i][0], kMarkCentres[i][1], 1);
    places[i] = {p[0] / p[2], p[1] / p[2]};
  }
  return places;
}

// A part of the photo without some of the marks, or with a mark cut through.
cv::Mat Cropped(Try& t) {
  const cv::Mat photo = t.Photo();
  const std::array<cv::Point2d, 3> marks = MarkPlaces(t.options);
  const cv::Point2d mark = marks[t.random.uniform(0, 3)];
  const cv::Point2d middle = (marks[1] + marks[2]) / 2;
  cv::Rect part({}, photo.size());
  // The side of the photo nearest to the mark moves to it, or past it by up to a sixth of the chart.
  const double past = t.degree * cv::norm(marks[1] - marks[0]) / 6;
  if (std::fabs(mark.x - middle.x) > std::fabs(mark.y - middle.y)) {
    const int at = cvRound(mark.x < middle.x ? mark.x + past : mark.x - past);
    part = mark.x < middle.x ? cv::Rect(at, 0, photo.cols - at, photo.rows) : cv::Rect(0, 0, at, photo.rows);
  } else {
    const int at = cvRound(mark.y < middle.y ? mark.y + past : mark.y - past);
    part = mark.y < middle.y ? cv::Rect(0, at, photo.cols, photo.rows - at) : cv::Rect(0, 0, photo.cols, at);
  }
  return photo(part).clone();
}

// Something lies on a mark: a disc as dark as a finger, or as light as paper, over its middle or a side.
cv::Mat Covered(Try& t) {
  cv::Mat photo = t.Photo();
  const std::array<cv::Point2d, 3> marks = MarkPlaces(t.options);
  const double module = cv::norm(marks[1] - marks[0]) * kMarkSizes.back().module / kChartSide;
  const cv::Point2d off(t.random.uniform(-2.0, 2.0) * module, t.random.uniform(-2.0, 2.0) * module);
  const cv::Point2d at = marks[t.random.uniform(0, 3)] + off;
  const double level = t.random.uniform(0, 2) == 0 ? 235 : t.random.uniform(40, 160);
  cv::circle(photo, at, cvRound(module * (2.5 + 2.5 * t.degree)), cv::Scalar::all(level), cv::FILLED, cv::LINE_AA);
  return photo;
}

const std::vector<ChartFault>& ChartFaults() {
  using C = MissCause;
  static const std::vector<ChartFault> faults = {
      {"blur, sigma 4 to 12 px",
       {C::kBlur},
       [](Try& t) {
         t.options.camera.blur_px = 4 + 8 * t.degree;
         return t.Photo();
       }},
      {"defocus, radius 7 to 20 px",
       {C::kBlur},
       [](Try& t) {
         t.options.camera.defocus_px = 7 + 13 * t.degree;
         return t.Photo();
       }},
      {"cropped", {C::kCut}, Cropped},
      {"marks under 3 px a module",
       {C::kSmall},
       [](Try& t) {
         const int width = cvRound(180 + 120 * t.degree);
         t.options.camera.size = {width, width * 3 / 4};
         t.options.camera.blur_px = 0.6;
         return t.Photo();
       }},
      {"a mark covered", {C::kCovered}, Covered},
      {"dark, 2 to 4 stops",
       {C::kThreshold, C::kContrast},
       [](Try& t) {
         t.options.camera.exposure_ev = -2 - 2 * t.degree;
         return t.Photo();
       }},
      {"tilt or pan, 45 to 60 degrees",
       {C::kOblique},
       [](Try& t) {
         (t.random.uniform(0, 2) == 0 ? t.options.camera.tilt_deg : t.options.camera.pan_deg) = 45 + 15 * t.degree;
         t.options.camera.turn_deg = t.random.uniform(-10.0, 10.0);
         return t.Photo();
       }},
      {"no chart: a textured scene",
       {C::kNoChart},
       [](Try& t) {
         t.options.scene = "pair";
         return t.Photo();
       }},
      {"no chart: a plain target, a display, lights, a print",
       {C::kNoChart, C::kContrast},
       [](Try& t) {
         const char* const scenes[] = {"dust", "display", "lights", "print"};
         t.options.scene = scenes[t.random.uniform(0, 4)];
         return t.Photo();
       }},
  };
  return faults;
}

struct Outcome {
  bool missed = false, first = false, suggested = false;
  std::string told;
};

Outcome Look(const ChartFault& fault, int trial, int trials) {
  Try t;
  t.random = cv::RNG(trial + 1);
  t.degree = (trial + 0.5) / trials;
  t.options.camera.size = {960, 720};
  t.options.camera.fill = 0.85;
  t.options.camera.blur_px = 0.8;
  t.options.camera.noise_percent = 1;
  t.options.camera.seed = trial + 1;
  t.options.camera.turn_deg = t.random.uniform(0.0, 360.0);
  const cv::Mat photo = fault.photo(t);
  QVTester tester;
  const ChartView view = LookAtChart(tester.FindChart(photo, 125));
  Outcome outcome;
  outcome.missed = !view.complete();
  if (!outcome.missed) return outcome;
  const Miss miss = ExplainMiss(view.marks, view.threshold, photo);
  outcome.first = std::find(fault.causes.begin(), fault.causes.end(), miss.cause) != fault.causes.end();
  outcome.suggested = miss.threshold.has_value();
  for (const std::string& reason : miss.reasons) outcome.told += (outcome.told.empty() ? "" : "; ") + reason;
  return outcome;
}

void Run(bool show) {
  const int trials = Trials(30, 3);
  int misses = 0;
  int right = 0;
  std::printf(
      "\nWhy a chart is not found: %d photos a row of 960 x 720, any turn, blur 0.8 px, noise 1 %% where not "
      "varied\n\n",
      trials);
  std::printf("| fault | missed | true reason told first | a threshold suggested |\n|---|---|---|---|\n");
  for (const ChartFault& fault : ChartFaults()) {
    std::array<int, 3> counts = {};
    std::vector<Outcome> outcomes(trials);
    ForEachTrial(trials, [&](int trial) { outcomes[trial] = Look(fault, trial, trials); });
    for (const Outcome& outcome : outcomes) {
      counts[0] += outcome.missed ? 1 : 0;
      counts[1] += outcome.first ? 1 : 0;
      counts[2] += outcome.suggested ? 1 : 0;
      if (show && outcome.missed) std::printf("%s %s\n", outcome.first ? "   " : "!!!", outcome.told.c_str());
    }
    std::printf("| %s | %d | %d | %d |\n", fault.name, counts[0], counts[1], counts[2]);
    std::fflush(stdout);
    misses += counts[0];
    right += counts[1];
  }
  std::printf("\n%d of %d misses were told their true reason.\n", right, misses);
  Hold("misses_named", 100.0 * right / misses);
}

}  // namespace
}  // namespace qv

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  qv::Run(std::find(words.begin(), words.end(), "--show") != words.end());
  return AllKept() ? 0 : 1;
}
