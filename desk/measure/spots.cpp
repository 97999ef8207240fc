// Spots on a photo of a plain target, at any size.
//
// 1. The light's fall-off: a smooth surface of fourth degree, fitted to means of blocks without those below it. What
//    is left is held relative to it, and to the noise at each place, measured between neighbours.
// 2. A pyramid of halves. At each level two sizes of Gaussian are held against one four times as wide, which takes out
//    what the surface left; that is a matched filter for discs and soft spots alike (89 % of the best for a disc).
// 3. Minima deeper than that level's own noise makes by itself, the surest first; each takes its connected dark
//    region and with it all fainter minima there, so that a large spot's rim makes no spots of its own.

#include "desk/measure/spots.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <functional>
#include <opencv2/core/utility.hpp>
#include <opencv2/imgproc.hpp>

#include "desk/measure/grey.h"
#include "desk/measure/residual_trust.h"

namespace qv {

namespace {

constexpr double kFalse = 0.005;  // spots that pure noise shows in a photo at each size
constexpr double kLeastDeviations = 5.2;
constexpr int kPyramidLevels = 7;
constexpr double kWider = 4;  // of the Gaussian for the ground about a spot
constexpr std::size_t kMostMinima = 20000;
constexpr std::size_t kMostFound = 2000;

// Of the Gaussians at a level, in its pixels; a disc of 3.2 sigmas answers best, so that discs of 3.8, 6.4, 9, 12.8 to
// 290 pixels do.
std::vector<double> SigmasAt(int level) {
  return level == 0 ? std::vector<double>{1.2} : std::vector<double>{1, std::sqrt(2.0)};
}

// By how many deviations noise departs at one of so many places in so few photos.
double DeviationsFor(std::size_t places) {
  double low = kLeastDeviations;
  double high = 8;
  for (int i = 0; i < 40; ++i) {
    const double middle = (low + high) / 2;
    (0.5 * std::erfc(middle / std::sqrt(2.0)) * static_cast<double>(places) > kFalse ? low : high) = middle;
  }
  return high;
}

constexpr double kDeviationsOfMedian = 1.4826;

double MedianOf(std::vector<float>& values) {
  if (values.empty()) return 0;
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

// Of values that were rounded to whole `step`s and none below 0: as if those of a step lay evenly over it. The median
// itself would jump from step to step where noise is not many times as large.
double MedianOfRounded(std::vector<float>& values, double step) {
  if (values.empty()) return 0;
  const double median = MedianOf(values);
  const double begin = std::max(median - step / 2, 0.0);
  const double end = median + step / 2;
  const auto below = std::count_if(values.begin(), values.end(), [=](float v) { return v < begin; });
  const auto until = std::count_if(values.begin(), values.end(), [=](float v) { return v < end; });
  const double missing = static_cast<double>(values.size()) / 2 - static_cast<double>(below);
  return begin + (end - begin) * missing / static_cast<double>(until - below);
}

// Every so many-th value is sampled, about 100000 in all; odd, so that columns change from row to row.
std::size_t SampleStep(const cv::Mat& map) { return map.total() / 100000 * 2 + 1; }

template <typename Value>
std::vector<float> Sampled(const cv::Mat& map, Value&& value) {
  const std::size_t step = SampleStep(map);
  std::vector<float> values;
  for (std::size_t i = 0; i < map.total(); i += step) {
    values.push_back(value(static_cast<int>(i / map.cols), static_cast<int>(i % map.cols)));
  }
  return values;
}

// Grey levels as they are stored, read row by row in levels of 255.
class Photo {
 public:
  explicit Photo(const cv::Mat& photo) : unit_(photo.depth() == CV_16U ? 1.0f / 257 : 1.0f) {
    CV_Assert(!photo.empty() && (photo.depth() == CV_8U || photo.depth() == CV_16U));
    grey_ = GreyOf(photo);
  }

  int rows() const { return grey_.rows; }
  int cols() const { return grey_.cols; }
  cv::Size size() const { return grey_.size(); }
  double step() const { return unit_; }  // between two levels

  /// The levels from `first` on, as many as `out` has.
  void Read(int row, int first, std::vector<float>& out) const {
    if (grey_.depth() == CV_8U) {
      const auto* const levels = grey_.ptr<std::uint8_t>(row) + first;
      for (std::size_t i = 0; i < out.size(); ++i) out[i] = levels[i];
    } else {
      const auto* const levels = grey_.ptr<std::uint16_t>(row) + first;
      for (std::size_t i = 0; i < out.size(); ++i) out[i] = unit_ * levels[i];
    }
  }

 private:
  cv::Mat grey_;
  float unit_;
};

// Where a line of so many values falls when it is shrunk or enlarged to another number.
struct SizeSpan {
  int first = 0;
  double first_share = 1;  // of the first value
  int last = 0;
  double last_share = 1;
};

std::vector<SizeSpan> SpansOf(int from, int to) {
  std::vector<SizeSpan> spans(to);
  const double scale = static_cast<double>(from) / to;
  for (int i = 0; i < to; ++i) {
    const double begin = i * scale;
    const double end = std::min((i + 1) * scale, static_cast<double>(from));
    spans[i].first = std::min(static_cast<int>(begin), from - 1);
    spans[i].last = std::max(static_cast<int>(std::ceil(end)) - 1, spans[i].first);
    spans[i].first_share = spans[i].first + 1 - begin;
    spans[i].last_share = end - spans[i].last;
    if (spans[i].first == spans[i].last) spans[i].first_share = end - begin;
  }
  return spans;
}

// Means over blocks that need not be of whole pixels.
cv::Mat BlockMeans(const Photo& photo, cv::Size size) {
  const std::vector<SizeSpan> across = SpansOf(photo.cols(), size.width);
  const std::vector<SizeSpan> down = SpansOf(photo.rows(), size.height);
  cv::Mat sums = cv::Mat::zeros(size, CV_64F);
  std::vector<float> levels(photo.cols());
  std::vector<double> row_sums(size.width);
  int done = -1;  // row that row_sums are of: two blocks may share it
  for (int y = 0; y < size.height; ++y) {
    auto* const out = sums.ptr<double>(y);
    for (int row = down[y].first; row <= down[y].last; ++row) {
      if (row != done) {
        photo.Read(row, 0, levels);
        for (int x = 0; x < size.width; ++x) {
          const SizeSpan& span = across[x];
          float whole = 0;  // of small whole numbers, or near it
          for (int i = span.first + 1; i < span.last; ++i) whole += levels[i];
          row_sums[x] = whole + span.first_share * levels[span.first] +
                        (span.last > span.first ? span.last_share * levels[span.last] : 0.0);
        }
        done = row;
      }
      const double share = row == down[y].first ? down[y].first_share : row == down[y].last ? down[y].last_share : 1;
      for (int x = 0; x < size.width; ++x) out[x] += share * row_sums[x];
    }
  }
  cv::Mat means;
  sums.convertTo(means, CV_32F, 1.0 * size.area() / (1.0 * photo.rows() * photo.cols()));
  return means;
}

// A picture enlarged by linear interpolation, row by row in their order: as cv::resize does it, to the bit.
class Enlarged {
 public:
  Enlarged(const cv::Mat& picture, cv::Size size)
      : picture_(picture), size_(size), near_(size.width), row_(size.width) {
    const double scale = static_cast<double>(picture.cols) / size.width;
    for (int x = 0; x < size.width; ++x) {
      auto at = static_cast<float>((x + 0.5) * scale - 0.5);
      int left = cvFloor(at);
      at -= static_cast<float>(left);
      if (left < 0) at = static_cast<float>(left = 0);
      if (left >= picture.cols - 1) {
        left = picture.cols - 1;
        at = 0;
      }
      near_[x] = {left, at};
    }
  }

  const std::vector<float>& Row(int y) {
    auto at = static_cast<float>((y + 0.5) * (static_cast<double>(picture_.rows) / size_.height) - 0.5);
    const int above = cvFloor(at);
    at -= static_cast<float>(above);
    const float rest = 1.0f - at;
    const std::vector<float>& first = Widened(std::clamp(above, 0, picture_.rows - 1));
    const std::vector<float>& second = Widened(std::clamp(above + 1, 0, picture_.rows - 1));
    float* const out = row_.data();
    for (int x = 0; x < size_.width; ++x) out[x] = first[x] * rest + second[x] * at;
    return row_;
  }

 private:
  const std::vector<float>& Widened(int row) {
    std::vector<float>& widened = widened_[row % 2];
    if (held_[row % 2] == row) return widened;
    held_[row % 2] = row;
    widened.resize(size_.width);
    const auto* const values = picture_.ptr<float>(row);
    for (int x = 0; x < size_.width; ++x) {
      const auto& [left, share] = near_[x];
      const float right = left + 1 < picture_.cols ? values[left + 1] : values[left];
      widened[x] = values[left] * (1.0f - share) + right * share;
    }
    return widened;
  }

  cv::Mat picture_;
  cv::Size size_;
  std::vector<std::pair<int, float>> near_;  // by column: the left neighbour, and the right one's share
  std::vector<float> row_;
  std::array<std::vector<float>, 2> widened_;
  std::array<int, 2> held_ = {-1, -1};
};

// ---- 1. Fall-off and noise ------------------------------------------------------------------------------------------

constexpr int kTerms = 15;  // of x^i y^j, i + j <= 4

using TermVector = cv::Vec<double, kTerms>;

TermVector Terms(double x, double y) {
  TermVector terms;
  int k = 0;
  double of_x = 1;
  for (int i = 0; i <= 4; ++i) {
    double both = of_x;
    for (int j = 0; i + j <= 4; ++j) {
      terms[k++] = both;
      both *= y;
    }
    of_x *= x;
  }
  return terms;
}

// A surface over -1 to 1 in both directions.
struct Surface {
  TermVector factors;

  // Factors of 1, x, ... x^4 along the line at y.
  std::array<float, 5> AtRow(double y) const {
    std::array<float, 5> row = {};
    int k = 0;
    for (int i = 0; i <= 4; ++i) {
      double sum = 0;
      double of_y = 1;
      for (int j = 0; i + j <= 4; ++j) {
        sum += factors[k++] * of_y;
        of_y *= y;
      }
      row[i] = static_cast<float>(sum);
    }
    return row;
  }
  static float Value(const std::array<float, 5>& row, float x) {
    return std::max(row[0] + x * (row[1] + x * (row[2] + x * (row[3] + x * row[4]))), 1.0f);  // light is never nothing
  }
};

double Place(int i, int count) { return (2 * i + 1.0) / count - 1; }

// Weighted least squares by the normal equations: the terms are few, and their places alike.
TermVector FitTerms(const std::vector<TermVector>& terms, const std::vector<double>& levels,
                    const std::vector<double>& weights) {
  cv::Matx<double, kTerms, kTerms> products = cv::Matx<double, kTerms, kTerms>::zeros();
  TermVector sums;
  for (std::size_t i = 0; i < terms.size(); ++i) {
    if (weights[i] == 0) continue;
    const TermVector weighted = terms[i] * weights[i];
    sums += weighted * levels[i];
    for (int k = 0; k < kTerms; ++k) {
      for (int j = 0; j <= k; ++j) products(k, j) += weighted[k] * terms[i][j];
    }
  }
  for (int k = 0; k < kTerms; ++k) {
    for (int j = k + 1; j < kTerms; ++j) products(k, j) = products(j, k);
  }
  return products.solve(sums, cv::DECOMP_SVD);
}

// A smooth surface through the blocks; those far below or above it are left out in turn.
Surface FitSurface(const cv::Mat& blocks) {
  std::vector<TermVector> terms;
  std::vector<double> levels;
  for (int i = 0; i < static_cast<int>(blocks.total()); ++i) {
    terms.push_back(Terms(Place(i % blocks.cols, blocks.cols), Place(i / blocks.cols, blocks.rows)));
    levels.push_back(blocks.at<float>(i / blocks.cols, i % blocks.cols));
  }
  std::vector<double> weights(terms.size(), 1);
  std::vector<double> left(terms.size());
  Surface surface;
  for (int round = 0; round < 8; ++round) {
    surface.factors = FitTerms(terms, levels, weights);
    std::vector<float> off;
    for (std::size_t i = 0; i < terms.size(); ++i) {
      left[i] = std::abs(levels[i] - terms[i].dot(surface.factors));
      off.push_back(static_cast<float>(left[i]));
    }
    const double scale = std::max(4.685 * kDeviationsOfMedian * MedianOf(off), 1e-6);
    for (std::size_t i = 0; i < terms.size(); ++i) {  // Tukey's biweight
      const double u = std::min(left[i] / scale, 1.0);
      weights[i] = (1 - u * u) * (1 - u * u);
    }
  }
  return surface;
}

constexpr int kTileRows = 48;  // that are looked at, or all where there are fewer

cv::Size TilesOf(const Photo& photo) {
  return {std::clamp(photo.cols() / 60, 1, 12), std::clamp(photo.rows() / 60, 1, 9)};
}

constexpr double kSecondDifference = 1.5;  // variance of v[i] - (v[i - 4] + v[i + 4]) / 2, of a pixel's

struct TileNoise {
  cv::Mat deviation;  // of a pixel, levels
  cv::Mat spread;     // standard uncertainty of that, a share of it
};

// Standard deviation of a pixel by tiles, from second differences of neighbours: gradients and most edges do not count.
TileNoise NoiseByTiles(const Photo& photo) {
  constexpr double kMedianSpread = 1.166;  // of a median of normal values' sizes, times the root of their number
  const cv::Size tiles = TilesOf(photo);
  TileNoise noise = {cv::Mat(tiles, CV_32F), cv::Mat(tiles, CV_32F)};
  for (int i = 0; i < tiles.area(); ++i) {
    const int x = i % tiles.width;
    const int y = i / tiles.width;
    const cv::Rect tile(cv::Point(x * photo.cols() / tiles.width, y * photo.rows() / tiles.height),
                        cv::Point((x + 1) * photo.cols() / tiles.width, (y + 1) * photo.rows() / tiles.height));
    std::vector<float> off;
    std::vector<float> v(tile.width);
    const int step = std::max(1, tile.height / kTileRows);
    for (int row = 0; row < tile.height; row += step) {
      photo.Read(tile.y + row, tile.x, v);
      for (int c = 4; c + 4 < tile.width; c += 3) off.push_back(std::abs(v[c] - 0.5f * (v[c - 4] + v[c + 4])));
    }
    noise.deviation.at<float>(y, x) =
        static_cast<float>(kDeviationsOfMedian * MedianOfRounded(off, photo.step() / 2) / std::sqrt(kSecondDifference));
    noise.spread.at<float>(y, x) =
        static_cast<float>(kMedianSpread / std::sqrt(std::max(1.0, static_cast<double>(off.size()))));
  }
  return noise;
}

// So many rows are worked on together: they stay in the nearest memory, and threads share them out.
constexpr int kStrip = 64;

void ForEachStrip(int rows, const std::function<void(int first, int end, int strip)>& work) {
  cv::parallel_for_({0, (rows + kStrip - 1) / kStrip}, [&](const cv::Range& strips) {
    for (int i = strips.start; i < strips.end; ++i) work(i * kStrip, std::min((i + 1) * kStrip, rows), i);
  });
}

// Departures from the surface over the noise there.
cv::Mat OverNoise(const Photo& photo, const Surface& surface, const cv::Mat& noise) {
  const cv::Mat inverse = 1 / noise;
  cv::Mat relative(photo.size(), CV_32F);
  const auto step = static_cast<float>(2.0 / photo.cols());
  const auto first = static_cast<float>(Place(0, photo.cols()));
  ForEachStrip(photo.rows(), [&](int begin, int end, int) {
    Enlarged factor(inverse, photo.size());
    std::vector<float> levels(photo.cols());
    for (int row = begin; row < end; ++row) {
      const auto factors = surface.AtRow(Place(row, photo.rows()));
      photo.Read(row, 0, levels);
      const float* const scale = factor.Row(row).data();
      auto* const out = relative.ptr<float>(row);
      for (int column = 0; column < photo.cols(); ++column) {
        const float x = first + step * static_cast<float>(column);
        out[column] = scale[column] * (levels[column] - Surface::Value(factors, x));
      }
    }
  });
  return relative;
}

// ---- 2. The pyramid -------------------------------------------------------------------------------------------------

struct Minimum {
  int level;
  double sigma;  // of the Gaussian, in the level's pixels as the place is
  cv::Point at;
  double response;  // below the ground, in noise of a pixel
  double score;     // the same in deviations of such responses
};

struct Pyramid {
  std::vector<cv::Mat> levels;  // departure from the surface over the noise of a pixel
  std::vector<double> noise;    // of each level's own pixels

  double scale(int level) const { return std::ldexp(1.0, level); }
};

Pyramid Build(const cv::Mat& relative) {
  Pyramid pyramid;
  cv::Mat level = relative;
  while (static_cast<int>(pyramid.levels.size()) < kPyramidLevels + 2 && std::min(level.cols, level.rows) >= 4) {
    pyramid.levels.push_back(level);
    std::vector<float> off = Sampled(level, [&](int row, int column) {
      return std::abs(level.at<float>(row, column) - level.at<float>(row, std::abs(column - 2)));
    });
    pyramid.noise.push_back(kDeviationsOfMedian * MedianOf(off) / std::sqrt(2.0));
    cv::Mat half;
    cv::resize(level, half, {(level.cols + 1) / 2, (level.rows + 1) / 2}, 0, 0, cv::INTER_AREA);
    level = half;
  }
  return pyramid;
}

// The ground about spots of a level's size, as it is to be enlarged: from two levels up, where the wide Gaussian is a
// narrow one.
cv::Mat GroundOf(const Pyramid& pyramid, int level, double sigma) {
  const int up = std::min(level + 2, static_cast<int>(pyramid.levels.size()) - 1);
  cv::Mat ground;
  const double there = kWider * sigma / std::ldexp(1.0, up - level);
  cv::GaussianBlur(pyramid.levels[up], ground, {}, there, there, cv::BORDER_REFLECT);
  return ground;
}

// Of some rows of a picture, the row before and the row after besides where there are such.
bool IsLeast(const cv::Mat& rows, int row, int column) {
  for (int i = std::max(row - 1, 0); i <= std::min(row + 1, rows.rows - 1); ++i) {
    for (int j = std::max(column - 1, 0); j <= std::min(column + 1, rows.cols - 1); ++j) {
      if (rows.at<float>(i, j) < rows.at<float>(row, column)) return false;
    }
  }
  return true;
}

// What a strip of a level's response shows.
struct Strip {
  std::vector<Minimum> minima;
  std::vector<float> samples;  // sizes, of every so many-th value
};

// One size of Gaussian, held against the ground.
class SizeSearch {
 public:
  SizeSearch(const Pyramid& pyramid, int level, double sigma)
      : picture_(pyramid.levels[level]), level_(level), sigma_(sigma), ground_(GroundOf(pyramid, level, sigma)) {}

  /// Minima of the response that lie below `loose`, and every so many-th value's size, in strips.
  std::vector<Strip> Look(float loose) const {
    std::vector<Strip> strips((picture_.rows + kStrip - 1) / kStrip);
    ForEachStrip(picture_.rows, [&](int begin, int end, int i) { LookAt(begin, end, loose, strips[i]); });
    return strips;
  }

  cv::Size size() const { return picture_.size(); }

 private:
  void LookAt(int begin, int end, float loose, Strip& strip) const {
    const int top = std::max(begin - 1, 0);
    const int bottom = std::min(end + 1, picture_.rows);
    const int side = 2 * cvCeil(2.5 * sigma_) + 1;
    cv::Mat response;
    cv::GaussianBlur(picture_.rowRange(top, bottom), response, {side, side}, sigma_, sigma_, cv::BORDER_REFLECT);
    Enlarged ground(ground_, picture_.size());
    for (int row = top; row < bottom; ++row) {
      auto* const values = response.ptr<float>(row - top);
      const float* const about = ground.Row(row).data();
      for (int i = 0; i < response.cols; ++i) values[i] -= about[i];
    }
    const std::size_t step = SampleStep(picture_);
    const auto width = static_cast<std::size_t>(picture_.cols);
    for (std::size_t i = (begin * width + step - 1) / step * step; i < end * width; i += step) {
      strip.samples.push_back(
          std::abs(response.at<float>(static_cast<int>(i / width) - top, static_cast<int>(i % width))));
    }
    for (int row = begin; row < end; ++row) {
      const auto* const values = response.ptr<float>(row - top);
      for (int first = 0; first < response.cols; first += kRun) {
        const int last = std::min(first + kRun, response.cols);
        int any = 0;
        for (int i = first; i < last; ++i) any |= static_cast<int>(values[i] < loose);
        for (int i = first; any != 0 && i < last; ++i) {
          if (values[i] >= loose || !IsLeast(response, row - top, i)) continue;
          strip.minima.push_back({level_, sigma_, {i, row}, -values[i], 0});
        }
      }
    }
  }

  static constexpr int kRun = 64;  // of pixels that are looked at one by one only where some is low

  cv::Mat picture_;
  int level_;
  double sigma_;
  cv::Mat ground_;
};

// Minima deeper than noise makes them. How deep that is only the whole response tells; at first it is guessed from a
// white picture's, and looked again where that was too deep.
void AddMinima(const SizeSearch& search, double sigma, double least_depth, double white, std::vector<Minimum>& minima) {
  const double deviations = DeviationsFor(search.size().area());
  constexpr double kCautious = 0.6;
  double loose = -kCautious * std::max(deviations * white, least_depth);
  for (;;) {
    const std::vector<Strip> strips = search.Look(static_cast<float>(loose));
    std::vector<float> off;
    for (const Strip& strip : strips) off.insert(off.end(), strip.samples.begin(), strip.samples.end());
    const double noise = std::max({kDeviationsOfMedian * MedianOf(off), least_depth / deviations, 1e-9});
    if (-deviations * noise > loose) {
      loose = -kCautious * deviations * noise;
      continue;
    }
    const auto limit = static_cast<float>(-deviations * noise);
    const int rim = cvCeil(2 * sigma);
    const auto at_rim = [rim](int at, int count) { return at < rim || at >= count - rim ? std::sqrt(2.0) : 1; };
    for (const Strip& strip : strips) {
      for (Minimum m : strip.minima) {
        // The picture goes on mirrored: at its rim each noisy pixel counts twice.
        const double here = noise * at_rim(m.at.y, search.size().height) * at_rim(m.at.x, search.size().width);
        if (-m.response >= limit || -m.response >= -deviations * here) continue;
        m.score = m.response / here / deviations;
        minima.push_back(m);
      }
    }
    return;
  }
}

std::vector<Minimum> FindMinima(const Pyramid& pyramid, double least_depth) {
  std::vector<Minimum> minima;
  for (int level = 0; level < std::min(kPyramidLevels, static_cast<int>(pyramid.levels.size())); ++level) {
    for (const double sigma : SigmasAt(level)) {
      // White noise of one a pixel keeps so much under the Gaussian.
      const double white = pyramid.noise[level] / (2 * sigma * std::sqrt(CV_PI));
      AddMinima(SizeSearch(pyramid, level, sigma), sigma, least_depth, white, minima);
    }
  }
  std::sort(minima.begin(), minima.end(), [](const Minimum& a, const Minimum& b) { return a.score > b.score; });
  return minima;
}

// ---- 3. Spots -------------------------------------------------------------------------------------------------------

class SpotRegions {
 public:
  SpotRegions(const Pyramid& pyramid, cv::Size photo) : pyramid_(pyramid) {
    taken_ = cv::Mat::zeros((photo.height + 1) / 2, (photo.width + 1) / 2, CV_8U);
  }

  // Lies in a spot's region, or is no more than a smaller spot, seen at a larger size.
  bool IsTaken(const Minimum& m) const {
    if (taken_.at<std::uint8_t>(ToTaken(m.level, m.at)) != 0) return true;
    const double scale = pyramid_.scale(m.level);
    const double sigma = m.sigma * scale;
    const cv::Point2d at = (cv::Point2d(m.at) + cv::Point2d(0.5, 0.5)) * scale - cv::Point2d(0.5, 0.5);
    double explained = 0;
    for (const auto& [centre, mass] : masses_) {
      const cv::Point2d off = centre - at;
      explained += mass * std::exp(-0.5 * off.dot(off) / (sigma * sigma)) / (2 * CV_PI * sigma * sigma);
    }
    return m.score * (1 - explained / m.response) < 1;
  }

  // The dark region about a minimum, taken from then on: at the finest level on which its depth stands out of the
  // noise. The spot's contrast is left as a multiple of the noise.
  Spot Take(const Minimum& m) {
    int level = m.level;
    const double depth = Depth(level, m.at);
    while (level > 0 && depth > 6 * pyramid_.noise[level - 1]) --level;
    const double shrink = std::ldexp(1.0, m.level - level);
    const cv::Mat& whole = pyramid_.levels[level];
    const cv::Point at =
        Inside(cv::Point(cvRound((m.at.x + 0.5) * shrink - 0.5), cvRound((m.at.y + 0.5) * shrink - 0.5)), whole);
    const int reach = cvCeil(12 * shrink);  // some five radii
    const cv::Rect window =
        cv::Rect(at.x - reach, at.y - reach, 2 * reach + 1, 2 * reach + 1) & cv::Rect({}, whole.size());
    cv::Mat part;
    cv::GaussianBlur(whole(window), part, {}, 0.7, 0.7, cv::BORDER_REPLICATE);
    const double ground = Ground(part);
    cv::Mat dark = part < ground - 0.5 * depth;
    cv::Mat labels;
    cv::Mat boxes;
    cv::Mat centres;
    cv::connectedComponentsWithStats(dark, labels, boxes, centres, 8, CV_32S);
    const int label = LabelNear(labels, at - window.tl(), shrink);
    const double scale = pyramid_.scale(level);
    Spot spot = {};
    if (label == 0) {  // a minimum between dark pixels
      const double side = 3.2 * pyramid_.scale(m.level);
      spot.area_px = CV_PI / 4 * side * side;
      spot.centre = (cv::Point2d(at) + cv::Point2d(0.5, 0.5)) * scale - cv::Point2d(0.5, 0.5);
      dark = cv::Mat::zeros(dark.size(), CV_8U);
    } else {
      spot.area_px = boxes.at<int>(label, cv::CC_STAT_AREA) * scale * scale;
      const cv::Point2d middle(centres.at<double>(label, 0) + window.x, centres.at<double>(label, 1) + window.y);
      spot.centre = (middle + cv::Point2d(0.5, 0.5)) * scale - cv::Point2d(0.5, 0.5);
      dark = labels == label;
    }
    const cv::Point middle = Inside(cv::Point(cvRound((spot.centre.x + 0.5) / scale - 0.5) - window.x,
                                              cvRound((spot.centre.y + 0.5) / scale - 0.5) - window.y),
                                    part);
    spot.contrast = std::max(depth, ground - part.at<float>(middle));
    spot.score = m.score;
    masses_.emplace_back(spot.centre, 2 * spot.contrast * spot.area_px);  // at least: a soft one has half as much again
    Mark(dark, window.tl(), level, m);
    return spot;
  }

 private:
  static cv::Point Inside(cv::Point p, const cv::Mat& of) {
    return {std::clamp(p.x, 0, of.cols - 1), std::clamp(p.y, 0, of.rows - 1)};
  }

  cv::Point ToTaken(int level, cv::Point at) const {
    const double factor = std::ldexp(1.0, level - 1);
    return Inside({static_cast<int>((at.x + 0.5) * factor), static_cast<int>((at.y + 0.5) * factor)}, taken_);
  }

  static double Ground(const cv::Mat& part) {  // the median of the window's rim
    std::vector<float> rim;
    for (int i = 0; i < part.rows; ++i) {
      for (int j = 0; j < part.cols; ++j) {
        const bool inner = i > part.rows / 8 && i < part.rows - 1 - part.rows / 8 && j > part.cols / 8 &&
                           j < part.cols - 1 - part.cols / 8;
        if (!inner) rim.push_back(part.at<float>(i, j));
      }
    }
    return MedianOf(rim);
  }

  // In the middle of the spot: mean of the level's pixels next to the minimum, below the ground.
  double Depth(int level, cv::Point at) const {
    const cv::Mat& whole = pyramid_.levels[level];
    const cv::Rect all({}, whole.size());
    const cv::Mat middle = whole(cv::Rect(at.x - 1, at.y - 1, 3, 3) & all);
    const double ground = Ground(whole(cv::Rect(at.x - 8, at.y - 8, 17, 17) & all));
    return std::max(ground - cv::mean(middle)[0], 1e-6);
  }

  static int LabelNear(const cv::Mat& labels, cv::Point at, double reach) {
    int label = labels.at<int>(at);
    for (int r = 1; label == 0 && r <= cvCeil(reach); ++r) {
      for (int i = -r; i <= r && label == 0; ++i) {
        for (int j = -r; j <= r && label == 0; ++j) label = labels.at<int>(Inside(at + cv::Point(j, i), labels));
      }
    }
    return label;
  }

  // The region and a rim of half the size at which it was seen: what its blurred edge throws up is no spot.
  void Mark(const cv::Mat& dark, cv::Point corner, int level, const Minimum& m) {
    const double factor = std::ldexp(1.0, level - 1);
    std::vector<std::vector<cv::Point>> outlines;
    cv::findContours(dark, outlines, cv::RETR_EXTERNAL, cv::CHAIN_APPROX_SIMPLE, corner);
    const int rim = std::max(2, cvRound(1.6 * std::ldexp(1.0, m.level - 1)));
    for (std::vector<cv::Point>& outline : outlines) {
      for (cv::Point& p : outline) p = {cvRound((p.x + 0.5) * factor), cvRound((p.y + 0.5) * factor)};
      cv::drawContours(taken_, std::vector<std::vector<cv::Point>>{outline}, 0, cv::Scalar(255), cv::FILLED);
      cv::polylines(taken_, outline, true, cv::Scalar(255), 2 * rim);
    }
    cv::circle(taken_, ToTaken(m.level, m.at), cvCeil(3.2 * std::ldexp(1.0, m.level - 1)), cv::Scalar(255), cv::FILLED);
  }

  const Pyramid& pyramid_;
  cv::Mat taken_;                                       // at half the photo's size
  std::vector<std::pair<cv::Point2d, double>> masses_;  // places, and depths times pixels
};

constexpr double kLeastNoise = 0.5;  // steps of the levels: less does not show

// The photo without its light's fall-off.
struct Target {
  cv::Mat relative;      // departures over the noise there
  cv::Mat share;         // the noise over the light, by blocks
  double shrink = 1;     // blocks to a pixel
  TileNoise tiles;       // the noise by itself
  bool stepped = false;  // noise is less than a step of the levels: rounding makes edges of its own

  float ShareAt(cv::Point2d at) const {
    return share.at<float>(std::clamp(static_cast<int>(at.y * shrink), 0, share.rows - 1),
                           std::clamp(static_cast<int>(at.x * shrink), 0, share.cols - 1));
  }
};

Target LookAtTarget(const Photo& photo) {
  Target target;
  target.shrink = std::min(1.0, 128.0 / std::max(photo.cols(), photo.rows()));
  const cv::Mat blocks = BlockMeans(
      photo, {std::max(cvRound(photo.cols() * target.shrink), 1), std::max(cvRound(photo.rows() * target.shrink), 1)});
  const Surface surface = FitSurface(blocks);
  target.tiles = NoiseByTiles(photo);
  // A spot must then be deeper than the edges that rounding makes.
  target.stepped =
      cv::countNonZero(target.tiles.deviation < 0.9 * photo.step()) * 2 > target.tiles.deviation.size().area();
  cv::Mat noise;
  cv::max(target.tiles.deviation, kLeastNoise * photo.step(), noise);
  cv::resize(noise, noise, blocks.size(), 0, 0, cv::INTER_LINEAR);
  target.relative = OverNoise(photo, surface, noise);
  target.share = noise;
  for (int row = 0; row < target.share.rows; ++row) {
    const auto factors = surface.AtRow(Place(row, target.share.rows));
    for (int column = 0; column < target.share.cols; ++column) {
      target.share.at<float>(row, column) /=
          Surface::Value(factors, static_cast<float>(Place(column, target.share.cols)));
    }
  }
  return target;
}

// By which share a tile's noise is known to read high: the differences stand on half steps, and between these their
// median is read off a straight line, though their density falls; to second order.
double KnownToReadHigh(double deviation, double step) {
  const double spread = deviation * std::sqrt(kSecondDifference);
  const double median = spread / kDeviationsOfMedian;
  const double width = step / 2;
  const double begin = std::max((std::floor(median / width + 0.5) - 0.5) * width, 0.0);
  const double end = (std::floor(median / width + 0.5) + 0.5) * width;
  return ((median - begin) * (end - median) / 2 - width * width / 24) / (spread * spread);
}

// Of the median over the photo: what the tiles' own scatter does to it is drawn (JCGM 101).
Uncertainty OfNoise(const Target& target, double step, double noise) {
  constexpr int kDraws = 200;
  std::vector<float> levels(target.tiles.deviation.begin<float>(), target.tiles.deviation.end<float>());
  const double deviation = MedianOf(levels);
  if (deviation <= kLeastNoise * step) return {noise / std::sqrt(3.0), noise, std::sqrt(3.0), kSpotMethod};
  // Rounding adds a twelfth of a step squared, evenly only where noise carries levels over the whole step.
  const double before = std::max(std::pow(deviation / step, 2) - 1.0 / 12, 0.0);
  const double uneven = 2 * std::exp(-2 * CV_PI * CV_PI * before);
  cv::Mat shares;
  cv::resize(target.share, shares, {32, 24}, 0, 0, cv::INTER_AREA);
  cv::RNG random(kDraws);
  double squares = 0;
  for (int i = 0; i < kDraws; ++i) {
    cv::Mat off(target.tiles.spread.size(), CV_32F);
    random.fill(off, cv::RNG::NORMAL, 0, 1);
    off = off.mul(target.tiles.spread);
    cv::resize(off, off, shares.size(), 0, 0, cv::INTER_LINEAR);
    std::vector<float> drawn(shares.total());
    for (int k = 0; k < static_cast<int>(drawn.size()); ++k) {
      drawn[k] = shares.at<float>(k / shares.cols, k % shares.cols) * (1 + off.at<float>(k / off.cols, k % off.cols));
    }
    squares += std::pow(MedianOf(drawn) - noise, 2) / kDraws;
  }
  return FromKnownError(noise * KnownToReadHigh(deviation, step), std::hypot(std::sqrt(squares), uneven * noise),
                        kSpotMethod);
}

}  // namespace

SpotTrust SpotFinding::Trust(const Spot& spot) const {
  // The 95 % quantiles of simulated spots' errors, half of them sharp and half soft, 4 to 80 px, by how far they stand
  // out of the noise. From kClear on a spot is seen at a scale fine enough for its depth.
  constexpr double kClear = 50;
  const double seen = spot.contrast * std::sqrt(spot.area_px) / noise;
  const auto of_quantile = [](double size) { return Uncertainty{size / 1.96, size, 1.96, kSpotMethod}; };
  return {of_quantile(spot.area_px * (0.48 + 1.5 / seen)),
          of_quantile(spot.contrast * ((seen < kClear ? 0.45 : 0.1) + 6 / seen)),
          of_quantile(spot.diameter_px() * (0.015 + 1.2 / seen))};
}

double Spot::diameter_px() const { return 2 * std::sqrt(area_px / CV_PI); }

SpotFinding FindSpots(const cv::Mat& photo) {
  const Target target = LookAtTarget(Photo(photo));
  const Pyramid pyramid = Build(target.relative);
  SpotRegions regions(pyramid, photo.size());
  std::vector<Minimum> minima = FindMinima(pyramid, target.stepped ? 1.5 : 0);
  SpotFinding found;
  found.cut_short = minima.size() > kMostMinima;
  if (found.cut_short) minima.resize(kMostMinima);
  std::vector<float> shares(target.share.begin<float>(), target.share.end<float>());
  found.noise = MedianOf(shares);
  found.of_noise = OfNoise(target, Photo(photo).step(), found.noise);
  for (const Minimum& minimum : minima) {
    if (regions.IsTaken(minimum)) continue;
    if (found.spots.size() == kMostFound) {
      found.cut_short = true;
      break;
    }
    Spot spot = regions.Take(minimum);
    spot.contrast *= target.ShareAt(spot.centre);
    found.spots.push_back(spot);
    found.largest_area = std::max(found.largest_area, spot.area_px);
    found.dark_share += spot.area_px / static_cast<double>(photo.total());
  }
  return found;
}

}  // namespace qv
