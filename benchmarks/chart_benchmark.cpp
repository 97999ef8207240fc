// Finding, straightening and measuring the chart on photos of 12 megapixels, beside the plain forms and the OpenCV
// calls that no form can do without.

#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <map>
#include <opencv2/imgproc.hpp>
#include <string>

#include "benchmarks/pictures.h"
#include "benchmarks/ratios.h"
#include "chart/find_chart.h"
#include "unit_tests/drawing.h"
#include "unit_tests/plain/chart_mtf.h"
#include "unit_tests/plain/finder.h"

namespace {

constexpr int kChartThreshold = 125;
const cv::Size kChartSize(4000, 3000);

cv::Mat GrayChart() {
  cv::Mat gray;
  cv::cvtColor(ChartPhoto(), gray, cv::COLOR_RGB2GRAY);
  return gray;
}

// The noise of the dark sides of the edges reaches over the threshold.
cv::Mat SpeckedChart() {
  const cv::Mat gray = GrayChart();
  const cv::Mat dark_side = gray(cv::Rect(2100, 1000, 100, 100));
  return gray > cv::mean(dark_side)[0] + 2;
}

cv::Mat Noise() {
  cv::Mat noise(kChartSize, CV_8UC1);
  cv::randu(noise, 0, 256);
  return noise > 127;
}

// Blocks as of a two-dimensional code of so many modules a side, over the whole picture.
cv::Mat Code(int modules) {
  const int module = kChartSize.height / modules;
  cv::Mat blocks(modules, kChartSize.width / module + 1, CV_8UC1);
  cv::randu(blocks, 0, 256);
  cv::Mat code;
  cv::resize(blocks > 127, code, {}, module, module, cv::INTER_NEAREST);
  const int far = (modules - 8) * module;
  for (const cv::Point corner : {cv::Point(0, 0), cv::Point(0, far), cv::Point(far, 0)}) {
    code(cv::Rect(corner, cv::Size(8 * module, 8 * module))).setTo(255);
    DrawMark(code, corner.y + (corner.y > 0 ? module : 0), corner.x + (corner.x > 0 ? module : 0), module);
  }
  cv::Mat picture(kChartSize, CV_8UC1, cv::Scalar(255));
  const cv::Rect shared = cv::Rect({}, code.size()) & cv::Rect({}, kChartSize);
  code(shared).copyTo(picture(shared));
  return picture;
}

const cv::Mat& Binary(const std::string& name) {
  static const std::map<std::string, cv::Mat> pictures = {{"chart", GrayChart() > kChartThreshold},
                                                          {"specks", SpeckedChart()},
                                                          {"code10", Code(57)},
                                                          {"code40", Code(177)},
                                                          {"noise", Noise()}};
  return pictures.at(name);
}

// ---- Finder scan

void GetFinderPoints(benchmark::State& state, const char* picture) {
  const cv::Mat& binary = Binary(picture);
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) benchmark::DoNotOptimize(tester.GetFinderPoints(binary));
}

void PlainFinderPoints(benchmark::State& state, const char* picture) {
  const cv::Mat& binary = Binary(picture);
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) benchmark::DoNotOptimize(plain::GetFinderPoints(tester, binary));
}

// Every third row, as the search takes them until its first find, in words of 8 pixels.
void ReadRows(benchmark::State& state, const char* picture) {
  const cv::Mat& binary = Binary(picture);
  for ([[maybe_unused]] auto _ : state) {
    std::uint64_t sum = 0;
    for (int i = 2; i < binary.rows; i += 3) {
      for (int j = 0; j + 8 <= binary.cols; j += 8) {
        std::uint64_t word = 0;
        std::memcpy(&word, binary.ptr<uchar>(i) + j, sizeof(word));
        sum += word;
      }
    }
    benchmark::DoNotOptimize(sum);
  }
}

