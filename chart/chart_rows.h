#ifndef QVTESTER_CHART_CHART_ROWS_H_
#define QVTESTER_CHART_CHART_ROWS_H_

#include <cstdint>
#include <vector>

#include "qvtester/tester.h"

/// The binary picture of a photo, in the tester's work images, made row by row where the search for marks reads it:
/// that is about a third of the rows, and those that run through marks.
class ChartRows {
 public:
  /// Throws cv::Exception (StsUnsupportedFormat) for a photo that is not of 8 bits and three or four channels.
  ChartRows(QVTester& tester, const cv::Mat& photo, int threshold);

  // Rows are made some together, since each call costs as much as a row or two.

  /// Makes the row if it is not there yet, and with it others about it: the scan, once it has found something, has made
  /// every other row.
  void Need(int row) {
    if (!made_[static_cast<std::size_t>(row)]) Make(row - row % (2 * kTogether) + row % 2, 2, kTogether);
  }
  /// Makes the row if it is not there yet, and with it the next few, so many rows apart.
  void NeedSome(int row, int step) {
    if (!made_[static_cast<std::size_t>(row)]) Make(row, step, kTogether);
  }

 private:
  static constexpr int kTogether = 8;

  void Make(int row, int step, int count);

  const cv::Mat& photo_;
  cv::Mat& gray_;
  cv::Mat& binary_;
  int threshold_;
  std::vector<std::uint8_t> made_;
};

/// What QVTester::GetFinderPoints finds in the photo, binarised at the threshold (Binarise). The work images hold only
/// the rows that were read.
std::vector<cv::Point> FindMarks(QVTester& tester, const cv::Mat& photo, int threshold);

#endif  // QVTESTER_CHART_CHART_ROWS_H_
