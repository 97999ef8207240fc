#include <algorithm>
#include <array>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "desk/measure/legs.h"
#include "desk/measure/residual_trust.h"

namespace qv {

namespace {

using Places = cv::Vec<double, 6>;  // column and row of the three marks

struct Core {
  cv::Point2d centre;
  double module_px = 0;     // along a row
  double lifted_px = 0;     // what of it black that is cut off makes
  double centre_noise = 0;  // standard uncertainties by noise and codec, pixels
  double module_noise = 0;
  double follows = 0;  // of a step of the square about it, which takes in more of the blurred frame
};

// Of levels as the search weighs them.
cv::Mat GreyPart(const cv::Mat& photo, const cv::Rect& part) {
  cv::Mat grey;
  if (photo.channels() == 1) {
    photo(part).convertTo(grey, CV_32F);
    return grey;
  }
  cv::cvtColor(photo(part), grey, photo.channels() == 4 ? cv::COLOR_RGBA2GRAY : cv::COLOR_RGB2GRAY);
  grey.convertTo(grey, CV_32F);
  return grey;
}

// Of a pixel, as it acts on means: from what is light in the photo there, by second differences of means of 4 x 4
// pixels along the rows, which see what a codec or a filter left. The smaller half of them: some are not even.
double NoiseInMeans(const cv::Mat& grey, double light) {
  constexpr int kCell = 4;
  constexpr double kTheirSquares = 0.1426;  // mean of a normal variable's squares among the smaller half
  cv::Mat cells;
  cv::resize(grey, cells, {}, 1.0 / kCell, 1.0 / kCell, cv::INTER_AREA);
  std::vector<double> squares;
  for (int row = 0; row < cells.rows; ++row) {
    const auto* const v = cells.ptr<float>(row);
    for (int i = 0; i + 2 < cells.cols; ++i) {
      if (std::min({v[i], v[i + 1], v[i + 2]}) < 0.93 * light) continue;
      squares.push_back(std::pow(1.0 * v[i] - 2.0 * v[i + 1] + v[i + 2], 2));
    }
  }
  const auto half = static_cast<std::ptrdiff_t>(squares.size() / 2);
  if (half == 0) return 0;
  std::nth_element(squares.begin(), squares.begin() + half, squares.end());
  const double mean = std::accumulate(squares.begin(), squares.begin() + half, 0.0) / static_cast<double>(half);
  return kCell * std::sqrt(mean / kTheirSquares / 6);
}

// A square about a mark, or about its inner one, turned as the chart is, and how a pixel lies to it.
struct TurnedSquare {
  cv::Point2d middle, right;

  TurnedSquare(cv::Point2d middle, double turn_deg)
      : middle(middle), right(std::cos(turn_deg * CV_PI / 180), -std::sin(turn_deg * CV_PI / 180)) {}

  // Distances from the middle along both sides.
  cv::Point2d From(int row, int column) const {
    const cv::Point2d off = cv::Point2d(column, row) - middle;
    return {std::fabs(off.dot(right)), std::fabs(off.cross(right))};
  }
  double Reach(double half_side) const { return half_side * (std::fabs(right.x) + std::fabs(right.y)); }
  cv::Rect Bounds(double half_side, cv::Size size) const {
    const int reach = cvCeil(Reach(half_side)) + 1;
    return cv::Rect(cvRound(middle.x) - reach, cvRound(middle.y) - reach, 2 * reach + 1, 2 * reach + 1) &
           cv::Rect({}, size);
  }
};

double ShareWithin(double half, double distance) { return std::clamp(half + 0.5 - distance, 0.0, 1.0); }

// Visits the pixels within a square with what of each lies within: visit(row, column, share).
template <typename Visit>
void ForEachWithin(const cv::Mat& grey, const TurnedSquare& square, double half_side, const Visit& visit) {
  const cv::Rect bounds = square.Bounds(half_side, grey.size());
  for (int row = bounds.y; row < bounds.br().y; ++row) {
    for (int i = bounds.x; i < bounds.br().x; ++i) {
      const cv::Point2d from = square.From(row, i);
      const double within = ShareWithin(half_side, from.x) * ShareWithin(half_side, from.y);
      if (within > 0) visit(row, i, within);
    }
  }
}

// The light that falls there, as a plane through the paper about the mark: no edge's blur reaches it.
struct MarkLight {
  cv::Vec3d plane;
  double noise = 0;  // of a pixel