#define QV_FINDER(picture)                               \
  BENCHMARK_CAPTURE(GetFinderPoints, picture, #picture); \
  BENCHMARK_CAPTURE(PlainFinderPoints, picture, #picture)
QV_FINDER(chart);
QV_FINDER(specks);
QV_FINDER(code10);
QV_FINDER(code40);
QV_FINDER(noise);
BENCHMARK_CAPTURE(ReadRows, chart, "chart");

// ---- Grey and binary picture

void GrayAndBinary(benchmark::State& state) {
  const cv::Mat& photo = ChartPhoto();
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    benchmark::DoNotOptimize(Binarise(tester, photo, kChartThreshold, nullptr).data);
  }
}
BENCHMARK(GrayAndBinary);

void CvtColorAndThreshold(benchmark::State& state) {
  const cv::Mat& photo = ChartPhoto();
  cv::Mat gray;
  cv::Mat binary;
  for ([[maybe_unused]] auto _ : state) {
    cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
    cv::threshold(gray, binary, kChartThreshold, 255, cv::THRESH_BINARY);
    benchmark::DoNotOptimize(binary.data);
  }
}
BENCHMARK(CvtColorAndThreshold);

// ---- Straightening

// Marks of a chart turned counter-clockwise, rows in x.
std::vector<cv::Point> Marks(double turn_deg) {
  ChartView view;
  view.size = kChartSize;
  view.turn_deg = turn_deg;
  view.scale = 0.3;
  std::vector<cv::Point> points;
  for (const cv::Point2d& centre : MarkCentres(view)) points.emplace_back(cvRound(centre.y), cvRound(centre.x));
  return points;
}

void NormalizePatternImage(benchmark::State& state) {
  const cv::Mat gray = GrayChart();
  const std::vector<cv::Point> marks = Marks(static_cast<double>(state.range(0)));
  QVTester tester;
  cv::Mat upright;
  for ([[maybe_unused]] auto _ : state) {
    std::vector<cv::Point> points = marks;
    tester.NormalizePatternImage(gray, points, upright);
    benchmark::DoNotOptimize(upright.data);
  }
}
BENCHMARK(NormalizePatternImage)->Arg(0)->Arg(3)->Arg(118);

void CopyIntoCanvas(benchmark::State& state) {
  const cv::Mat gray = GrayChart();
  cv::Mat canvas(kChartSize.width, kChartSize.width, CV_8UC1);
  for ([[maybe_unused]] auto _ : state) {
    gray.copyTo(canvas.rowRange(0, gray.rows));
    canvas.rowRange(gray.rows, canvas.rows).setTo(0);
    benchmark::DoNotOptimize(canvas.data);
  }
}
BENCHMARK(CopyIntoCanvas);

void WarpAffine(benchmark::State& state) {
  const cv::Mat gray = GrayChart();
  const float middle = static_cast<float>(kChartSize.width) * 0.5f;
  const float angle_deg = QVTester().GetPatternAngle(Marks(static_cast<double>(state.range(0))));
  const cv::Mat turn = cv::getRotationMatrix2D({middle, middle}, 315 - angle_deg, 1);
  cv::Mat canvas;
  for ([[maybe_unused]] auto _ : state) {
    cv::warpAffine(gray, canvas, turn, {kChartSize.width, kChartSize.width});
    benchmark::DoNotOptimize(canvas.data);
  }
}
BENCHMARK(WarpAffine)->Arg(3)->Arg(118);

// ---- The sharpness of a photo

void GetSFRFromImage(benchmark::State& state) {
  const cv::Mat& photo = ChartPhoto(static_cast<double>(state.range(0)));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    std::vector<float> freq;
    std::vector<float> vertical;
    std::vector<float> horizontal;
    float mtf50[2];
    if (tester.GetSFRFromImage(photo, freq, vertical, horizontal, mtf50[0], mtf50[1]) != QV_SUCCESS) {
      state.SkipWithError("no marks");
    }
    benchmark::DoNotOptimize(mtf50);
  }
}
BENCHMARK(GetSFRFromImage)->Arg(0)->Arg(3)->Arg(29)->Arg(118);

void GetMTFFromImage(benchmark::State& state) {
  const cv::Mat& photo = ChartPhoto(static_cast<double>(state.range(0)));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    float mtf50[2];
    if (tester.GetMTFFromImage(photo, mtf50[0], mtf50[1]) != QV_SUCCESS) state.SkipWithError("no marks");
    benchmark::DoNotOptimize(mtf50);
  }
}
BENCHMARK(GetMTFFromImage)->Arg(0)->Arg(3)->Arg(29)->Arg(118);

