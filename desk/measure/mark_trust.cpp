#include <algorithm>
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
  double module_px = 0;     // along the square's side
  double noise = 0;         // of a pixel, of the contrast
  double module_noise = 0;  // what that leaves of the size, pixels
  double follows = 0;       // of a step of the circle about it, which takes in more of the blurred frame
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

float LevelAt(std::vector<float> levels, double share) {
  const auto at = levels.begin() + static_cast<std::ptrdiff_t>(share * static_cast<double>(levels.size() - 1));
  std::nth_element(levels.begin(), at, levels.end());
  return *at;
}

// Of a pixel, from the smaller half of the second differences along the rows, where these stay light or dark.
double NoiseOf(const cv::Mat& grey, double light, double dark) {
  constexpr double kTheirSquares = 0.1426;  // mean of a normal variable's squares among the smaller half
  const double most = (light - dark) / 4;
  std::vector<double> squares;
  for (int row = 0; row < grey.rows; ++row) {
    const auto* const v = grey.ptr<float>(row);
    for (int i = 0; i + 2 < grey.cols; ++i) {
      const auto [least, largest] = std::minmax({v[i], v[i + 1], v[i + 2]});
      if (least < light - most && largest > dark + most) continue;
      squares.push_back(std::pow(1.0 * v[i] - 2.0 * v[i + 1] + v[i + 2], 2));
    }
  }
  const auto half = static_cast<std::ptrdiff_t>(squares.size() / 2);
  if (half == 0) return 0;
  std::nth_element(squares.begin(), squares.begin() + half, squares.end());
  const double mean = std::accumulate(squares.begin(), squares.begin() + half, 0.0) / static_cast<double>(half);
  return std::sqrt(mean / kTheirSquares / 6);
}

// How dark the levels are within a circle, moved by where. Pixels on its rim count by what of them lies within.
cv::Vec3d DarknessWithin(const cv::Mat& grey, cv::Point2d middle, double radius, double light) {
  cv::Vec3d sum;
  for (int row = 0; row < grey.rows; ++row) {
    for (int i = 0; i < grey.cols; ++i) {
      const cv::Point2d off = cv::Point2d(i, row) - middle;
      const double within = std::clamp(radius + 0.5 - cv::norm(off), 0.0, 1.0);
      if (within > 0) sum += within * (light - grey.at<float>(row, i)) * cv::Vec3d(off.x, off.y, 1);
    }
  }
  return sum;
}

// How dark the levels are within a square that is turned counter-clockwise.
double DarknessOfSquare(const cv::Mat& even, cv::Point2d middle, double half_side, double turn_deg) {
  const double turn = turn_deg * CV_PI / 180;
  const cv::Point2d right(std::cos(turn), -std::sin(turn));
  double sum = 0;
  for (int row = 0; row < even.rows; ++row) {
    for (int i = 0; i < even.cols; ++i) {
      const cv::Point2d off = cv::Point2d(i, row) - middle;
      const double x = std::fabs(off.dot(right));
      const double y = std::fabs(off.cross(right));
      const double within = std::clamp(half_side + 0.5 - x, 0.0, 1.0) * std::clamp(half_side + 0.5 - y, 0.0, 1.0);
      sum += within * (1 - even.at<float>(row, i));
    }
  }
  return sum;
}

