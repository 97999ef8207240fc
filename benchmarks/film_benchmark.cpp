// Tests 25 and 23 on a film of 1080p, H.264 at 10 Mbit/s, and on one without noise at 0.2 Mbit/s, which is far cheaper
// to decode, beside decoding it alone: frame after frame as the tests get them. CPU time of the whole process, since
// decoders have threads of their own.

#include <benchmark/benchmark.h>

#include <opencv2/imgproc.hpp>
#include <opencv2/videoio.hpp>

#include "benchmarks/ratios.h"
#include "chart/cut_photo.h"
#include "chart/find_chart.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"
#include "unit_tests/film_file.h"

namespace {

constexpr int kFilmThreshold = 125;
const cv::Size kFrameSize(1920, 1080);

// A chart that sways, with noise.
const std::vector<cv::Mat>& Frames() {
  static const std::vector<cv::Mat> frames = [] {
    std::vector<cv::Mat> all;
    cv::RNG random(1);
    for (int i = 0; i < 40; ++i) {
      cv::Mat noise(kFrameSize, CV_16SC3);
      random.fill(noise, cv::RNG::NORMAL, 0, 2);
      cv::Mat frame;
      cv::add(DrawChart({3, 0.1 * i, 0.12, kFrameSize, 1}), noise, frame, cv::noArray(), CV_8U);
      all.push_back(frame);
    }
    return all;
  }();
  return frames;
}

enum Kind { kRich, kThin };

std::vector<cv::Mat> PlainFrames() {
  std::vector<cv::Mat> frames;
  for (int i = 0; i < 40; ++i) frames.push_back(DrawChart({3, 0.1 * i, 0.12, kFrameSize, 1}));
  return frames;
}

std::string FilmPath(Kind kind) {
  static const TemporaryFolder folder;
  static const std::string rich = WriteFilm(folder.Path("rich.mp4"), Frames(), kH264 + " -preset veryfast -b:v 10M");
  static const std::string thin =
      WriteFilm(folder.Path("thin.mp4"), PlainFrames(), kH264 + " -preset veryfast -b:v 0.2M");
  return kind == kRich ? rich : thin;
}

void Decode(benchmark::State& state, Kind kind) {
  const std::string path = FilmPath(kind);
  cv::Mat frame;
  for ([[maybe_unused]] auto _ : state) {
    cv::VideoCapture film(path, cv::CAP_FFMPEG);
    while (film.read(frame)) benchmark::DoNotOptimize(frame.data);
  }
}
BENCHMARK_CAPTURE(Decode, rich, kRich)->MeasureProcessCPUTime();
BENCHMARK_CAPTURE(Decode, thin, kThin)->MeasureProcessCPUTime();

void DecodeAndBinarise(benchmark::State& state) {
  const std::string path = FilmPath(kRich);
  QVTester tester;
  cv::Mat frame;
  for ([[maybe_unused]] auto _ : state) {
    cv::VideoCapture film(path, cv::CAP_FFMPEG);
    while (film.read(frame)) benchmark::DoNotOptimize(Binarise(tester, frame, kFilmThreshold, nullptr).data);
  }
}
BENCHMARK(DecodeAndBinarise)->MeasureProcessCPUTime();

void Film(benchmark::State& state, QV_TEST_INDEX test, QV_RESOURCE_INDEX slot, Kind kind) {
  std::string path = FilmPath(kind);
  QVTester tester;
  tester.Initialize();
  tester.SetResource(slot, path.data());
  for ([[maybe_unused]] auto _ : state) {
    if (tester.RunTest(test, false) != QV_SUCCESS) state.SkipWithError("no marks");
  }
}
BENCHMARK_CAPTURE(Film, record, QV_TEST_VIDEO_RECORD, QV_RESOURCE_RECORDED_VIDEO, kRich)->MeasureProcessCPUTime();
BENCHMARK_CAPTURE(Film, record_thin, QV_TEST_VIDEO_RECORD, QV_RESOURCE_RECORDED_VIDEO, kThin)->MeasureProcessCPUTime();
BENCHMARK_CAPTURE(Film, autofocus, QV_TEST_VIDEO_AUTOFOCUS, QV_RESOURCE_VIDEO, kRich)->MeasureProcessCPUTime();
BENCHMARK_CAPTURE(Film, autofocus_thin, QV_TEST_VIDEO_AUTOFOCUS, QV_RESOURCE_VIDEO, kThin)->MeasureProcessCPUTime();

void MarksOfFrame(benchmark::State& state) {
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) benchmark::DoNotOptimize(FindMarks(tester, Frames()[0], kFilmThreshold));
}
BENCHMARK(MarksOfFrame);

void PlainMarksOfFrame(benchmark::State& state) {
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    benchmark::DoNotOptimize(tester.GetFinderPoints(Binarise(tester, Frames()[0], kFilmThreshold, nullptr)));
  }
}
BENCHMARK(PlainMarksOfFrame);

const Ratios kFilmRatios = {
    {"film: marks of each frame, over decoding", "Film/record", {"Decode/rich"}, 1.15},
    {"film of 0.2 Mbit/s: the same", "Film/record_thin", {"Decode/thin"}, 1.15},
    {"film: MTF50 of each frame, over decoding", "Film/autofocus", {"Decode/rich"}, 1.5},
    {"film of 0.2 Mbit/s: the same", "Film/autofocus_thin", {"Decode/thin"}, 1.5},
    {"film: marks of each frame, over binarising", "Film/record", {"DecodeAndBinarise"}, 1.02},
    {"marks of a frame, 1080p, by rows", "MarksOfFrame", {"PlainMarksOfFrame"}, 0.85},
};

}  // namespace
