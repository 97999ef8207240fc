// Finder marks of a chart: a row scan with run-length counts and three cross-checks, after the finder search of QR
// codes (ISO/IEC 18004). It departs from the usual form, and every limit in use refers to it as it is:
//   - the row step is 3 whatever the image size, then 2, and the run's first count after a find at a row's end;
//   - no rows are jumped once two marks are known;
//   - the diagonal check is always applied; vertical and horizontal checks differ in the size they allow;
//   - the best three are chosen by module size alone, and the points come back as (row, column).
// The row scan pixel by pixel, as it is described, is in unit_tests/plain/finder.h.

#include <algorithm>
#include <cfloat>
#include <climits>
#include <cmath>
#include <cstdlib>
#include <numeric>
#include <optional>

#include "chart/cut_photo.h"
#include "chart/dark_runs.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

constexpr int kFirstRow = 2;
constexpr int kRowStep = 3;
constexpr int kRowStepAfterFind = 2;
constexpr int kNoLimit = INT_MAX - 1;

int Total(const int* counts) { return std::accumulate(counts, counts + 5, 0); }

cv::Point RowColumn(const QVFinderPattern& mark) { return {mark.getY(), mark.getX()}; }

float SumOfModuleSizes(const std::vector<QVFinderPattern>& candidates) {
  float sum = 0;
  for (const QVFinderPattern& candidate : candidates) sum += candidate.estimatedModuleSize;
  return sum;
}

void SetAverage(std::vector<QVFinderPattern>& candidates, float average) {
  for (QVFinderPattern& candidate : candidates) candidate.setAverage(average);
}

// A walk over the image, one pixel at a time; `left` pixels lie ahead of it.
struct Walk {
  const uchar* start;
  std::ptrdiff_t at, step;
  int left;
  const CutPhoto* photo;  // null: a binary picture

  bool IsDark() const { return photo == nullptr ? start[at] == 0 : photo->IsDark(start + at); }

  // Counts pixels of one kind while they last, the image lasts, and the count is at most `most`.
  void Count(bool dark, int most, int& count) {
    for (; left > 0 && IsDark() == dark && count <= most; at += step, --left) ++count;
  }
};

// Run lengths along a line through the core at (i, j): first against (di, dj), then along it. The first half may count
// maxCount pixels and end at the border, the second stays below maxCount and ends before it, but for its last run.
// Answers where counting ended, or nothing when a run is too long or leaves the image.
std::optional<cv::Point> CountRuns(const cv::Mat& image, const CutPhoto* photo, int i, int j, int di, int dj,
                                   int maxCount, int* counts) {
  if (i < 0 || i >= image.rows || j < 0 || j >= image.cols) return std::nullopt;
  const auto* const core = image.ptr(i, j);
  const std::ptrdiff_t step =
      di * static_cast<std::ptrdiff_t>(image.step) + dj * static_cast<std::ptrdiff_t>(image.elemSize());
  Walk back{core, 0, -step, std::min(di == 0 ? INT_MAX : i + 1, dj == 0 ? INT_MAX : j + 1), photo};
  back.Count(true, kNoLimit, counts[2]);
  if (back.left == 0) return std::nullopt;
  back.Count(false, maxCount, counts[1]);
  if (back.left == 0 || counts[1] > maxCount) return std::nullopt;
  back.Count(true, maxCount, counts[0]);
  if (counts[0] > maxCount) return std::nullopt;

  const int ahead_left = std::min(di == 0 ? INT_MAX : image.rows - 1 - i, dj == 0 ? INT_MAX : image.cols - 1 - j);
  Walk ahead{core, step, step, ahead_left, photo};
  ahead.Count(true, kNoLimit, counts[2]);
  if (ahead.left == 0) return std::nullopt;
  ahead.Count(false, maxCount - 1, counts[3]);
  if (ahead.left == 0 || counts[3] >= maxCount) return std::nullopt;
  ahead.Count(true, maxCount - 1, counts[4]);
  if (counts[4] >= maxCount) return std::nullopt;
  const int walked = 1 + ahead_left - ahead.left;
  return cv::Point(i + di * walked, j + dj * walked);
}

}  // namespace

