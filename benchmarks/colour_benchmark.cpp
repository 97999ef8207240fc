// Colour conversions of whole buffers of 12 megapixels, beside the plain forms, OpenCV's transform and the powers that
// a pixel's temperature can't do without. What hands out a new buffer is held against what does so too.

#include <benchmark/benchmark.h>

#include <cmath>
#include <cstdlib>
#include <memory>
#include <opencv2/core.hpp>

#include "benchmarks/ratios.h"
#include "qvtester/tester.h"
#include "unit_tests/plain/colour.h"

namespace {

constexpr int kRows = 3000;
constexpr int kCols = 4000;
constexpr std::size_t kPixels = std::size_t{kRows} * kCols;

using Buffer = std::unique_ptr<float, decltype(&std::free)>;

// Chromaticities along the Planckian locus: the warm side of the fit, the cool one, or black.
enum Light { kWarm, kCool, kBlack };

cv::Mat& Triples(Light light) {
  static cv::Mat pictures[3];
  cv::Mat& picture = pictures[light];
  if (!picture.empty()) return picture;
  picture = cv::Mat(kRows, kCols, CV_32FC3, cv::Scalar::all(0));
  if (light == kBlack) return picture;
  cv::RNG random(1);
  for (auto& triple : cv::Mat_<cv::Vec3f>(picture)) {
    const float x = light == kWarm ? random.uniform(0.34f, 0.60f) : random.uniform(0.24f, 0.33f);
    const float y = random.uniform(0.3f, 0.4f);
    triple = cv::Vec3f(x, y, 1 - x - y) * random.uniform(0.1f, 2.0f);
  }
  return picture;
}

void Rgb2Xyz(benchmark::State& state) {
  cv::Mat& rgb = Triples(kWarm);
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    benchmark::DoNotOptimize(Buffer(tester.rgb2xyz(rgb.ptr<float>(), kRows, kCols), &std::free));
  }
}
BENCHMARK(Rgb2Xyz);

void PlainRgb2Xyz(benchmark::State& state) {
  const cv::Mat& rgb = Triples(kWarm);
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    const Buffer xyz(static_cast<float*>(std::calloc(3 * kPixels, sizeof(float))), &std::free);
    plain::rgb2xyz(tester.prop_color_matrix_, rgb.ptr<float>(), kPixels, xyz.get());
    benchmark::DoNotOptimize(xyz.get());
  }
}
BENCHMARK(PlainRgb2Xyz);

void Transform(benchmark::State& state) {
  const cv::Mat& rgb = Triples(kWarm);
  QVTester tester;
  const cv::Mat matrix(3, 3, CV_32F, tester.prop_color_matrix_);
  for ([[maybe_unused]] auto _ : state) {
    cv::Mat xyz;
    cv::transform(rgb, xyz, matrix);
    benchmark::DoNotOptimize(xyz.data);
  }
}
BENCHMARK(Transform);

void Xyz2Cct(benchmark::State& state, Light light) {
  cv::Mat& xyz = Triples(light);
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    benchmark::DoNotOptimize(Buffer(tester.xyz2cct(xyz.ptr<float>(), kRows, kCols), &std::free));
  }
}
BENCHMARK_CAPTURE(Xyz2Cct, warm, kWarm);
BENCHMARK_CAPTURE(Xyz2Cct, cool, kCool);
BENCHMARK_CAPTURE(Xyz2Cct, black, kBlack);

void PlainXyz2Cct(benchmark::State& state, Light light) {
  const cv::Mat& xyz = Triples(light);
  for ([[maybe_unused]] auto _ : state) {
    const Buffer cct(static_cast<float*>(std::calloc(kPixels, sizeof(float))), &std::free);
    plain::xyz2cct(xyz.ptr<float>(), kPixels, cct.get());
    benchmark::DoNotOptimize(cct.get());
  }
}
BENCHMARK_CAPTURE(PlainXyz2Cct, warm, kWarm);
BENCHMARK_CAPTURE(PlainXyz2Cct, cool, kCool);

// One power and one exponential a pixel.
void PowAndExp(benchmark::State& state) {
  const cv::Mat& xyz = Triples(kWarm);
  const auto* const values = xyz.ptr<float>();
  for ([[maybe_unused]] auto _ : state) {
    double sum = 0;
    for (std::size_t i = 0; i < kPixels; ++i) {
      const double x = values[3 * i];
      sum += std::pow(x, static_cast<double>(values[3 * i + 1])) + std::exp(x);
    }
    benchmark::DoNotOptimize(sum);
  }
}
BENCHMARK(PowAndExp);

const Ratios kColourRatios = {
    {"RGB to XYZ, over cv::transform", "Rgb2Xyz", {"Transform"}, 1.8},
    {"RGB to XYZ", "Rgb2Xyz", {"PlainRgb2Xyz"}, 1},
    {"colour temperature, warm", "Xyz2Cct/warm", {"PowAndExp"}, 2.4},
    {"colour temperature, cool", "Xyz2Cct/cool", {"PowAndExp"}, 2.4},
    {"colour temperature, black", "Xyz2Cct/black", {"PowAndExp"}, 0.25},
    {"colour temperature, warm, over plain", "Xyz2Cct/warm", {"PlainXyz2Cct/warm"}, 1},
    {"colour temperature, cool, over plain", "Xyz2Cct/cool", {"PlainXyz2Cct/cool"}, 1},
};

}  // namespace
