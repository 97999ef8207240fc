// Plain form: the scan in unit_tests/plain/finder.h, pixel by pixel. Here a row becomes the bounds of its dark runs:
// masks of 64 pixels, in which counting trailing zeros goes from one bound to the next. Marks are looked for where a
// dark run ends, four ends at a time.

#include "chart/dark_runs.h"

#include <cstdint>
#include <cstring>
#include <opencv2/core.hpp>
#include <opencv2/core/hal/intrin.hpp>

namespace {

constexpr int kBlock = CutPhoto::kBlock;
constexpr int kCacheLine = 64;

// Bit k is set when pixel k is dark.
std::uint64_t DarkMask(const uchar* pixels) {
  const cv::v_uint8x16 dark = cv::v_setzero_u8();
  std::uint64_t mask = 0;
  for (int k = 0; k < kBlock; k += 16) {
    mask |= static_cast<std::uint64_t>(cv::v_signmask(cv::v_load(pixels + k) == dark)) << k;
  }
  return mask;
}

// Bit k is set when the three runs from bounds[2 k] may be a mark's: outer runs strictly between a half and one and a
// half modules of total / 7, the core between three times as much. Here all is times 14, with a fourteenth of a pixel
// of slack and a thousandth of the total, far above what rounding does to this test or to the exact one.
int MayBeMarks(const int* bounds) {
  cv::v_int32x4 b[6];
  for (int k = 0; k < 6; k += 2) cv::v_load_deinterleave(bounds + k, b[k], b[k + 1]);
  const auto pixels = [&](int from, int to) { return cv::v_cvt_f32(b[to] - b[from]); };
  const auto times = [](float factor, const cv::v_float32x4& a) { return cv::v_setall_f32(factor) * a; };
  const cv::v_float32x4 total = pixels(0, 5);
  const cv::v_float32x4 slack = times(0.001f, total) + cv::v_setall_f32(1);
  const cv::v_float32x4 shortest =
      cv::v_min(cv::v_min(pixels(0, 1), pixels(1, 2)), cv::v_min(pixels(3, 4), pixels(4, 5)));
  const cv::v_float32x4 longest =
      cv::v_max(cv::v_max(pixels(0, 1), pixels(1, 2)), cv::v_max(pixels(3, 4), pixels(4, 5)));
  const cv::v_float32x4 core = times(14, pixels(2, 3));
  return cv::v_signmask((total >= cv::v_setall_f32(7)) & (times(14, shortest) > total - slack) &
                        (times(14, longest) < times(3, total) + slack) & (core > times(3, total) - slack) &
                        (core < times(9, total) + slack));
}

}  // namespace

// A block's mask, exclusive-or itself moved up by a pixel, has a bit wherever dark and light meet, so a block of one
// kind costs no more than its reading.
template <typename DarkMask>
void DarkRuns::Take(DarkMask dark_mask) {
  int* bound = bounds_.data();
  std::uint64_t last = 0;  // of the block before: light before the row
  for (int j = 0; j < cols_; j += kBlock) {
    const std::uint64_t dark = dark_mask(j);
    for (std::uint64_t meet = dark ^ (dark << 1 | last); meet != 0; meet &= meet - 1) {
      *bound++ = j + __builtin_ctzll(meet);
    }
    last = dark >> (kBlock - 1);
  }
  if (last != 0) *bound++ = cols_;
  end_ = bound;
}

// Rows lie far apart: the processor would not fetch the next one by itself.
void DarkRuns::Read(const uchar* row, const uchar* next) {
  Take([&](int j) {
    __builtin_prefetch(next + j);
    uchar rest[kBlock];
    const bool whole = cols_ - j >= kBlock;
    if (!whole) {  // light behind the row
      std::memset(rest, 255, kBlock);
      std::memcpy(rest, row + j, static_cast<std::size_t>(cols_ - j));
    }
    return DarkMask(whole ? row + j : rest);
  });
}

void DarkRuns::Read(const CutPhoto& photo, const uchar* row, const uchar* next) {
  const int bytes = kBlock * photo.channels();
  Take([&, at = 0](int j) mutable {
    for (int line = 0; line < bytes; line += kCacheLine) __builtin_prefetch(next + at + line);
    const std::uint64_t dark = photo.DarkMask(row + at, cols_ - j);
    at += bytes;
    return dark;
  });
}

const int* DarkRuns::NextMark(const int* bounds) const {
  for (; end_ - bounds >= 6; bounds += 8) {
    const int marks = MayBeMarks(bounds);
    if (marks == 0) continue;
    bounds += 2 * __builtin_ctz(static_cast<unsigned>(marks));
    return end_ - bounds >= 6 ? bounds : nullptr;
  }
  return nullptr;
}
