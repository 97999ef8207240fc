#ifndef QVTESTER_UNIT_TESTS_PLAIN_ERROR_AREAS_H_
#define QVTESTER_UNIT_TESTS_PLAIN_ERROR_AREAS_H_

#include <algorithm>
#include <opencv2/core.hpp>
#include <vector>

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

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_ERROR_AREAS_H_
