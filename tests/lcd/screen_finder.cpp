// A lit or dark display in a photo.
//
// 1. Candidates: a reduced picture is cut at many levels; each blob, bright or dark, as it is, opened and closed, gives
//    the quadrilaterals that its hull suggests.
// 2. Each candidate's sides are held against the photo itself: along its normals a side must show a step of the right
//    sign for most of its length; a line through those steps, robustly fitted, takes its place.
// 3. Of those left the largest is chosen, screens in bezels aside.
// 4. Edge profiles across the chosen sides, sampled finer than the pixels as in a slanted-edge measurement, place the
//    lines. A blurred edge is symmetrical in light; where stored levels are a bent measure of it, its profile leans,
//    and the crossing of one half lies off by up to the blur's width. The power that makes the profile symmetrical
//    again undoes that, whatever the transfer was.

#include "tests/lcd/screen_finder.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <opencv2/imgproc.hpp>
#include <optional>

namespace {

using Quad = std::array<cv::Point2d, 4>;

constexpr int kCoarsePx = 480;          // longer side of the reduced picture
constexpr double kLeastFill = 0.75;     // of a quadrilateral by its blob
constexpr double kLeastSupport = 0.6;   // of a side by steps in one line
constexpr double kLeastAngle = 0.6;     // sine of a corner's angle
constexpr double kScreenOfPhone = 0.3;  // a bright area this large in a dark one is a screen in its bezel
constexpr int kMostTried = 120;
constexpr double kSkipped = 0.06;       // of a side at either end: corners may be rounded
constexpr double kLeastGreyStep = 0.4;  // of the highest step of a colour
constexpr double kClearly = 0.1;        // vote for grey: as much as noise alone gives here and there

double Cross(cv::Point2d a, cv::Point2d b) { return a.x * b.y - a.y * b.x; }

double AreaOf(const Quad& q) { return 0.5 * Cross(q[2] - q[0], q[3] - q[1]); }

// A line through p along the unit vector d; the screen lies on its right as seen (y points down), so n points outward.
struct Line {
  cv::Point2d p, d;
  cv::Point2d n() const { return {d.y, -d.x}; }
};

std::optional<cv::Point2d> Meet(const Line& a, const Line& b) {
  const double sine = Cross(a.d, b.d);
  if (std::abs(sine) < 0.1) return std::nullopt;
  return a.p + a.d * (Cross(b.p - a.p, b.d) / sine);
}

using Sides = std::array<Line, 4>;  // side i runs from corner i to the next

Sides SidesOf(const Quad& q) {
  Sides sides;
  for (int i = 0; i < 4; ++i) {
    const cv::Point2d along = q[(i + 1) % 4] - q[i];
    sides[i] = {q[i], along / cv::norm(along)};
  }
  return sides;
}

std::optional<Quad> CornersOf(const Sides& sides) {
  Quad q;
  for (int i = 0; i < 4; ++i) {
    const auto corner = Meet(sides[(i + 3) % 4], sides[i]);
    if (!corner) return std::nullopt;
    q[i] = *corner;
  }
  return q;
}

// Convex, clockwise as seen, no corner too sharp or too flat.
bool IsSound(const Quad& q, double least_side) {
  for (int i = 0; i < 4; ++i) {
    const cv::Point2d in = q[i] - q[(i + 3) % 4];
    const cv::Point2d out = q[(i + 1) % 4] - q[i];
    if (cv::norm(out) < least_side || Cross(in, out) < kLeastAngle * cv::norm(in) * cv::norm(out)) return false;
  }
  return true;
}

// Clockwise as seen, from the corner nearest the upper left.
Quad InOrder(Quad q) {
  if (AreaOf(q) < 0) std::reverse(q.begin(), q.end());
  const auto first = std::min_element(q.begin(), q.end(), [](auto a, auto b) { return a.x + a.y < b.x + b.y; });
  std::rotate(q.begin(), first, q.end());
  return q;
}

// ---- 1. Candidates --------------------------------------------------------------------------------------------------

struct Outline {
  Quad corners;
  bool dark;
};

// The quadrilateral of a hull: by dropping its least corners, and by its four longest sides, which sees past corners
// that are rounded or cut.
std::vector<Quad> QuadsOf(const std::vector<cv::Point>& hull) {
  std::vector<Quad> quads;
  const double perimeter = cv::arcLength(hull, true);
  std::vector<cv::Point> rough;
  for (const double share : {0.01, 0.015, 0.022, 0.034, 0.05, 0.076}) {
    if (!quads.empty()) break;
    cv::approxPolyDP(hull, rough, share * perimeter, true);
    if (rough.size() == 4) quads.push_back(InOrder({rough[0], rough[1], rough[2], rough[3]}));
    if (rough.size() < 4) break;
  }
  cv::approxPolyDP(hull, rough, 0.01 * perimeter, true);
  const std::size_t count = rough.size();
  if (count < 5) return quads;
  if (cv::contourArea(rough, true) < 0) std::reverse(rough.begin(), rough.end());
  std::vector<std::size_t> longest(count);
  for (std::size_t i = 0; i < count; ++i) longest[i] = i;
  const auto side = [&](std::size_t i) { return cv::Point2d(rough[(i + 1) % count] - rough[i]); };
  std::nth_element(longest.begin(), longest.begin() + 3, longest.end(),
                   [&](auto a, auto b) { return cv::norm(side(a)) > cv::norm(side(b)); });
  std::sort(longest.begin(), longest.begin() + 4);
  Sides sides;
  for (int i = 0; i < 4; ++i) sides[i] = {rough[longest[i]], side(longest[i]) / cv::norm(side(longest[i]))};
  if (const auto quad = CornersOf(sides)) quads.push_back(InOrder(*quad));
  return quads;
}

void AddCandidates(const cv::Mat& mask, bool dark, double least_area, std::vector<Outline>& candidates) {
  cv::Mat framed;
  cv::copyMakeBorder(mask, framed, 1, 1, 1, 1, cv::BORDER_CONSTANT, cv::Scalar(0));
  std::vector<std::vector<cv::Point>> contours;
  std::vector<cv::Vec4i> tree;
  cv::findContours(framed, contours, tree, cv::RETR_CCOMP, cv::CHAIN_APPROX_SIMPLE, {-1, -1});
  for (std::size_t i = 0; i < contours.size(); ++i) {
    const bool hole = tree[i][3] >= 0;
    const double area = cv::contourArea(contours[i]);
    if (hole || area < least_area) continue;
    std::vector<cv::Point> hull;
    cv::convexHull(contours[i], hull);
    for (const Quad& quad : QuadsOf(hull)) {
      const double fill = area / std::max(AreaOf(quad), 1e-9);
      if (fill > kLeastFill && fill < 1.2 && IsSound(quad, 3)) candidates.push_back({quad, dark});
    }
  }
}

// Levels to cut at: evenly between the extremes, and where a tenth more of the picture is darker.
std::vector<int> Cuts(const cv::Mat& coarse) {
  std::array<int, 256> histogram = {};
  for (int row = 0; row < coarse.rows; ++row) {
    for (int column = 0; column < coarse.cols; ++column) ++histogram[coarse.at<std::uint8_t>(row, column)];
  }
  std::vector<int> cuts;
  for (int i = 1; i < 16; ++i) cuts.push_back(16 * i);
  std::size_t below = 0;
  std::size_t next = 1;
  for (int level = 0; level < 255; ++level) {
    below += histogram[level];
    if (below * 10 < next * coarse.total()) continue;
    cuts.push_back(level);
    next = below * 10 / coarse.total() + 1;
  }
  std::sort(cuts.begin(), cuts.end());
  cuts.erase(std::unique(cuts.begin(), cuts.end()), cuts.end());
  return cuts;
}

double CoarseScale(cv::Size photo) {
  return std::max(1.0, static_cast<double>(std::max(photo.width, photo.height)) / kCoarsePx);
}

// In the photo's pixels, the largest first.
std::vector<Outline> Candidates(const cv::Mat& levels, double min_area) {
  const double scale = CoarseScale(levels.size());
  cv::Mat coarse;
  const cv::Size size(cvRound(std::max(levels.cols / scale, 1.0)), cvRound(std::max(levels.rows / scale, 1.0)));
  cv::resize(levels, coarse, size, 0, 0, cv::INTER_AREA);
  cv::normalize(coarse, coarse, 0, 255, cv::NORM_MINMAX, CV_8U);
  if (std::min(size.width, size.height) > 40) cv::medianBlur(coarse, coarse, 3);
  const int brush = std::max(3, std::max(size.width, size.height) / 60) | 1;
  const cv::Mat kernel = cv::getStructuringElement(cv::MORPH_RECT, {brush, brush});
  const double least_area = 0.8 * min_area * static_cast<double>(coarse.total());
  std::vector<Outline> candidates;
  for (const int cut : Cuts(coarse)) {
    const cv::Mat bright = coarse > cut;
    cv::Mat opened;
    cv::Mat closed;
    cv::morphologyEx(bright, opened, cv::MORPH_OPEN, kernel);
    cv::morphologyEx(bright, closed, cv::MORPH_CLOSE, kernel);
    for (const cv::Mat& mask : {bright, opened, closed}) {
      AddCandidates(mask, false, least_area, candidates);
      AddCandidates(~mask, true, least_area, candidates);
    }
  }
  const double sx = static_cast<double>(levels.cols) / size.width;
  const double sy = static_cast<double>(levels.rows) / size.height;
  for (Outline& candidate : candidates) {  // 1: the frame; contours run through the centres of the outermost pixels
    for (cv::Point2d& p : candidate.corners) p = {(p.x - 0.5) * sx - 0.5, (p.y - 0.5) * sy - 0.5};
  }
  std::stable_sort(candidates.begin(), candidates.end(),
                   [](const auto& a, const auto& b) { return AreaOf(a.corners) > AreaOf(b.corners); });
  return candidates;
}

bool SamePlace(const Quad& a, const Quad& b, double near) {
  for (int i = 0; i < 4; ++i) {
    if (cv::norm(a[i] - b[i]) > near) return false;
  }
  return true;
}

// Without those that lie where one before lies.
std::vector<Outline> Distinct(const std::vector<Outline>& candidates, double near) {
  std::vector<Outline> distinct;
  for (const Outline& candidate : candidates) {
    if (std::none_of(distinct.begin(), distinct.end(), [&](const Outline& other) {
          return other.dark == candidate.dark && SamePlace(other.corners, candidate.corners, near);
        })) {
      distinct.push_back(candidate);
    }
  }
  return distinct;
}

// ---- 2. Sides in the photo ------------------------------------------------------------------------------------------

class Levels {
 public:
  explicit Levels(const cv::Mat& levels) : levels_(levels), scale_(levels.depth() == CV_16U ? 1.0 / 257 : 1) {}

