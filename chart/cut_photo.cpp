// Plain form: Binarise and GetFinderPoints, one after the other.

#include "chart/cut_photo.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <opencv2/core/hal/intrin.hpp>

namespace {

constexpr int kLanes = 16;

// The tester's search reads this photo while this lives.
class Attached {
 public:
  Attached(QVTester& tester, const CutPhoto& photo) : tester_(tester) { tester_.kept_->cut_photo = &photo; }
  ~Attached() { tester_.kept_->cut_photo = nullptr; }
  Attached(const Attached&) = delete;
  Attached& operator=(const Attached&) = delete;

 private:
  QVTester& tester_;
};

}  // namespace

CutPhoto::CutPhoto(const cv::Mat& photo, int threshold)
    : channels_(photo.channels()),
      threshold_(std::clamp(threshold, -1, 255)),
      dark_below_((threshold_ + 1) * (1 << 15) - (1 << 14)) {
  if (photo.depth() != CV_8U || channels_ < 3 || channels_ > 4) {
    CV_Error(cv::Error::StsUnsupportedFormat, "a chart photo needs three or four channels of 8 bits");
  }
}

// A grey level lies between the channels' lowest and highest, so most of a chart needs no arithmetic: there all
// channels are on the same side of the threshold.
std::uint64_t CutPhoto::DarkMask(const uchar* pixels, int left) const {
  if (left < kBlock) {
    std::array<uchar, 4 * kBlock> rest = {};
    std::memcpy(rest.data(), pixels, static_cast<std::size_t>(left) * static_cast<std::size_t>(channels_));
    return DarkMask(rest.data(), kBlock) & ((std::uint64_t{1} << left) - 1);
  }
  if (threshold_ < 0) return 0;
  const cv::v_uint8x16 threshold = cv::v_setall_u8(static_cast<uchar>(threshold_));
  std::uint64_t mask = 0;
  for (int k = 0; k < kBlock; k += kLanes, pixels += kLanes * channels_) {
    cv::v_uint8x16 lowest = cv::v_load(pixels);
    cv::v_uint8x16 highest = lowest;
    for (int i = 1; i < channels_; ++i) {
      const cv::v_uint8x16 more = cv::v_load(pixels + i * kLanes);
      lowest = cv::v_min(lowest, more);
      highest = cv::v_max(highest, more);
    }
    if (cv::v_check_all(highest <= threshold)) {
      mask |= std::uint64_t{0xFFFF} << k;
    } else if (!cv::v_check_all(lowest > threshold)) {
      mask |= MixedMask(pixels) << k;
    }
  }
  return mask;
}

// Sixteen pixels by their weighted sums.
std::uint64_t CutPhoto::MixedMask(const uchar* pixels) const {
  cv::v_uint8x16 first;
  cv::v_uint8x16 second;
  cv::v_uint8x16 third;
  cv::v_uint8x16 fourth;
  if (channels_ == 3) {
    cv::v_load_deinterleave(pixels, first, second, third);
  } else {
    cv::v_load_deinterleave(pixels, first, second, third, fourth);
  }
  const auto wide = [](const cv::v_uint8x16& bytes, cv::v_int16x8* halves) {
    halves[0] = cv::v_reinterpret_as_s16(cv::v_expand_low(bytes));
    halves[1] = cv::v_reinterpret_as_s16(cv::v_expand_high(bytes));
  };
  const auto pair = [](int a, int b) { return cv::v_reinterpret_as_s16(cv::v_setall_s32(a + b * (1 << 16))); };
  const cv::v_int16x8 front_weights = pair(kWeights[0], kWeights[1]);
  const cv::v_int16x8 back_weights = pair(kWeights[2], 0);
  const cv::v_int16x8 zero = cv::v_setzero_s16();
  const cv::v_int32x4 below = cv::v_setall_s32(dark_below_);
  cv::v_int16x8 a[2];
  cv::v_int16x8 b[2];
  cv::v_int16x8 c[2];
  wide(first, a);
  wide(second, b);
  wide(third, c);
  cv::v_int16x8 dark[2];
  for (int i = 0; i < 2; ++i) {
    cv::v_int16x8 front[2];
    cv::v_int16x8 back[2];
    cv::v_zip(a[i], b[i], front[0], front[1]);
    cv::v_zip(c[i], zero, back[0], back[1]);
    cv::v_int32x4 sums[2];
    for (int k = 0; k < 2; ++k) {
      sums[k] = cv::v_dotprod(front[k], front_weights) + cv::v_dotprod(back[k], back_weights);
    }
    dark[i] = cv::v_pack(sums[0] < below, sums[1] < below);
  }
  return static_cast<std::uint64_t>(cv::v_signmask(cv::v_pack(dark[0], dark[1])));
}

std::vector<cv::Point> FindMarks(QVTester& tester, const cv::Mat& photo, int threshold) {
  const CutPhoto cut(photo, threshold);
  const Attached attached(tester, cut);
  return tester.GetFinderPoints(photo);
}
