#ifndef QVTESTER_DESK_MEASURE_CODED_MEAN_H_
#define QVTESTER_DESK_MEASURE_CODED_MEAN_H_

#include <array>
#include <map>
#include <opencv2/core.hpp>
#include <utility>
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
  /// Of blocks of which the scene makes as many as this list says differ by so much from the level.
  PlaneRounding Over(const std::vector<double>& scene) const;
  /// Of a mean over so many blocks, drawn.
  double Draw(double level, double blocks, cv::RNG& random) const;
  double step() const { return step_; }

 private:
  double step_;
  std::vector<Error> errors_;  // over the period
};

/// Shares of blue and red chroma's values.
using ChromaCounts = std::map<std::pair<int, int>, double>;

/// What a JPEG file may have added to the mean of a picture's pixels, drawn many times; noise is in it. Where the mean
/// lay between the steps is known as far as what became of it tells.
class CodedMean {
 public:
  /// @param pixels  CV_8UC3, channels as stored: blue first. Part of the photo, so that its blocks can be told.
  /// @param codec   of the photo's file.
  CodedMean(const cv::Mat& pixels, const CodecSteps& codec);

  /// Of a mean over so many pixels, levels in the order of the channels.
  cv::Vec3d Draw(double area, cv::RNG& random) const;
  /// The same of another picture, as noisy and as even, of which nothing else is known.
  cv::Vec3d DrawOther(double area, cv::RNG& random) const;
  /// Of the grey of a small part somewhere in the picture, within which the scene is even.
  std::vector<double> DrawGreyOfPart(double area, int draws, cv::RNG& random) const;
  /// Of grey means over so many pixels each, which lie about each other as this grid (CV_64F) says, and are as long as
  /// this share of its steps;
  /// `rounded` is the variance of what was rounded after decoding, but for the change to grey.
  std::vector<cv::Mat> DrawGrey(const cv::Mat& grid, double area, double share, double rounded, int draws,
                                cv::RNG& random) const;

 private:
  struct Place {  // where a plane's mean may have lain, and what it then is off by
    double level, off;
  };
  using Planes = std::vector<PlaneRounding>;  // luma, blue, red
  static Place PlaceOf(int plane, const PlaneRounding& rounding, double level, double area, cv::RNG& random);
  static std::array<Place, 3> AnyPlaces(const Planes& planes, double area, cv::RNG& random);
  Place SeenPlace(int plane, double area, cv::RNG& random) const;
  cv::Point MovedBy(const std::array<Place, 3>& places) const;
  cv::Vec3d InChannels(const std::array<Place, 3>& places, cv::Point moved, cv::RNG& random) const;

  CodecSteps codec_;
  cv::Mat decoded_;                          // luma, red and blue
  double noise_ = 0;                         // of a pixel's luma, before the codec took most of it
  Planes planes_, seen_;                     // of blocks, and of those over the scene in them
  std::array<double, 3> decoded_mean_ = {};  // of chroma, about grey
  std::array<double, 3> relative_ = {};      // the planes' means over that of luma
  ChromaCounts chroma_;
  double whole_levels_ = 0;  // half of what the codec was given is rounded to
};

/// Half the interval in which rounding to steps leaves a mean; a spread of the step's size takes the error away.
double HalfInterval(double step, double spread);

/// Grey of means as the tests weigh stored blue, green and red.
inline double GreyOfMeans(const cv::Vec3d& bgr) { return 0.299 * bgr[0] + 0.587 * bgr[1] + 0.114 * bgr[2]; }

/// A smooth surface through a grid of means, CV_64F, of so many terms: a constant, a plane, of the second degree.
cv::Mat SurfaceThrough(const cv::Mat& grid, int terms);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CODED_MEAN_H_