// Levels as if the light that falls there were even, and paper and ring at level 1: over the plane through those that
// come within this share of it. Looked for anew about each plane, else the brighter side would have more blurred edges.
cv::Mat Evened(const cv::Mat& grey, double light, double share) {
  constexpr int kRounds = 12;
  const auto at = [](int row, int column) { return cv::Vec3d(1, column, row); };
  cv::Vec3d plane(light, 0, 0);
  for (int round = 0; round < kRounds; ++round) {
    cv::Matx33d products = cv::Matx33d::zeros();
    cv::Vec3d sums;
    for (int row = 0; row < grey.rows; ++row) {
      for (int i = 0; i < grey.cols; ++i) {
        const double level = grey.at<float>(row, i);
        const double expected = plane.dot(at(row, i));
        if (std::fabs(level - expected) > share * expected) continue;
        products += at(row, i) * at(row, i).t();
        sums += at(row, i) * level;
      }
    }
    plane = products.solve(sums, cv::DECOMP_SVD);
  }
  cv::Mat even(grey.size(), CV_32F);
  for (int row = 0; row < grey.rows; ++row) {
    for (int i = 0; i < grey.cols; ++i) {
      even.at<float>(row, i) = static_cast<float>(grey.at<float>(row, i) / plane.dot(at(row, i)));
    }
  }
  return even;
}

// How far the centre of gravity within a circle follows the circle, by what is dark on its rim.
double FollowsCircle(const cv::Mat& grey, cv::Point2d middle, double radius, double light) {
  constexpr double kRim = 1;  // pixels to either side
  const double inner = std::max(radius - kRim, 0.0);
  const double outer = radius + kRim;
  const double rim = DarknessWithin(grey, middle, outer, light)[2] - DarknessWithin(grey, middle, inner, light)[2];
  const double share = radius * radius / (outer * outer - inner * inner);  // rim to ring: both have twice the pi
  return share * rim / DarknessWithin(grey, middle, radius, light)[2];
}

std::vector<float> LevelsWithin(const cv::Mat& grey, cv::Point2d middle, double radius) {
  std::vector<float> levels;
  for (int row = 0; row < grey.rows; ++row) {
    for (int i = 0; i < grey.cols; ++i) {
      if (cv::norm(cv::Point2d(i, row) - middle) <= radius) levels.push_back(grey.at<float>(row, i));
    }
  }
  return levels;
}

// The dark inner square, three modules wide, in the light ring about it. Its centre of gravity is that of what is dark
// within 2.2 modules, which holds the whole square whatever its turn, and of the dark frame what blur makes shine in.
// Its size is all that is dark up to the middle of the ring, where the frame's blur adds what the square's takes away.
Core LookAtCore(const cv::Mat& photo, const Mark& mark, double module, double turn_deg, double hidden) {
  constexpr double kReach = 2.2;
  constexpr double kRingMiddle = 2;
  constexpr double kSeen = 4.1;  // the paper about the mark
  // Half the root of the square's pixels over its side: by so much noise over the contrast moves a module.
  constexpr double kNoiseModulePx = 0.23;
  const int reach = cvCeil(kSeen * module) + 1;
  const cv::Rect part =
      cv::Rect(cvRound(mark.centre.x) - reach, cvRound(mark.centre.y) - reach, 2 * reach + 1, 2 * reach + 1) &
      cv::Rect({}, photo.size());
  if (part.width < 9 || part.height < 9) return {};
  cv::Mat grey = GreyPart(photo, part);
  const std::vector<float> levels(grey.begin<float>(), grey.end<float>());
  const double light = LevelAt(levels, 0.85);
  const double black = LevelAt(levels, 0.15);
  const double contrast = light - black;
  if (!(contrast > 0)) return {};
  // What is light but for noise, and no blurred edge.
  const double noise = NoiseOf(grey, light, black);
  grey = Evened(grey, light, std::clamp(2.5 * noise, contrast / 16, contrast / 3) / light);
  const cv::Point2d corner = part.tl();
  Core core = {mark.centre, 0, std::hypot(noise, hidden) / contrast};
  for (int round = 0; round < 6; ++round) {
    const cv::Vec3d dark = DarknessWithin(grey, core.centre - corner, kReach * module, 1);
    if (!(dark[2] > 0)) return {};
    core.centre += cv::Point2d(dark[0], dark[1]) / dark[2];
  }
  core.follows = std::clamp(FollowsCircle(grey, core.centre - corner, kReach * module, 1), 0.0, 0.9);
  // Means throughout: noise that is cut off at black lifts them, and leaves a median where it is.
  const std::vector<float> inside = LevelsWithin(grey, core.centre - corner, module);
  if (inside.empty()) return {};
  const auto pixels = static_cast<double>(inside.size());
  const double square = std::accumulate(inside.begin(), inside.end(), 0.0) / pixels;
  const double dark = DarknessOfSquare(grey, core.centre - corner, kRingMiddle * module, turn_deg);
  core.module_px = square < 1 ? std::sqrt(std::max(dark, 0.0) / (1 - square)) / 3 : 0;
  core.module_noise = core.noise * std::hypot(kNoiseModulePx, core.module_px / 2 / std::sqrt(pixels));
  return core;
}