  double At(int row, int column) const { return plane[0] + plane[1] * column + plane[2] * row; }
};

MarkLight LightAbout(const cv::Mat& grey, const TurnedSquare& mark, double module) {
  constexpr double kFrom = 4.2;
  constexpr double kTo = 4.6;
  constexpr int kRounds = 3;
  constexpr double kNoisy = 4;   // deviations beyond which it is no paper
  std::vector<cv::Vec4d> paper;  // 1, column, row, level
  std::vector<float> levels;
  for (int row = 0; row < grey.rows; ++row) {
    for (int i = 0; i < grey.cols; ++i) {
      const cv::Point2d from = mark.From(row, i);
      const double furthest = std::max(from.x, from.y) / module;
      if (furthest < kFrom || furthest > kTo) continue;
      paper.emplace_back(1, i, row, grey.at<float>(row, i));
      levels.push_back(grey.at<float>(row, i));
    }
  }
  if (levels.size() < 20) return {};
  std::nth_element(levels.begin(), levels.begin() + levels.size() / 2, levels.end());
  MarkLight light = {{levels[levels.size() / 2], 0, 0}};
  double furthest = light.plane[0] / 4;
  for (int round = 0; round < kRounds; ++round) {
    cv::Matx33d products = cv::Matx33d::zeros();
    cv::Vec3d sums;
    double squares = 0;
    double count = 0;
    for (const cv::Vec4d& p : paper) {
      const cv::Vec3d at(p[0], p[1], p[2]);
      const double left = p[3] - light.plane.dot(at);
      if (std::fabs(left) > furthest) continue;
      products += at * at.t();
      sums += at * p[3];
      squares += left * left;
      ++count;
    }
    light.plane = products.solve(sums, cv::DECOMP_SVD);
    light.noise = std::sqrt(squares / std::max(count, 1.0));
    furthest = std::min(furthest, std::max(kNoisy * light.noise, light.plane[0] / 64));
  }
  return light;
}

// Standard uncertainty of a weighted sum of levels, `weights` at this place of the photo, by what a codec rounds: each
// coefficient of a block that is not even by anything up to half its step.
double RoundingOfSum(const cv::Mat& weights, cv::Point at, const CodecSteps& codec) {
  constexpr int kBlock = 8;
  const cv::Point before(at.x % kBlock, at.y % kBlock);
  cv::Mat blocks;
  cv::copyMakeBorder(weights, blocks, before.y, kBlock - 1 - (before.y + weights.rows - 1) % kBlock, before.x,
                     kBlock - 1 - (before.x + weights.cols - 1) % kBlock, cv::BORDER_CONSTANT);
  double squares = 0;
  cv::Mat block;
  for (int row = 0; row < blocks.rows; row += kBlock) {
    for (int i = 0; i < blocks.cols; i += kBlock) {
      const cv::Mat spatial = blocks(cv::Rect(i, row, kBlock, kBlock));
      if (cv::countNonZero(spatial) == 0) continue;
      cv::dct(spatial, block);
      squares += std::pow(cv::norm(block.mul(cv::Mat(codec.luma_table))), 2);
    }
  }
  return std::sqrt(squares / 12);
}

constexpr double kRingMiddle = 2;  // modules from a mark's middle, where its frame's blur meets that of its square

// A mark and the paper about it.
struct MarkLook {
  const cv::Mat& photo;
  const CodecSteps& codec;
  cv::Rect part;
  cv::Mat grey;
  TurnedSquare square;
  double module = 0;  // along the square's side
  MarkLight light;

