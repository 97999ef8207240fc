#ifndef QVTESTER_DESK_MEASURE_DOUBTS_H_
#define QVTESTER_DESK_MEASURE_DOUBTS_H_

#include <array>
#include <opencv2/core.hpp>
#include <optional>

#include "qvtester/tester.h"

namespace qv {

// Signs in a photo that a figure of it would be wrong.

/// Levels that pile up where they end: light was cut off, by the sensor or by what came after it.
struct LevelPile {
  int level;
  bool top;      // else at the dark end
  int channel;   // blue, green, red
  double share;  // of the region's light, or dark, pixels
};

/// The worst pile of a region that shows one edge between dark and light; outline: corners, column and row. Where there
/// is hardly any noise flat paper is no pile, unless the edge comes to it abruptly.
///
/// @param photo  rows x cols, 8 bits, one, three or four channels.
std::optional<LevelPile> FindLevelPile(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline);

/// How far from its middle an edge has all but come to its light plateau, over how far on the dark side: the smallest
/// such ratio at 80, 90 and 95 % of the way. 1 of a lens that blurs alike to both sides, however sharpened; above 1 in
/// levels that were stored as sRGB; below 1 where a tone curve flattens towards white. None where there is no edge,
/// or one by less than 1.5 or more than 6.5 degrees off the pixels' grid.
///
/// @param photo, outline  as FindLevelPile takes them.
std::optional<double> LightSideReach(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline);

/// Whether the chart is seen in a mirror: its three marks look the same, its dark rectangle lies on the other side.
bool LooksMirrored(const FoundChart& found);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_DOUBTS_H_
