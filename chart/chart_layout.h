#ifndef QVTESTER_CHART_CHART_LAYOUT_H_
#define QVTESTER_CHART_CHART_LAYOUT_H_

#include <array>
#include <cmath>
#include <opencv2/core.hpp>

#include "chart/points.h"

// Geometry of the sharpness chart, in chart units; the origin is the centre of the corner mark (top left on the upright
// chart), x to the right, y down. What measures the chart, draws it or simulates it reads it here.

/// Side of the square whose corners the three finder marks take: the reference of every scale.
inline constexpr int kChartSide = 6970;

/// Goes up when anything below changes: photos of charts of different revisions don't compare.
inline constexpr int kChartRevision = 1;

/// Finder marks come in three sizes; a module is a seventh of a mark's width, in chart units. The search misses modules
/// under 3 pixels, and on a chart turned by some 30 degrees places a mark up to a quarter of a module off: so the marks
/// should be the smallest whose modules still take 6 pixels.
struct MarkSize {
  const char* name;
  int module;
};
inline constexpr std::array<MarkSize, 3> kMarkSizes = {{{"fine", 25}, {"medium", 50}, {"coarse", 100}}};
inline constexpr double kModulePx = 6;

/// The size for photos of this scale; the largest when even that is small.
constexpr const MarkSize& SuitableMarks(double pixels_per_unit) {
  for (const MarkSize& size : kMarkSizes) {
    if (size.module * pixels_per_unit >= kModulePx) return size;
  }
  return kMarkSizes.back();
}

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

/// A colour patch of the ring along the square's sides, at its sampling position.
struct ChartPatch {
  const char* name;
  int red, green, blue;  // sRGB
};

/// Patches are sampled over D / 21 to each side of their middle. They are drawn larger by what a straightening that is
/// a degree off moves the furthest of them.
inline constexpr double kPatchHalf = 470;

inline constexpr int kWhitePatch = 9;
inline constexpr std::array<int, 4> kPatchesWithoutStandard = {12, 13, 14, kWhitePatch};  // that are measured then

// In sampling order: six along the top, six along the bottom, six down the left side, six down the right.
inline constexpr std::array<ChartPatch, 24> kPatches = {{
    {"grey 20", 20, 20, 20}, {"yellow", 250, 225, 110},   {"purple", 90, 40, 110},    {"light cyan", 150, 240, 245},
    {"brown", 110, 60, 40},  {"grey 240", 240, 240, 240}, {"dark teal", 20, 90, 100}, {"pink", 250, 190, 205},
    {"grey 45", 45, 45, 45}, {"white", 255, 255, 255},    {"maroon", 120, 20, 60},    {"light green", 170, 245, 170},
    {"red", 190, 30, 40},    {"green", 20, 110, 50},      {"blue", 40, 50, 160},      {"grey 225", 225, 225, 225},
    {"grey 70", 70, 70, 70}, {"lavender", 205, 195, 250}, {"navy", 20, 30, 100},      {"peach", 255, 205, 160},
    {"grey 90", 90, 90, 90}, {"grey 210", 210, 210, 210}, {"dark olive", 80, 80, 20}, {"sky", 170, 210, 255},
}};

constexpr bool PatchesKeepOffTheThreshold() {
  for (const ChartPatch& patch : kPatches) {
    // The measures weigh a photo's channels as red, green, blue whatever their order, so both orders count.
    for (const int first : {patch.red, patch.blue}) {
      const int last = patch.red + patch.blue - first;
      const double grey = 0.299 * first + 0.587 * patch.green + 0.114 * last;
      if (grey > 125 - 30 && grey < 125 + 30) return false;
    }
  }
  return true;
}
static_assert(PatchesKeepOffTheThreshold(), "specks near the default threshold of 125 pass for marks");

/// Where the patches are sampled on an upright picture, in sampling order: rows and columns within `half` of a centre.
struct PatchGrid {
  int half;
  std::array<cv::Point, 24> centres;  // row in x, column in y
};

/// From corner, second and third mark (row in x, column in y). One pitch serves all four sides.
inline PatchGrid PlacePatches(cv::Point corner, cv::Point second, cv::Point third) {
  const int pitch = (second.y - corner.y) / 7;
  PatchGrid grid = {static_cast<int>(Distance(corner, second)) / 21, {}};
  for (int i = 0; i < 24; ++i) {
    const int along = (i % 6 + 1) * pitch;
    switch (i / 6) {
      case 0: grid.centres[i] = {corner.x, corner.y + along}; break;
      case 1: grid.centres[i] = {third.x, corner.y + along}; break;
      case 2: grid.centres[i] = {corner.x + along, corner.y}; break;
      default: grid.centres[i] = {corner.x + along, second.y}; break;
    }
  }
  return grid;
}

/// Middle of a patch in chart units.
inline cv::Point2d PatchCentre(int number) {
  const double along = (number % 6 + 1) * kChartSide / 7.0;
  switch (number / 6) {
    case 0: return {along, 0.0};
    case 1: return {along, static_cast<double>(kChartSide)};
    case 2: return {0.0, along};
    default: return {static_cast<double>(kChartSide), along};
  }
}

#endif  // QVTESTER_CHART_CHART_LAYOUT_H_
