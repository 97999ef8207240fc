#ifndef QVTESTER_UNIT_TESTS_PLAIN_FINDER_H_
#define QVTESTER_UNIT_TESTS_PLAIN_FINDER_H_

#include <algorithm>
#include <vector>

#include "qvtester/tester.h"

// The finder's row scan pixel by pixel. What it does with a run of five, and with the finds, are the tester's own
// steps.
namespace plain {

/// Stands for QVTester::GetFinderPoints: the same points, and the same search state left in the tester.
inline std::vector<cv::Point> GetFinderPoints(QVTester& tester, const cv::Mat& image) {
  tester.hasSkipped = false;
  tester.possibleCenters.clear();
  if (image.rows < 3) return tester.selectBestPatterns();

  int iSkip = 3;
  bool done = false;
  for (int i = 2; i < image.rows && !done; i += iSkip) {
    const auto* row = image.ptr<uchar>(i);
    int counts[5] = {};
    int s = 0;
    for (int j = 0; j < image.cols; ++j) {
      if (row[j] == 0) {
        if (s % 2 == 1) ++s;
        ++counts[s];
      } else if (s != 4) {
        if (s % 2 == 0) ++s;
        ++counts[s];
      } else if (tester.foundPatternCross(counts) && tester.handlePossibleCenter(image, counts, i, j)) {
        iSkip = 2;
        if (tester.hasSkipped) {
          done = tester.haveMultiplyConfirmedCenters();
        } else {
          tester.findRowSkip();  // called for hasSkipped; the skip itself is always 0
        }
        std::fill_n(counts, 5, 0);
        s = 0;
      } else {  // the last three runs of a failed match may be the first three of the next
        counts[0] = counts[2];
        counts[1] = counts[3];
        counts[2] = counts[4];
        counts[3] = 1;
        counts[4] = 0;
        s = 3;
      }
    }
    if (tester.foundPatternCross(counts) && tester.handlePossibleCenter(image, counts, i, image.cols)) {
      iSkip = counts[0];
      if (tester.hasSkipped) done = tester.haveMultiplyConfirmedCenters();
    }
  }
  return tester.selectBestPatterns();
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_FINDER_H_