cv::Point2d Right(const Places& p) { return {p[2] - p[0], p[3] - p[1]}; }
cv::Point2d Down(const Places& p) { return {p[4] - p[0], p[5] - p[1]}; }

double LegsRatio(const Places& p) { return Legs{Right(p), Down(p)}.ratio(); }
double LegsAngle(const Places& p) { return Legs{Right(p), Down(p)}.angle_deg(); }
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
  constexpr double kCorePx = 0.005;         // type B: what pixels and light leave of a centre
  constexpr double kApartPx = 0.003;        // and of two centres' distance
  constexpr double kRimPx = 0.0125;         // and those on the circle's rim, times how dark they are
  constexpr double kCoreModulePx = 0.0065;  // what is left of the squares' sizes
  constexpr double kRimModulePx = 0.1;  // and of their corners, which blur rounds, as much as the circle is followed
  // Noise over the contrast moves a centre by the circle's second moment over the square's weight.
  constexpr double kNoisePx = 0.48;
  if (!view.complete()) return;
  const double hidden = 8 * codec.luma / std::sqrt(12.0);  // noise of a pixel that a codec's steps take off it
  const double turn = view.turn_deg * CV_PI / 180;
  const double upright = std::max(std::fabs(std::cos(turn)), std::fabs(std::sin(turn)));  // of a row's way through
  Places found;
  Places cores;
  auto covariance = cv::Matx<double, 6, 6>::zeros();
  double module_off = 0;
  double module_squares = kCoreModulePx * kCoreModulePx;
  double follows = 0;
  std::vector<Uncertainty> rows;
  for (int i = 0; i < 3; ++i) {
    const Mark& mark = view.marks[i];
    const Core core = LookAtCore(photo, mark, mark.module_px * upright, view.turn_deg, hidden);
    if (core.module_px == 0) return;
    found[2 * i] = mark.centre.x;
    found[2 * i + 1] = mark.centre.y;
    cores[2 * i] = core.centre.x;
    cores[2 * i + 1] = core.centre.y;
    const auto left = [&](double type_b) {
      return std::hypot(type_b + kRimPx * core.follows, kNoisePx * core.noise) / (1 - core.follows);
    };
    covariance(2 * i, 2 * i) = covariance(2 * i + 1, 2 * i + 1) = std::pow(left(kApartPx), 2);
    rows.push_back(FromKnownError(mark.centre.y - core.centre.y, left(kCorePx)));
    module_off += (mark.module_px - core.module_px / upright) / 3;
    module_squares += std::pow(core.module_noise / 3, 2);
    follows += core.follows / 3;
  }
  phase.Find("marks")->Trust(std::move(rows));
  const auto trust = [&](const char* figure, double (*f)(const Places&)) {
    phase.Find(figure)->Trust({FromKnownError(f(found) - f(cores), Propagated<6>(f, cores, covariance, 0.01))});
  };
  trust("legs_ratio", LegsRatio);
  trust("legs_angle", LegsAngle);
  trust("chart_turn", TurnOf);
  const double off = std::hypot(std::sqrt(module_squares), kRimModulePx * follows);
  phase.Find("module_size")->Trust({FromKnownError(module_off, off)});
}

}  // namespace qv
