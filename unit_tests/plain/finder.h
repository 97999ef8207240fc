#ifndef QVTESTER_UNIT_TESTS_PLAIN_FINDER_H_
#define QVTESTER_UNIT_TESTS_PLAIN_FINDER_H_

#include <algorithm>
#include <cfloat>
#include <climits>
#include <cstdlib>
#include <numeric>
#include <optional>
#include <vector>

#include "qvtester/tester.h"

// The finder search pixel by pixel: row scan and cross checks. The steps that it shares with the fast form are the
// tester's own.
namespace plain {

// A walk over the image, one pixel at a time.
struct Walk {
  const cv::Mat& image;
  int i, j, di, dj;

  bool Inside() const { return i >= 0 && i < image.rows && j >= 0 && j < image.cols; }

  // Counts pixels of one kind while they last, the image lasts, and the count is at most `most`.
  void Count(bool dark, int most, int& count) {
    for (; Inside() && (image.ptr<uchar>(i)[j] == 0) == dark && count <= most; i += di, j += dj) ++count;
  }
};

// Run lengths along a line through the core at (i, j): first against (di, dj), then along it. The first half may count
// maxCount pixels and end at the border, the second stays below maxCount and ends before it, but for its last run.
// Answers where counting ended, or nothing when a run is too long or leaves the image.
inline std::optional<cv::Point> CountRuns(const cv::Mat& image, int i, int j, int di, int dj, int maxCount,
                                          int* counts) {
  Walk back{image, i, j, -di, -dj};
  back.Count(true, INT_MAX - 1, counts[2]);
  if (!back.Inside()) return std::nullopt;
  back.Count(false, maxCount, counts[1]);
  if (!back.Inside() || counts[1] > maxCount) return std::nullopt;
  back.Count(true, maxCount, counts[0]);
  if (counts[0] > maxCount) return std::nullopt;

  Walk ahead{image, i + di, j + dj, di, dj};
  ahead.Count(true, INT_MAX - 1, counts[2]);
  if (!ahead.Inside()) return std::nullopt;
  ahead.Count(false, maxCount - 1, counts[3]);
  if (!ahead.Inside() || counts[3] >= maxCount) return std::nullopt;
  ahead.Count(true, maxCount - 1, counts[4]);
  if (counts[4] >= maxCount) return std::nullopt;
  return cv::Point(ahead.i, ahead.j);
}

inline int CrossCheckTotal(const QVTester& tester) {
  return std::accumulate(tester.crossCheckStateCount, tester.crossCheckStateCount + 5, 0);
}

inline float CrossCheckVertical(QVTester& tester, const cv::Mat& image, int startI, int centerJ, int maxCount,
                                int rowTotal) {
  tester.getCrossCheckStateCount();
  const auto end = CountRuns(image, startI, centerJ, 1, 0, maxCount, tester.crossCheckStateCount);
  if (!end || 5 * std::abs(CrossCheckTotal(tester) - rowTotal) >= 2 * rowTotal) return FLT_MAX;
  return tester.foundPatternCross(tester.crossCheckStateCount)
             ? tester.centerFromEnd(tester.crossCheckStateCount, end->x)
             : FLT_MAX;
}

inline float CrossCheckHorizontal(QVTester& tester, const cv::Mat& image, int startJ, int centerI, int maxCount,
                                  int rowTotal) {
  tester.getCrossCheckStateCount();
  const auto end = CountRuns(image, centerI, startJ, 0, 1, maxCount, tester.crossCheckStateCount);
  if (!end || 5 * std::abs(CrossCheckTotal(tester) - rowTotal) >= rowTotal) return FLT_MAX;
  return tester.foundPatternCross(tester.crossCheckStateCount)
             ? tester.centerFromEnd(tester.crossCheckStateCount, end->y)
             : FLT_MAX;
}

inline bool CrossCheckDiagonal(QVTester& tester, const cv::Mat& image, int startI, int centerJ, int maxCount,
                               int rowTotal) {
  tester.getCrossCheckStateCount();
  return CountRuns(image, startI, centerJ, 1, 1, maxCount, tester.crossCheckStateCount) &&
         std::abs(CrossCheckTotal(tester) - rowTotal) < 2 * rowTotal &&
         tester.foundPatternCross(tester.crossCheckStateCount);
}

inline bool HandlePossibleCenter(QVTester& tester, const cv::Mat& image, int* stateCount, int i, int j) {
  const int total = std::accumulate(stateCount, stateCount + 5, 0);
  float centerJ = tester.centerFromEnd(stateCount, j);
  const float centerI = CrossCheckVertical(tester, image, i, static_cast<int>(centerJ), stateCount[2], total);
  if (centerI == FLT_MAX) return false;
  centerJ =
      CrossCheckHorizontal(tester, image, static_cast<int>(centerJ), static_cast<int>(centerI), stateCount[2], total);
  if (centerJ == FLT_MAX) return false;
  if (!CrossCheckDiagonal(tester, image, static_cast<int>(centerI), static_cast<int>(centerJ), stateCount[2], total)) {
    return false;
  }

  const float moduleSize = static_cast<float>(total) / 7.0f;
  for (QVFinderPattern& candidate : tester.possibleCenters) {
    if (candidate.aboutEquals(moduleSize, centerI, centerJ)) {
      candidate = candidate.combineEstimate(centerI, centerJ, moduleSize);
      return true;
    }
  }
  tester.possibleCenters.emplace_back(centerJ, centerI, moduleSize, 1);
  return true;
}

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
      } else if (tester.foundPatternCross(counts) && HandlePossibleCenter(tester, image, counts, i, j)) {
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
    if (tester.foundPatternCross(counts) && HandlePossibleCenter(tester, image, counts, i, image.cols)) {
      iSkip = counts[0];
      if (tester.hasSkipped) done = tester.haveMultiplyConfirmedCenters();
    }
  }
  return tester.selectBestPatterns();
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_FINDER_H_
