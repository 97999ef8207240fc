#include "desk/measure/codec_steps.h"

#include <algorithm>
#include <fstream>
#include <sstream>
#include <vector>

namespace qv {

namespace {

constexpr double kRootOfBlock = 8;  // a block's first coefficient is eight times its mean

// A table's first entry: 8 bits, or 16.
void TakeTables(const std::vector<unsigned char>& tables, CodecSteps& steps) {
  for (std::size_t at = 0; at + 1 < tables.size();) {
    const bool wide = tables[at] >> 4 != 0;
    const int number = tables[at] & 15;
    const std::size_t size = 1 + (wide ? 128 : 64);
    if (at + size > tables.size()) return;
    const double first = wide ? 256 * tables[at + 1] + tables[at + 2] : tables[at + 1];
    if (number == 0) steps.luma = first / kRootOfBlock;
    if (number == 1) steps.chroma = first / kRootOfBlock;
    at += size;
  }
}

CodecSteps StepsOfStream(std::istream& file) {
  constexpr int kStart = 0xD8;
  constexpr int kTables = 0xDB;
  constexpr int kScan = 0xDA;
  constexpr int kMostSegments = 1000;
  CodecSteps steps;
  if (file.get() != 0xFF || file.get() != kStart) return steps;
  for (int i = 0; i < kMostSegments; ++i) {
    int marker = file.get();
    while (marker == 0xFF) marker = file.get();
    const int high = file.get();
    const int low = file.get();
    const int size = 256 * high + low - 2;
    if (!file || size < 0 || marker == kScan) return steps;
    if (marker == kTables) {
      std::vector<unsigned char> tables(size);
      file.read(reinterpret_cast<char*>(tables.data()), size);  // NOLINT: bytes
      if (!file) return steps;
      TakeTables(tables, steps);
    } else {
      file.seekg(size, std::ios::cur);
    }
    if (file.get() != 0xFF) return steps;
  }
  return steps;
}

}  // namespace

CodecSteps StepsOf(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return StepsOfStream(file);
}

CodecSteps StepsOf(const Input& input) {
  if (input.is_path()) return StepsOf(input.name);
  std::istringstream file(input.content.value_or(""));
  return StepsOfStream(file);
}

CodecSteps StepsAtQuality(int quality) {
  constexpr int kFirstOfLuma = 16;
  constexpr int kFirstOfChroma = 17;
  const int scale = quality < 50 ? 5000 / std::max(quality, 1) : 200 - 2 * quality;
  const auto first = [scale](int entry) { return std::clamp((entry * scale + 50) / 100, 1, 255) / kRootOfBlock; };
  return {first(kFirstOfLuma), first(kFirstOfChroma)};
}

}  // namespace qv
