#ifndef QVTESTER_CHART_SURF_H_
#define QVTESTER_CHART_SURF_H_

#include <opencv2/core.hpp>
#include <opencv2/features2d.hpp>
#include <vector>

/// Speeded-up robust features (Bay, Tuytelaars, Van Gool 2006) of a grey picture (CV_8UC1): key points, and a
/// descriptor of 64 floats a row for each (CV_32F, n x 64). Whoever has another SURF puts it behind this call.
void DetectAndDescribe(const cv::Mat& gray, std::vector<cv::KeyPoint>& keypoints, cv::Mat& descriptors);

#endif  // QVTESTER_CHART_SURF_H_
