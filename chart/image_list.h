#ifndef QVTESTER_CHART_IMAGE_LIST_H_
#define QVTESTER_CHART_IMAGE_LIST_H_

#include "qvtester/tester.h"

/// Of so many first principal components wanted, those that hold more than rounding.
int UsableComponents(const QVTester::ImageList& list, int wanted);

/// Of the median over the list's pictures, and over photos that are held against them.
inline constexpr int kMedianAperture = 5;

#endif  // QVTESTER_CHART_IMAGE_LIST_H_
