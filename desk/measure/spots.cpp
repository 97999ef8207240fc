// Spots on a photo of a plain target, at any size.
//
// 1. The light's fall-off: a smooth surface of fourth degree, fitted to means of blocks without those that lie below
// it.
//    What is left is held relative to it, and to the noise at each place, measured between neighbours.
// 2. A pyramid of halves. At each level two sizes of Gaussian are held against one four times as wide, which takes out
//    what the surface left; that is a matched filter for discs and soft spots alike (89 % of the best for a disc).
// 3. Minima deeper than that level's own noise makes by itself, the surest first; each takes its connected dark region
// and
//    with it all fainter minima there, so that a large spot's rim makes no spots of its own.

#include "desk/measure/spots.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>

namespace qv {

namespace {

constexpr double kFalse = 0.005;  // spots that pure noise shows in a photo at each size
constexpr double kLeastDeviations = 5.2;
constexpr int kLevels = 7;
constexpr double kWider = 4;  // of the Gaussian for the ground about a spot
constexpr std::size_t kMostMinima = 20000;
constexpr std::size_t kMostSpots = 2000;

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

double MedianOf(std::vector<float>& values) {
  if (values.empty()) return 0;
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

// Every so many-th value, at most about 100000.
template <typename Value>
std::vector<float> Sampled(const cv::Mat& map, Value&& value) {
  const std::size_t step = map.total() / 100000 * 2 + 1;  // odd, so that columns change from row to row
  std::vector<float> values;
  for (std::size_t i = 0; i < map.total(); i += step) {
    values.push_back(value(static_cast<int>(i / map.cols), static_cast<int>(i % map.cols)));
  }
  return values;
}

// ---- 1. Fall-off and noise ------------------------------------------------------------------------------------------

constexpr int kTerms = 15;  // of x^i y^j, i + j <= 4

std::array<double, kTerms> Terms(double x, double y) {
  std::array<double, kTerms> terms = {};
  int k = 0;
  for (int i = 0; i <= 4; ++i) {
    for (int j = 0; i + j <= 4; ++j) terms[k++] = std::pow(x, i) * std::pow(y, j);
  }
  return terms;
}

// A surface over -1 to 1 in both directions.
struct Surface {
  cv::Mat factors;  // of the terms

  // Factors of 1, x, ... x^4 along the line at y.
  std::array<float, 5> AtRow(double y) const {
    std::array<float, 5> row = {};
    int k = 0;
    for (int i = 0; i <= 4; ++i) {
      double sum = 0;
      for (int j = 0; i + j <= 4; ++j) sum += factors.at<double>(k++) * std::pow(y, j);
      row[i] = static_cast<float>(sum);
    }
    return row;
  }
  static float Value(const std::array<float, 5>& row, float x) {
    return std::max(row[0] + x * (row[1] + x * (row[2] + x * (row[3] + x * row[4]))), 1.0f);  // light is never nothing
  }
};

double Place(int i, int count) { return (2 * i + 1.0) / count - 1; }

// A smooth surface through the blocks; those far below or above it are left out in turn.
Surface FitSurface(const cv::Mat& blocks) {
  const int count = static_cast<int>(blocks.total());
  cv::Mat terms(count, kTerms, CV_64F);
  cv::Mat levels(count, 1, CV_64F);
  for (int i = 0; i < count; ++i) {
    const auto at = Terms(Place(i % blocks.cols, blocks.cols), Place(i / blocks.cols, blocks.rows));
    for (int k = 0; k < kTerms; ++k) terms.at<double>(i, k) = at[k];
    levels.at<double>(i) = blocks.at<float>(i / blocks.cols, i % blocks.cols);
  }
  cv::Mat weights = cv::Mat::ones(count, 1, CV_64F);
  Surface surface;
  for (int round = 0; round < 8; ++round) {
    cv::Mat weighted = terms.clone();
    for (int k = 0; k < kTerms; ++k) weighted.col(k) = weighted.col(k).mul(weights);
    cv::solve(weighted.t() * terms, weighted.t() * levels, surface.factors, cv::DECOMP_SVD);
    const cv::Mat left = levels - terms * surface.factors;
    std::vector<float> off;
    for (int i = 0; i < count; ++i) off.push_back(static_cast<float>(std::abs(left.at<double>(i))));
    const double scale = std::max(4.685 * 1.4826 * MedianOf(off), 1e-6);
    for (int i = 0; i < count; ++i) {  // Tukey's biweight
      const double u = std::min(std::abs(left.at<double>(i)) / scale, 1.0);
      weights.at<double>(i) = (1 - u * u) * (1 - u * u);
    }
  }
  return surface;
}

// Standard deviation of a pixel by tiles, from second differences of neighbours: gradients and most edges do not count.
cv::Mat NoiseByTiles(const cv::Mat& grey) {
  const cv::Size tiles(std::clamp(grey.cols / 60, 1, 12), std::clamp(grey.rows / 60, 1, 9));
  cv::Mat noise(tiles, CV_32F);
  for (int i = 0; i < tiles.area(); ++i) {
    const int x = i % tiles.width;
    const int y = i / tiles.width;
    const cv::Rect tile(cv::Point(x * grey.cols / tiles.width, y * grey.rows / tiles.height),
                        cv::Point((x + 1) * grey.cols / tiles.width, (y + 1) * grey.rows / tiles.height));
    const cv::Mat part = grey(tile);
    std::vector<float> off;
    const int step = std::max(1, part.rows / 48);
    for (int row = 0; row < part.rows; row += step) {
      const auto* const v = part.ptr<float>(row);
      for (int c = 4; c + 4 < part.cols; c += 3) off.push_back(std::abs(v[c] - 0.5f * (v[c - 4] + v[c + 4])));
    }
    noise.at<float>(y, x) = static_cast<float>(1.4826 * MedianOf(off) / std::sqrt(1.5));
  }
  return noise;
}

// Departures from the surface over the noise there.
cv::Mat OverNoise(const cv::Mat& grey, const Surface& surface, const cv::Mat& noise) {
  cv::Mat relative;
  cv::resize(1 / noise, relative, grey.size(), 0, 0, cv::INTER_LINEAR);
  const auto step = static_cast<float>(2.0 / grey.cols);
  const auto first = static_cast<float>(Place(0, grey.cols));
  for (int row = 0; row < grey.rows; ++row) {
    const auto factors = surface.AtRow(Place(row, grey.rows));
    const auto* const levels = grey.ptr<float>(row);
    auto* const out = relative.ptr<float>(row);
    for (int column = 0; column < grey.cols; ++column) {
      const float x = first + step * static_cast<float>(column);
      out[column] *= levels[column] - Surface::Value(factors, x);
    }
  }
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
  while (static_cast<int>(pyramid.levels.size()) < kLevels + 2 && std::min(level.cols, level.rows) >= 4) {
    pyramid.levels.push_back(level);
    std::vector<float> off = Sampled(level, [&](int row, int column) {
      return std::abs(level.at<float>(row, column) - level.at<float>(row, std::abs(column - 2)));
    });
    pyramid.noise.push_back(1.4826 * MedianOf(off) / std::sqrt(2.0));
    cv::Mat half;
    cv::resize(level, half, {(level.cols + 1) / 2, (level.rows + 1) / 2}, 0, 0, cv::INTER_AREA);
    level = half;
  }
  return pyramid;
}

// The ground about spots of a level's size: from two levels up, where the wide Gaussian is a narrow one.
cv::Mat GroundOf(const Pyramid& pyramid, int level, double sigma) {
  const int up = std::min(level + 2, static_cast<int>(pyramid.levels.size()) - 1);
  cv::Mat ground;
  const double there = kWider * sigma / std::ldexp(1.0, up - level);
  cv::GaussianBlur(pyramid.levels[up], ground, {}, there, there, cv::BORDER_REFLECT);
  cv::resize(ground, ground, pyramid.levels[level].size(), 0, 0, cv::INTER_LINEAR);
  return ground;
}

bool IsLeast(const cv::Mat& response, int row, int column) {
  for (int i = std::max(row - 1, 0); i <= std::min(row + 1, response.rows - 1); ++i) {
    for (int j = std::max(column - 1, 0); j <= std::min(column + 1, response.cols - 1); ++j) {
      if (response.at<float>(i, j) < response.at<float>(row, column)) return false;
    }
  }
  return true;
}

void AddMinima(const cv::Mat& response, int level, double sigma, double least_depth, std::vector<Minimum>& minima) {
  const double deviations = DeviationsFor(response.total());
  std::vector<float> off =
      Sampled(response, [&](int row, int column) { return std::abs(response.at<float>(row, column)); });
  const double noise = std::max({1.4826 * MedianOf(off), least_depth / deviations, 1e-9});
  const auto limit = static_cast<float>(-deviations * noise);
  const int rim = cvCeil(2 * sigma);
  for (int row = 0; row < response.rows; ++row) {
    const auto* const values = response.ptr<float>(row);
    const double row_noise = noise * (row < rim || row >= response.rows - rim ? std::sqrt(2.0) : 1);
    for (int column = 0; column < response.cols; ++column) {
      if (values[column] >= limit) continue;
      // The picture goes on mirrored: at its rim each noisy pixel counts twice.
      const double here = row_noise * (column < rim || column >= response.cols - rim ? std::sqrt(2.0) : 1);
      if (values[column] >= -deviations * here || !IsLeast(response, row, column)) continue;
      minima.push_back({level, sigma, {column, row}, -values[column], -values[column] / here / deviations});
    }
  }
}

std::vector<Minimum> FindMinima(const Pyramid& pyramid, double least_depth) {
  std::vector<Minimum> minima;
  for (int level = 0; level < std::min(kLevels, static_cast<int>(pyramid.levels.size())); ++level) {
    for (const double sigma : SigmasAt(level)) {
      cv::Mat response;
      const int side = 2 * cvCeil(2.5 * sigma) + 1;
      cv::GaussianBlur(pyramid.levels[level], response, {side, side}, sigma, sigma, cv::BORDER_REFLECT);
      response -= GroundOf(pyramid, level, sigma);
      AddMinima(response, level, sigma, least_depth, minima);
    }
  }
  std::sort(minima.begin(), minima.end(), [](const Minimum& a, const Minimum& b) { return a.score > b.score; });
  return minima;
}

// ---- 3. Spots -------------------------------------------------------------------------------------------------------

class Regions {
 public:
  Regions(const Pyramid& pyramid, cv::Size photo) : pyramid_(pyramid) {
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

cv::Mat GreyLevels(const cv::Mat& photo) {
  CV_Assert(!photo.empty() && (photo.depth() == CV_8U || photo.depth() == CV_16U));
  cv::Mat grey;
  if (photo.channels() == 1) {
    grey = photo;
  } else {
    cv::cvtColor(photo, grey, photo.channels() == 4 ? cv::COLOR_BGRA2GRAY : cv::COLOR_BGR2GRAY);
  }
  grey.convertTo(grey, CV_32F, photo.depth() == CV_16U ? 1.0 / 257 : 1.0);
  return grey;
}

}  // namespace

double Spot::diameter_px() const { return 2 * std::sqrt(area_px / CV_PI); }

SpotFinding FindSpots(const cv::Mat& photo) {
  const cv::Mat grey = GreyLevels(photo);
  cv::Mat blocks;
  const double shrink = std::min(1.0, 128.0 / std::max(grey.cols, grey.rows));
  cv::resize(grey, blocks, {std::max(cvRound(grey.cols * shrink), 1), std::max(cvRound(grey.rows * shrink), 1)}, 0, 0,
             cv::INTER_AREA);
  const Surface surface = FitSurface(blocks);
  cv::Mat noise = NoiseByTiles(grey);
  // Where noise is less than a step of the levels, rounding makes edges of its own, and a spot must be deeper than
  // those.
  const double step = photo.depth() == CV_16U ? 1.0 / 257 : 1.0;
  const bool stepped = cv::countNonZero(noise < 0.75 * step) * 2 > noise.size().area();
  noise = cv::max(noise, 0.5 * step);
  cv::resize(noise, noise, blocks.size(), 0, 0, cv::INTER_LINEAR);
  const cv::Mat relative = OverNoise(grey, surface, noise);
  cv::Mat share = noise.clone();
  for (int row = 0; row < share.rows; ++row) {
    const auto factors = surface.AtRow(Place(row, share.rows));
    for (int column = 0; column < share.cols; ++column) {
      share.at<float>(row, column) /= Surface::Value(factors, static_cast<float>(Place(column, share.cols)));
    }
  }

  SpotFinding found;
  const Pyramid pyramid = Build(relative);
  Regions regions(pyramid, photo.size());
  std::vector<Minimum> minima = FindMinima(pyramid, stepped ? 1.5 : 0);
  found.cut_short = minima.size() > kMostMinima;
  if (found.cut_short) minima.resize(kMostMinima);
  std::vector<float> shares(share.begin<float>(), share.end<float>());
  found.noise = MedianOf(shares);
  for (const Minimum& minimum : minima) {
    if (regions.IsTaken(minimum)) continue;
    if (found.spots.size() == kMostSpots) {
      found.cut_short = true;
      break;
    }
    Spot spot = regions.Take(minimum);
    const cv::Point at(std::clamp(static_cast<int>(spot.centre.x * shrink), 0, share.cols - 1),
                       std::clamp(static_cast<int>(spot.centre.y * shrink), 0, share.rows - 1));
    spot.contrast *= share.at<float>(at);
    found.spots.push_back(spot);
    found.largest_area = std::max(found.largest_area, spot.area_px);
    found.dark_share += spot.area_px / static_cast<double>(photo.total());
  }
  return found;
}

}  // namespace qv
