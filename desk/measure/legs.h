#ifndef QVTESTER_DESK_MEASURE_LEGS_H_
#define QVTESTER_DESK_MEASURE_LEGS_H_

#include <opencv2/core.hpp>

namespace qv {

/// The legs between a chart's marks: from the corner mark to the second, and to the third.
struct Legs {
  cv::Point2d right, down;

  double ratio() const;      // of their lengths
  double angle_deg() const;  // between them
  /// Whether they look like a chart's: of one length, at a right angle.
  bool plausible() const;
};

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LEGS_H_
