#include "desk/measure/doubts.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <numeric>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "chart/chart_layout.h"
#include "desk/measure/grey.h"
#include "desk/measure/slanted_edge.h"

namespace qv {

namespace {

constexpr int kLevels = 256;
constexpr int kFewestPixels = 200;     // of a side, to say anything of it
constexpr double kShareAtEnd = 0.05;   // of pixels at a level that ends the range
constexpr double kShareInside = 0.05;  // at another: of noise about one level, the outermost holds far less
constexpr double kLeastNoise = 1;      // levels
// Where the cut takes a side's own noise away, that of the other side tells that there was some.
constexpr double kNoiseElsewhere = 2;
constexpr double kShareFlat = 0.9;
constexpr int kTail = 3;  // levels from the pile to the far end of its side

using Histogram = std::array<std::int64_t, kLevels>;

struct Side {
  Histogram levels = {};
  Histogram steps = {};  // to the right neighbour, where that is of the same side
};

std::int64_t CountOf(const Histogram& histogram) {
  return std::accumulate(histogram.begin(), histogram.end(), std::int64_t{0});
}

// Of one channel inside the outline: what lies up to the middle of its levels, and what above.
std::array<Side, 2> SidesOf(const cv::Mat& channel, const cv::Mat& inside, int middle) {
  std::array<Side, 2> sides;
  for (int i = 0; i < channel.rows; ++i) {
    const auto* level = channel.ptr<uchar>(i);
    const auto* in = inside.ptr<uchar>(i);
    int left_side = -1;  // of the pixel to the left; -1 outside
    for (int j = 0; j < channel.cols; ++j) {
      const int own = in[j] == 0 ? -1 : static_cast<int>(level[j] > middle);
      if (own >= 0) {
        ++sides[own].levels[level[j]];
        if (own == left_side) ++sides[own].steps[std::abs(level[j] - level[j - 1])];
      }
      left_side = own;
    }
  }
  return sides;
}

// Standard deviation of independent noise, from the mean of the smallest three quarters of the steps between
// neighbours: those across the edge are none of it. Of |a - b| of two normal values that mean is 0.728 sigma.
double NoiseOf(const Side& side) {
  const std::int64_t count = CountOf(side.steps) / 4 * 3;
  if (count == 0) return 0;
  std::int64_t sum = 0;
  std::int64_t left = count;
  for (int step = 0; left > 0; ++step) {
    const std::int64_t taken = std::min(left, side.steps[step]);
    sum += taken * step;
    left -= taken;
  }
  return static_cast<double>(sum) / static_cast<double>(count) / 0.728;
}

// How far from `level`, an end of the side's levels, the farthest lie when a fiftieth of them is left out.
int ReachOf(const Side& side, int level) {
  std::int64_t beyond = CountOf(side.levels) / 50;
  for (int reach = kLevels - 1; reach > 0; --reach) {
    for (const int at : {level - reach, level + reach}) {
      if (at >= 0 && at < kLevels) beyond -= side.levels[at];
    }
    if (beyond < 0) return reach;
  }
  return 0;
}

// Of so many of a side's pixels at its outermost level it depends on the edge's shape whether they were cut off.
constexpr double kShareToLookAt = 0.5;

struct PileCandidate {
  LevelPile pile;
  bool sure;
};

std::optional<PileCandidate> PileOf(const Side& side, double noise_elsewhere, bool top, int channel) {
  const std::int64_t count = CountOf(side.levels);
  if (count < kFewestPixels) return std::nullopt;
  int level = top ? kLevels - 1 : 0;
  while (side.levels[level] == 0) level += top ? -1 : 1;
  const double share = static_cast<double>(side.levels[level]) / static_cast<double>(count);
  const bool at_end = top ? level == kLevels - 1 : level == 0;
  const bool one_sided = ReachOf(side, level) >= kTail || share > kShareFlat;
  const bool noisy = NoiseOf(side) >= kLeastNoise || (noise_elsewhere >= kNoiseElsewhere && one_sided);
  const bool piled = at_end ? share > kShareAtEnd : share > kShareInside && noisy;
  return piled || share > kShareToLookAt ? std::optional<PileCandidate>({{level, top, channel, share}, piled})
                                         : std::nullopt;
}

// Distance from the edge at which its spread first comes so near to a plateau: share 0.1 and 0.01 of the step, from the
// middle outwards.
std::optional<double> Corner(const EdgeSpread& spread, bool right) {
  const auto rest = [&](int k) {
    const double share = spread.levels[spread.middle + (right ? k : -k)];
    return right ? 1 - share : share;
  };
  double begin = NAN;
  for (int k = 1; k <= spread.middle; ++k) {
    const auto crosses = [&](double level) { return rest(k) <= level && rest(k - 1) > level; };
    const auto place = [&](double level) { return k - (level - rest(k)) / (rest(k - 1) - rest(k)); };
    if (std::isnan(begin) && crosses(0.1)) begin = place(0.1);
    if (!std::isnan(begin) && crosses(0.01)) return place(0.01) - begin;
  }
  return std::nullopt;
}

// Whether the edge comes to its light (or dark) plateau far more abruptly than to the other: there it is cut off, which
// a photo without noise tells by nothing else. A lens does both alike; a transfer function makes the dark corner the
// sharper one.
bool IsCut(const cv::Mat& channel, const std::array<cv::Point2d, 4>& outline, bool top) {
  constexpr double kSharperTop = 0.6;
  constexpr double kSharperBottom = 0.55;
  const SlantedEdge edge = LocateEdge(channel, outline, {Transfer::Kind::kLinear, 1});
  if (edge.reason != nullptr) return false;
  const EdgeSpread spread = ProjectEdge(edge, edge.room).whole;
  if (spread.levels.empty()) return false;
  const bool light_right = edge.right.level > edge.left.level;
  const std::optional<double> here = Corner(spread, light_right == top);
  const std::optional<double> there = Corner(spread, light_right != top);
  return here && there && *here < (top ? kSharperTop : kSharperBottom) * *there;
}

// Bin in which the spread comes to so much of the way, the nearest to its middle; NaN where it does not.
double BinOf(const EdgeSpread& spread, double share) {
  const std::vector<double>& levels = spread.levels;
  const int way = levels[spread.middle] < share ? 1 : -1;
  const int last = static_cast<int>(levels.size()) - 1;
  for (int k = spread.middle; k + way >= 0 && k + way <= last; k += way) {
    if (way * (levels[k + way] - share) >= 0) return k + way * (share - levels[k]) / (levels[k + way] - levels[k]);
  }
  return NAN;
}

// What of a photo lies about an outline, with the outline in it, also rounded.
struct Surroundings {
  cv::Mat photo;
  std::array<cv::Point2d, 4> outline;
  std::vector<cv::Point> corners;
};

Surroundings SurroundingsOf(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline) {
  std::vector<cv::Point> corners;
  for (const cv::Point2d& corner : outline) corners.emplace_back(cvRound(corner.x), cvRound(corner.y));
  const cv::Rect bounds = cv::boundingRect(corners) & cv::Rect({}, photo.size());
  Surroundings part = {photo(bounds), outline, corners};
  for (cv::Point2d& corner : part.outline) corner -= cv::Point2d(bounds.tl());
  for (cv::Point& corner : part.corners) corner -= bounds.tl();
  return part;
}

// Mean grey level about a place of the chart, in chart units.
std::optional<double> LevelAt(const FoundChart& found, double x, double y) {
  constexpr int kHalf = 3;  // pixels
  const auto place = [](const QVFinderPattern& mark) { return cv::Point2d(mark.x, mark.y); };
  const cv::Point2d corner = place(found.marks[0]);
  const cv::Point2d at =
      corner + (x * (place(found.marks[1]) - corner) + y * (place(found.marks[2]) - corner)) / kChartSide;
  const cv::Rect about(cvRound(at.x) - kHalf, cvRound(at.y) - kHalf, 2 * kHalf + 1, 2 * kHalf + 1);
  if ((about & cv::Rect({}, found.gray.size())) != about) return std::nullopt;
  return cv::mean(found.gray(about))[0];
}

}  // namespace

std::optional<LevelPile> FindLevelPile(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline) {
  const Surroundings part = SurroundingsOf(photo, outline);
  if (part.photo.empty()) return std::nullopt;
  cv::Mat inside(part.photo.size(), CV_8UC1, cv::Scalar(0));
  cv::fillConvexPoly(inside, part.corners, cv::Scalar(255));
  std::vector<cv::Mat> channels;
  cv::split(part.photo, channels);
  std::optional<LevelPile> worst;
  for (int channel = 0; channel < std::min<int>(3, static_cast<int>(channels.size())); ++channel) {
    double lowest = 0;
    double highest = 0;
    cv::minMaxLoc(channels[channel], &lowest, &highest, nullptr, nullptr, inside);
    const int middle = cvFloor((lowest + highest) / 2);
    const auto [dark, light] = SidesOf(channels[channel], inside, middle);
    for (const bool top : {true, false}) {
      const std::optional<PileCandidate> found = PileOf(top ? light : dark, NoiseOf(top ? dark : light), top, channel);
      if (!found || (worst && found->pile.share <= worst->share)) continue;
      if (found->sure || IsCut(channels[channel], part.outline, top)) worst = found->pile;
    }
  }
  return worst;
}

std::optional<double> LightSideReach(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline) {
  const Surroundings part = SurroundingsOf(photo, outline);
  if (part.photo.empty()) return std::nullopt;
  const SlantedEdge edge = LocateEdge(GreyOf(part.photo), part.outline, {Transfer::Kind::kLinear, 1});
  // Nearer to the pixels' grid the spread is seen in too few places; steeper, the region may hold the chart's corner.
  constexpr double kLeastAngleDeg = 1.5;
  constexpr double kMostAngleDeg = 6.5;
  const double angle = edge.reason == nullptr ? std::fabs(edge.angle_deg()) : 0;
  if (angle < kLeastAngleDeg || angle > kMostAngleDeg) return std::nullopt;
  const EdgeSpread spread = ProjectEdge(edge, edge.room).whole;
  if (spread.levels.empty()) return std::nullopt;
  const double middle = BinOf(spread, 0.5);
  const bool light_right = edge.right.level > edge.left.level;
  double least = INFINITY;
  for (const double rest : {0.2, 0.1, 0.05}) {
    const double to_right = BinOf(spread, 1 - rest) - middle;
    const double to_left = middle - BinOf(spread, rest);
    const double reach = light_right ? to_right / to_left : to_left / to_right;
    if (!std::isfinite(reach)) return std::nullopt;
    least = std::min(least, reach);
  }
  return least;
}

bool LooksMirrored(const FoundChart& found) {
  if (found.marks.size() != kMarks || found.gray.empty()) return false;
  // Four places in the dark rectangle, and where a mirror would put them.
  const std::array<cv::Point2d, 4> rectangle = EdgeTarget();
  int dark_there = 0;
  int dark_mirrored = 0;
  const cv::Point2d middle = (rectangle[0] + rectangle[2]) / 2;
  for (const cv::Point2d& corner : rectangle) {
    const cv::Point2d at = (middle + corner) / 2;
    const std::optional<double> there = LevelAt(found, at.x, at.y);
    const std::optional<double> mirrored = LevelAt(found, at.y, at.x);
    if (!there || !mirrored) return false;
    dark_there += *there <= found.threshold ? 1 : 0;
    dark_mirrored += *mirrored <= found.threshold ? 1 : 0;
  }
  return dark_mirrored >= 3 && dark_there <= 1;
}

}  // namespace qv
