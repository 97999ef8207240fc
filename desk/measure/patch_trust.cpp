#include "desk/measure/patch_trust.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "desk/measure/cielab.h"
#include "desk/measure/coded_mean.h"

namespace qv {

namespace {

// A codec's channels are luma and whole levels where its chroma is flat: what is cut off them is then alike.
cv::Vec3d CutAlike(const cv::Scalar& mean, double place) {
  cv::Vec3d cut;
  for (int k = 0; k < 3; ++k) cut[k] = mean[k] + place - std::floor(mean[k] + place);
  return cut;
}

cv::Vec3d CutOff(const cv::Scalar& pixels, const cv::Point3i& mean) {
  const cv::Vec3d cut = cv::Vec3d(pixels[0], pixels[1], pixels[2]) - LevelsOf(mean);
  return {std::clamp(cut[0], 0.0, 1.0), std::clamp(cut[1], 0.0, 1.0), std::clamp(cut[2], 0.0, 1.0)};
}

// Of a camera's own levels.
std::vector<cv::Vec3d> DrawUncoded(const cv::Mat& pixels, double area, const cv::Point3i& mean, cv::RNG& random) {
  const double share = static_cast<double>(pixels.total()) / area;
  const cv::Matx33d root = RootOf(CovarianceOfMean(pixels, 0) * share);
  std::vector<cv::Vec3d> draws;
  for (int i = 0; i < kColourDraws; ++i) {
    cv::Vec3d normal;
    cv::Vec3d cut;
    for (int k = 0; k < 3; ++k) normal[k] = random.gaussian(1);
    for (int k = 0; k < 3; ++k) cut[k] = random.uniform(0.0, 1.0);
    draws.push_back(LevelsOf(mean) + cut + root * normal);
  }
  return draws;
}

}  // namespace

cv::Matx33d RootOf(const cv::Matx33d& covariance) {
  cv::Matx33d root = cv::Matx33d::zeros();
  for (int row = 0; row < 3; ++row) {
    for (int column = 0; column <= row; ++column) {
      double rest = covariance(row, column);
      for (int k = 0; k < column; ++k) rest -= root(row, k) * root(column, k);
      if (row == column) {
        root(row, row) = std::sqrt(std::max(rest, 0.0));
      } else if (root(column, column) > 0) {
        root(row, column) = rest / root(column, column);
      }
    }
  }
  return root;
}

std::vector<cv::Vec3d> DrawPatchColours(const cv::Mat& pixels, double area, const cv::Point3i& mean, std::uint64_t seed,
                                        const CodecSteps& codec) {
  cv::RNG random(seed);
  if (codec.luma == 0) return DrawUncoded(pixels, area, mean, random);
  const CodedMean coded(pixels, codec);
  const cv::Vec3d decoded = LevelsOf(mean) + CutOff(cv::mean(pixels), mean);
  std::vector<cv::Vec3d> draws;
  for (int i = 0; i < kColourDraws; ++i) draws.push_back(decoded - coded.Draw(area, random));
  return draws;
}

std::vector<cv::Vec3d> DrawStandardColours(const cv::Mat& pixels, double area, const cv::Point3i& mean,
                                           std::uint64_t seed, const CodecSteps& codec) {
  cv::RNG random(seed);
  if (codec.luma == 0) return DrawUncoded(pixels, area, mean, random);
  const CodedMean coded(pixels, codec);
  std::vector<cv::Vec3d> draws;
  for (int i = 0; i < kColourDraws; ++i) {
    const cv::Vec3d cut = CutAlike(cv::mean(pixels), random.uniform(0.0, 1.0));
    draws.push_back(LevelsOf(mean) + cut - coded.DrawOther(area, random));
  }
  return draws;
}

Uncertainty TrustInColour(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const ColourFigure& figure) {
  const double reading = figure(LevelsOf(mean));
  std::vector<double> errors;
  for (const cv::Vec3d& draw : draws) errors.push_back(figure(draw) - reading);
  return FromErrors(std::move(errors), kPixelMethod);
}

void DrawnDifferences::Add(double reading, std::vector<double> drawn) {
  readings_.push_back(reading);
  draws_.push_back(std::move(drawn));
}

void DrawnDifferences::Add(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const cv::Point3i& standard,
                           const std::vector<cv::Vec3d>& standard_draws, const PairFigure& difference) {
  std::vector<double> drawn;
  for (std::size_t i = 0; i < std::min(draws.size(), standard_draws.size()); ++i) {
    drawn.push_back(difference(draws[i], standard_draws[i]));
  }
  Add(difference(LevelsOf(mean), LevelsOf(standard)), std::move(drawn));
}

Uncertainty DrawnDifferences::OfPatch(std::size_t i) const {
  std::vector<double> errors = draws_.at(i);
  for (double& error : errors) error -= readings_[i];
  return FromErrors(std::move(errors), kPixelMethod);
}

Uncertainty DrawnDifferences::OfAll(const std::function<double(const std::vector<double>&)>& figure) const {
  const double reading = figure(readings_);
  std::vector<double> all(draws_.size());
  std::vector<double> errors;
  for (std::size_t draw = 0; draw < draws_.at(0).size(); ++draw) {
    for (std::size_t i = 0; i < all.size(); ++i) all[i] = draws_[i][draw];
    errors.push_back(figure(all) - reading);
  }
  return FromErrors(std::move(errors), kPixelMethod);
}

cv::Vec3d OwnLab(const cv::Vec3d& rgb) { return LabOfXyz(XyzOfLab(LabD65OfSrgb(rgb), kD65), kUnitWhite); }

}  // namespace qv