std::vector<cv::Point> QVTester::GetFinderPoints(cv::Mat image) {
  const CutPhoto* const photo = kept_->cut_photo;
  if (photo == nullptr && image.type() != CV_8UC1) {
    CV_Error(cv::Error::StsUnsupportedFormat, "finder marks need one channel of 8 bits");
  }
  hasSkipped = false;
  possibleCenters.clear();
  if (image.rows < 3) return selectBestPatterns();

  DarkRuns runs(image.cols);
  int iSkip = kRowStep;
  bool done = false;
  for (int i = kFirstRow; i < image.rows && !done; i += iSkip) {
    const uchar* const row = image.ptr(i);
    const uchar* const next = image.ptr(std::min(i + iSkip, image.rows - 1));
    photo == nullptr ? runs.Read(row, next) : runs.Read(*photo, row, next);
    const int* bounds = runs.Begin();
    while ((bounds = runs.NextMark(bounds)) != nullptr) {
      int counts[5];
      for (int k = 0; k < 5; ++k) counts[k] = bounds[k + 1] - bounds[k];
      const int j = bounds[5];
      if (!foundPatternCross(counts) || !handlePossibleCenter(image, counts, i, j)) {
        bounds += 2;  // the last two dark runs of a failed match may be the first two of the next
        continue;
      }
      const bool at_row_end = j == image.cols;
      iSkip = at_row_end ? counts[0] : kRowStepAfterFind;
      if (hasSkipped) {
        done = haveMultiplyConfirmedCenters();
      } else if (!at_row_end) {
        findRowSkip();  // called for hasSkipped; the skip itself is always 0
      }
      bounds += 6;  // a find starts the counts afresh
    }
  }
  return selectBestPatterns();
}

bool QVTester::foundPatternCross(int* stateCount) {
  if (std::any_of(stateCount, stateCount + 5, [](int count) { return count == 0; })) return false;
  const int total = Total(stateCount);
  if (total < 7) return false;
  const float moduleSize = static_cast<float>(total) / 7.0f;
  const float maxVariance = moduleSize * 0.5f;
  const auto near = [&](int count, float modules) {
    return std::fabs(modules * moduleSize - static_cast<float>(count)) < modules * maxVariance;
  };
  return near(stateCount[0], 1) && near(stateCount[1], 1) && near(stateCount[2], 3) && near(stateCount[3], 1) &&
         near(stateCount[4], 1);
}

bool QVTester::handlePossibleCenter(cv::Mat image, int* stateCount, int i, int j) {
  const int total = Total(stateCount);
  float centerJ = centerFromEnd(stateCount, j);
  const float centerI = crossCheckVertical(image, i, static_cast<int>(centerJ), stateCount[2], total);
  if (centerI == FLT_MAX) return false;
  centerJ = crossCheckHorizontal(image, static_cast<int>(centerJ), static_cast<int>(centerI), stateCount[2], total);
  if (centerJ == FLT_MAX) return false;
  if (!crossCheckDiagonal(image, static_cast<int>(centerI), static_cast<int>(centerJ), stateCount[2], total)) {
    return false;
  }

  const float moduleSize = static_cast<float>(total) / 7.0f;
  for (QVFinderPattern& candidate : possibleCenters) {
    if (candidate.aboutEquals(moduleSize, centerI, centerJ)) {
      candidate = candidate.combineEstimate(centerI, centerJ, moduleSize);
      return true;
    }
  }
  possibleCenters.emplace_back(centerJ, centerI, moduleSize, 1);
  return true;
}

float QVTester::centerFromEnd(int* stateCount, int end) {
  return static_cast<float>(end - stateCount[4] - stateCount[3]) - static_cast<float>(stateCount[2]) * 0.5f;
}

float QVTester::crossCheckVertical(cv::Mat image, int startI, int centerJ, int maxCount, int rowStateCountTotal) {
  getCrossCheckStateCount();
  const auto end = CountRuns(image, kept_->cut_photo, startI, centerJ, 1, 0, maxCount, crossCheckStateCount);
  if (!end) return FLT_MAX;
  // 40 % off the row's total is too much.
  if (5 * std::abs(Total(crossCheckStateCount) - rowStateCountTotal) >= 2 * rowStateCountTotal) return FLT_MAX;
  return foundPatternCross(crossCheckStateCount) ? centerFromEnd(crossCheckStateCount, end->x) : FLT_MAX;
}

