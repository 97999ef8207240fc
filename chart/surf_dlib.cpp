// SURF by dlib. Its descriptor rounds samples to whole pixels, so it is given the picture at twice its size; and it
// reads beyond key points near the border, so the picture is padded.

// Only headers of dlib are used: its check against a compiled part would ask debug builds for that part.
#define DLIB_TEST_FOR_ODR_VIOLATIONS_H_
#include <dlib/image_keypoint.h>
#include <dlib/opencv.h>

#include <cstdint>
#include <opencv2/imgproc.hpp>

#include "chart/surf.h"

namespace {

constexpr int kZoom = 2;
constexpr int kPadding = 192;  // of the enlarged picture, pixels
constexpr int kOctaves = 5;
constexpr int kIntervals = 6;
constexpr int kStep = 2;
constexpr double kThreshold = 30;
constexpr double kSmallestScale = 3.2;
constexpr double kReach = 3.75;  // scales that a key point keeps off the picture's own border
constexpr double kWindow = 32;   // side, in scales, of all that a descriptor reads
constexpr int kDescriptor = 64;

using IntegralImage = dlib::integral_image_generic<std::int64_t>;  // 32 bits overflow above 8 megapixels

// The enlarged, padded picture's place in the picture itself, both counted from pixel centres.
float Back(double x) { return static_cast<float>((x - kPadding + 0.5) / kZoom - 0.5); }

bool IsUsable(const dlib::interest_point& point, const cv::Mat& padded) {
  if (point.scale < kSmallestScale) return false;
  const double reach = kReach * point.scale;
  const auto keeps_off = [&](double x, int size) { return x - kPadding >= reach && size - kPadding - 1 - x >= reach; };
  if (!keeps_off(point.center.x(), padded.cols) || !keeps_off(point.center.y(), padded.rows)) return false;
  const auto side = static_cast<unsigned long>(kWindow * point.scale);
  const dlib::rectangle all(0, 0, padded.cols - 1, padded.rows - 1);
  return all.contains(dlib::centered_rect(point.center, side, side));  // dlib's own check is compiled out
}

}  // namespace

void DetectAndDescribe(const cv::Mat& gray, std::vector<cv::KeyPoint>& keypoints, cv::Mat& descriptors) {
  keypoints.clear();
  descriptors.release();
  cv::Mat padded;
  cv::resize(gray, padded, cv::Size(), kZoom, kZoom, cv::INTER_LINEAR);
  cv::copyMakeBorder(padded, padded, kPadding, kPadding, kPadding, kPadding, cv::BORDER_REPLICATE);
  IntegralImage integral;
  integral.load(dlib::cv_image<unsigned char>(padded));

  std::vector<dlib::interest_point> points;
  {
    dlib::hessian_pyramid pyramid;
    pyramid.build_pyramid(integral, kOctaves, kIntervals, kStep);
    dlib::get_interest_points(pyramid, kThreshold, points);
  }
  for (const dlib::interest_point& point : points) {
    if (!IsUsable(point, padded)) continue;
    const double angle = dlib::compute_dominant_angle(integral, point.center, point.scale);
    dlib::matrix<double, kDescriptor, 1> values;
    dlib::compute_surf_descriptor(integral, point.center, point.scale, angle, values);
    cv::Mat row(1, kDescriptor, CV_32F);
    for (int i = 0; i < kDescriptor; ++i) row.at<float>(i) = static_cast<float>(values(i));
    descriptors.push_back(row);
    keypoints.emplace_back(Back(point.center.x()), Back(point.center.y()), static_cast<float>(20 * point.scale / kZoom),
                           static_cast<float>(angle * 180 / CV_PI), static_cast<float>(point.score));
  }
}
