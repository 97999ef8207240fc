// The camera tests on photos of 12 megapixels, beside the OpenCV calls that they can't do without, into kept matrices:
// each runs once before the clock starts, so that the memory is there.

#include <benchmark/benchmark.h>

#include <array>
#include <opencv2/features2d.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "benchmarks/pictures.h"
#include "benchmarks/ratios.h"
#include "qvtester/host_properties.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"

namespace {

const cv::Size kSize(4000, 3000);
constexpr int kThreshold = 125;

void Load(QVTester& tester, int slot, const cv::Mat& photo) {
  tester.resources_[slot] = std::make_unique<QVResource>();
  tester.resources_[slot]->SetImage(photo);
}

// ---- Lens dust

// A plain target with a little noise and four specks.
const cv::Mat& DustPhoto() {
  static cv::Mat photo;
  if (!photo.empty()) return photo;
  cv::Mat noise(kSize, CV_8UC3);
  cv::RNG(1).fill(noise, cv::RNG::UNIFORM, 176, 185);
  for (int i = 0; i < 4; ++i) cv::circle(noise, {500 + 900 * i, 1500}, 4, cv::Scalar::all(60), cv::FILLED);
  photo = noise;
  return photo;
}

void TestLensDust(benchmark::State& state, bool fake_mode) {
  const TemporaryFolder folder;
  SetHostPropertyStore(folder.Path("properties").c_str());
  QVTester tester;
  tester.Initialize();
  Load(tester, QV_RESOURCE_DUST_PHOTO, DustPhoto());
  const auto run = [&] { tester.TestLensDust(false, fake_mode); };
  run();
  run();  // two pictures take turns
  for ([[maybe_unused]] auto _ : state) run();
  if (tester.results_->dust_blob_count_main_ != (fake_mode ? -1 : 4)) state.SkipWithError("other blobs than drawn");
  SetHostPropertyStore(nullptr);
}
BENCHMARK_CAPTURE(TestLensDust, real, false);
BENCHMARK_CAPTURE(TestLensDust, fake, true);

void Histogram(const cv::Mat& gray, cv::Mat& histogram) {
  const int channel = 0;
  const int bins = 256;
  const float range[] = {0, 256};
  const float* ranges[] = {range};
  cv::calcHist(&gray, 1, &channel, cv::noArray(), histogram, 1, &bins, ranges);
}

void DustCalls(benchmark::State& state, bool fake_mode) {
  const cv::Mat& photo = DustPhoto();
  cv::SimpleBlobDetector::Params params;
  params.thresholdStep = 125;
  params.minThreshold = 0;
  params.maxThreshold = 130;
  params.minArea = 20;
  params.filterByCircularity = params.filterByInertia = params.filterByConvexity = false;
  const cv::Ptr<cv::SimpleBlobDetector> detector = cv::SimpleBlobDetector::create(params);
  cv::Mat gray;
  cv::Mat binary;
  cv::Mat histogram;
  std::vector<cv::KeyPoint> keypoints;
  const auto run = [&] {
    cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
    if (!fake_mode) {
      const double mean = cv::mean(gray)[0];
      cv::adaptiveThreshold(gray, binary, static_cast<int>(mean), cv::ADAPTIVE_THRESH_MEAN_C, cv::THRESH_BINARY, 15, 7);
      cv::rectangle(binary, {{}, kSize}, cv::Scalar(0));
      detector->detect(binary, keypoints);
    }
    Histogram(gray, histogram);
    benchmark::DoNotOptimize(histogram.data);
  };
  run();
  for ([[maybe_unused]] auto _ : state) run();
}
BENCHMARK_CAPTURE(DustCalls, real, false);
BENCHMARK_CAPTURE(DustCalls, fake, true);

// ---- Loading

const char* PhotoFile() {
  static const TemporaryFolder folder;
  static const std::string path = folder.Write("photo.jpg", ChartPhoto());
  return path.c_str();
}

void SetResource(benchmark::State& state) {
  std::string path = PhotoFile();
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    if (tester.SetResource(QV_RESOURCE_CHART_PHOTO, path.data()) != QV_SUCCESS) state.SkipWithError("not loaded");
  }
}
BENCHMARK(SetResource);

void Imread(benchmark::State& state) {
  const char* const path = PhotoFile();
  cv::Mat photo;
  for ([[maybe_unused]] auto _ : state) {
    photo = cv::imread(path, cv::IMREAD_COLOR | cv::IMREAD_IGNORE_ORIENTATION);
    benchmark::DoNotOptimize(photo.data);
  }
}
BENCHMARK(Imread);