void PlainSFRFromImage(benchmark::State& state) {
  const cv::Mat& photo = ChartPhoto(static_cast<double>(state.range(0)));
  QVTester tester;
  for ([[maybe_unused]] auto _ : state) {
    std::vector<float> freq;
    std::vector<float> vertical;
    std::vector<float> horizontal;
    float mtf50[2];
    plain::GetSFRFromImage(tester, photo, freq, vertical, horizontal, mtf50[0], mtf50[1]);
    benchmark::DoNotOptimize(mtf50);
  }
}
BENCHMARK(PlainSFRFromImage)->Arg(0)->Arg(3)->Arg(29)->Arg(118);

const Ratios kChartRatios = {
    {"finder marks, chart", "GetFinderPoints/chart", {"PlainFinderPoints/chart"}, 0.10},
    {"finder marks, chart, over reading", "GetFinderPoints/chart", {"ReadRows/chart"}, 3},
    {"finder marks, specks", "GetFinderPoints/specks", {"PlainFinderPoints/specks"}, 0.13},
    {"finder marks, code of version 10", "GetFinderPoints/code10", {"PlainFinderPoints/code10"}, 0.20},
    {"finder marks, code of version 40", "GetFinderPoints/code40", {"PlainFinderPoints/code40"}, 0.26},
    {"finder marks, 50 % noise", "GetFinderPoints/noise", {"PlainFinderPoints/noise"}, 0.75},
    {"grey and binary picture", "GrayAndBinary", {"CvtColorAndThreshold"}, 1.10},
    {"straightening, 0 degrees", "NormalizePatternImage/0", {"CopyIntoCanvas"}, 2},
    {"straightening, 3 degrees", "NormalizePatternImage/3", {"WarpAffine/3"}, 1.05},
    {"straightening, 118 degrees", "NormalizePatternImage/118", {"WarpAffine/118"}, 1.05},
    {"SFR of a photo, 0 degrees", "GetSFRFromImage/0", {"PlainSFRFromImage/0"}, 0.13},
    {"SFR of a photo, 3 degrees", "GetSFRFromImage/3", {"PlainSFRFromImage/3"}, 0.13},
    {"SFR of a photo, 29 degrees", "GetSFRFromImage/29", {"PlainSFRFromImage/29"}, 0.13},
    {"SFR of a photo, 118 degrees", "GetSFRFromImage/118", {"PlainSFRFromImage/118"}, 0.13},
    {"SFR of a photo, 0 degrees, over grey", "GetSFRFromImage/0", {"CvtColorAndThreshold"}, 2.8},
    {"SFR of a photo, 3 degrees, over grey", "GetSFRFromImage/3", {"CvtColorAndThreshold"}, 2.8},
    {"SFR of a photo, 29 degrees, over grey", "GetSFRFromImage/29", {"CvtColorAndThreshold"}, 2.8},
    {"SFR of a photo, 118 degrees, over grey", "GetSFRFromImage/118", {"CvtColorAndThreshold"}, 2.8},
    // The plain chain for the MTF50 alone is that of the SFR.
    {"MTF50 of a photo, 0 degrees", "GetMTFFromImage/0", {"PlainSFRFromImage/0"}, 0.13},
    {"MTF50 of a photo, 3 degrees", "GetMTFFromImage/3", {"PlainSFRFromImage/3"}, 0.13},
    {"MTF50 of a photo, 29 degrees", "GetMTFFromImage/29", {"PlainSFRFromImage/29"}, 0.13},
    {"MTF50 of a photo, 118 degrees", "GetMTFFromImage/118", {"PlainSFRFromImage/118"}, 0.13},
    {"MTF50 of a photo, 0 degrees, over grey", "GetMTFFromImage/0", {"CvtColorAndThreshold"}, 2.8},
    {"MTF50 of a photo, 3 degrees, over grey", "GetMTFFromImage/3", {"CvtColorAndThreshold"}, 2.8},
    {"MTF50 of a photo, 29 degrees, over grey", "GetMTFFromImage/29", {"CvtColorAndThreshold"}, 2.8},
    {"MTF50 of a photo, 118 degrees, over grey", "GetMTFFromImage/118", {"CvtColorAndThreshold"}, 2.8},
};

}  // namespace
