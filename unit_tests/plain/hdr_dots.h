#ifndef QVTESTER_UNIT_TESTS_PLAIN_HDR_DOTS_H_
#define QVTESTER_UNIT_TESTS_PLAIN_HDR_DOTS_H_

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <opencv2/core.hpp>

// Detection of dots as its method is written, with the whole summed-area table: what
// tests/led_touch/QVTester_HdrDots.cpp is compared with.

namespace plain {

// S[y][x] = sum of channel 0 over the rows above y and the columns left of x, accumulated row by row in single
// precision: its rounding is part of the result. (height + 1) x (width + 1).
inline cv::Mat SumChannel0(const float* data, int height, int width) {
  cv::Mat sums = cv::Mat::zeros(height + 1, width + 1, CV_32F);
  for (int y = 0; y < height; ++y) {
    const auto* const above = sums.ptr<float>(y);
    auto* const here = sums.ptr<float>(y + 1);
    float row_sum = 0;
    for (int x = 0; x < width; ++x, data += 3) {
      row_sum += *data;
      here[x + 1] = above[x + 1] + row_sum;
    }
  }
  return sums;
}

// The window about a pixel is shifted inward near an edge, so that it keeps its size.
inline void DetectDot(const float* data, int height, int width, float threshold, int radius, unsigned char* mask) {
  const std::int64_t size = 2 * static_cast<std::int64_t>(radius) + 1;
  if (radius < 0 || height < size || width < size) return;
  const int side = static_cast<int>(size);
  const cv::Mat sums = SumChannel0(data, height, width);
  const auto area = static_cast<float>(size * size);
  for (int y = 0; y < height; ++y) {
    const int top = std::min(std::max(y - radius, 0), height - side);
    const auto* const upper = sums.ptr<float>(top);
    const auto* const lower = sums.ptr<float>(top + side);
    for (int x = 0; x < width; ++x, data += 3, ++mask) {
      const int left = std::min(std::max(x - radius, 0), width - side);
      const int right = left + side;
      const float mean = (lower[right] + upper[left] - upper[right] - lower[left]) / area;
      if (std::fabs((mean - *data) / mean) > threshold) *mask = 1;
    }
  }
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_HDR_DOTS_H_
