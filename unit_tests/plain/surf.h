#ifndef QVTESTER_UNIT_TESTS_PLAIN_SURF_H_
#define QVTESTER_UNIT_TESTS_PLAIN_SURF_H_

// SURF by dlib's own calls: what chart/surf.cpp is compared with.

// Only headers of dlib are used: its check against a compiled part would ask debug builds for that part.
#define DLIB_TEST_FOR_ODR_VIOLATIONS_H_
#include <dlib/image_keypoint.h>
#include <dlib/opencv.h>

#include <cstdint>
#include <opencv2/features2d.hpp>
#include <opencv2/imgproc.hpp>
#include <vector>

namespace plain {

inline void DetectAndDescribe(const cv::Mat& gray, std::vector<cv::KeyPoint>& keypoints, cv::Mat& descriptors) {
  constexpr int kPadding = 192;
  cv::Mat padded;
  cv::resize(gray, padded, cv::Size(), 2, 2, cv::INTER_LINEAR);
  cv::copyMakeBorder(padded, padded, kPadding, kPadding, kPadding, kPadding, cv::BORDER_REPLICATE);
  dlib::integral_image_generic<std::int64_t> integral;  // 32 bits overflow above 8 megapixels
  integral.load(dlib::cv_image<unsigned char>(padded));
  std::vector<dlib::interest_point> points;
  dlib::hessian_pyramid pyramid;
  pyramid.build_pyramid(integral, 5, 6, 2);
  dlib::get_interest_points(pyramid, 30, points);

  const dlib::rectangle all(0, 0, padded.cols - 1, padded.rows - 1);
  const auto back = [](double x) { return static_cast<float>((x - kPadding + 0.5) / 2 - 0.5); };
  for (const dlib::interest_point& point : points) {
    const double reach = 3.75 * point.scale;
    const auto keeps_off = [&](double x, int size) {
      return x - kPadding >= reach && size - kPadding - 1 - x >= reach;
    };
    if (!keeps_off(point.center.x(), padded.cols) || !keeps_off(point.center.y(), padded.rows)) continue;
    const auto side = static_cast<unsigned long>(32 * point.scale);
    if (point.scale < 3.2 || !all.contains(dlib::centered_rect(point.center, side, side))) continue;
    const double angle = dlib::compute_dominant_angle(integral, point.center, point.scale);
    dlib::matrix<double, 64, 1> values;
    dlib::compute_surf_descriptor(integral, point.center, point.scale, angle, values);
    cv::Mat row(1, 64, CV_32F);
    for (int i = 0; i < 64; ++i) row.at<float>(i) = static_cast<float>(values(i));
    descriptors.push_back(row);
    keypoints.emplace_back(back(point.center.x()), back(point.center.y()), static_cast<float>(20 * point.scale / 2),
                           static_cast<float>(angle * 180 / CV_PI), static_cast<float>(point.score));
  }
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_SURF_H_
