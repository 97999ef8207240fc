// Registration of a picture of 640 x 480 onto another, beside the same with SURF by dlib's own calls.

#include <benchmark/benchmark.h>

#include <opencv2/imgproc.hpp>

#include "benchmarks/ratios.h"
#include "chart/registration.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"
#include "unit_tests/plain/surf.h"

namespace {

cv::Mat View(int shift) { return DrawScene(5)(cv::Rect(20 + shift, 20, 640, 480)).clone(); }

void GetUnwarpedImage(benchmark::State& state) {
  const cv::Mat reference = View(0);
  const cv::Mat image = View(7);
  QVTester tester;
  cv::Mat unwarped;
  for ([[maybe_unused]] auto _ : state) tester.GetUnwarpedImage(reference, image, unwarped);
}
BENCHMARK(GetUnwarpedImage);

FeatureImage PlainFeatures(const cv::Mat& image) {
  FeatureImage features;
  features.image = image;
  plain::DetectAndDescribe(image, features.keypoints, features.descriptors);
  return features;
}

void PlainGetUnwarpedImage(benchmark::State& state) {
  const cv::Mat reference = View(0);
  const cv::Mat image = View(7);
  for ([[maybe_unused]] auto _ : state) {
    benchmark::DoNotOptimize(Register(PlainFeatures(reference), PlainFeatures(image)).unwarped.data);
  }
}
BENCHMARK(PlainGetUnwarpedImage);

const Ratios kRegistrationRatios = {{"registration, 640 x 480", "GetUnwarpedImage", {"PlainGetUnwarpedImage"}, 0.5}};

}  // namespace
