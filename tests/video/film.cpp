#include "tests/video/film.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <limits>
#include <opencv2/videoio.hpp>

#include "qvtester/log.h"

namespace {

constexpr int kFailuresAtEnd = 8;
constexpr double kUsualInterval = 1000 / 30.0;  // ms, where neither stamps nor container tell one
constexpr double kLeastInterval = 0.1;          // ms: no camera takes more frames than 10,000 in a second
constexpr double kGap = 1.5;                    // median intervals

int AsCount(double value) {
  if (!(value > 0)) return 0;
  return value < INT_MAX ? static_cast<int>(value) : INT_MAX;
}

double NominalInterval(const cv::VideoCapture& video) {
  const double interval = 1000 / video.get(cv::CAP_PROP_FPS);
  return interval >= kLeastInterval && std::isfinite(interval) ? interval : kUsualInterval;
}

double FirstOf(const std::vector<double>& stamps) { return std::isfinite(stamps[0]) ? stamps[0] : 0; }
bool GoesOn(double stamp, double last) { return std::isfinite(stamp) && stamp > last; }

// Intervals between neighbours whose stamps both go on from the highest before.
std::vector<double> UsableIntervals(const std::vector<double>& stamps) {
  std::vector<double> intervals;
  double last = FirstOf(stamps);
  bool went_on = true;
  for (std::size_t i = 1; i < stamps.size(); ++i) {
    const bool goes_on = GoesOn(stamps[i], last);
    if (goes_on && went_on) intervals.push_back(stamps[i] - last);
    if (goes_on) last = stamps[i];
    went_on = goes_on;
  }
  return intervals;
}

// False for a frame that can't be decoded, or comes in another size than the film's head says and doesn't fit.
bool Retrieve(cv::VideoCapture& video, cv::Mat& frame) {
  try {
    return video.retrieve(frame) && !frame.empty();
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
    return false;
  }
}

}  // namespace

double Median(std::vector<double> values) {
  if (values.empty()) return std::numeric_limits<double>::quiet_NaN();
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  if (values.size() % 2 != 0) return *middle;
  return (*std::max_element(values.begin(), middle) + *middle) / 2;
}

int KeepTime(const std::vector<double>& stamps, double nominal, Film& film) {
  const std::vector<double> intervals = UsableIntervals(stamps);
  const bool ticks = !intervals.empty() && Median(intervals) < kLeastInterval;  // a bare stream's, which tell no time
  const double interval = intervals.empty() || ticks ? nominal : Median(intervals);
  int extended = 0;
  const double first = FirstOf(stamps);
  double last = first;
  double lost = 0;
  film.time.assign(1, 0.0);
  for (std::size_t i = 1; i < stamps.size(); ++i) {
    const bool goes_on = !ticks && GoesOn(stamps[i], last);
    const double now = goes_on ? stamps[i] : last + interval;
    extended += goes_on ? 0 : 1;
    film.longest_gap = std::max(film.longest_gap, now - last);
    if (now - last > kGap * interval) lost += std::round((now - last) / interval) - 1;
    film.time.push_back(now - first);
    last = now;
  }
  film.lost = AsCount(lost);
  const double whole = film.time.back();
  film.mean_rate = whole > 0 ? 1000 * static_cast<double>(film.time.size() - 1) / whole : 0;
  return extended;
}

int ReadFilm(QVTester& tester, int slot, const char* test, int most, const std::function<void(const cv::Mat&)>& measure,
             Film& film) {
  const QVResource* resource = tester.resources_[slot].get();
  if (resource == nullptr) return QV_ERROR_SLOT_EMPTY;
  cv::VideoCapture video;
  if (resource->OpenVideo(&video) != QV_SUCCESS) {
    QVDEBUGP("[%s] slot %d holds no film that can be opened", test, slot);
    return QV_ERROR_UNUSABLE_INPUT;
  }
  film = Film();
  film.promised = AsCount(video.get(cv::CAP_PROP_FRAME_COUNT));
  std::vector<double> stamps;
  cv::Mat frame;
  for (int failures = 0; failures < kFailuresAtEnd && (most <= 0 || static_cast<int>(stamps.size()) < most);) {
    if (!video.grab()) {
      ++failures;
      continue;
    }
    film.bad += failures;  // passed over, so the film went on
    failures = 0;
    if (!Retrieve(video, frame)) {
      ++film.bad;
      continue;
    }
    stamps.push_back(video.get(cv::CAP_PROP_POS_MSEC));
    measure(frame);
    if (tester.kept_->film_progress) tester.kept_->film_progress(static_cast<int>(stamps.size()), film.promised);
  }
  if (stamps.empty()) {
    QVDEBUGP("[%s] the film in slot %d has no frame that can be decoded", test, slot);
    return QV_ERROR_UNUSABLE_INPUT;
  }
  const int count = static_cast<int>(stamps.size());
  if (film.promised > 0 && count > film.promised) {  // a film in fragments may count the first alone, and end there
    QVDEBUGP("[%s] %d frames where %d are promised: more may follow that OpenCV does not read", test, count,
             film.promised);
  }
  const int extended = KeepTime(stamps, NominalInterval(video), film);
  if (extended > 0 && extended == count - 1) {
    QVDEBUGP("[%s] the time stamps tell no time; the container's rate is taken, or 30 frames a second", test);
  } else if (extended > 0) {
    QVDEBUGP("[%s] %d of %d time stamps go back or repeat; each was extended by the median interval", test, extended,
             count);
  }
  return QV_SUCCESS;
}
