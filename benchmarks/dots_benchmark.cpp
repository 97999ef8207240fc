// Dots in a high-dynamic-range capture of 12 megapixels, three floats each, beside the plain form, a plain read of the
// same bytes, and box filters.

#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <opencv2/imgproc.hpp>

#include "benchmarks/ratios.h"
#include "qvtester/tester.h"
#include "unit_tests/plain/hdr_dots.h"

namespace {

const cv::Size kCaptureSize(4000, 3000);
constexpr int kRadius = 10;
constexpr float kDotThreshold = 0.1f;

// Light that falls off to the side, a little noise, and some hundred dots.
cv::Mat& Capture() {
  static cv::Mat capture;
  if (!capture.empty()) return capture;
  capture.create(kCaptureSize, CV_32FC3);
  cv::RNG random(1);
  random.fill(capture, cv::RNG::UNIFORM, 0.98, 1.02);
  for (int x = 0; x < kCaptureSize.width; ++x) capture.col(x) *= 200 - 0.02 * x;
  for (int i = 0; i < 300; ++i) {
    capture.at<cv::Vec3f>(cv::Point{random.uniform(0, kCaptureSize.width), random.uniform(0, kCaptureSize.height)}) = {
        400, 400, 400};
  }
  return capture;
}

void DetectDot(benchmark::State& state) {
  cv::Mat& capture = Capture();
  cv::Mat mask(kCaptureSize, CV_8U, cv::Scalar(0));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    tester.DetectDot(capture.ptr<float>(), kCaptureSize.height, kCaptureSize.width, kDotThreshold, kRadius, mask.data);
    benchmark::DoNotOptimize(mask.data);
  }
}
BENCHMARK(DetectDot);

void PlainDetectDot(benchmark::State& state) {
  const cv::Mat& capture = Capture();
  cv::Mat mask(kCaptureSize, CV_8U, cv::Scalar(0));
  for ([[maybe_unused]] auto _ : state) {
    plain::DetectDot(capture.ptr<float>(), kCaptureSize.height, kCaptureSize.width, kDotThreshold, kRadius, mask.data);
    benchmark::DoNotOptimize(mask.data);
  }
}
BENCHMARK(PlainDetectDot);

void ReadCapture(benchmark::State& state) {
  const cv::Mat& capture = Capture();
  const std::size_t bytes = capture.total() * capture.elemSize();
  for ([[maybe_unused]] auto _ : state) {
    std::uint64_t sum = 0;
    for (std::size_t i = 0; i < bytes; i += 8) {
      std::uint64_t word = 0;
      std::memcpy(&word, capture.data + i, sizeof(word));
      sum += word;
    }
    benchmark::DoNotOptimize(sum);
  }
}
BENCHMARK(ReadCapture);

// The same by OpenCV's calls, into kept matrices; the means differ from the method's in last bits and near the edges.
void BoxFilter(benchmark::State& state) {
  const cv::Mat& capture = Capture();
  cv::Mat channel;
  cv::Mat mean;
  cv::Mat departure;
  cv::Mat below;
  cv::Mat mask;
  const auto run = [&] {
    cv::extractChannel(capture, channel, 0);
    cv::boxFilter(channel, mean, CV_32F, {2 * kRadius + 1, 2 * kRadius + 1});
    cv::subtract(mean, channel, departure);
    cv::divide(departure, mean, departure);
    cv::compare(departure, kDotThreshold, mask, cv::CMP_GT);
    cv::compare(departure, -kDotThreshold, below, cv::CMP_LT);
    cv::bitwise_or(mask, below, mask);
    benchmark::DoNotOptimize(mask.data);
  };
  run();  // the matrices' memory is there when the clock starts
  for ([[maybe_unused]] auto _ : state) run();
}
BENCHMARK(BoxFilter);

const Ratios kDotsRatios = {
    {"dots", "DetectDot", {"PlainDetectDot"}, 0.25},
    {"dots, over box filters", "DetectDot", {"BoxFilter"}, 0.30},
    {"dots, over reading", "DetectDot", {"ReadCapture"}, 3},
};

}  // namespace