  MarkLook(const cv::Mat& photo, const CodecSteps& codec, const Mark& mark, double module, double turn_deg)
      : photo(photo), codec(codec), square(mark.centre, turn_deg), module(module) {
    constexpr double kSeen = 4.6;  // modules
    part = square.Bounds(kSeen * module, photo.size());
    if (part.width < 9 || part.height < 9) return;
    grey = GreyPart(photo, part);
    square.middle -= cv::Point2d(part.tl());
    light = LightAbout(grey, square, module);
  }
  bool coded() const { return codec.luma > 0; }
  double DarknessAt(int row, int i) const { return 1 - grey.at<float>(row, i) / light.At(row, i); }
  double LightAtMiddle() const { return light.At(cvRound(square.middle.y), cvRound(square.middle.x)); }
  double Noise() const {
    constexpr double kEven = 10;  // modules; what lies there is paper, mostly
    const TurnedSquare about(square.middle + cv::Point2d(part.tl()), 0);
    return NoiseInMeans(GreyPart(photo, about.Bounds(kEven * module, photo.size())), light.plane[0]);
  }
  double steep() const { return std::min(std::fabs(square.right.x), std::fabs(square.right.y)); }
  double upright() const { return std::max(std::fabs(square.right.x), std::fabs(square.right.y)); }
};

// Moves the square to the centre of gravity of what is dark in it; how dark all of it is, in pixels.
double MoveToCentre(MarkLook& look) {
  constexpr int kRounds = 6;
  double weight = 0;
  for (int round = 0; round < kRounds; ++round) {
    cv::Point2d moment;
    weight = 0;
    ForEachWithin(look.grey, look.square, kRingMiddle * look.module, [&](int row, int i, double within) {
      const double dark = within * look.DarknessAt(row, i);
      moment += dark * (cv::Point2d(i, row) - look.square.middle);
      weight += dark;
    });
    if (!(weight > 0)) return 0;
    look.square.middle += moment / weight;
  }
  return weight;
}

// How far the centre of gravity follows a step of the square, by what is dark on its rim: two sides of four modules,
// two modules from the middle, over nine modules squared.
double FollowsSquare(const MarkLook& look) {
  constexpr double kRim = 1;  // pixels to either side
  double dark = 0;
  double pixels = 0;
  ForEachWithin(look.grey, look.square, kRingMiddle * look.module + kRim, [&](int row, int i, double) {
    const cv::Point2d from = look.square.From(row, i);
    if (std::max(from.x, from.y) < kRingMiddle * look.module - kRim) return;
    dark += look.DarknessAt(row, i);
    ++pixels;
  });
  return std::clamp(16.0 / 9 * dark / pixels, 0.0, 0.9);
}

// Rows that cross two opposite sides of the inner square, away from its corners. None does where a chart stands
// at a slant, and its area must do.
struct CrossingRows {
  double half;  // of them, pixels
  bool cross;
  double count = 0;

  explicit CrossingRows(const MarkLook& look) : half((1.5 * (look.upright() - look.steep()) - 0.6) * look.module) {
    cross = half > 0.2 * look.module;
    if (!cross) half = 0.75 * look.module;
    for (int row = 0; row < look.grey.rows; ++row) count += ShareWithin(half, std::fabs(row - look.square.middle.y));
  }
  double Share(const MarkLook& look, int row) const {
    return cross ? ShareWithin(half, std::fabs(row - look.square.middle.y)) : 1;
  }
};

// The inner square's own level, in the same rows, whose blur is then in both.
struct SquareLevel {
  cv::Rect part;
  double level = 0, scatter = 0;

