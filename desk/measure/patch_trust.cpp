#include "desk/measure/patch_trust.h"

#include "desk/measure/cielab.h"

namespace qv {

namespace {

constexpr int kDraws = 400;

cv::Vec3d Levels(const cv::Point3i& mean) { return {1.0 * mean.x, 1.0 * mean.y, 1.0 * mean.z}; }

// L with L L^T = covariance, of what is positive definite but for rounding.
cv::Matx33d Root(const cv::Matx33d& covariance) {
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

// Half the interval in which a codec's rounding leaves the mean, whose blocks noise spreads over its steps.
double RoundingOf(double step, double noise) {
  if (step == 0) return 0;
  const double spread = noise / step;
  return step / 2 * std::exp(-2 * CV_PI * CV_PI * spread * spread);
}

// What the rounding of luma and both chromas may add (ITU-T T.871), in the order of the stored channels: blue first.
cv::Vec3d RgbOf(double luma, double blue, double red) {
  return {luma + 1.772 * blue, luma - 0.344136 * blue - 0.714136 * red, luma + 1.402 * red};
}

}  // namespace

std::vector<cv::Vec3d> DrawPatchColours(const cv::Mat& pixels, double area, const cv::Point3i& mean, std::uint64_t seed,
                                        const CodecSteps& codec) {
  constexpr double kBlockPx = 8;
  constexpr double kChromaBlockPx = 16;  // of halved chroma
  const double noise = std::sqrt(cv::trace(CovarianceOfMean(pixels, 0)) / 3 * static_cast<double>(pixels.total()));
  const double luma = RoundingOf(codec.luma, noise / kBlockPx);
  const double chroma = RoundingOf(codec.chroma, noise / kChromaBlockPx);
  const double share = static_cast<double>(pixels.total()) / area;
  const cv::Matx33d root = Root(CovarianceOfMean(pixels, 0) * share);
  cv::RNG random(seed);
  std::vector<cv::Vec3d> draws;
  for (int i = 0; i < kDraws; ++i) {
    cv::Vec3d normal;
    cv::Vec3d cut;
    for (int k = 0; k < 3; ++k) normal[k] = random.gaussian(1);
    for (int k = 0; k < 3; ++k) cut[k] = random.uniform(0.0, 1.0);
    draws.push_back(Levels(mean) + cut + root * normal);
    if (codec.luma == 0) continue;
    cv::Vec3d off;
    for (int k = 0; k < 3; ++k) off[k] = random.uniform(-1.0, 1.0);
    draws.back() += RgbOf(luma * off[0], chroma * off[1], chroma * off[2]);
  }
  return draws;
}

Uncertainty TrustInColour(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const ColourFigure& figure) {
  const double reading = figure(Levels(mean));
  std::vector<double> errors;
  for (const cv::Vec3d& draw : draws) errors.push_back(figure(draw) - reading);
  return FromErrors(std::move(errors), kPixelMethod);
}

Uncertainty TrustInPair(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const cv::Point3i& standard,
                        const std::vector<cv::Vec3d>& standard_draws, const PairFigure& figure) {
  const double reading = figure(Levels(mean), Levels(standard));
  std::vector<double> errors;
  for (std::size_t i = 0; i < std::min(draws.size(), standard_draws.size()); ++i) {
    errors.push_back(figure(draws[i], standard_draws[i]) - reading);
  }
  return FromErrors(std::move(errors), kPixelMethod);
}

cv::Vec3d OwnLab(const cv::Vec3d& rgb) { return LabOfXyz(XyzOfLab(LabD65OfSrgb(rgb), kD65), kUnitWhite); }

}  // namespace qv
