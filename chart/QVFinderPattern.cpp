#include "qvtester/finder_pattern.h"

#include <cmath>

QVFinderPattern::QVFinderPattern(float x, float y, float estimatedModuleSize, int count)
    : x(x), y(y), estimatedModuleSize(estimatedModuleSize), count(count) {}

int QVFinderPattern::getX() const { return static_cast<int>(x); }
int QVFinderPattern::getY() const { return static_cast<int>(y); }
float QVFinderPattern::getEstimatedModuleSize() const { return estimatedModuleSize; }
float QVFinderPattern::getAverage() const { return average; }
int QVFinderPattern::getCount() const { return count; }
void QVFinderPattern::setAverage(float average) { this->average = average; }

bool QVFinderPattern::aboutEquals(float moduleSize, float i, float j) const {
  const bool near = std::fabs(i - y) <= moduleSize && std::fabs(j - x) <= moduleSize;  // not so where one is NaN
  const float difference = std::fabs(moduleSize - estimatedModuleSize);
  return near && (difference <= 1.0f || difference <= estimatedModuleSize);
}

QVFinderPattern QVFinderPattern::combineEstimate(float i, float j, float newModuleSize) const {
  const auto n = static_cast<float>(count);
  const auto total = static_cast<float>(count + 1);
  return QVFinderPattern((n * x + j) / total, (n * y + i) / total, (n * estimatedModuleSize + newModuleSize) / total,
                         count + 1);
}

bool QVFinderPattern::compareAvg(const QVFinderPattern& a, const QVFinderPattern& b) {
  return std::fabs(a.estimatedModuleSize - a.average) < std::fabs(b.estimatedModuleSize - b.average);
}

bool QVFinderPattern::compareAvgAndCount(const QVFinderPattern& a, const QVFinderPattern& b) {
  return a.count != b.count ? a.count > b.count : compareAvg(a, b);
}
