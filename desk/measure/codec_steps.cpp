#include "desk/measure/codec_steps.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <vector>

namespace qv {

namespace {

constexpr int kBlock = 8;
constexpr double kRootOfBlock = 8;  // a block's first coefficient is eight times its mean

// Tables stand in a zigzag from the lowest frequencies to the highest (T.81, figure 5).
std::array<cv::Point, kBlock * kBlock> Zigzag() {
  std::array<cv::Point, kBlock * kBlock> order;
  std::size_t n = 0;
  for (int sum = 0; sum <= 2 * (kBlock - 1); ++sum) {
    for (int i = std::max(0, sum - kBlock + 1); i <= std::min(sum, kBlock - 1); ++i) {
      order.at(n++) = sum % 2 == 0 ? cv::Point(i, sum - i) : cv::Point(sum - i, i);
    }
  }
  return order;
}

// Entries of 8 bits, or of 16.
void TakeTables(const std::vector<unsigned char>& tables, CodecSteps& steps) {
  for (std::size_t at = 0; at + 1 < tables.size();) {
    const bool wide = tables[at] >> 4 != 0;
    const int number = tables[at] & 15;
    const std::size_t size = 1 + (wide ? 128 : 64);
    if (at + size > tables.size()) return;
    const auto entry = [&](std::size_t i) {
      return wide ? 256.0 * tables[at + 1 + 2 * i] + tables[at + 2 + 2 * i] : 1.0 * tables[at + 1 + i];
    };
    if (number == 0) {
      steps.luma = entry(0) / kRootOfBlock;
      const auto order = Zigzag();
      for (std::size_t i = 0; i < order.size(); ++i) {
        steps.luma_table(order.at(i).y, order.at(i).x) = static_cast<float>(entry(i));
      }
    }
    if (number == 1) steps.chroma = entry(0) / kRootOfBlock;
    at += size;
  }
}

}  // namespace

CodecSteps StepsOf(const std::string& content) {
  constexpr int kStart = 0xD8;
  constexpr int kTables = 0xDB;
  constexpr int kScan = 0xDA;
  CodecSteps steps;
  const auto byte = [&](std::size_t at) { return at < content.size() ? static_cast<unsigned char>(content[at]) : -1; };
  if (byte(0) != 0xFF || byte(1) != kStart) return steps;
  for (std::size_t at = 2; byte(at) == 0xFF;) {
    while (byte(at) == 0xFF) ++at;
    const int marker = byte(at);
    if (marker == kScan || at + 2 >= content.size()) return steps;
    const std::size_t size = 256 * byte(at + 1) + byte(at + 2);  // its own two bytes too
    const std::size_t end = at + 1 + size;
    if (size < 2 || end > content.size()) return steps;
    if (marker == kTables) TakeTables({content.begin() + at + 3, content.begin() + end}, steps);
    at = end;
  }
  return steps;
}

CodecSteps StepsAtQuality(int quality) {
  constexpr int kFirstOfLuma = 16;
  constexpr int kFirstOfChroma = 17;
  const int scale = quality < 50 ? 5000 / std::max(quality, 1) : 200 - 2 * quality;
  const auto first = [scale](int entry) { return std::clamp((entry * scale + 50) / 100, 1, 255) / kRootOfBlock; };
  return {first(kFirstOfLuma), first(kFirstOfChroma)};
}

cv::Mat Coded(const cv::Mat& part, cv::Point first, const CodecSteps& codec) {
  cv::Mat coded = part.clone();
  if (codec.luma == 0) return coded;
  const auto start = [](int at) { return ((-at) % kBlock + kBlock) % kBlock; };
  cv::Mat_<float> block(kBlock, kBlock);
  for (int top = start(first.y); top + kBlock <= part.rows; top += kBlock) {
    for (int left = start(first.x); left + kBlock <= part.cols; left += kBlock) {
      cv::Mat pixels = coded(cv::Rect(left, top, kBlock, kBlock));
      pixels.convertTo(block, CV_32F, 1, -128);
      cv::dct(block, block);
      for (int i = 0; i < kBlock; ++i) {
        for (int k = 0; k < kBlock; ++k) {
          const float step = codec.luma_table(i, k);
          if (step > 0) block(i, k) = step * std::round(block(i, k) / step);
        }
      }
      cv::idct(block, block);
      block.convertTo(pixels, CV_8U, 1, 128);
    }
  }
  return coded;
}

}  // namespace qv
