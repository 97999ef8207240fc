#ifndef QVTESTER_CHART_REGION_WARP_H_
#define QVTESTER_CHART_REGION_WARP_H_

#include <opencv2/core.hpp>

/// A region of a warped picture without the rest: bit for bit what
///   cv::warpAffine(image, canvas, map, canvas_size, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0))
/// puts into canvas(region). The map is 2 x 3, CV_64F, from picture to canvas.
/// Throws for a region that reaches outside the canvas what canvas(region) throws.
cv::Mat WarpRegion(const cv::Mat& image, const cv::Mat& map, cv::Size canvas_size, cv::Rect region);

#endif  // QVTESTER_CHART_REGION_WARP_H_
