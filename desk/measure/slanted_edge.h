#ifndef QVTESTER_DESK_MEASURE_SLANTED_EDGE_H_
#define QVTESTER_DESK_MEASURE_SLANTED_EDGE_H_

#include <array>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/line_spread.h"
#include "desk/measure/transfer.h"

// Where one slanted edge lies in a region of a photo, and how it rises from its dark to its light plateau.

namespace qv {

/// A rectangle whose longer side is nearer to the rows' direction of counting (down) than to the columns'.
struct EdgeRegion {
  cv::Point2d middle, along, across;  // unit vectors along the longer and the shorter side
  double half_length, half_width;
};

/// column = offset + slope t + bend t^2, t being rows from `middle_row`.
struct EdgeCurve {
  double middle_row, offset, slope, bend;
  double Column(double row) const;
  double Slope(double row) const;
};

/// Level of a plateau at distance d from the edge and t rows from the curve's middle.
struct Plateau {
  double level, by_distance, by_row;
  double At(double d, double t) const { return level + by_distance * d + by_row * t; }
};

inline constexpr int kBands = 4;  // along the edge, each with a spread of its own

struct SlantedEdge {
  const char* reason = nullptr;  // why there is no edge, a phrase; null otherwise, and only then does the rest hold
  cv::Point first;               // of `light` in the photo
  cv::Mat light;                 // the part of the photo about the region, CV_64F, the edge running down the rows
  EdgeRegion region;             // in `light`
  bool lying = false;            // rows and columns of the photo were swapped
  EdgeCurve curve;
  std::vector<char> rows;  // whether each row of `light` shows the edge
  double room = 0;         // pixels from the edge to the nearer long side, along the edge's normal
  double sigma_px = 0;     // of the Gaussian that is as sharp as the edge, pixel included; roughly
  Plateau left, right;     // of the edge

  double angle_deg() const;  // of the edge from the nearer of the photo's rows and columns, -45 to 45
};

/// Finds the edge that runs along the longer sides of a rectangle, from one shorter side to the other.
///
/// @param gray     as LinearLight takes it.
/// @param corners  of the rectangle, in order around it: column and row, pixel centres at whole numbers; pixels
///                 outside the photo are left out.
SlantedEdge LocateEdge(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer);

/// Share of the way from the left plateau to the right one, by distance from the edge.
struct EdgeSpreads {
  EdgeSpread whole;
  std::array<EdgeSpread, kBands> bands;
};

/// Up to `reach` pixels to each side, of all rows and of each of the bands; a band's may end after two fifths of that.
/// A spread has no levels when too many of its bins see no pixel.
EdgeSpreads ProjectEdge(const SlantedEdge& edge, double reach);

/// Of all rows, as far as the edge differs from its plateaus.
EdgeSpread RiseOf(const SlantedEdge& edge);

/// `edge.light` without its noise, and so many pixels more to each side: each pixel by its distance from the edge,
/// which is moved across by some pixels.
cv::Mat NoiselessLight(const SlantedEdge& edge, const EdgeSpread& rise, int margin = 0, double moved = 0);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_SLANTED_EDGE_H_