  cv::Size size() const { return levels_.size(); }
  double At(int column, int row) const {
    return scale_ *
           (levels_.depth() == CV_16U ? levels_.at<std::uint16_t>(row, column) : levels_.at<std::uint8_t>(row, column));
  }
  bool Holds(cv::Point2d p) const { return p.x >= 0 && p.y >= 0 && p.x <= levels_.cols - 1 && p.y <= levels_.rows - 1; }
  double Between(cv::Point2d p) const {  // p is held
    const int x = std::min(static_cast<int>(p.x), std::max(levels_.cols - 2, 0));
    const int y = std::min(static_cast<int>(p.y), std::max(levels_.rows - 2, 0));
    const int right = std::min(x + 1, levels_.cols - 1);
    const int below = std::min(y + 1, levels_.rows - 1);
    const double fx = p.x - x;
    const double fy = p.y - y;
    return (1 - fy) * ((1 - fx) * At(x, y) + fx * At(right, y)) +
           fy * ((1 - fx) * At(x, below) + fx * At(right, below));
  }

 private:
  cv::Mat levels_;
  double scale_;
};

// The place along the normal, in pixels outward from p, where the level falls most (times sign), if it falls enough:
// means of kReach samples on either side are compared, of fewer outside where the photo ends.
std::optional<double> StepAt(const Levels& levels, cv::Point2d p, const Line& side, double window, double sign,
                             double least) {
  constexpr int kReach = 5;
  const int count = static_cast<int>(std::ceil(window));
  const int from = -count - kReach;
  std::vector<double> sums = {0};
  for (int o = from; o <= count + kReach; ++o) {
    double sum = 0;
    int held = 0;
    for (int t = -1; t <= 1; ++t) {
      const cv::Point2d q = p + side.n() * static_cast<double>(o) + side.d * static_cast<double>(t);
      if (!levels.Holds(q)) continue;
      sum += levels.Between(q);
      ++held;
    }
    if (held == 0 && o < -count) {
      sums.assign(1, 0);  // the window reaches beyond the photo on its inner side: a small screen's far rim
      continue;
    }
    if (held == 0) break;
    sums.push_back(sums.back() + sum / held);
  }
  const int samples = static_cast<int>(sums.size()) - 1;
  std::optional<double> place;
  for (int i = 1; i < samples; ++i) {
    const int inside = std::min(i, kReach);
    const int outside = std::min(samples - i, kReach);
    const double step = sign * ((sums[i] - sums[i - inside]) / inside - (sums[i + outside] - sums[i]) / outside);
    if (step < least) continue;
    least = step;
    place = from + i - 0.5;
  }
  return place && std::abs(*place) <= count ? place : std::nullopt;
}

struct FittedSide {
  Line line;
  double support = 0;
};

// The line that most points lie near (median of squares, as Rousseeuw 1984), then least squares through those.
std::optional<FittedSide> FitLine(const std::vector<cv::Point2d>& points, std::size_t wanted, cv::Point2d along) {
  if (points.size() < 3) return std::nullopt;
  double least = 1e30;
  Line best = {};
  std::vector<double> off(points.size());
  cv::RNG random(1);
  for (int trial = 0; trial < 60; ++trial) {
    const cv::Point2d a = points[random.uniform(0, static_cast<int>(points.size()))];
    const cv::Point2d b = points[random.uniform(0, static_cast<int>(points.size()))];
    const double length = cv::norm(b - a);
    if (length < 2) continue;
    const Line line = {a, (b - a) / length};
    for (std::size_t i = 0; i < points.size(); ++i) off[i] = std::abs(Cross(line.d, points[i] - a));
    const auto quantile = off.begin() + static_cast<std::ptrdiff_t>(0.6 * static_cast<double>(off.size()));
    std::nth_element(off.begin(), quantile, off.end());
    if (*quantile >= least) continue;
    least = *quantile;
    best = line;
  }
  if (least > 1e29) return std::nullopt;
  const double near = std::max(1.0, 2.5 * least);
  std::vector<cv::Point2f> kept;
  for (const cv::Point2d p : points) {
    if (std::abs(Cross(best.d, p - best.p)) <= near) kept.emplace_back(p - best.p);
  }
  cv::Vec4f line;
  cv::fitLine(kept, line, cv::DIST_L2, 0, 0.001, 0.001);
  FittedSide side;
  side.line = {best.p + cv::Point2d(line[2], line[3]), {line[0], line[1]}};
  side.line.d *= 1 / cv::norm(side.line.d);
  if (side.line.d.dot(along) < 0) side.line.d = -side.line.d;
  side.support = static_cast<double>(kept.size()) / static_cast<double>(wanted);
  return side;
}

std::optional<FittedSide> FitSide(const Levels& levels, cv::Point2d from, cv::Point2d to, double window, bool dark,
                                  double contrast) {
  const double length = cv::norm(to - from);
  const Line side = {from, (to - from) / length};
  const std::size_t count = static_cast<std::size_t>(std::clamp(length / 2, 6.0, 160.0));
  std::vector<cv::Point2d> points;
  for (std::size_t i = 0; i < count; ++i) {
    const double t = kSkipped + (1 - 2 * kSkipped) * (static_cast<double>(i) + 0.5) / static_cast<double>(count);
    const cv::Point2d p = from + (to - from) * t;
    if (const auto step = StepAt(levels, p, side, window, dark ? -1 : 1, contrast))
      points.push_back(p + side.n() * *step);
  }
  if (static_cast<double>(points.size()) < kLeastSupport * static_cast<double>(count)) return std::nullopt;
  return FitLine(points, count, side.d);
}

struct Screen {
  Quad corners;
  bool dark;
  double support;  // of the least supported side
};

std::optional<Screen> HoldAgainst(const Levels& levels, const Outline& candidate, const ScreenRules& rules) {
  const double scale = CoarseScale(levels.size());
  Screen screen = {candidate.corners, candidate.dark, 1};
  for (const double window : {4 * scale, 2 + scale}) {
    Sides sides;
    screen.support = 1;
    for (int i = 0; i < 4; ++i) {
      const auto side =
          FitSide(levels, screen.corners[i], screen.corners[(i + 1) % 4], window, screen.dark, rules.min_contrast);
      if (!side || side->support < kLeastSupport) return std::nullopt;
      sides[i] = side->line;
      screen.support = std::min(screen.support, side->support);
    }
    const auto corners = CornersOf(sides);
    if (!corners || !IsSound(*corners, 4)) return std::nullopt;
    screen.corners = *corners;
  }
  const bool inside = std::all_of(screen.corners.begin(), screen.corners.end(), [&](cv::Point2d p) {
    return p.x > -0.5 && p.y > -0.5 && p.x < levels.size().width - 0.5 && p.y < levels.size().height - 0.5;
  });
  if (!inside || AreaOf(screen.corners) < rules.min_area * levels.size().area()) return std::nullopt;
  return screen;
}

// ---- 3. The screen among the candidates -----------------------------------------------------------------------------

// At least so far from every side.
bool LiesIn(const Quad& inner, const Quad& outer, double margin) {
  const Sides sides = SidesOf(outer);
  return std::all_of(inner.begin(), inner.end(), [&](cv::Point2d p) {
    return std::all_of(sides.begin(), sides.end(),
                       [&](const Line& side) { return side.n().dot(p - side.p) < -margin; });
  });
}

const Screen* Largest(const std::vector<Screen>& screens, const Screen* within, std::optional<bool> dark) {
  const Screen* largest = nullptr;
  for (const Screen& screen : screens) {
    if (&screen == within || (dark && screen.dark != *dark)) continue;
    if (within != nullptr && !LiesIn(screen.corners, within->corners, -1)) continue;
    if (largest == nullptr || AreaOf(screen.corners) > AreaOf(largest->corners)) largest = &screen;
  }
  return largest;
}

// Of the bright ones that lie well within a bright one.
const Screen* LargestInside(const std::vector<Screen>& screens, const Screen& outer) {
  const Screen* largest = nullptr;
  for (const Screen& screen : screens) {
    if (screen.dark || !LiesIn(screen.corners, outer.corners, 0.01 * std::sqrt(AreaOf(outer.corners)))) continue;
    if (largest == nullptr || AreaOf(screen.corners) > AreaOf(largest->corners)) largest = &screen;
  }
  return largest;
}

const Screen* Choose(const std::vector<Screen>& screens, bool dark_first) {
  const Screen* chosen = dark_first ? Largest(screens, nullptr, true) : nullptr;
  if (chosen == nullptr) chosen = Largest(screens, nullptr, std::nullopt);
  if (chosen == nullptr) return nullptr;
  // A phone on a bright ground: its bezel is dark, what shows in it is the screen. So too on a sheet that is all in
  // view.
  const Screen* phone = chosen->dark ? chosen : Largest(screens, chosen, true);
  if (phone != nullptr) {
    const Screen* lit = Largest(screens, phone, false);
    if (lit != nullptr && AreaOf(lit->corners) > kScreenOfPhone * AreaOf(phone->corners)) chosen = lit;
  }
  // A light frame about a lighter screen.
  if (!chosen->dark) {
    const Screen* inner = LargestInside(screens, *chosen);
    if (inner != nullptr && AreaOf(inner->corners) > kScreenOfPhone * AreaOf(chosen->corners)) chosen = inner;
  }
  // Of nearly the same outlines, from other levels, the one that is best supported.
  const Screen* best = chosen;
  const double near = 0.02 * std::sqrt(AreaOf(chosen->corners));
  for (const Screen& screen : screens) {
    const bool better = screen.dark == chosen->dark && screen.support > best->support;
    if (better && SamePlace(screen.corners, chosen->corners, near)) best = &screen;
  }
  return best;
}

// ---- 4. Corners to sub-pixels ---------------------------------------------------------------------------------------

struct Sample {
  double place, level;  // pixels outward from the line; 0 to 255
};

struct Profile {
  std::vector<Sample> samples;
  double noise = 0;  // standard deviation of a pixel, levels
};

// Mean level by distance from the line, in quarters of a pixel, from the photo's pixels along a piece of the side.
Profile EdgeProfile(const Levels& levels, cv::Point2d from, cv::Point2d to, const Line& line, double reach) {
  constexpr int kPerPixel = 4;
  const int bins = 2 * static_cast<int>(reach * kPerPixel) + 1;
  std::vector<cv::Vec4d> sums(bins);  // count, place, level, its square
  const bool lying = std::abs(line.d.x) > std::abs(line.d.y);
  const auto major = [lying](cv::Point2d p) { return lying ? p.x : p.y; };
  const double a = major(from);
  const double b = major(to);
  const double slope = lying ? line.d.y / line.d.x : line.d.x / line.d.y;
  const int across = static_cast<int>(std::ceil(reach * std::sqrt(1 + slope * slope)));
  for (int i = static_cast<int>(std::ceil(std::min(a, b))); i <= std::max(a, b); ++i) {
    const int middle = cvRound((lying ? line.p.y : line.p.x) + slope * (i - major(line.p)));
    for (int j = middle - across; j <= middle + across; ++j) {
      const cv::Point p = lying ? cv::Point(i, j) : cv::Point(j, i);
      const double place = line.n().dot(cv::Point2d(p) - line.p);
      const int bin = cvRound(place * kPerPixel) + bins / 2;
      if (bin < 0 || bin >= bins || !levels.Holds(p)) continue;
      const double level = levels.At(p.x, p.y);
      sums[bin] += cv::Vec4d(1, place, level, level * level);
    }
  }
  Profile profile;
  std::vector<double> variances;  // at the ends, away from the edge
  for (const cv::Vec4d& sum : sums) {
    if (sum[0] == 0) continue;
    const Sample sample = {sum[1] / sum[0], sum[2] / sum[0]};
    profile.samples.push_back(sample);
    if (std::abs(sample.place) > reach / 2) variances.push_back(sum[3] / sum[0] - sample.level * sample.level);
  }
  // The upper quartile: where levels are clipped, noise hardly shows.
  const auto upper = variances.begin() + static_cast<std::ptrdiff_t>(variances.size() * 3 / 4);
  if (upper != variances.end()) {
    std::nth_element(variances.begin(), upper, variances.end());
    profile.noise = std::sqrt(std::max(*upper, 0.0));
  }
  return profile;
}

// How stored levels of 0 to 1 come from light: as they are, or by the transfer function of sRGB (IEC 61966-2-1).
using Transfer = double (*)(double);

double AsLight(double v) { return v; }

double AsSrgb(double v) { return v <= 0.0031308 ? 12.92 * v : 1.055 * std::pow(v, 1 / 2.4) - 0.055; }

double LightOfSrgb(double v) { return v <= 0.04045 ? v / 12.92 : std::pow((v + 0.055) / 1.055, 2.4); }

// A step blurred in light, then stored and clipped: place, logarithm of the blur's sigma, light outside, and how much
// more there is inside.
using Edge = cv::Vec4d;

// Mean of a level with noise, none of which goes below 0.
double ClippedMean(double level, double noise) {
  if (level > 4 * noise) return level;
  const double x = level / noise;
  return level * 0.5 * std::erfc(-x / std::sqrt(2.0)) + noise * std::exp(-x * x / 2) / std::sqrt(2 * CV_PI);
}

double StoredLevel(const Edge& edge, Transfer stored, double noise, double place) {
  const double light = edge[2] + edge[3] * 0.5 * std::erfc((place - edge[0]) / (std::sqrt(2.0) * std::exp(edge[1])));
  return ClippedMean(255 * std::clamp(stored(std::max(light, 0.0)), 0.0, 1.0), noise);
}

double SquaredError(const Profile& profile, const Edge& edge, Transfer stored) {
  double sum = 0;
  for (const Sample& s : profile.samples) {
    sum += std::pow(s.level - StoredLevel(edge, stored, profile.noise, s.place), 2);
  }
  return sum;
}

struct EdgeFit {
  double place, error;
};

// By Levenberg and Marquardt's method.
EdgeFit FitEdge(const Profile& profile, Transfer stored) {
  const auto light = [stored](double level) { return stored == AsLight ? level / 255 : LightOfSrgb(level / 255); };
  const double outside = light(profile.samples.back().level);
  Edge edge(0, 0, outside, light(profile.samples.front().level) - outside);
  double error = SquaredError(profile, edge, stored);
  double damping = 1e-3;
  for (int round = 0; round < 30 && damping < 1e6; ++round) {
    cv::Matx44d curvature = cv::Matx44d::zeros();
    Edge slope;
    for (const Sample& s : profile.samples) {
      const double level = StoredLevel(edge, stored, profile.noise, s.place);
      Edge change;
      for (int k = 0; k < 4; ++k) {
        Edge moved = edge;
        moved[k] += 1e-5;
        change[k] = (StoredLevel(moved, stored, profile.noise, s.place) - level) / 1e-5;
      }
      curvature += change * change.t();
      slope += change * (s.level - level);
    }
    for (int k = 0; k < 4; ++k) curvature(k, k) += damping * curvature(k, k) + 1e-9;
    Edge next = edge + curvature.solve(slope, cv::DECOMP_CHOLESKY);
    next[1] = std::clamp(next[1], -2.0, 2.0);
    const double next_error = SquaredError(profile, next, stored);
    const bool better = next_error < error;
    damping *= better ? 0.2 : 8;
    if (!better) continue;
    const bool settled = cv::norm(next - edge) < 1e-6;
    edge = next;
    error = next_error;
    if (settled) break;
  }
  return {edge[0], error};
}

double StepOf(const std::vector<Sample>& profile) {
  const std::size_t few = profile.size() / 4 + 1;
  double step = 0;
  for (std::size_t i = 0; i < few; ++i) step += profile[i].level - profile[profile.size() - 1 - i].level;
  return std::abs(step) / static_cast<double>(few);
}

// A side in pieces, so that its direction comes out as well as its place.
struct PiecewiseFit {
  std::vector<cv::Point2d> points;
  std::vector<double> errors;  // of all pieces, over the noise's
};

PiecewiseFit FitPieces(const std::vector<Profile>& pieces, const Line& line, double length, Transfer stored) {
  PiecewiseFit fit;
  const double used = (1 - 2 * kSkipped) * length;
  for (std::size_t i = 0; i < pieces.size(); ++i) {
    const EdgeFit edge = FitEdge(pieces[i], stored);
    const double along = kSkipped * length + used * (static_cast<double>(i) + 0.5) / static_cast<double>(pieces.size());
    if (std::abs(edge.place) < 3) fit.points.push_back(line.p + line.d * along + line.n() * edge.place);
    fit.errors.push_back(edge.error / (std::pow(pieces[i].noise, 2) + 0.01));
  }
  return fit;
}

// Least squares, once more without points that lie off by more than three of the median distance.
Line Through(std::vector<cv::Point2d> points, const Line& coarse) {
  Line line = coarse;
  for (int round = 0; round < 2 && points.size() > 1; ++round) {
    std::vector<cv::Point2f> near;
    for (const cv::Point2d p : points) near.emplace_back(p - coarse.p);
    cv::Vec4f fitted;
    cv::fitLine(near, fitted, cv::DIST_L2, 0, 1e-4, 1e-4);
    line = {coarse.p + cv::Point2d(fitted[2], fitted[3]), cv::Point2d(fitted[0], fitted[1])};
    line.d *= (line.d.dot(coarse.d) < 0 ? -1 : 1) / cv::norm(line.d);
    std::vector<double> off;
    for (const cv::Point2d p : points) off.push_back(std::abs(Cross(line.d, p - line.p)));
    std::vector<double> sorted = off;
    std::sort(sorted.begin(), sorted.end());
    const double most = std::max(3 * sorted[sorted.size() / 2], 0.05);
    std::vector<cv::Point2d> kept;
    for (std::size_t i = 0; i < points.size(); ++i) {
      if (off[i] <= most) kept.push_back(points[i]);
    }
    points.swap(kept);
  }
  return line;
}

// Without what lies beyond a narrow bezel: outside, where the level comes back by more than a 25th of the step.
void CutAtNextEdge(std::vector<Sample>& profile) {
  constexpr std::size_t kMean = 3;
  const double inside = profile.front().level;
  const auto depth = [&](std::size_t i) {  // of kMean samples from i on, below or above the inside
    double sum = 0;
    for (std::size_t k = i; k < i + kMean; ++k) sum += profile[k].level / kMean;
    return std::abs(inside - sum);
  };
  double deepest = 0;
  for (std::size_t i = profile.size() / 2; i + kMean <= profile.size(); ++i) {
    deepest = std::max(deepest, depth(i));
    if (depth(i) > 0.96 * deepest) continue;
    while (i > profile.size() / 2 && depth(i - 1) < 0.99 * deepest) --i;
    profile.resize(i + 1);
    return;
  }
}

// Profiles of one piece: of the colour with the highest step, since the brightest one at each place would bend the
// profile where noise decides which that is; and of grey, unless its step is far lower.
struct Piece {
  std::array<Profile, 2> by_source;  // colour, grey
};

std::optional<Piece> ProfilesOf(const std::vector<Levels>& channels, const Levels& grey, cv::Point2d from,
                                cv::Point2d to, const Line& line, double reach) {
  Piece piece;
  Profile& best = piece.by_source[0];
  double highest = -1;
  for (const Levels& channel : channels) {
    Profile found = EdgeProfile(channel, from, to, line, reach);
    if (found.samples.size() < 5) return std::nullopt;
    const double step = StepOf(found.samples);
    if (step <= highest) continue;
    highest = step;
    std::swap(best, found);
  }
  Profile mixed = EdgeProfile(grey, from, to, line, reach);
  piece.by_source[1] = StepOf(mixed.samples) >= kLeastGreyStep * highest ? mixed : best;
  for (Profile& profile : piece.by_source) CutAtNextEdge(profile.samples);
  return piece;
}

// How much better the second fits than the first, on average of the pieces; one that neither fits, at the end of a bar
// or under a reflection, has no more than one vote.
double Vote(const std::array<PiecewiseFit, 4>& first, const std::array<PiecewiseFit, 4>& second) {
  double vote = 0;
  std::size_t pieces = 0;
  for (int i = 0; i < 4; ++i) {
    for (std::size_t k = 0; k < first[i].errors.size(); ++k, ++pieces) {
      vote += std::clamp(std::log((first[i].errors[k] + 1e-9) / (second[i].errors[k] + 1e-9)), -1.0, 1.0);
    }
  }
  return vote / static_cast<double>(pieces);
}

// By the colours or by grey, and by either transfer, whichever fits best. JPEG, and a sensor's mosaic, blur colours
// more than grey, and that blur is none of light: there grey fits better by far.
Quad Refine(const std::vector<Levels>& channels, const Levels& grey, const Screen& screen) {
  const Sides sides = SidesOf(screen.corners);
  double shortest = 1e9;
  for (int i = 0; i < 4; ++i) shortest = std::min(shortest, cv::norm(screen.corners[(i + 1) % 4] - screen.corners[i]));
  const double reach = std::min(8.0, shortest / 4);
  std::array<std::array<std::array<PiecewiseFit, 4>, 2>, 2> fits;  // by source, by transfer, by side
  const std::size_t sources = channels.size() > 1 ? 2 : 1;
  for (int i = 0; i < 4; ++i) {
    const cv::Point2d from = screen.corners[i];
    const cv::Point2d way = screen.corners[(i + 1) % 4] - from;
    const int count = static_cast<int>(std::clamp(cv::norm(way) / 24, 2.0, 10.0));
    std::array<std::vector<Profile>, 2> pieces;
    for (int k = 0; k < count; ++k) {
      const auto at = [&](int end) { return from + way * (kSkipped + (1 - 2 * kSkipped) * end / count); };
      const auto piece = ProfilesOf(channels, grey, at(k), at(k + 1), sides[i], reach);
      if (!piece) return screen.corners;
      for (std::size_t source = 0; source < sources; ++source) pieces[source].push_back(piece->by_source[source]);
    }
    for (std::size_t source = 0; source < sources; ++source) {
      fits[source][0][i] = FitPieces(pieces[source], sides[i], cv::norm(way), AsLight);
      fits[source][1][i] = FitPieces(pieces[source], sides[i], cv::norm(way), AsSrgb);
    }
  }
  const auto better = [](const auto& both) { return &both[Vote(both[0], both[1]) > 0 ? 1 : 0]; };
  const auto* best = better(fits[0]);
  if (sources > 1) {
    const auto* by_grey = better(fits[1]);
    if (Vote(*best, *by_grey) > kClearly) best = by_grey;
  }
  Sides fitted;
  for (int i = 0; i < 4; ++i) fitted[i] = Through((*best)[i].points, sides[i]);
  return CornersOf(fitted).value_or(screen.corners);
}

// Of the colour channels.
cv::Mat Brightest(const std::vector<cv::Mat>& channels) {
  cv::Mat brightest = channels[0].clone();  // the maximum is taken in place
  for (std::size_t i = 1; i < channels.size(); ++i) brightest = cv::max(brightest, channels[i]);
  return brightest;
}

}  // namespace

std::vector<cv::Point2d> FindScreenCorners(const cv::Mat& photo, const ScreenRules& rules) {
  std::vector<cv::Mat> channels;
  cv::split(photo, channels);
  if (channels.size() == 4) channels.pop_back();  // opacity
  const cv::Mat brightest = Brightest(channels);
  const Levels levels(brightest);
  std::vector<Screen> screens;
  int tried = 0;
  for (const Outline& candidate : Distinct(Candidates(brightest, rules.min_area), 1.5 * CoarseScale(photo.size()))) {
    if (++tried > kMostTried) break;
    if (const auto screen = HoldAgainst(levels, candidate, rules)) screens.push_back(*screen);
  }
  const Screen* chosen = Choose(screens, rules.dark_first);
  if (chosen == nullptr) return {};
  cv::Mat grey;
  if (channels.size() == 3) cv::cvtColor(photo, grey, photo.channels() == 4 ? cv::COLOR_BGRA2GRAY : cv::COLOR_BGR2GRAY);
  const Quad corners =
      InOrder(Refine({channels.begin(), channels.end()}, Levels(grey.empty() ? brightest : grey), *chosen));
  return {corners.begin(), corners.end()};
}
