#ifndef QVTESTER_DESK_MEASURE_MEAN_TRUST_H_
#define QVTESTER_DESK_MEASURE_MEAN_TRUST_H_

#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/codec_steps.h"
#include "desk/measure/coded_mean.h"
#include "desk/measure/patch_trust.h"
#include "desk/measure/uncertainty.h"

namespace qv {

// How far means of a photo's colours may be trusted, and what is made of them.

/// By how much the means of a lit area's channels may be off, drawn many times (JCGM 101).
class MeanErrors {
 public:
  /// @param pixels  CV_8UC3, from within the area, blue first.
  /// @param codec   by how much the photo's file rounds the means of its blocks.
  MeanErrors(const cv::Mat& pixels, const CodecSteps& codec);

  /// Of a mean over so many pixels: levels, blue first. None where there are too few pixels to tell their noise.
  std::vector<cv::Vec3d> OfMean(double area, int draws = kColourDraws) const;
  /// Of the grey of a small part of the area, within which the scene is even.
  std::vector<double> OfGreyPart(double area, int draws) const;
  /// Of the smallest over the largest of a grid of means of grey (CV_64F) over so many pixels each, drawn about what
  /// their true values probably are: of even levels noise makes the least smaller and the largest larger. `rounded` is
  /// the variance of what rounds each mean's pixels after the photo was stored, `share` that of the grid's step which
  /// each mean's pixels take.
  Uncertainty OfEvenness(const cv::Mat& means, double area, double rounded = 0, double share = 1) const;

 private:
  std::vector<cv::Mat> OfGreyMeans(const cv::Mat& grid, double area, double share, double rounded) const;

  cv::Mat pixels_;
  CodecSteps codec_;
  CodedMean coded_;
  cv::Matx33d covariance_ = cv::Matx33d::zeros();  // of a pixel, as means of many have it
  double degrees_ = 0;                             // of freedom
};

/// Of a reading of drawn means' errors: `figure` says what it is if the means are off by so much.
template <typename Figure>
Uncertainty OfDrawn(const std::vector<cv::Vec3d>& off, double reading, const Figure& figure) {
  std::vector<double> errors;
  for (const cv::Vec3d& one : off) errors.push_back(figure(one) - reading);
  return FromErrors(std::move(errors), kPixelMethod);
}

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_MEAN_TRUST_H_
