// Registration of a picture of 640 x 480 onto another, beside the same with SURF by dlib's own calls.

#include <benchmark/benchmark.h>

#include <opencv2/imgproc.hpp>

#include "benchmarks/ratios.h"
#include "chart/registration.h"
#include "qvtester/tester.h"
#include "unit_tests/plain/surf.h"

namespace {

// Polygons, of which the second view is shifted.
cv::Mat View(int shift) {
  cv::RNG random(5);
  cv::Mat scene(520, 680, CV_8UC1, cv::Scalar(128));
  for (int i = 0; i < 500; ++i) {
    std::vector<cv::Point> corners;
    const cv::Point at(random.uniform(0, scene.cols), random.uniform(0, scene.rows));
    for (int k = 0; k < 5; ++k) corners.push_back(at + cv::Point(random.uniform(-40, 40), random.uniform(-40, 40)));
    cv::fillConvexPoly(scene, corners, cv::Scalar(random.uniform(0, 256)), cv::LINE_AA);
  }
  cv::GaussianBlur(scene, scene, {}, 1);
  return scene(cv::Rect(20 + shift, 20, 640, 480)).clone();
}

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

const Ratios kRatios = {{"registration, 640 x 480", "GetUnwarpedImage", {"PlainGetUnwarpedImage"}, 0.5}};

}  // namespace
