// Test 23: sharpness over a film of the chart, and when the focus settles.

#include <algorithm>
#include <cmath>
#include <limits>

#include "core/slots.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"
#include "tests/video/film.h"

namespace {

constexpr int kMedianReach = 2;         // frames on either side of the middle one
constexpr double kSettledWithin = 0.1;  // of the final level
constexpr float kNotMeasured = std::numeric_limits<float>::quiet_NaN();

struct FocusCourse {
  int found = 0;
  std::vector<float> vertical, horizontal;  // one a frame; NaN where not measured
  std::vector<int> measured;                // frames with both figures finite
  std::vector<double> level;                // mean of both figures, one a measured frame

  void Append(bool is_found, float v, float h) {
    const bool finite = is_found && std::isfinite(v) && std::isfinite(h);
    found += is_found ? 1 : 0;
    if (finite) {
      measured.push_back(static_cast<int>(vertical.size()));
      level.push_back((static_cast<double>(v) + h) / 2);
    }
    vertical.push_back(finite ? v : kNotMeasured);
    horizontal.push_back(finite ? h : kNotMeasured);
  }
};

// A chart too near the frame's edge is not found: the film goes on.
bool MeasureFrame(QVTester& tester, const cv::Mat& frame, float& vertical, float& horizontal) {
  try {
    return tester.GetMTFFromImage(frame, vertical, horizontal) == QV_SUCCESS;
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
    QVDEBUGP("[%s] %s", "TestVideoAutofocus", e.what());
    return false;
  }
}

// Median of the last fifth.
double FinalLevel(const std::vector<double>& level) {
  const auto fifth = static_cast<std::ptrdiff_t>((level.size() + 4) / 5);
  return Median({level.end() - fifth, level.end()});
}

// The first measured frame from which the running median stays near the final level; as many as there are, if none.
std::size_t SettledFrom(const std::vector<double>& level, double final_level) {
  const auto count = static_cast<std::ptrdiff_t>(level.size());
  std::ptrdiff_t from = count;
  while (from > 0) {
    const std::ptrdiff_t first = std::max<std::ptrdiff_t>(from - 1 - kMedianReach, 0);
    const std::ptrdiff_t last = std::min<std::ptrdiff_t>(from - 1 + kMedianReach, count - 1);
    const double median = Median({level.begin() + first, level.begin() + last + 1});
    if (!(std::fabs(median - final_level) <= kSettledWithin * std::fabs(final_level))) break;
    --from;
  }
  return static_cast<std::size_t>(from);
}

}  // namespace

int QVTester::TestVideoAutofocus() {
  const char* const name = "TestVideoAutofocus";
  Film film;
  FocusCourse course;
  const auto measure = [&](const cv::Mat& frame) {
    float vertical = kNotMeasured;
    float horizontal = kNotMeasured;
    const bool found = MeasureFrame(*this, frame, vertical, horizontal);
    course.Append(found, vertical, horizontal);
  };
  if (const int code = ReadFilm(*this, QV_RESOURCE_VIDEO, name, 0, measure, film); code != QV_SUCCESS) return code;
  if (course.measured.empty()) {
    QVDEBUGP("[%s] the chart was found in %d of %d frames and measured in none", name, course.found,
             static_cast<int>(film.time.size()));
    return QV_ERROR_PATTERN_NOT_FOUND;
  }
  const auto best = std::max_element(course.level.begin(), course.level.end()) - course.level.begin();
  const double final_level = FinalLevel(course.level);
  const std::size_t settled = SettledFrom(course.level, final_level);

  QVResultData& results = Results(*this);
  auto times = ArrayOf(film.time);
  auto vertical = ArrayOf(course.vertical);
  auto horizontal = ArrayOf(course.horizontal);
  ReleaseTestResult(QV_TEST_VIDEO_AUTOFOCUS);
  results.video_af_frame_count_ = static_cast<int>(film.time.size());
  results.video_af_found_count_ = course.found;
  results.video_af_best_frame_ = course.measured[best];
  results.video_af_time_ = times.release();
  results.video_af_mtf50_vertical_ = vertical.release();
  results.video_af_mtf50_horizontal_ = horizontal.release();
  results.video_af_best_mtf50_ = static_cast<float>(course.level[best]);
  results.video_af_final_mtf50_ = static_cast<float>(final_level);
  results.video_af_settle_time_ =
      settled < course.level.size() ? film.time[course.measured[settled]] : std::numeric_limits<double>::quiet_NaN();
  return QV_SUCCESS;
}