// ---- Preview

void TestCameraPreview(benchmark::State& state) {
  QVTester tester;
  tester.Initialize();
  Load(tester, QV_RESOURCE_PREVIEW_FIRST_FRAME, ChartPhoto());
  Load(tester, QV_RESOURCE_PREVIEW_FIRST_FRAME + 1, ChartPhoto(3));
  const auto run = [&] { tester.TestCameraPreview(false); };
  run();
  for ([[maybe_unused]] auto _ : state) run();
  if (tester.results_->preview_main_.preview_diff_cols_ != kSize.width) state.SkipWithError("nothing stored");
}
BENCHMARK(TestCameraPreview);

void PreviewCalls(benchmark::State& state) {
  const cv::Mat& first = ChartPhoto();
  const cv::Mat& second = ChartPhoto(3);
  cv::Mat gray[2];
  cv::Mat map;
  const auto run = [&] {
    cv::cvtColor(first, gray[0], cv::COLOR_RGB2GRAY);
    cv::cvtColor(second, gray[1], cv::COLOR_RGB2GRAY);
    cv::absdiff(gray[1], gray[0], gray[1]);
    gray[1].convertTo(map, CV_32F, 1 / 255.0);
    double maximum = 0;
    cv::minMaxLoc(map, nullptr, &maximum);
    benchmark::DoNotOptimize(cv::mean(map));
    map /= maximum;
    benchmark::DoNotOptimize(map.data);
  };
  run();
  for ([[maybe_unused]] auto _ : state) run();
}
BENCHMARK(PreviewCalls);

// ---- Capture

void TestCameraCapture(benchmark::State& state) {
  QVTester tester;
  tester.Initialize();
  Load(tester, QV_RESOURCE_CHART_PHOTO, ChartPhoto(static_cast<double>(state.range(0))));
  const auto run = [&] {
    if (tester.TestCameraCapture(false) != QV_SUCCESS) state.SkipWithError("not measured");
  };
  run();
  for ([[maybe_unused]] auto _ : state) run();
}
BENCHMARK(TestCameraCapture)->Arg(0)->Arg(3);

// Without the search for the marks, for which there is no call. Where the photo is turned, patches alone are warped.
void CaptureCalls(benchmark::State& state) {
  const cv::Mat& photo = ChartPhoto(static_cast<double>(state.range(0)));
  const float middle = static_cast<float>(kSize.width) * 0.5f;
  const cv::Mat turn = cv::getRotationMatrix2D({middle, middle}, -static_cast<double>(state.range(0)), 1);
  cv::Mat gray;
  cv::Mat binary;
  int side_px = 0;  // of a patch
  const auto run = [&] {
    cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
    cv::threshold(gray, binary, kThreshold, 255, cv::THRESH_BINARY);
    for (int i = 0; i < 24; ++i) {
      const cv::Rect place(400 + i % 6 * 520, 200 + i / 6 * 650, side_px, side_px);
      cv::Mat patch;
      if (state.range(0) == 0 || side_px == 0) {
        patch = photo(place);
      } else {
        cv::Mat shifted = turn.clone();
        shifted.at<double>(0, 2) -= place.x;
        shifted.at<double>(1, 2) -= place.y;
        cv::warpAffine(photo, patch, shifted, place.size());
      }
      benchmark::DoNotOptimize(cv::mean(patch));
    }
    benchmark::DoNotOptimize(binary.data);
  };
  run();
  cv::Point corner;
  cv::Point second;
  cv::Point third;
  QVTester tester;
  tester.SortPatternPoints(tester.GetFinderPoints(binary), corner, second, third);
  side_px = 2 * (static_cast<int>(cv::norm(corner - second)) / 21);
  for ([[maybe_unused]] auto _ : state) run();
}
BENCHMARK(CaptureCalls)->Arg(0)->Arg(3);

const Ratios kCameraRatios = {
    {"lens dust, real", "TestLensDust/real", {"DustCalls/real"}, 1.10},
    {"lens dust, fake", "TestLensDust/fake", {"DustCalls/fake"}, 1.10},
    {"loading a photo, over cv::imread", "SetResource", {"Imread"}, 1.05},
    {"preview, over its calls", "TestCameraPreview", {"PreviewCalls"}, 1.10},
    {"capture, 0 degrees, over its calls", "TestCameraCapture/0", {"CaptureCalls/0"}, 1.10},
    {"capture, 3 degrees, over its calls", "TestCameraCapture/3", {"CaptureCalls/3"}, 1.10},
};

}  // namespace
