#ifndef QVTESTER_CHART_REGISTRATION_H_
#define QVTESTER_CHART_REGISTRATION_H_

#include <opencv2/core.hpp>
#include <opencv2/features2d.hpp>
#include <vector>

/// A picture with its SURF features; one reference serves many registrations.
struct FeatureImage {
  cv::Mat image;  // as given
  std::vector<cv::KeyPoint> keypoints;
  cv::Mat descriptors;  // n x 64, CV_32F
};

/// Finds a picture's features: 8 bits, one channel or three or four that are weighed to grey.
FeatureImage FindFeatures(const cv::Mat& image);

struct Registration {
  std::vector<cv::DMatch> good;  // in match order, one a reference key point at most
  cv::Mat matrix;                // 2 x 3, CV_64F: reference coordinates to image coordinates
  cv::Mat unwarped;              // the image in the reference's frame and size
};

/// Registers an image onto a reference by its three best matches; empty matrix when fewer than three are good.
Registration Register(const FeatureImage& reference, const FeatureImage& image);

#endif  // QVTESTER_CHART_REGISTRATION_H_
