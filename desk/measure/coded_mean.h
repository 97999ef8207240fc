#ifndef QVTESTER_DESK_MEASURE_CODED_MEAN_H_
#define QVTESTER_DESK_MEASURE_CODED_MEAN_H_

#include <array>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/codec_steps.h"

namespace qv {

/// What a JPEG file does to a mean of one of its planes, luma or chroma: blocks' means, moved by noise, are rounded to
/// a step, and samples of blocks without detail to whole levels. Where the mean lies between the steps decides by how
/// much all blocks are off alike; the rest falls with the root of their number.
class PlaneRounding {
 public:
  /// @param step   levels between rounded means of blocks, a multiple of an eighth.
  /// @param noise  of a block's mean, before it is rounded.
  /// @param flat   share of the blocks whose samples are all alike.
  PlaneRounding(double step, double noise, double flat);

  struct Error {
    double mean, variance;  // of a block, in levels
  };
  /// Of a block whose mean is so many levels from some multiple of eight steps.
  Error At(double level) const;
  /// Of a mean over so many blocks, drawn; the scene in them differs by so much from this level.
  double Draw(double level, const std::vector<double>& scene, double blocks, cv::RNG& random) const;
  double period() const { return 8 * step_; }

 private:
  double step_;
  std::vector<Error> errors_;  // over the period
};

/// What a JPEG file may have added to the mean of a picture's pixels, drawn many times, since nothing tells where the
/// mean lay between the steps. Noise is in it.
class CodedMean {
 public:
  /// @param pixels  CV_8UC3, channels as stored: blue first. Part of the photo, so that its blocks can be told.
  /// @param codec   of the photo's file.
  CodedMean(const cv::Mat& pixels, const CodecSteps& codec);

  /// Of a mean over so many pixels, levels in the order of the channels.
  cv::Vec3d Draw(double area, cv::RNG& random) const;
  /// Of grey means over so many pixels each, which lie about each other as this grid (CV_64F) says.
  cv::Mat DrawGrey(const cv::Mat& grid, double area, cv::RNG& random) const;
  /// Of a pixel's luma, before the codec took most of it.
  double noise() const { return noise_; }

 private:
  double noise_ = 0;
  std::vector<PlaneRounding> planes_;                // luma, blue, red
  std::array<std::vector<double>, 3> scene_;         // of their blocks, about the mean
  std::array<double, 3> relative_ = {};              // the planes' means over that of luma
  std::vector<cv::Vec3d> channels_;                  // what rounding to channels may do
  double channels_apart_ = 0;                        // to grey of small parts, beyond what it does to all alike
  double whole_levels_ = 0;                          // half of what the codec was given is rounded to
};

/// Half the interval in which rounding to steps leaves a mean; a spread of the step's size takes the error away.
double HalfInterval(double step, double spread);

/// Grey of means as the tests weigh stored blue, green and red.
inline double GreyOfMeans(const cv::Vec3d& bgr) { return 0.299 * bgr[0] + 0.587 * bgr[1] + 0.114 * bgr[2]; }

/// A smooth surface through a grid of means, CV_64F, of so many terms: a constant, a plane, of the second degree.
cv::Mat SurfaceThrough(const cv::Mat& grid, int terms);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CODED_MEAN_H_
