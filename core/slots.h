#ifndef QVTESTER_CORE_SLOTS_H_
#define QVTESTER_CORE_SLOTS_H_

#include <cstddef>
#include <cstdint>
#include <new>
#include <opencv2/core.hpp>

#include "qvtester/tester.h"

// What the setters put into each slot.

enum class SlotKind { kNone, kHdr, kImage, kVideo, kImageList };

struct SlotRange {
  int first, last;
  SlotKind kind;
  const char* holds;
};

inline constexpr SlotRange kSlotRanges[] = {
    {0, 13, SlotKind::kHdr, "float HDR buffer"},
    {14, 33, SlotKind::kImage, "image"},
    {34, 35, SlotKind::kVideo, "video file"},
    {36, 36, SlotKind::kImageList, "list of image files"},
};

constexpr SlotKind KindOfSlot(int slot) {
  for (const SlotRange& range : kSlotRanges) {
    if (range.first <= slot && slot <= range.last) return range.kind;
  }
  return SlotKind::kNone;
}

/// Pixels of a width x height picture; memory counts as exhausted where its bytes could not be addressed, so that no
/// product of sizes ever wraps.
inline std::size_t CheckedPixels(int width, int height, std::size_t bytes_per_pixel) {
  const auto pixels = static_cast<std::uint64_t>(width) * static_cast<std::uint64_t>(height);  // below 2^62
  if (pixels > PTRDIFF_MAX / bytes_per_pixel) throw std::bad_alloc();
  return pixels;
}

/// Converts a preview frame, NV21 of height + height / 2 rows and width columns, to four 8-bit channels (BGRA).
/// Throws cv::Exception for a size that NV21 can't have.
void ConvertPreviewFrame(void* data, int width, int height, cv::Mat& converted);

/// Shares the image of a slot. -98 when the slot is empty; throws cv::Exception when it holds no image.
int FetchImage(const QVTester& tester, int slot, cv::Mat& image);

/// Sets a system property, if the tester publishes any, and counts it where the store took it.
void Publish(QVTester& tester, const char* key, const char* value);

/// The block that a test writes into. Throws cv::Exception when Initialize has not been called.
QVResultData& Results(const QVTester& tester);

#endif  // QVTESTER_CORE_SLOTS_H_
