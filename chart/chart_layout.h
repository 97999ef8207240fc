#ifndef QVTESTER_CHART_CHART_LAYOUT_H_
#define QVTESTER_CHART_CHART_LAYOUT_H_

#include <array>
#include <cmath>
#include <opencv2/core.hpp>

// Geometry of the sharpness chart, in chart units; the origin is the centre of the corner mark (top left on the upright
// chart), x to the right, y down. What measures the chart, draws it or simulates it reads it here.

/// Side of the square whose corners the three finder marks take: the reference of every scale.
inline constexpr int kChartSide = 6970;

/// A module is a seventh of a finder mark's width.
inline constexpr int kMarkModule = 100;

/// Centres of the marks: corner, second, third.
inline constexpr std::array<std::array<int, 2>, 3> kMarkCentres = {{{0, 0}, {kChartSide, 0}, {0, kChartSide}}};

/// A measured region; its edge runs through the whole of it.
struct ChartRegion {
  int x, y, width, height;
  constexpr double MiddleX() const { return x + width / 2.0; }
  constexpr double MiddleY() const { return y + height / 2.0; }
};

inline constexpr ChartRegion kVerticalRegion = {3880, 3260, 2160, 750};
inline constexpr ChartRegion kHorizontalRegion = {3230, 940, 750, 2160};

/// The region in pixels of the upright picture, truncated; corner holds its row in x, its column in y.
inline cv::Rect PlaceRegion(const ChartRegion& region, cv::Point corner, float scale) {
  return {static_cast<int>(static_cast<float>(corner.y) + static_cast<float>(region.x) * scale),
          static_cast<int>(static_cast<float>(corner.x) + static_cast<float>(region.y) * scale),
          static_cast<int>(static_cast<float>(region.width) * scale),
          static_cast<int>(static_cast<float>(region.height) * scale)};
}

inline constexpr double kEdgeAngleDeg = 5;

/// Corners of the dark rectangle whose left and lower sides are the slanted edges. They cross the middles of the two
/// regions, turned by the angle, and reach beyond the regions on all sides.
inline std::array<cv::Point2d, 4> EdgeTarget(double angle_deg = kEdgeAngleDeg) {
  constexpr double kWidth = 2600;
  constexpr double kHeight = 2950;
  const double slope = std::tan(angle_deg * CV_PI / 180);
  // Left side: x = middle + slope (y - middle). Lower side: y = middle - slope (x - middle). They meet in `corner`.
  const double low = kVerticalRegion.MiddleY() + slope * kVerticalRegion.MiddleX();
  const double left = kHorizontalRegion.MiddleX() - slope * kHorizontalRegion.MiddleY();
  const cv::Point2d corner((left + slope * low) / (1 + slope * slope), (low - slope * left) / (1 + slope * slope));
  const cv::Point2d right(kWidth, -slope * kWidth);
  const cv::Point2d up(-slope * kHeight, -kHeight);
  return {corner, corner + right, corner + right + up, corner + up};
}

#endif  // QVTESTER_CHART_CHART_LAYOUT_H_
