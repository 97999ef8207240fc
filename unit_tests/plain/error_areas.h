#ifndef QVTESTER_UNIT_TESTS_PLAIN_ERROR_AREAS_H_
#define QVTESTER_UNIT_TESTS_PLAIN_ERROR_AREAS_H_

#include <algorithm>
#include <cstdlib>
#include <opencv2/core.hpp>
#include <vector>

#include "qvtester/tester.h"

// Merging of error areas as its method is written: what tests/led_touch/QVTester_ErrorAreas.cpp is compared with.

namespace plain {

struct ErrorArea {
  cv::Point top_left, bottom_right;
  int count, kept;  // kept: its index in the pass before

  bool operator==(const ErrorArea& o) const {
    return top_left == o.top_left && bottom_right == o.bottom_right && count == o.count && kept == o.kept;
  }
};

// Every area against every output area, pass after pass.
inline std::vector<ErrorArea> ErrorAreaClustering(int distance, int width, int height, std::vector<ErrorArea> in) {
  const int margin = distance > 1 ? distance / 2 : distance;
  for (bool stable = false; !stable;) {
    stable = true;
    std::vector<ErrorArea> out;
    for (int k = 0; k < static_cast<int>(in.size()); ++k) {
      const ErrorArea& b = in[k];
      const auto home = std::find_if(out.begin(), out.end(), [&](const ErrorArea& a) {
        return std::max(std::max(a.top_left.x, b.top_left.x) - margin, 0) <
                   std::min(width - 1, std::min(a.bottom_right.x, b.bottom_right.x) + margin) &&
               std::max(std::max(a.top_left.y, b.top_left.y) - margin, 0) <
                   std::min(height - 1, std::min(a.bottom_right.y, b.bottom_right.y) + margin);
      });
      if (home == out.end()) {
        out.push_back({b.top_left, b.bottom_right, b.count, k});
        continue;
      }
      home->top_left = {std::min(home->top_left.x, b.top_left.x), std::min(home->top_left.y, b.top_left.y)};
      home->bottom_right = {std::max(home->bottom_right.x, b.bottom_right.x),
                            std::max(home->bottom_right.y, b.bottom_right.y)};
      home->count += b.count;
      stable = false;
    }
    in = out;
  }
  return in;
}

// The tester's answer by its own interface: arrays from malloc, which it replaces.
inline std::vector<ErrorArea> ClusterByTester(int distance, int width, int height, std::vector<ErrorArea> in) {
  std::vector<int> areas(in.size());
  auto* counts = static_cast<int*>(std::calloc(in.size(), sizeof(int)));
  auto* first = static_cast<cv::Point*>(std::calloc(in.size(), sizeof(cv::Point)));
  auto* last = static_cast<cv::Point*>(std::calloc(in.size(), sizeof(cv::Point)));
  for (std::size_t i = 0; i < in.size(); ++i) {
    counts[i] = in[i].count;
    first[i] = in[i].top_left;
    last[i] = in[i].bottom_right;
  }
  in.resize(QVTester().ErrorAreaClustering(distance, width, height, &areas, &counts, &first, &last));
  for (std::size_t i = 0; i < in.size(); ++i) in[i] = {first[i], last[i], counts[i], areas.at(i)};
  std::free(counts);
  std::free(first);
  std::free(last);
  return in;
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_ERROR_AREAS_H_
