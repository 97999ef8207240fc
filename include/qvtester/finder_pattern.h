#ifndef QVTESTER_FINDER_PATTERN_H_
#define QVTESTER_FINDER_PATTERN_H_

#include "qvtester/indices.h"

/// One candidate of a finder mark: centre and module size in pixels, and how often it was seen.
class QV_API QVFinderPattern {
 public:
  QVFinderPattern(float x, float y, float estimatedModuleSize, int count);

  /// Column and row of the centre, truncated toward zero.
  int getX() const;
  int getY() const;
  float getEstimatedModuleSize() const;
  float getAverage() const;
  int getCount() const;
  void setAverage(float average);

  /// True when a sighting of size moduleSize at row i, column j is this mark: within one module in both directions, and
  /// with a module size that differs by at most one pixel or by at most this candidate's own.
  bool aboutEquals(float moduleSize, float i, float j) const;

  /// This candidate merged with one more sighting at row i, column j, weighted by count. In single precision.
  QVFinderPattern combineEstimate(float i, float j, float newModuleSize) const;

  /// Order: nearest to the average module size first.
  static bool compareAvg(const QVFinderPattern& a, const QVFinderPattern& b);
  /// Order: higher count first, then nearest to the average module size.
  static bool compareAvgAndCount(const QVFinderPattern& a, const QVFinderPattern& b);

  float x;                    // column
  float y;                    // row
  float estimatedModuleSize;  // a seventh of the mark's width
  float average = 0;          // over all candidates; written when the best three are chosen
  int count;
};

#endif  // QVTESTER_FINDER_PATTERN_H_
