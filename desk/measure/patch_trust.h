#ifndef QVTESTER_DESK_MEASURE_PATCH_TRUST_H_
#define QVTESTER_DESK_MEASURE_PATCH_TRUST_H_

#include <cstdint>
#include <functional>
#include <opencv2/core.hpp>
#include <vector>

#include "desk/measure/codec_steps.h"
#include "desk/measure/uncertainty.h"

namespace qv {

constexpr int kColourDraws = 400;  // of what a colour may be (JCGM 101)

/// L with L L^T = covariance, of what is positive definite but for rounding.
cv::Matx33d RootOf(const cv::Matx33d& covariance);

/// What a patch's colour may be, given its mean cut to whole levels and its pixels' own noise: drawn many times (JCGM
/// 101). Channels are in the order of `mean`.
///
/// @param pixels  CV_8UC3, channels in the order of `mean`, from within the patch.
/// @param area    pixels that the mean was taken over.
/// @param codec   by how much the photo's file rounds the means of its blocks.
std::vector<cv::Vec3d> DrawPatchColours(const cv::Mat& pixels, double area, const cv::Point3i& mean, std::uint64_t seed,
                                        const CodecSteps& codec = {});
/// The same of a standard's patch, of which the mean alone is known; `pixels` are those of the patch held against it.
std::vector<cv::Vec3d> DrawStandardColours(const cv::Mat& pixels, double area, const cv::Point3i& mean,
                                           std::uint64_t seed, const CodecSteps& codec);

/// The levels of a mean that was cut to whole ones.
inline cv::Vec3d LevelsOf(const cv::Point3i& mean) { return {1.0 * mean.x, 1.0 * mean.y, 1.0 * mean.z}; }

/// Of a figure of one patch.
using ColourFigure = std::function<double(const cv::Vec3d&)>;
Uncertainty TrustInColour(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const ColourFigure& figure);

/// Of patches that were compared with standards: each one's difference as it is read, and as it may be, draw by draw.
class DrawnDifferences {
 public:
  using PairFigure = std::function<double(const cv::Vec3d&, const cv::Vec3d&)>;
  void Add(double reading, std::vector<double> drawn);
  void Add(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const cv::Point3i& standard,
           const std::vector<cv::Vec3d>& standard_draws, const PairFigure& difference);
  std::size_t size() const { return readings_.size(); }

  Uncertainty OfPatch(std::size_t i) const;
  /// Of what is made of all of them, say their mean: the cut of means to whole levels moves many one way.
  Uncertainty OfAll(const std::function<double(const std::vector<double>&)>& figure) const;

 private:
  std::vector<double> readings_;
  std::vector<std::vector<double>> draws_;
};

/// The tests' own L*a*b* of a colour, 0 to 255.
cv::Vec3d OwnLab(const cv::Vec3d& rgb);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_PATCH_TRUST_H_
