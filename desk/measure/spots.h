#ifndef QVTESTER_DESK_MEASURE_SPOTS_H_
#define QVTESTER_DESK_MEASURE_SPOTS_H_

#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/uncertainty.h"

namespace qv {

/// A dark spot in a photo of a plain target.
struct Spot {
  cv::Point2d centre;  // column, row; a pixel's centre is a whole number
  double area_px;      // of what is darker than half the depth
  double contrast;     // depth in the middle, as a share of the light about it
  double score;        // depth over what noise alone shows in one of 200 photos; 1 or more

  double diameter_px() const;  // of a disc of that area
};

/// How far a spot's figures may be trusted. Its softness is not known: that is most of it.
struct SpotTrust {
  Uncertainty area, contrast, place;  // place: of column and of row
};

struct SpotFinding {
  std::vector<Spot> spots;  // the surest first
  double noise = 0;         // of a pixel, median over the photo, as a share of the light
  double largest_area = 0;  // pixels
  double dark_share = 0;    // of the photo's pixels that lie in spots
  bool cut_short = false;   // more than can be spots on a plain target
  Uncertainty of_noise = {};

  SpotTrust Trust(const Spot& spot) const;
};

/// Dark spots of 3 to 300 pixels across, sharp or soft, wherever contrast times the root of the spot's pixels is 9
/// times the noise or more; once per spot, at the size that shows it best. The light's own fall-off is taken out first.
/// No photo may be empty, or of another depth than 8 or 16 bits (throws cv::Exception). A difference of Gaussians in a
/// pyramid (as Lindeberg 1998), with noise measured at each size and place.
SpotFinding FindSpots(const cv::Mat& photo);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_SPOTS_H_