  SquareLevel(const MarkLook& look, const CrossingRows& rows) {
    const cv::Size half(cvRound(0.75 * look.module), cvRound(rows.half));
    part = cv::Rect(cvRound(look.square.middle.x) - half.width, cvRound(look.square.middle.y) - half.height,
                    2 * half.width + 1, 2 * half.height + 1) &
           cv::Rect({}, look.grey.size());
    if (part.empty()) return;
    cv::Scalar mean;
    cv::Scalar deviation;
    cv::meanStdDev(look.grey(part), mean, deviation);
    level = mean[0];
    scatter = deviation[0];
  }
  // What of it is noise that is cut off at black in each channel, and lifts the square, but not its blurred rim: all
  // where half of the pixels are black. Where a codec left other noise than there was, by what noise of this size
  // lifts.
  double Lift(const MarkLook& look, double noise) const {
    if (!(level > 0)) return 0;
    const double channels = look.photo.channels() == 1 ? 1 : 1.5;  // noise of one to that of grey
    const double by_noise = 0.4 * noise * channels / level;
    const double at_zero = 2 * cv::mean(look.photo(part + look.part.tl()) == 0)[0] / 255;
    return level * std::pow(std::min(look.coded() ? by_noise : at_zero, 1.0), 2);
  }
};

// How much of it noise that is cut off at 0 lifts a level that then is so many times as light as black: half at 1.75,
// which is where normal noise of half its deviation above 0 puts it; more than all evens out with less.
double LiftedShare(double blacks) { return std::max((2.6 - blacks) / 1.6, 0.0); }

struct ModuleSeen {
  double module_px = 0;  // along a row
  double lifted_px = 0;  // what of it black that is cut off makes
};

// What is dark up to the middle of the ring, where the frame's blur adds what the square's takes away.
ModuleSeen SeeModule(const MarkLook& look, const CrossingRows& rows, const SquareLevel& black, double lift) {
  constexpr double kSmoothed = 0.4;  // pixels that smoothing takes of what is black at either side
  const double level = look.LightAtMiddle();
  cv::Mat smooth;
  cv::GaussianBlur(look.grey, smooth, {3, 3}, 0);
  double dark = 0;
  double lifted = 0;
  ForEachWithin(look.grey, look.square, kRingMiddle * look.module, [&](int row, int i, double within) {
    const double share = within * rows.Share(look, row);
    dark += share * look.DarknessAt(row, i) * level;
    if (lift > 0) lifted += share * LiftedShare(smooth.at<float>(row, i) / black.level);
  });
  lifted *= 1 + 2 * kSmoothed / (3 * look.module);
  const auto module = [&](double by) {
    const double pixels = std::max(dark + by * lifted, 0.0) / (level - black.level + by);
    return (rows.cross ? pixels / rows.count : std::sqrt(pixels) / look.upright()) / 3;
  };
  return {module(lift), std::fabs(module(lift) - module(0))};
}

// What a codec's rounding leaves of the centre, and of the module, `weight` and `pixels` being what they are divided
// by.
cv::Vec2d OfRounding(const MarkLook& look, const CrossingRows& rows, double weight, double pixels) {
  if (!look.coded()) return {};
  cv::Mat of_column = cv::Mat::zeros(look.grey.size(), CV_32F);
  cv::Mat of_module = cv::Mat::zeros(look.grey.size(), CV_32F);
  ForEachWithin(look.grey, look.square, kRingMiddle * look.module, [&](int row, int i, double within) {
    of_column.at<float>(row, i) = static_cast<float>(within * (i - look.square.middle.x) / weight);
    of_module.at<float>(row, i) = static_cast<float>(within * rows.Share(look, row) / pixels);
  });
  return {RoundingOfSum(of_column, look.part.tl(), look.codec), RoundingOfSum(of_module, look.part.tl(), look.codec)};
}

// The dark inner square, three modules wide, in the light ring about it.
Core LookAtCore(const cv::Mat& photo, const Mark& mark, double module, double turn_deg, const CodecSteps& codec) {
  MarkLook look(photo, codec, mark, module, turn_deg);
  if (!(look.light.plane[0] > 0)) return {};
  const double weight = MoveToCentre(look);
  if (!(weight > 0)) return {};
  const CrossingRows rows(look);
  const SquareLevel black(look, rows);
  const double level = look.LightAtMiddle();
  const double contrast = level - black.level;
  if (black.part.empty() || !(contrast > 0)) return {};
  const double noise = look.Noise();
  const ModuleSeen size = SeeModule(look, rows, black, black.Lift(look, noise));
  Core core = {look.square.middle + cv::Point2d(look.part.tl()), size.module_px, size.lifted_px};
  core.follows = FollowsSquare(look);
  // By the squares of the distances in the light ring, and in the dark, over nine modules squared.
  const double of_light = noise / contrast;
  const double of_dark = look.light.noise > 0 ? std::min(black.scatter / look.light.noise, 1.0) * of_light : 0;
  const double of_centre = std::hypot(std::sqrt(14.6) * of_light, std::sqrt(6.75) * of_dark) / 9;
  // By the light beside the rows, and by the square's pixels in them that its own level was not taken from.
  const double ring = rows.cross ? 2 * rows.half * module : 3 * module * module;
  const double apart = std::sqrt(std::max(1.0 / black.part.area() - 1 / (3 * ring), 0.0));
  const double of_module = module * std::hypot(of_light / 3 / std::sqrt(ring), of_dark * apart);
  const cv::Vec2d rounded =
      OfRounding(look, rows, weight * level, contrast * (rows.cross ? 3 * rows.count : 18 * module));
  core.centre_noise = std::hypot(of_centre, rounded[0]);
  core.module_noise = std::hypot(of_module, rounded[1]);
  return core;
}

std::array<Core, 3> LookAtCores(const ChartView& view, const cv::Mat& photo, const CodecSteps& codec) {
  const double turn = view.turn_deg * CV_PI / 180;
  const double upright = std::max(std::fabs(std::cos(turn)), std::fabs(std::sin(turn)));  // of a row's way through
  std::array<Core, 3> seen;
  for (int i = 0; i < 3; ++i) {
    double module = view.marks[i].module_px * upright;  // the search's is a per cent off, and so the ring's middle
    for (int round = 0; round < 2 && module > 0; ++round) {
      seen.at(i) = LookAtCore(photo, view.marks[i], module, view.turn_deg, codec);
      module = seen.at(i).module_px * upright;
    }
  }
  return seen;
}

cv::Point2d Right(const Places& p) { return {p[2] - p[0], p[3] - p[1]}; }
cv::Point2d Down(const Places& p) { return {p[4] - p[0], p[5] - p[1]}; }

double LegsRatio(const Places& p) { return Legs{Right(p), Down(p)}.ratio(); }
double LegsAngle(const Places& p) { return Legs{Right(p), Down(p)}.angle_deg(); }

// How far the centres of gravity lie from the squares' middles where the chart is seen obliquely. A scale that changes
// by g a pixel moves all three by 4/3 g times half a side squared, and by half a leg times g in their ratio and angle.
double OffByView(const Places& cores, double module) {
  const double half_leg = cv::norm(Right(cores)) / 2;
  const double scale =
      std::hypot(LegsRatio(cores) - 1, (LegsAngle(cores) - 90) * CV_PI / 180) / std::sqrt(2.0) / half_leg;
  return 4.0 / 3 * scale * std::pow(1.5 * module, 2);
}

double TurnOf(const Places& p) { return std::atan2(-Right(p).y, Right(p).x) * 180 / CV_PI; }

}  // namespace

// The true value is normal about where the known error puts it: 95 % of it lie within so much of the reading.
Uncertainty FromKnownError(double error, double standard, const char* method) {
  const double off = std::fabs(error);
  const double all = std::hypot(off, standard);
  const auto below = [&](double x) { return 0.5 * std::erfc((off - x) / standard / std::sqrt(2.0)); };
  const double high = HalfWidthHolding(below, off, off + 2 * standard);
  return {all, high, all == 0 ? 1 : high / all, method};
}

void TrustMarks(Phase& phase, const ChartView& view, const cv::Mat& photo, const CodecSteps& codec) {
  constexpr double kCorePx = 0.0008;        // type B: what pixels leave of a centre
  constexpr double kRimPx = 0.0075;         // and those on the square's rim, times how dark they are
  constexpr double kCoreModulePx = 0.0007;  // what pixels leave of the squares' sizes
  constexpr double kRimModulePx = 0.06;     // and of blurred ones, as much as the square about them is followed
  constexpr double kLifted = 0.25;          // of what black that is cut off makes of them
  if (!view.complete()) return;
  const std::array<Core, 3> seen = LookAtCores(view, photo, codec);
  Places found;
  Places cores;
  for (int i = 0; i < 3; ++i) {
    if (!(seen.at(i).module_px > 0)) return;
    found[2 * i] = view.marks[i].centre.x;
    found[2 * i + 1] = view.marks[i].centre.y;
    cores[2 * i] = seen.at(i).centre.x;
    cores[2 * i + 1] = seen.at(i).centre.y;
  }
  const double oblique = OffByView(cores, seen[0].module_px);
  auto covariance = cv::Matx<double, 6, 6>::zeros();
  double module_off = 0;
  double module_squares = kCoreModulePx * kCoreModulePx;
  double follows = 0;
  double lifted = 0;
  std::vector<Uncertainty> rows;
  for (int i = 0; i < 3; ++i) {
    const Core& core = seen.at(i);
    const double apart = std::hypot(kCorePx + kRimPx * core.follows, core.centre_noise) / (1 - core.follows);
    covariance(2 * i, 2 * i) = covariance(2 * i + 1, 2 * i + 1) = apart * apart;
    rows.push_back(FromKnownError(found[2 * i + 1] - cores[2 * i + 1], std::hypot(apart, oblique)));
    module_off += (view.marks[i].module_px - core.module_px) / 3;
    module_squares += std::pow(core.module_noise / 3, 2);
    follows += core.follows / 3;
    lifted += core.lifted_px / 3;
  }
  phase.Find("marks")->Trust(std::move(rows));
  const auto trust = [&](const char* figure, double (*f)(const Places&)) {
    phase.Find(figure)->Trust({FromKnownError(f(found) - f(cores), Propagated<6>(f, cores, covariance, 0.01))});
  };
  trust("legs_ratio", LegsRatio);
  trust("legs_angle", LegsAngle);
  trust("chart_turn", TurnOf);
  const double off = std::hypot(std::sqrt(module_squares), kRimModulePx * follows, kLifted * lifted);
  phase.Find("module_size")->Trust({FromKnownError(module_off, off)});
}

}  // namespace qv
