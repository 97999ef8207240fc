// Dots in a high-dynamic-range capture: pixels that depart from their local mean.
//
// The plain form is in unit_tests/plain/hdr_dots.h; this one flags the same pixels. Of the summed-area table it keeps,
// in a ring, the rows that the windows still reach, and it sums several rows side by side, since each is one long chain
// of additions. A stretch of columns is first tested without dividing and with slack for every rounding; only where a
// pixel of it may lie beyond the threshold is the exact expression taken.

#include <algorithm>
#include <array>
#include <cfloat>
#include <cmath>
#include <cstdint>
#include <opencv2/core.hpp>
#include <opencv2/core/hal/intrin.hpp>
#include <opencv2/imgproc.hpp>

#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

constexpr int kRowsAtOnce = 6;
constexpr int kRun = 32;

// Rows of the table S[y][x] = sum of channel 0 over the rows above y and the columns left of x, accumulated row by row
// in single precision: its rounding is part of the result. A row takes the place of the one `rows` before it.
class SumRows {
 public:
  SumRows(int rows, int width) : sums_(cv::Mat::zeros(rows, width + 1, CV_32F)) {}

  float* operator[](int y) { return sums_.ptr<float>(y % sums_.rows); }

  // Rows y + 1 to y + kRows, from as many rows of the capture, which begin at data.
  template <int kRows>
  void Append(const float* data, int y) {
    const int width = sums_.cols - 1;
    const float* const above = (*this)[y];
    std::array<float*, kRows> rows = {};
    for (int k = 0; k < kRows; ++k) rows[k] = (*this)[y + k + 1];
    std::array<float, kRows> row_sums = {};
    for (int x = 0; x < width; ++x) {
      float sum = above[x + 1];
      for (int k = 0; k < kRows; ++k) {
        row_sums[k] += data[3 * (static_cast<std::size_t>(k) * width + x)];
        sum += row_sums[k];
        rows[k][x + 1] = sum;
      }
    }
  }

 private:
  cv::Mat sums_;
};

// First row or column of the window about place i: shifted inward near an edge, so that it keeps its size.
int WindowStart(int i, int radius, int size) { return std::clamp(i - radius, 0, size - 2 * radius - 1); }

// One row of pixels, of three floats each, and the table's rows at the upper and lower end of its windows.
struct Row {
  const float *pixels, *upper, *lower;
};

class DotJudge {
 public:
  DotJudge(int radius, float threshold, int width)
      : radius_(radius), side_(2 * radius + 1), width_(width), threshold_(threshold) {
    area_ = static_cast<float>(static_cast<std::int64_t>(side_) * side_);
    const float safe = threshold * (1 - 1e-6f) - 1e-6f;
    low_ = std::max(1 - safe, 0.0f) / area_;
    high_ = (1 + safe) / area_;
  }

  // `ahead` is a row that will be summed soon: fetched meanwhile, since this here is arithmetic, and summing is
  // waiting.
  void Flag(const Row& row, const float* ahead, unsigned char* mask) const {
    FlagExactly(row, 0, radius_, mask);
    int x = radius_;
    for (; x + kRun <= width_ - radius_; x += kRun) {
      for (int i = 0; i < 3 * kRun; i += 16) __builtin_prefetch(ahead + 3 * x + i);
      if (MayDepart(row, x)) FlagExactly(row, x, x + kRun, mask);
    }
    FlagExactly(row, x, width_, mask);
  }

 private:
  // A pixel between low and high times the window's sum departs from the mean by less than the threshold: the slack of
  // 1e-6 covers the roundings of both forms, some ten of 2^-24, as long as the mean is a normal number. Pixels of
  // another sign than the mean, NaN, infinity and means that are negative or below the normal numbers fail the test.
  bool MayDepart(const Row& row, int begin) const {
    using cv::v_float32x4;
    const v_float32x4 low = cv::v_setall_f32(low_);
    const v_float32x4 high = cv::v_setall_f32(high_);
    v_float32x4 above = cv::v_reinterpret_as_f32(cv::v_setall_s32(-1));
    v_float32x4 below = above;
    v_float32x4 least = cv::v_setall_f32(FLT_MAX);
    const float* const upper = row.upper + begin - radius_;
    const float* const lower = row.lower + begin - radius_;
    for (int i = 0; i < kRun; i += v_float32x4::nlanes) {
      v_float32x4 pixel;
      v_float32x4 second;
      v_float32x4 third;
      cv::v_load_deinterleave(row.pixels + 3 * (begin + i), pixel, second, third);
      const v_float32x4 sum =
          cv::v_load(lower + i + side_) + cv::v_load(upper + i) - cv::v_load(upper + i + side_) - cv::v_load(lower + i);
      above = above & (pixel > low * sum);
      below = below & (pixel < high * sum);
      least = cv::v_min(least, sum);
    }
    return !cv::v_check_all(above & below & (least > cv::v_setall_f32(area_ * FLT_MIN)));
  }

  void FlagExactly(const Row& row, int begin, int end, unsigned char* mask) const {
    for (int x = begin; x < end; ++x) {
      const int left = WindowStart(x, radius_, width_);
      const int right = left + side_;
      const float mean = (row.lower[right] + row.upper[left] - row.upper[right] - row.lower[left]) / area_;
      if (std::fabs((mean - row.pixels[3 * x]) / mean) > threshold_) mask[x] = 1;
    }
  }

  int radius_, side_, width_;
  float threshold_, area_, low_, high_;
};

}  // namespace

void QVTester::DetectDot(float* data, int height, int width, float threshold, int radius, unsigned char* mask) {
  if (radius < 0 || std::min(height, width) - 2 * static_cast<std::int64_t>(radius) < 1) {
    QVDEBUGP("[%s] a picture of %d x %d is smaller than the window of radius %d", "DetectDot", width, height, radius);
    return;
  }
  const int side = 2 * radius + 1;
  const DotJudge judge(radius, threshold, width);
  SumRows sums(side + kRowsAtOnce, width);
  const auto start = [width](int y) { return static_cast<std::size_t>(y) * width; };
  QVDEBUGP("[OKAPI] OpenMP #1 Start");
  int judged = 0;
  for (int summed = 0; summed < height;) {
    const bool several = summed + kRowsAtOnce <= height;
    if (several) {
      sums.Append<kRowsAtOnce>(data + 3 * start(summed), summed);
    } else {
      sums.Append<1>(data + 3 * start(summed), summed);
    }
    summed += several ? kRowsAtOnce : 1;
    for (; judged < height; ++judged) {
      const int top = WindowStart(judged, radius, height);
      if (top + side > summed) break;
      const int ahead = std::min(judged + radius + kRowsAtOnce, height - 1);
      judge.Flag({data + 3 * start(judged), sums[top], sums[top + side]}, data + 3 * start(ahead),
                 mask + start(judged));
    }
  }
  QVDEBUGP("[OKAPI] OpenMP #1 End");
}

cv::Mat QVTester::HDR2UCHAR(cv::Mat& hdr) {
  CV_Assert(!hdr.empty());
  std::vector<cv::Mat> channels;
  cv::split(hdr, channels);
  cv::Mat stretched;
  cv::normalize(channels[0], stretched, 0, 255.0, cv::NORM_MINMAX, CV_32F);
  stretched.convertTo(stretched, CV_8U);
  return stretched;
}
