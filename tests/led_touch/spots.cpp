#include "tests/led_touch/spots.h"

#include <algorithm>
#include <cstdlib>
#include <new>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "qvtester/log.h"
#include "tests/led_touch/malloc_array.h"

namespace {

constexpr int kMostSpots = 20'000;
constexpr int kFarthest = 1'000'000;  // beyond any picture: sums of coordinates never wrap

struct Spot {
  cv::Point first, last;
  int pixels;
};

std::vector<Spot> FindSpots(const cv::Mat& flagged) {
  cv::Mat labels;
  cv::Mat stats;
  cv::Mat centres;
  const int count = cv::connectedComponentsWithStats(flagged, labels, stats, centres, 8);
  std::vector<Spot> spots;
  for (int i = 1; i < count; ++i) {  // 0 is the ground
    const int* const spot = stats.ptr<int>(i);
    const cv::Point first(spot[cv::CC_STAT_LEFT], spot[cv::CC_STAT_TOP]);
    const cv::Point size(spot[cv::CC_STAT_WIDTH], spot[cv::CC_STAT_HEIGHT]);
    spots.push_back({first, first + size - cv::Point(1, 1), spot[cv::CC_STAT_AREA]});
  }
  return spots;
}

void Merge(QVTester& tester, cv::Size size, std::vector<Spot>& spots) {
  const int count = static_cast<int>(spots.size());
  auto counts = MallocArray<int>(count);
  auto first = MallocArray<cv::Point>(count);
  auto last = MallocArray<cv::Point>(count);
  for (int i = 0; i < count; ++i) {
    counts[i] = spots[i].pixels;
    first[i] = spots[i].first;
    last[i] = spots[i].last;
  }
  std::vector<int> indices(spots.size());
  int* count_array = counts.release();
  cv::Point* first_array = first.release();
  cv::Point* last_array = last.release();
  const int distance = std::clamp(tester.prop_param_59_, -kFarthest, kFarthest);
  const int merged =
      tester.ErrorAreaClustering(distance, size.width, size.height, &indices, &count_array, &first_array, &last_array);
  counts.reset(count_array);
  first.reset(first_array);
  last.reset(last_array);
  spots.clear();
  for (int i = 0; i < merged; ++i) spots.push_back({first[i], last[i], counts[i]});
}

}  // namespace

ErrorAreas FindErrorAreas(QVTester& tester, const char* test, const cv::Mat& flagged) {
  std::vector<Spot> spots = FindSpots(flagged);
  if (spots.size() > kMostSpots) {
    QVDEBUGP("[%s] %zu separate spots are noise: not merged", test, spots.size());
  } else if (spots.size() > 1) {
    Merge(tester, flagged.size(), spots);
  }
  ErrorAreas found;
  found.areas = std::make_unique<QVRECT[]>(spots.size());
  found.pixels = std::make_unique<int[]>(spots.size());
  for (const Spot& spot : spots) {
    if (spot.pixels < tester.prop_param_60_) continue;
    found.areas[found.count] = {spot.first.x, spot.first.y, spot.last.x, spot.last.y};
    found.pixels[found.count++] = spot.pixels;
  }
  return found;
}