float QVTester::crossCheckHorizontal(cv::Mat image, int startJ, int centerI, int maxCount, int rowStateCountTotal) {
  getCrossCheckStateCount();
  const auto end = CountRuns(image, kept_->cut_photo, centerI, startJ, 0, 1, maxCount, crossCheckStateCount);
  if (!end) return FLT_MAX;
  // 20 % off the row's total is too much: half of what the vertical check allows.
  if (5 * std::abs(Total(crossCheckStateCount) - rowStateCountTotal) >= rowStateCountTotal) return FLT_MAX;
  return foundPatternCross(crossCheckStateCount) ? centerFromEnd(crossCheckStateCount, end->y) : FLT_MAX;
}

bool QVTester::crossCheckDiagonal(cv::Mat image, int startI, int centerJ, int maxCount, int rowStateCountTotal) {
  getCrossCheckStateCount();
  return CountRuns(image, kept_->cut_photo, startI, centerJ, 1, 1, maxCount, crossCheckStateCount) &&
         std::abs(Total(crossCheckStateCount) - rowStateCountTotal) < 2 * rowStateCountTotal &&
         foundPatternCross(crossCheckStateCount);
}

int QVTester::findRowSkip() {
  bool seen = false;
  for (const QVFinderPattern& candidate : possibleCenters) {
    if (candidate.count < 2) continue;
    if (seen) {
      hasSkipped = true;
      // Both operands are the second confirmed candidate, so the scan never jumps rows.
      const QVFinderPattern& first = candidate;
      const QVFinderPattern& second = candidate;
      return (std::abs(first.getX() - second.getX()) - std::abs(first.getY() - second.getY())) / 2;
    }
    seen = true;
  }
  return 0;
}

bool QVTester::haveMultiplyConfirmedCenters() {
  int confirmedCount = 0;
  float totalModuleSize = 0;
  for (const QVFinderPattern& candidate : possibleCenters) {
    if (candidate.count < 2) continue;
    ++confirmedCount;
    totalModuleSize += candidate.estimatedModuleSize;
  }
  if (confirmedCount < 3) return false;
  // The sum over the confirmed ones is set against the number of all: unconfirmed candidates keep the scan going.
  const float average = totalModuleSize / static_cast<float>(possibleCenters.size());
  float totalDeviation = 0;
  for (const QVFinderPattern& candidate : possibleCenters) {
    totalDeviation += std::fabs(candidate.estimatedModuleSize - average);
  }
  return totalDeviation <= 0.05f * totalModuleSize;
}

std::vector<cv::Point> QVTester::selectBestPatterns() {
  startSize = static_cast<int>(possibleCenters.size());
  if (startSize < 3) QVDEBUGP("[OKAPI] startSize : %d", startSize);

  if (possibleCenters.size() > 3) {
    const auto n = static_cast<float>(possibleCenters.size());
    float sumOfSquares = 0;
    for (const QVFinderPattern& candidate : possibleCenters) {
      sumOfSquares += candidate.estimatedModuleSize * candidate.estimatedModuleSize;
    }
    const float average = SumOfModuleSizes(possibleCenters) / n;
    const float stdDev = std::sqrt(sumOfSquares / n - average * average);
    const float limit = std::max(0.2f * average, stdDev);  // rounding may make stdDev NaN; then the first holds
    SetAverage(possibleCenters, average);
    std::sort(possibleCenters.begin(), possibleCenters.end(), QVFinderPattern::compareAvg);
    for (std::size_t i = 0; i < possibleCenters.size() && possibleCenters.size() > 3;) {
      if (std::fabs(possibleCenters[i].estimatedModuleSize - average) > limit) {
        possibleCenters.erase(possibleCenters.begin() + static_cast<std::ptrdiff_t>(i));
      } else {
        ++i;
      }
    }
  }

  if (possibleCenters.size() > 3) {
    SetAverage(possibleCenters, SumOfModuleSizes(possibleCenters) / static_cast<float>(possibleCenters.size()));
    std::sort(possibleCenters.begin(), possibleCenters.end(), QVFinderPattern::compareAvgAndCount);
    // The index moves on after each removal, so every other one of the tail stays. Only the first three are used.
    for (std::size_t i = 3; i < possibleCenters.size(); ++i) {
      possibleCenters.erase(possibleCenters.begin() + static_cast<std::ptrdiff_t>(i));
    }
  }

  std::vector<cv::Point> points;
  const std::size_t emitted = std::min<std::size_t>(possibleCenters.size(), 3);
  for (std::size_t i = 0; i < emitted; ++i) points.push_back(RowColumn(possibleCenters[i]));
  return points;
}

void QVTester::getCrossCheckStateCount() { std::fill_n(crossCheckStateCount, 5, 0); }
