#ifndef QVTESTER_CHART_DARK_RUNS_H_
#define QVTESTER_CHART_DARK_RUNS_H_

#include <opencv2/core.hpp>
#include <vector>

#include "chart/cut_photo.h"

/// The dark runs of one row of a picture (0 is dark), as their bounds: a run's first column, the column after its last,
/// and so on.
class DarkRuns {
 public:
  explicit DarkRuns(int cols) : cols_(cols), bounds_(static_cast<std::size_t>(cols) + 1 + kSpare) {}

  /// Reads a row of `cols` pixels, and fetches the one that is probably the next to be read.
  void Read(const uchar* row, const uchar* next);
  /// The same of a colour photo.
  void Read(const CutPhoto& photo, const uchar* row, const uchar* next);
  const int* Begin() const { return bounds_.data(); }
  /// Three runs that may be those of a finder mark, at or after these bounds; six values, or null when there are none.
  /// Finds all that QVTester::foundPatternCross accepts, and a few that it does not.
  const int* NextMark(const int* bounds) const;

 private:
  static constexpr int kSpare = 6;  // NextMark looks at four marks together

  template <typename DarkMask>
  void Take(DarkMask dark_mask);

  int cols_;
  std::vector<int> bounds_;
  const int* end_ = nullptr;
};

#endif  // QVTESTER_CHART_DARK_RUNS_H_
