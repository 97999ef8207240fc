// Test 24: brightness over a film, and the flash's pulse in it.

#include <algorithm>

#include "core/slots.h"
#include "qvtester/tester.h"
#include "tests/video/film.h"

namespace {

constexpr float kLeastPulse = 5;  // levels above the base

// When the brightness between a frame at or above the level and its neighbour below it crosses the level.
double Crossing(const Film& film, const std::vector<float>& mean, int inside, int outside, double level) {
  const double share = (mean[inside] - level) / (static_cast<double>(mean[inside]) - mean[outside]);
  return film.time[inside] + share * (film.time[outside] - film.time[inside]);
}

// Width at half height of the pulse around the peak; as wide as what is seen where the film cuts it.
double PulseWidth(const Film& film, const std::vector<float>& mean, int peak, float base) {
  const double level = (static_cast<double>(mean[peak]) + base) / 2;
  const int count = static_cast<int>(mean.size());
  int first = peak;
  while (first > 0 && mean[first - 1] >= level) --first;
  int last = peak;
  while (last < count - 1 && mean[last + 1] >= level) ++last;
  const double start = first > 0 ? Crossing(film, mean, first, first - 1, level) : film.time.front();
  const double end = last < count - 1 ? Crossing(film, mean, last, last + 1, level) : film.time.back();
  return end - start;
}

}  // namespace

int QVTester::TestVideoFlash() {
  Film film;
  std::vector<float> mean;
  const int code = ReadFilm(
      *this, QV_RESOURCE_VIDEO, "TestVideoFlash", prop_video_flash_frame_count_,
      [&](const cv::Mat& frame) { mean.push_back(static_cast<float>(cv::mean(frame)[0])); }, film);
  if (code != QV_SUCCESS) return code;
  const int peak = static_cast<int>(std::max_element(mean.begin(), mean.end()) - mean.begin());
  const auto base = static_cast<float>(Median({mean.begin(), mean.end()}));
  const bool pulse = mean[peak] - base >= kLeastPulse;

  QVResultData& results = Results(*this);
  auto times = ArrayOf(film.time);
  auto means = ArrayOf(mean);
  ReleaseTestResult(QV_TEST_VIDEO_FLASH);
  results.video_flash_frame_count_ = static_cast<int>(mean.size());
  results.video_flash_time_ = times.release();
  results.video_flash_mean_ = means.release();
  results.video_flash_peak_frame_ = peak;
  results.video_flash_peak_ = mean[peak];
  results.video_flash_base_ = base;
  results.video_flash_width_ = pulse ? PulseWidth(film, mean, peak, base) : std::numeric_limits<double>::quiet_NaN();
  return QV_SUCCESS;
}
