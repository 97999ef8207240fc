#include "desk/measure/coded_mean.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <map>
#include <opencv2/imgproc.hpp>
#include <utility>

#include "desk/measure/uncertainty.h"

namespace qv {

namespace {

constexpr int kLumaBlockPx = 8;     // pixels a side, of luma
constexpr int kChromaBlockPx = 16;  // of halved chroma
constexpr int kPhasesOfStep = 32;   // of a step that are looked at
constexpr int kGrey = 128;          // of chroma
constexpr int kStepsOfPeriod = 8;   // of an eighth's multiple, until whole levels come again

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

// Of the mean over a length that lies anywhere about blocks of so many pixels a side: the square of what a frequency
// within them adds to it, in the mean of all places.
double PartOfMean(double length, int side, int frequency) {
  const int pixels = std::max(cvRound(length), 1);
  const double scale = frequency == 0 ? std::sqrt(1.0 / side) : std::sqrt(2.0 / side);
  double squares = 0;
  for (int first = 0; first < side; ++first) {
    double in_block = 0;
    for (int i = first; i <= first + pixels; ++i) {
      if (i == first + pixels || (i % side == 0 && i > first)) {
        squares += in_block * in_block / side;
        in_block = 0;
      }
      in_block += scale * std::cos(CV_PI * frequency * (i % side + 0.5) / side);
    }
  }
  return squares / (1.0 * pixels * pixels);
}

// Blocks that a mean over a square is as good as: those it cuts count less.
double BlocksOf(double area, int side) {
  const double part = PartOfMean(std::sqrt(area), side, 0);
  return 1 / (part * part * side * side);
}

// Variance of a mean over a square, of what noise leaves in luma's coefficients but for blocks' means.
double DetailIn(double area, double noise, const CodecSteps& codec) {
  std::array<double, kLumaBlockPx> part = {};
  for (int i = 0; i < kLumaBlockPx; ++i) part.at(i) = PartOfMean(std::sqrt(area), kLumaBlockPx, i);
  double sum = 0;
  for (int i = 1; i < kLumaBlockPx * kLumaBlockPx; ++i) {
    const float step = codec.luma_table.val[i];
    if (step > 0) sum += part.at(i / kLumaBlockPx) * part.at(i % kLumaBlockPx) * RoundedSquare(noise, step);
  }
  return sum;
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
  constexpr int kMost = 12;      // places a side
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
    const int row = i / side;
    off.push_back(slope[0] * ((i % side + 0.5) / side - 0.5) + slope[1] * ((row + 0.5) / side - 0.5));
  }
  return off;
}

// How often samples of chroma are blue and red such, as shares.
ChromaCounts ChromaOf(const cv::Mat& planes) {
  constexpr int kMostSamples = 20000;
  ChromaCounts counts;
  const int step = static_cast<int>(planes.total()) / kMostSamples + 1;
  const double one = step / static_cast<double>(planes.total());
  for (int i = 0; i < static_cast<int>(planes.total()); i += step) {
    const auto& sample = planes.at<cv::Vec3b>(i / planes.cols, i % planes.cols);
    counts[{sample[2], sample[1]}] += one;
  }
  return counts;
}

// Of a picture cut as a grid is, the part of the grid's so many-th value.
cv::Mat PartOf(const cv::Mat& picture, const cv::Mat& grid, int number) {
  const auto range = [](int i, int of, int length) { return cv::Range(i * length / of, (i + 1) * length / of); };
  return picture(range(number / grid.cols, grid.rows, picture.rows),
                 range(number % grid.cols, grid.cols, picture.cols));
}

// What rounding to channels adds to the mean of such chroma, moved by whole levels, with luma of whole levels.
cv::Vec3d ChannelRounding(const ChromaCounts& counts, cv::Point moved) {
  cv::Vec3d error;
  for (const auto& [chroma, share] : counts) {
    const cv::Vec3d exact = RgbOf(0, chroma.first - kGrey + moved.x, chroma.second - kGrey + moved.y);
    for (int k = 0; k < 3; ++k) error[k] += (std::round(exact[k]) - exact[k]) * share;
  }
  return error;
}

// The same of grey, which is rounded in its turn.
double GreyRounding(const ChromaCounts& counts, cv::Point moved) {
  double error = 0;
  for (const auto& [chroma, share] : counts) {
    cv::Vec3d rgb = RgbOf(0, chroma.first - kGrey + moved.x, chroma.second - kGrey + moved.y);
    const double exact = GreyOfMeans(rgb);
    for (int k = 0; k < 3; ++k) rgb[k] = std::round(rgb[k]);
    error += (std::round(GreyOfMeans(rgb)) - exact) * share;
  }
  return error;
}

// What a part of so many pixels may have of it: blocks of one value each.
ChromaCounts SomeOf(const ChromaCounts& counts, double area, cv::RNG& random) {
  const int blocks = std::max(cvRound(area / (kChromaBlockPx * kChromaBlockPx)), 1);
  ChromaCounts some;
  for (int i = 0; i < blocks; ++i) {
    double left = random.uniform(0.0, 1.0);
    auto chosen = counts.begin();
    while (std::next(chosen) != counts.end() && left > chosen->second) left -= (chosen++)->second;
    some[chosen->first] += 1.0 / blocks;
  }
  return some;
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

PlaneRounding::PlaneRounding(double step, double noise, double flat)
    : step_(step), errors_(kStepsOfPeriod * kPhasesOfStep) {
  const double spread = std::max(noise, 1e-3 * step);
  const int reach = cvCeil(5 * spread / step) + 1;
  for (int i = 0; i < kStepsOfPeriod * kPhasesOfStep; ++i) {
    const double level = step * i / kPhasesOfStep;
    double mean = 0;
    double square = 0;
    for (int n = cvRound(level / step) - reach; n <= cvRound(level / step) + reach; ++n) {
      const double share = Below(((n + 0.5) * step - level) / spread) - Below(((n - 0.5) * step - level) / spread);
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

PlaneRounding PlaneRounding::Over(const std::vector<double>& scene) const {
  PlaneRounding over = *this;
  const auto n = static_cast<double>(scene.size());
  for (std::size_t i = 0; i < errors_.size(); ++i) {
    over.errors_[i] = {0, 0};
    for (const double one : scene) {
      const Error error = At(step_ * static_cast<double>(i) / kPhasesOfStep + one);
      over.errors_[i].mean += error.mean / n;
      over.errors_[i].variance += error.variance / n;
    }
  }
  return over;
}

double PlaneRounding::Draw(double level, double blocks, cv::RNG& random) const {
  const Error error = At(level);
  return error.mean + std::sqrt(error.variance / std::max(blocks, 1.0)) * random.gaussian(1);
}

CodedMean::CodedMean(const cv::Mat& pixels, const CodecSteps& codec) : codec_(codec) {
  if (codec.luma == 0) return;
  const auto plane_of = [&](int side, int k) {  // as decoded, to the level
    const cv::Mat blocks = WholeBlocks(pixels, side);
    cv::Mat planes;
    cv::Mat plane;
    cv::cvtColor(blocks.empty() ? pixels : blocks, planes, cv::COLOR_BGR2YCrCb);
    cv::extractChannel(planes, plane, k);
    return plane;
  };
  const cv::Mat luma = plane_of(kLumaBlockPx, 0);
  noise_ = LumaBeforeCodec(luma, codec);
  planes_.emplace_back(codec.luma, noise_ / kLumaBlockPx, FlatShare(luma, kLumaBlockPx));
  const std::vector<double> scene = SceneOf(luma, kLumaBlockPx);
  seen_.push_back(planes_.back().Over(scene));
  const double step = codec.chroma > 0 ? codec.chroma : codec.luma;  // files without a table of its own
  for (const int k : {2, 1}) {
    const cv::Mat chroma = plane_of(kChromaBlockPx, k);
    decoded_mean_.at(planes_.size()) = cv::mean(chroma)[0] - kGrey;
    relative_.at(planes_.size()) = decoded_mean_.at(planes_.size()) / std::max(cv::mean(luma)[0], 1.0);
    planes_.emplace_back(step, ChromaNoise(noise_) / kLumaBlockPx, FlatShare(chroma, kChromaBlockPx));
    seen_.push_back(planes_.back().Over(SceneOf(chroma, kChromaBlockPx)));
  }
  relative_[0] = 1;
  decoded_mean_[0] = cv::mean(luma)[0];
  cv::cvtColor(pixels, decoded_, cv::COLOR_BGR2YCrCb);
  chroma_ = ChromaOf(decoded_);
  whole_levels_ = HalfInterval(1, std::hypot(noise_ / kLumaShare, scene.size() < 2 ? 0 : Spread(scene)));
}

CodedMean::Place CodedMean::PlaceOf(int plane, const PlaneRounding& rounding, double level, double area,
                                    cv::RNG& random) {
  const int side = plane == 0 ? kLumaBlockPx : kChromaBlockPx;
  return {level, rounding.Draw(level, area / (side * side), random)};
}

// Such that the decoded mean comes about: where that lies about the steps tells something.
CodedMean::Place CodedMean::SeenPlace(int plane, double area, cv::RNG& random) const {
  constexpr int kTries = 60;
  constexpr double kAlike = 0.1;  // levels
  const double reach = 0.6 + planes_[plane].step();
  Place place = {};
  for (int i = 0; i < kTries; ++i) {
    place = PlaceOf(plane, seen_[plane], decoded_mean_[plane] + random.uniform(-reach, reach), area, random);
    if (std::fabs(place.level + place.off - decoded_mean_[plane]) < kAlike) break;
  }
  return place;
}

// Anywhere; chroma about grey, since what steps and channels round is bound to whole levels.
std::array<CodedMean::Place, 3> CodedMean::AnyPlaces(const Planes& planes, double area, cv::RNG& random) {
  constexpr double kReach = 60;
  std::array<Place, 3> places = {};
  for (int k = 0; k < 3; ++k) places.at(k) = PlaceOf(k, planes[k], random.uniform(-kReach, kReach), area, random);
  return places;
}

// By which whole levels decoded chroma then differs from what it is.
cv::Point CodedMean::MovedBy(const std::array<Place, 3>& places) const {
  const auto moved = [&](int k) { return cvRound(places.at(k).level + places.at(k).off - decoded_mean_[k]); };
  return {moved(1), moved(2)};
}

cv::Vec3d CodedMean::InChannels(const std::array<Place, 3>& places, cv::Point moved, cv::RNG& random) const {
  cv::Vec3d all = RgbOf(places[0].off, places[1].off, places[2].off) + ChannelRounding(chroma_, moved);
  for (int k = 0; k < 3; ++k) all[k] += whole_levels_ * random.uniform(-1.0, 1.0);
  return all;
}

cv::Vec3d CodedMean::Draw(double area, cv::RNG& random) const {
  if (planes_.empty()) return {};
  return InChannels({SeenPlace(0, area, random), SeenPlace(1, area, random), SeenPlace(2, area, random)}, {}, random);
}

cv::Vec3d CodedMean::DrawOther(double area, cv::RNG& random) const {
  if (planes_.empty()) return {};
  const std::array<Place, 3> places = AnyPlaces(seen_, area, random);
  return InChannels(places, MovedBy(places), random);
}

std::vector<double> CodedMean::DrawGreyOfPart(double area, int draws, cv::RNG& random) const {
  std::vector<double> drawn(draws);
  if (planes_.empty()) return drawn;
  const double detail = std::sqrt(DetailIn(area, noise_, codec_));
  for (double& one : drawn) {
    const std::array<Place, 3> places = AnyPlaces(planes_, area, random);
    one = GreyOfMeans(RgbOf(places[0].off, places[1].off, places[2].off)) +
          GreyRounding(SomeOf(chroma_, area, random), MovedBy(places));
    one += detail * random.gaussian(1);
  }
  return drawn;
}

std::vector<cv::Mat> CodedMean::DrawGrey(const cv::Mat& grid, double area, double share, double rounded, int draws,
                                         cv::RNG& random) const {
  std::vector<cv::Mat> drawn(draws);
  std::vector<ChromaCounts> chroma;
  for (int i = 0; i < static_cast<int>(grid.total()); ++i) chroma.push_back(ChromaOf(PartOf(decoded_, grid, i)));
  const double detail = std::sqrt(DetailIn(area, noise_, codec_) + rounded);
  const cv::Vec3d weights(1, GreyOfMeans(RgbOf(0, 1, 0)), GreyOfMeans(RgbOf(0, 0, 1)));
  const cv::Vec2d slope = {SlopeAcross(grid), SlopeAcross(grid.t())};
  const cv::Mat about = grid - cv::mean(grid)[0];
  Planes planes;
  cv::Vec3d blocks;
  for (int k = 0; k < 3; ++k) {
    const int side = k == 0 ? kLumaBlockPx : kChromaBlockPx;
    planes.push_back(planes_[k].Over(WithinPart(slope * share * relative_.at(k), cvRound(std::sqrt(area) / side))));
    blocks[k] = BlocksOf(area, side);
  }
  for (cv::Mat& off : drawn) {
    off.create(grid.size(), CV_64F);
    random.fill(off, cv::RNG::NORMAL, 0, detail);
    const std::array<Place, 3> places = AnyPlaces(seen_, static_cast<double>(decoded_.total()), random);
    const cv::Point moved = MovedBy(places);
    for (std::size_t i = 0; i < chroma.size(); ++i) {
      double& one = off.begin<double>()[static_cast<int>(i)];
      one += GreyRounding(share < 1 ? SomeOf(chroma[i], area, random) : chroma[i], moved);
      for (int k = 0; k < 3; ++k) {
        const double here = places.at(k).level + relative_.at(k) * about.begin<double>()[static_cast<int>(i)];
        one += weights[k] * planes[k].Draw(here, blocks[k], random);
      }
    }
  }
  return drawn;
}

}  // namespace qv
