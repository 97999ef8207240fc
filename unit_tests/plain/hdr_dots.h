#ifndef QVTESTER_UNIT_TESTS_PLAIN_HDR_DOTS_H_
#define QVTESTER_UNIT_TESTS_PLAIN_HDR_DOTS_H_

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <opencv2/core.hpp>

// Detection of dots as its method is written, with the whole summed-area table: what
// tests/led_touch/QVTester_HdrDots.cpp is compared with.

namespace plain {

// S[y][x] = sum of channel 0 over the rows above y and the columns left of x, accumulated row by row in single
// precision: its rounding is part of the result. (height + 1) x (width + 1).
inline cv::Mat SumChannel0(const float* data, int height, int width) {
  cv::Mat sums = cv::Mat::zeros(height + 1, width + 1, CV_32F);
  for (int y = 1; y <= height; ++y) {
    const float* const row = data + static_cast<std::size_t>(y - 1) * width * 3;
    const auto* const above = sums.ptr<float>(y - 1);
    auto* const here = sums.ptr<float>(y);
    float row_sum = 0;
    for (int x = 1; x <= width; ++x) {
      row_sum += row[3 * (x - 1)];
      here[x] = above[x] + row_sum;
    }
  }
  return sums;
}

// First row or column of the window about place i (from 1): shifted inward near an edge, so that it keeps its size.
inline int WindowStart(int i, int radius, int size) {
  const int side = 2 * radius + 1;
  return std::min(side + std::max(i - radius - 1, 0), size) - side;
}

inline void DetectDot(const float* data, int height, int width, float threshold, int radius, unsigned char* mask) {
  const std::int64_t side = 2 * static_cast<std::int64_t>(radius) + 1;
  if (radius < 0 || height < side || width < side) return;
  const cv::Mat sums = SumChannel0(data, height, width);
  const auto area = static_cast<float>(side * side);
  for (int y = 1; y <= height; ++y) {
    const int top = WindowStart(y, radius, height);
    const auto* const upper = sums.ptr<float>(top);
    const auto* const lower = sums.ptr<float>(top + static_cast<int>(side));
    const std::size_t row = static_cast<std::size_t>(y - 1) * width;
    for (int x = 1; x <= width; ++x) {
      const int left = WindowStart(x, radius, width);
      const int right = left + static_cast<int>(side);
      const float mean = (lower[right] + upper[left] - upper[right] - lower[left]) / area;
      const float pixel = data[3 * (row + x - 1)];
      if (std::fabs((mean - pixel) / mean) > threshold) mask[row + x - 1] = 1;
    }
  }
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_HDR_DOTS_H_
