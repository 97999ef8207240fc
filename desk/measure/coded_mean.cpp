#include "desk/measure/coded_mean.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <opencv2/imgproc.hpp>
#include <utility>

#include "desk/measure/uncertainty.h"

namespace qv {

namespace {

constexpr int kLumaBlockPx = 8;         // pixels a side, of luma
constexpr int kChromaBlockPx = 16;  // of halved chroma
constexpr int kPhasesOfStep = 32;       // of a step that are looked at
constexpr int kStepsOfPeriod = 8;         // of an eighth's multiple, until whole levels come again

// Noise of channels that is alike in all, as luma and chroma have it: roots of the weights' squares.
constexpr double kLumaShare = 0.669;
constexpr double kChromaShare = 0.62;

double Below(double deviations) { return 0.5 * std::erfc(-deviations / std::sqrt(2.0)); }

// Luma and both chromas to channels (ITU-T T.871), blue first.
cv::Vec3d RgbOf(double luma, double blue, double red) {
  return {luma + 1.772 * blue, luma - 0.344136 * blue - 0.714136 * red, luma + 1.402 * red};
}

// The part of the file's own blocks of so many pixels a side.
cv::Mat WholeBlocks(const cv::Mat& pixels, int side) {
  cv::Size all;
  cv::Point corner;
  pixels.locateROI(all, corner);
  const auto skip = [side](int first) { return (side - first % side) % side; };
  const cv::Rect rest(skip(corner.x), skip(corner.y), (pixels.cols - skip(corner.x)) / side * side,
                      (pixels.rows - skip(corner.y)) / side * side);
  return rest.width <= 0 || rest.height <= 0 ? cv::Mat() : pixels(rest);
}

// Of at most so many blocks, evenly over the picture.
template <typename Look>
int ForSomeBlocks(const cv::Mat& picture, int side, Look&& look) {
  constexpr int kMost = 300;
  const cv::Size count(picture.cols / side, picture.rows / side);
  const int step = count.area() / kMost + 1;
  int looked_at = 0;
  for (int i = 0; i < count.area(); i += step, ++looked_at) {
    look(picture(cv::Rect(i % count.width * side, i / count.width * side, side, side)));
  }
  return looked_at;
}

// Mean square of what a coefficient is rounded to, to multiples of a step; the mean is 0.
double RoundedSquare(double deviation, double step) {
  double sum = 0;
  for (int m = 1; (m - 0.5) * step < 5 * deviation; ++m) sum += (2 * m - 1) * 2 * Below(-(m - 0.5) * step / deviation);
  return step * step * sum;
}

// Deviation of luma's coefficients before they were rounded, from what is left of them: noise is alike in all. Those of
// the lowest frequencies have the scene's slope in them.
double LumaBeforeCodec(const cv::Mat& luma, const CodecSteps& codec) {
  std::vector<float> steps;
  double squares = 0;
  cv::Mat_<float> block(kLumaBlockPx, kLumaBlockPx);
  const int blocks = ForSomeBlocks(luma, kLumaBlockPx, [&](const cv::Mat& pixels) {
    pixels.convertTo(block, CV_32F);
    cv::dct(block, block);
    for (int i = 0; i < kLumaBlockPx; ++i) {
      for (int k = 0; k < kLumaBlockPx; ++k) {
        const float step = codec.luma_table(i, k);
        if (i + k >= 2 && step > 0) squares += std::pow(step * std::round(block(i, k) / step), 2);
      }
    }
  });
  if (blocks == 0 || squares == 0) return 0;
  double low = 0;
  double high = 64;
  for (int turn = 0; turn < 24; ++turn) {
    const double middle = (low + high) / 2;
    double expected = 0;
    for (int i = 0; i < kLumaBlockPx * kLumaBlockPx; ++i) {
      const float step = codec.luma_table.val[i];
      if (i / kLumaBlockPx + i % kLumaBlockPx >= 2 && step > 0) expected += RoundedSquare(middle, step);
    }
    (expected * blocks < squares ? low : high) = middle;
  }
  return low;
}

// Of a sample of halved chroma, given that of luma: both were rounded to levels, chroma before it was halved and after.
double ChromaNoise(double luma) {
  constexpr double kRounding = 1.0 / 12;
  if (luma * luma <= kRounding) return 0;
  return std::sqrt((std::pow(kChromaShare / kLumaShare, 2) * (luma * luma - kRounding) + kRounding) / 4 + kRounding);
}

// Share of blocks that show nothing within: neighbours reach into the rim of an enlarged one.
double FlatShare(const cv::Mat& plane, int side) {
  const int rim = side / kLumaBlockPx - 1 == 0 ? 0 : 2;
  int flat = 0;
  const int blocks = ForSomeBlocks(plane, side, [&](const cv::Mat& block) {
    double least = 0;
    double most = 0;
    cv::minMaxLoc(block(cv::Rect(rim, rim, side - 2 * rim, side - 2 * rim)), &least, &most);
    flat += least == most ? 1 : 0;
  });
  return blocks == 0 ? 1 : 1.0 * flat / blocks;
}

// How blocks' means differ by the scene alone: a smooth surface of as many terms as surely tell something.
std::vector<double> SceneOf(const cv::Mat& plane, int side) {
  constexpr int kMost = 32;       // blocks a side
  constexpr double kSurely = 4;  // times what a term takes of noise
  cv::Mat means;
  const cv::Size blocks(plane.cols / side, plane.rows / side);
  if (blocks.area() < 8) return {0};
  plane.convertTo(means, CV_32F);
  cv::resize(means, means, {std::min(blocks.width, kMost), std::min(blocks.height, kMost)}, 0, 0, cv::INTER_AREA);
  means.convertTo(means, CV_64F);
  cv::Mat scene = SurfaceThrough(means, 1);
  int used = 1;
  for (const int terms : {3, 6}) {
    const double freedom = static_cast<double>(means.total()) - terms;
    if (freedom < terms) break;
    const cv::Mat more = SurfaceThrough(means, terms);
    const double taken = std::pow(cv::norm(means, scene), 2) - std::pow(cv::norm(means, more), 2);
    if (taken / (terms - used) <= kSurely * std::pow(cv::norm(means, more), 2) / freedom + 1e-9) continue;
    scene = more;
    used = terms;
  }
  scene -= cv::mean(scene)[0];
  return {scene.begin<double>(), scene.end<double>()};
}

// Mean difference between neighbours of a row.
double SlopeAcross(const cv::Mat& grid) {
  if (grid.cols < 2) return 0;
  return cv::mean(grid.colRange(1, grid.cols) - grid.colRange(0, grid.cols - 1))[0];
}

// What blocks of a part differ by from its mean, so many a side; the scene rises by so much over the part.
std::vector<double> WithinPart(const cv::Vec2d& slope, int blocks) {
  constexpr int kMost = 6;
  const int side = std::clamp(blocks, 1, kMost);
  std::vector<double> off;
  for (int i = 0; i < side * side; ++i) {
    off.push_back(slope[0] * ((i % side + 0.5) / side - 0.5) + slope[1] * ((i / side + 0.5) / side - 0.5));
  }
  return off;
}

double GreyVariance(const std::vector<cv::Vec3d>& off) {
  double squares = 0;
  for (const cv::Vec3d& one : off) squares += std::pow(GreyOfMeans(one), 2) / static_cast<double>(off.size());
  return squares;
}

// What rounding to channels does to the mean of samples of chroma that differ as these do, wherever they lie.
std::vector<cv::Vec3d> ChannelRounding(const cv::Mat& chroma) {
  constexpr int kPlaces = 100;
  constexpr double kReach = 60;
  constexpr int kMostSamples = 20000;
  std::map<std::pair<int, int>, int> counts;
  const int step = static_cast<int>(chroma.total()) / kMostSamples + 1;
  int samples = 0;
  for (int i = 0; i < static_cast<int>(chroma.total()); i += step, ++samples) {
    const auto& one = chroma.at<cv::Vec3b>(i / chroma.cols, i % chroma.cols);
    ++counts[{one[2], one[1]}];
  }
  cv::RNG random(7);
  std::vector<cv::Vec3d> errors(kPlaces);
  for (cv::Vec3d& error : errors) {
    const cv::Point place(cvRound(random.uniform(-kReach, kReach)), cvRound(random.uniform(-kReach, kReach)));
    for (const auto& [values, count] : counts) {
      const cv::Vec3d exact = RgbOf(0, values.first + place.x, values.second + place.y);
      for (int k = 0; k < 3; ++k) error[k] += (std::round(exact[k]) - exact[k]) * count / samples;
    }
  }
  return errors;
}

}  // namespace

double HalfInterval(double step, double spread) {
  const double share = spread / step;
  return step / 2 * std::exp(-2 * CV_PI * CV_PI * share * share);
}

cv::Mat SurfaceThrough(const cv::Mat& grid, int terms) {
  cv::Mat at(static_cast<int>(grid.total()), terms, CV_64F);
  for (int i = 0; i < at.rows; ++i) {
    const double x = i % grid.cols - (grid.cols - 1) / 2.0;
    const int row = i / grid.cols;
    const double y = row - (grid.rows - 1) / 2.0;
    const std::array<double, 6> powers = {1, x, y, x * x, x * y, y * y};
    std::copy_n(powers.begin(), terms, at.ptr<double>(i));
  }
  cv::Mat factors;
  cv::solve(at, grid.reshape(1, at.rows), factors, cv::DECOMP_SVD);
  return cv::Mat(at * factors).reshape(1, grid.rows);
}

PlaneRounding::PlaneRounding(double step, double noise, double flat) : step_(step), errors_(kStepsOfPeriod * kPhasesOfStep) {
  const double spread = std::max(noise, 1e-3 * step);
  const int reach = cvCeil(5 * spread / step) + 1;
  for (int i = 0; i < kStepsOfPeriod * kPhasesOfStep; ++i) {
    const double level = step * i / kPhasesOfStep;
    double mean = 0;
    double square = 0;
    for (int n = cvRound(level / step) - reach; n <= cvRound(level / step) + reach; ++n) {
      const double share =
          Below(((n + 0.5) * step - level) / spread) - Below(((n - 0.5) * step - level) / spread);
      const double off = n * step + flat * (std::floor(n * step + 0.5) - n * step) - level;
      mean += share * off;
      square += share * off * off;
    }
    errors_[i] = {mean, std::max(square - mean * mean, 0.0)};
  }
}

PlaneRounding::Error PlaneRounding::At(double level) const {
  const double place = level / step_ * kPhasesOfStep;
  const double whole = std::floor(place);
  const auto index = [&](double i) {
    const double turns = std::floor(i / static_cast<double>(errors_.size()));
    return static_cast<std::size_t>(i - turns * static_cast<double>(errors_.size()));
  };
  const Error& low = errors_[index(whole)];
  const Error& high = errors_[index(whole + 1)];
  const double share = place - whole;
  return {low.mean + share * (high.mean - low.mean), low.variance + share * (high.variance - low.variance)};
}

double PlaneRounding::Draw(double level, const std::vector<double>& scene, double blocks, cv::RNG& random) const {
  Error sum = {0, 0};
  for (const double one : scene) {
    const Error error = At(level + one);
    sum.mean += error.mean / static_cast<double>(scene.size());
    sum.variance += error.variance / static_cast<double>(scene.size());
  }
  return sum.mean + std::sqrt(sum.variance / std::max(blocks, 1.0)) * random.gaussian(1);
}

CodedMean::CodedMean(const cv::Mat& pixels, const CodecSteps& codec) {
  if (codec.luma == 0) return;
  cv::Mat planes;  // as decoded, to the level
  cv::Mat luma;
  const auto plane_of = [&](int side, int k) {
    const cv::Mat blocks = WholeBlocks(pixels, side);
    cv::cvtColor(blocks.empty() ? pixels : blocks, planes, cv::COLOR_BGR2YCrCb);
    cv::Mat plane;
    cv::extractChannel(planes, plane, k);
    return plane;
  };
  luma = plane_of(kLumaBlockPx, 0);
  noise_ = LumaBeforeCodec(luma, codec);
  planes_.emplace_back(codec.luma, noise_ / kLumaBlockPx, FlatShare(luma, kLumaBlockPx));
  scene_[0] = SceneOf(luma, kLumaBlockPx);
  const double step = codec.chroma > 0 ? codec.chroma : codec.luma;  // files without a table of its own
  for (const int k : {2, 1}) {
    const cv::Mat chroma = plane_of(kChromaBlockPx, k);
    scene_.at(planes_.size()) = SceneOf(chroma, kChromaBlockPx);
    relative_.at(planes_.size()) = (cv::mean(chroma)[0] - 128) / std::max(cv::mean(luma)[0], 1.0);
    planes_.emplace_back(step, ChromaNoise(noise_) / kLumaBlockPx, FlatShare(chroma, kChromaBlockPx));
  }
  relative_[0] = 1;
  cv::cvtColor(pixels, planes, cv::COLOR_BGR2YCrCb);
  channels_ = ChannelRounding(planes);
  const cv::Size part(std::max(pixels.cols / 8, 1), std::max(pixels.rows / 8, 1));
  const cv::Rect middle({(pixels.cols - part.width) / 2, (pixels.rows - part.height) / 2}, part);
  channels_apart_ = std::sqrt(std::max(GreyVariance(ChannelRounding(planes(middle))) - GreyVariance(channels_), 0.0));
  whole_levels_ = HalfInterval(1, std::hypot(noise_ / kLumaShare, Spread(scene_[0])));
}

cv::Vec3d CodedMean::Draw(double area, cv::RNG& random) const {
  if (planes_.empty()) return {};
  std::array<double, 3> off = {};
  for (std::size_t k = 0; k < 3; ++k) {
    const int side = k == 0 ? kLumaBlockPx : kChromaBlockPx;
    const double level = random.uniform(0.0, planes_[k].period());
    off.at(k) = planes_[k].Draw(level, scene_.at(k), area / (side * side), random);
  }
  cv::Vec3d all = RgbOf(off[0], off[1], off[2]) + channels_[random.uniform(0, static_cast<int>(channels_.size()))];
  for (int k = 0; k < 3; ++k) all[k] += whole_levels_ * random.uniform(-1.0, 1.0);
  return all;
}

cv::Mat CodedMean::DrawGrey(const cv::Mat& grid, double area, cv::RNG& random) const {
  cv::Mat off = cv::Mat::zeros(grid.size(), CV_64F);
  if (planes_.empty()) return off;
  random.fill(off, cv::RNG::NORMAL, 0, channels_apart_);
  const cv::Vec3d weights(1, GreyOfMeans(RgbOf(0, 1, 0)), GreyOfMeans(RgbOf(0, 0, 1)));
  const cv::Vec2d slope = {SlopeAcross(grid), SlopeAcross(grid.t())};
  const double middle = cv::mean(grid)[0];
  for (int k = 0; k < 3; ++k) {
    const int side = k == 0 ? kLumaBlockPx : kChromaBlockPx;
    const double level = random.uniform(0.0, planes_[k].period());
    const std::vector<double> scene = WithinPart(slope * relative_.at(k), cvRound(std::sqrt(area) / side));
    for (int row = 0; row < grid.rows; ++row) {
      for (int i = 0; i < grid.cols; ++i) {
        const double here = level + relative_.at(k) * (grid.at<double>(row, i) - middle);
        off.at<double>(row, i) += weights[k] * planes_[k].Draw(here, scene, area / (side * side), random);
      }
    }
  }
  return off;
}

}  // namespace qv
