// Merging of rectangles of defective pixels that lie close together, until no two are close any more. The plain form,
// which holds every area against every other in each pass, is in unit_tests/plain/error_areas.h.

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <new>

#include "qvtester/tester.h"
#include "tests/led_touch/malloc_array.h"

namespace {

struct Area {
  cv::Point top_left, bottom_right;
  int count;
  bool grown;  // in the pass that made it
};

// Do both, grown by the margin, overlap inside the image?
struct Closeness {
  int margin, width, height;

  bool operator()(const Area& a, const Area& b) const {
    const int left = std::max(std::max(a.top_left.x, b.top_left.x) - margin, 0);
    const int right = std::min(width - 1, std::min(a.bottom_right.x, b.bottom_right.x) + margin);
    const int top = std::max(std::max(a.top_left.y, b.top_left.y) - margin, 0);
    const int bottom = std::min(height - 1, std::min(a.bottom_right.y, b.bottom_right.y) + margin);
    return left < right && top < bottom;
  }
};

void Absorb(Area& a, const Area& b) {
  a.top_left = {std::min(a.top_left.x, b.top_left.x), std::min(a.top_left.y, b.top_left.y)};
  a.bottom_right = {std::max(a.bottom_right.x, b.bottom_right.x), std::max(a.bottom_right.y, b.bottom_right.y)};
  a.count += b.count;
  a.grown = true;
}

// One pass: each area in order joins the first output area that it is close to, or becomes a new one, whose index in
// `in` is kept. Two areas that the pass before left as they were need no second look, since it found them apart: an
// unchanged area is held against changed ones only, so that all passes together cost no more than a few looks a pair.
std::vector<Area> MergeOnce(const std::vector<Area>& in, const Closeness& close, std::vector<int>& kept) {
  std::vector<Area> out;
  std::vector<std::size_t> changed;  // of `out`: in the pass before, or in this one so far
  kept.clear();
  for (std::size_t k = 0; k < in.size(); ++k) {
    std::size_t home = out.size();
    if (in[k].grown) {
      const auto all = [&](const Area& area) { return close(area, in[k]); };
      home = static_cast<std::size_t>(std::find_if(out.begin(), out.end(), all) - out.begin());
    } else {
      const auto one = [&](std::size_t j) { return close(out[j], in[k]); };
      const auto found = std::find_if(changed.begin(), changed.end(), one);
      if (found != changed.end()) home = *found;
    }
    if (home == out.size()) {
      if (in[k].grown) changed.push_back(home);
      out.push_back(in[k]);
      out.back().grown = false;
      kept.push_back(static_cast<int>(k));
    } else {
      Absorb(out[home], in[k]);
      const auto place = std::lower_bound(changed.begin(), changed.end(), home);
      if (place == changed.end() || *place != home) changed.insert(place, home);
    }
  }
  return out;
}

}  // namespace

int QVTester::ErrorAreaClustering(int distance, int width, int height, std::vector<int>* areas, int** counts,
                                  cv::Point** topLeft, cv::Point** bottomRight) {
  if (areas->size() < 2) return static_cast<int>(areas->size());
  const Closeness close = {distance > 1 ? distance / 2 : distance, width, height};
  std::vector<Area> current;
  for (std::size_t i = 0; i < areas->size(); ++i) {
    current.push_back(
        {(*topLeft)[i], (*bottomRight)[i], counts != nullptr && *counts != nullptr ? (*counts)[i] : 0, true});
  }
  std::vector<int> kept;
  for (std::size_t before = 0; before != current.size();) {
    before = current.size();
    current = MergeOnce(current, close, kept);
  }

  auto merged_counts = MallocArray<int>(current.size());
  auto merged_top_left = MallocArray<cv::Point>(current.size());
  auto merged_bottom_right = MallocArray<cv::Point>(current.size());
  for (std::size_t i = 0; i < current.size(); ++i) {
    merged_counts[i] = current[i].count;
    new (&merged_top_left[i]) cv::Point(current[i].top_left);
    new (&merged_bottom_right[i]) cv::Point(current[i].bottom_right);
  }
  *areas = kept;
  std::free(*topLeft);
  std::free(*bottomRight);
  *topLeft = merged_top_left.release();
  *bottomRight = merged_bottom_right.release();
  if (counts != nullptr) {
    std::free(*counts);
    *counts = merged_counts.release();
  }
  return static_cast<int>(current.size());
}
