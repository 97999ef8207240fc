#ifndef QVTESTER_DESK_MEASURE_EDGE_RESAMPLING_H_
#define QVTESTER_DESK_MEASURE_EDGE_RESAMPLING_H_

#include <functional>
#include <limits>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/uncertainty.h"

namespace qv {

inline constexpr int kResamplings = 50;

/// What a region's own noise does to a figure that is read off its edge and has no formula for it: the noise about the
/// edge spread is drawn again in blocks of rows, and each picture is read.
///
/// @param region  CV_8UC1, one edge along its longer side.
/// @param read    the figure of a region like it, CV_8UC1 or CV_32FC1 of the same levels.
/// @return the uncertainty of `read(region)`; NaN where no edge is found.
Uncertainty ResampleEdge(const cv::Mat& region, const std::function<double(const cv::Mat&)>& read);

/// Whether the region holds more than one edge and noise, such as the edge's end: it lies off its edge spread by over
/// three times what neighbouring pixels tell of noise. False where no edge is found.
bool ShowsMoreThanEdge(const cv::Mat& region);

struct NoiselessReading {
  double value;  // NaN where no edge is found
  double low,
      high;  // the same of edges moved by up to a twentieth of a pixel, about which a measure may be of two minds
  double in_its_light;  // the same in the light that falls on it, be it even or not
};

/// The figure of the region as it would be without noise, and in even light: what `read` gives of the edge spread
/// alone. Where a figure that was found lies within `tolerance` of it (a share), no moved edges are read, and low and
/// high are the value, and so is the reading in its light.
NoiselessReading ReadNoiseless(const cv::Mat& region, const std::function<double(const cv::Mat&)>& read,
                               double found = std::numeric_limits<double>::quiet_NaN(), double tolerance = 0);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_EDGE_RESAMPLING_H_
