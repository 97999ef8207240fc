// 1. Each row's edge is the centroid of its windowed derivative; a straight line through them, in two passes.
// 2. The response of the spread about that line tells how wide the edge is.
// 3. Centroids again, in a window that is just wide enough for the edge, and a curve of second order through them:
// lenses
//    bow straight edges, and light that falls off across the region pulls a wide window's centroid to one side.
// 4. A plane through each plateau. A pixel counts as its share of the way from the one to the other, which takes uneven
//    light out, across the edge and along it.
// Distances are taken along the edge's normal, so frequencies need no correction for the slant, and a region may lie in
// the photo at any turn.

#include "desk/measure/slanted_edge.h"

#include <algorithm>
#include <cmath>
#include <optional>

namespace qv {

double EdgeCurve::Column(double row) const {
  const double t = row - middle_row;
  return offset + t * (slope + bend * t);
}

double EdgeCurve::Slope(double row) const { return slope + 2 * bend * (row - middle_row); }

double SlantedEdge::angle_deg() const {
  const double angle = std::atan(curve.Slope(region.middle.y)) * 180 / CV_PI;
  return lying ? -angle : angle;
}

namespace {

constexpr std::size_t kFewestRows = 16;    // that show the edge from side to side
constexpr double kFarthest = 1e6;          // pixels from the photo's origin
constexpr double kSmallestReach = 6;       // pixels to each side of the edge
constexpr double kLeastRowContrast = 0.5;  // of a row, over that of the row that shows most
constexpr double kSurelyAnEdge = 3;        // mean contrast of the rows over its scatter
constexpr double kLeastLight = 1e-8;       // mean contrast, of full scale
constexpr double kMostEmptyBins = 0.02;    // share that may be filled from the neighbours
constexpr int kNarrowPasses = 3;

// In sigmas of the edge's width.
constexpr double kNarrow = 5;           // the centroid's window
constexpr double kPlateau = 5;          // where the plateaus begin
constexpr double kBeyondEdge = 4;       // and pixels more, for the overshoot of sharpened edges
constexpr double kWidest = 48;          // pixels of a plateau that are looked at: light falls off along a curve
constexpr double kFewestOfPlateau = 6;  // pixels of a plateau that show its slope

struct Span {
  int first, last;    // columns of one row
  bool side_to_side;  // from one longer side of the region to the other
};

struct RowEdge {
  int row;
  double place, contrast;
};

EdgeRegion Describe(const std::array<cv::Point2d, 4>& corners) {
  cv::Point2d along = corners[1] - corners[0];
  cv::Point2d across = corners[3] - corners[0];
  if (cv::norm(along) < cv::norm(across)) std::swap(along, across);
  const double length = cv::norm(along);
  const double width = cv::norm(across);
  return {(corners[0] + corners[2]) / 2, along / length, across / width, length / 2, width / 2};
}

// Turns x and y around, picture and region, so that the edge runs down the rows rather than along them.
void Transpose(cv::Mat& picture, EdgeRegion& region) {
  cv::transpose(picture, picture);
  for (cv::Point2d* p : {&region.middle, &region.along, &region.across}) std::swap(p->x, p->y);
}

// Columns for which |start + step * column| <= half.
void Clip(double start, double step, double half, double& low, double& high) {
  if (std::fabs(step) < 1e-12) {
    if (std::fabs(start) > half) high = low - 1;
    return;
  }
  const double a = (-half - start) / step;
  const double b = (half - start) / step;
  low = std::max(low, std::min(a, b));
  high = std::min(high, std::max(a, b));
}

Span SpanOf(const EdgeRegion& region, int row, int columns) {
  const cv::Point2d start = cv::Point2d(0, row) - region.middle;
  double low = -1e9;
  double high = 1e9;
  Clip(start.dot(region.across), region.across.x, region.half_width, low, high);
  const Span whole = {cvCeil(low), cvFloor(high), true};
  Clip(start.dot(region.along), region.along.x, region.half_length, low, high);
  const Span span = {std::max(cvCeil(low), 0), std::min(cvFloor(high), columns - 1), false};
  return {span.first, span.last, span.first == whole.first && span.last == whole.last};
}

// Columns of a row within `reach` of a place, inside the region.
Span Within(const Span& span, double place, double reach) {
  const int first = std::max(span.first, cvCeil(place - reach));
  return {first, std::max(std::min(span.last, cvFloor(place + reach)), first - 1), span.side_to_side};
}

// Centroid of the derivative under a parabola that reaches so far about a place.
RowEdge LocateInRow(const cv::Mat& light, int row, const Span& span, double middle, double reach) {
  const auto* levels = light.ptr<double>(row);
  const Span seen = Within(span, middle, reach + 1);
  double sum = 0;
  double moment = 0;
  for (int i = seen.first; i < seen.last; ++i) {
    const double x = (i + 0.5 - middle) / reach;
    const double weight = std::max(1 - x * x, 0.0) * (levels[i + 1] - levels[i]);
    sum += weight;
    moment += weight * (i + 0.5);
  }
  return {row, moment / sum, sum};
}

// Least squares, of second order where `bowed`.
EdgeCurve FitCurve(const std::vector<RowEdge>& edges, bool bowed) {
  const double middle = (edges.front().row + edges.back().row) / 2.0;
  const double scale = std::max(1.0, (edges.back().row - edges.front().row) / 2.0);
  cv::Matx33d normal = cv::Matx33d::zeros();
  cv::Vec3d right(0, 0, 0);
  for (const RowEdge& edge : edges) {
    const double t = (edge.row - middle) / scale;
    const cv::Vec3d basis(1, t, bowed ? t * t : 0);
    normal += basis * basis.t();
    right += basis * edge.place;
  }
  if (!bowed) normal(2, 2) = 1;
  const cv::Vec3d fit = normal.solve(right, cv::DECOMP_CHOLESKY);
  return {middle, fit[0], fit[1] / scale, fit[2] / (scale * scale)};
}

// Drops rows that the edge is not in, after the row that shows it best. Answers whether it is in most of them, by more
// than they scatter.
bool ShowAnEdge(std::vector<RowEdge>& edges) {
  const std::size_t rows = edges.size();
  double best = 0;
  for (const RowEdge& edge : edges) {
    if (std::fabs(edge.contrast) > std::fabs(best)) best = edge.contrast;
  }
  edges.erase(std::remove_if(edges.begin(), edges.end(),
                             [&](const RowEdge& edge) { return !(edge.contrast / best > kLeastRowContrast); }),
              edges.end());
  if (edges.size() < std::max(rows / 2, kFewestRows)) return false;
  const auto n = static_cast<double>(edges.size());
  double mean = 0;
  double square = 0;
  for (const RowEdge& edge : edges) {
    mean += edge.contrast / n;
    square += edge.contrast * edge.contrast / n;
  }
  return std::fabs(mean) > kSurelyAnEdge * std::sqrt(std::max(square - mean * mean, 0.0)) &&
         std::fabs(mean) > kLeastLight;
}

// Why there is no edge, or null.
const char* FitLine(SlantedEdge& edge, std::vector<RowEdge>& edges) {
  if (edges.size() < kFewestRows) return "too few rows show the edge from side to side";
  if (!ShowAnEdge(edges)) return "the region does not show one edge along its length";
  edge.curve = FitCurve(edges, false);
  return nullptr;
}

// Steps 1: rows that show the region from side to side. Fills the curve and the rows that the edge was not found in.
const char* LocateRoughly(SlantedEdge& edge) {
  edge.rows.assign(edge.light.rows, 1);
  std::vector<RowEdge> edges;
  for (const double share : {1.0, 0.5}) {
    const bool first = edges.empty();
    edges.clear();
    for (int row = 0; row < edge.light.rows; ++row) {
      const Span span = SpanOf(edge.region, row, edge.light.cols);
      if (!span.side_to_side) continue;
      const double middle = first ? (span.first + span.last) / 2.0 : edge.curve.Column(row);
      edges.push_back(LocateInRow(edge.light, row, span, middle, share * (span.last - span.first) / 2));
      edge.rows[row] = 0;
    }
    if (const char* reason = FitLine(edge, edges)) return reason;
  }
  for (const RowEdge& found : edges) edge.rows[found.row] = 1;
  const double off = (edge.curve.Column(edge.region.middle.y) - edge.region.middle.x) *
                     std::fabs(edge.region.across.x);  // the region's long sides are nearly along the edge
  edge.room = edge.region.half_width - std::fabs(off);
  return edge.room >= kSmallestReach ? nullptr : "the edge runs too near to the region's side";
}

// Step 3: every row that shows enough of both sides.
void LocateClosely(SlantedEdge& edge) {
  for (int pass = 0; pass < kNarrowPasses; ++pass) {
    const double reach =
        std::min(std::max(kNarrow * edge.sigma_px, 4.0), 0.9 * edge.room) * std::hypot(1, edge.curve.slope);
    std::vector<RowEdge> edges;
    for (int row = 0; row < edge.light.rows; ++row) {
      const Span span = SpanOf(edge.region, row, edge.light.cols);
      const double middle = edge.curve.Column(row);
      if (edge.rows[row] == 0 || middle - reach < span.first || middle + reach > span.last) continue;
      edges.push_back(LocateInRow(edge.light, row, span, middle, reach));
    }
    if (!ShowAnEdge(edges)) return;
    edge.curve = FitCurve(edges, true);
  }
}

// A plane by least squares over the pixels of one plateau, or a level where it is too narrow to show a slope.
class PlateauFit {
 public:
  void Add(double d, double t, double level) {
    const cv::Vec3d basis(1, d, t);
    normal_(0, 0) += 1;
    normal_(0, 1) += d;
    normal_(0, 2) += t;
    normal_(1, 1) += d * d;
    normal_(1, 2) += d * t;
    normal_(2, 2) += t * t;
    right_ += basis * level;
  }

  Plateau Solve(bool sloped) const {
    const Plateau flat = {right_[0] / normal_(0, 0), 0, 0};
    if (!sloped) return flat;
    cv::Matx33d normal = normal_;
    normal(1, 0) = normal(0, 1);
    normal(2, 0) = normal(0, 2);
    normal(2, 1) = normal(1, 2);
    bool solved = false;
    const cv::Matx33d inverse = normal.inv(cv::DECOMP_CHOLESKY, &solved);
    if (!solved) return flat;
    const cv::Vec3d fit = inverse * right_;
    return {fit[0], fit[1], fit[2]};
  }

 private:
  cv::Matx33d normal_ = cv::Matx33d::zeros();
  cv::Vec3d right_ = {0, 0, 0};
};

// Step 4.
void FitPlateaus(SlantedEdge& edge) {
  const double begin = kPlateau * edge.sigma_px + kBeyondEdge;
  const bool sloped = edge.room - begin >= kFewestOfPlateau;
  const double from = sloped ? begin : 0.8 * edge.room;
  const double to = std::min(edge.room, from + kWidest);
  PlateauFit fits[2];
  for (int row = 0; row < edge.light.rows; ++row) {
    if (edge.rows[row] == 0) continue;
    const double across = 1 / std::hypot(1, edge.curve.Slope(row));
    const double place = edge.curve.Column(row);
    const Span span = Within(SpanOf(edge.region, row, edge.light.cols), place, to / across);
    const auto* levels = edge.light.ptr<double>(row);
    for (int i = span.first; i <= span.last; ++i) {
      const double d = (i - place) * across;
      if (std::fabs(d) < from) continue;
      fits[d > 0 ? 1 : 0].Add(d, row - edge.curve.middle_row, levels[i]);
    }
  }
  edge.left = fits[0].Solve(sloped);
  edge.right = fits[1].Solve(sloped);
}

// Of the Gaussian whose response is one half where the spread's is; nothing where it is nowhere.
std::optional<double> RoughWidth(const EdgeSpread& spread, double room) {
  const LineSpread line = Differentiate(spread, room);
  if (line.weights.empty()) return std::nullopt;
  const auto count = static_cast<int>(kHighest / kCurveStep) + 1;
  const double half = FirstFall(line, ResponseCurve(line, kCurveStep, count), 0.5);
  return std::isfinite(half) ? std::optional<double>(kHalfOfSigma / half) : std::nullopt;
}

struct Bins {
  std::vector<double> sums, pixels;
  std::vector<double> distances;  // sums of what the pixels lie off their bins' middles

  explicit Bins(int count) : sums(count), pixels(count), distances(count) {}
  void Add(const Bins& other) {
    for (std::size_t k = 0; k < sums.size(); ++k) {
      sums[k] += other.sums[k];
      pixels[k] += other.pixels[k];
      distances[k] += other.distances[k];
    }
  }
};

// Bins to each side of the middle up to which no two neighbours are empty.
int FilledReach(const Bins& bins) {
  const int middle = static_cast<int>(bins.pixels.size()) / 2;
  const auto gap = [&](int k) { return bins.pixels[k] == 0 && bins.pixels[k + 1] == 0; };
  int reach = 0;
  while (reach < middle && !gap(middle + reach) && !gap(middle - reach - 1)) ++reach;
  while (reach > 0 && (bins.pixels[middle - reach] == 0 || bins.pixels[middle + reach] == 0)) --reach;
  return reach;
}

// Mean of each bin, carried from where its pixels lie in the mean to its middle. A lone empty bin is filled from its
// neighbours. The spread ends where bins stay empty, and is none when that is before `least` bins.
EdgeSpread Means(const Bins& bins, int least) {
  const int reach = FilledReach(bins);
  const int count = 2 * reach + 1;
  const int first = static_cast<int>(bins.pixels.size()) / 2 - reach;
  if (reach < least) return {};
  const auto empty = [&](int k) { return bins.pixels[first + k] == 0; };
  std::vector<double> means(count);
  std::vector<double> off(count);
  int filled = 0;
  for (int k = 0; k < count; ++k) {
    if (empty(k)) continue;
    means[k] = bins.sums[first + k] / bins.pixels[first + k];
    off[k] = bins.distances[first + k] / bins.pixels[first + k];
    ++filled;
  }
  if (count - filled > kMostEmptyBins * count) return {};
  for (int k = 1; k + 1 < count; ++k) {
    if (empty(k)) means[k] = (means[k - 1] + means[k + 1]) / 2;
  }
  EdgeSpread spread = {reach, means};
  for (int k = 1; k + 1 < count; ++k) spread.levels[k] -= off[k] * (means[k + 1] - means[k - 1]) * kBinsPerPixel / 2;
  return spread;
}

// A parabola through 2 m + 1 neighbours, its value at the middle (Savitzky and Golay).
std::vector<double> Smoothed(const std::vector<double>& levels, int m) {
  std::vector<double> smooth = levels;
  const int count = static_cast<int>(levels.size());
  for (int k = m; k + m < count; ++k) {
    double sum = 0;
    for (int i = -m; i <= m; ++i) sum += (3 * m * m + 3 * m - 1 - 5 * i * i) * levels[k + i];
    smooth[k] = 3 * sum / ((2 * m + 3) * (2 * m + 1) * (2 * m - 1));
  }
  return smooth;
}

}  // namespace

EdgeSpreads ProjectEdge(const SlantedEdge& edge, double reach) {
  const int middle = static_cast<int>(reach * kBinsPerPixel);
  const int count = 2 * middle + 1;
  std::vector<Bins> bands(kBands, Bins(count));
  const auto shown = [&](int row) { return edge.rows[row] != 0; };
  for (int row = 0; row < edge.light.rows; ++row) {
    if (!shown(row)) continue;
    Bins& bins = bands[row * kBands / edge.light.rows];
    const double across = 1 / std::hypot(1, edge.curve.Slope(row));
    const double place = edge.curve.Column(row);
    const double t = row - edge.curve.middle_row;
    const Span span = Within(SpanOf(edge.region, row, edge.light.cols), place, (reach + 1) / across);
    const auto* levels = edge.light.ptr<double>(row);
    for (int i = span.first; i <= span.last; ++i) {
      const double d = (i - place) * across;
      const double nearest = std::floor(d * kBinsPerPixel + 0.5);
      const int bin = middle + static_cast<int>(nearest);
      if (bin < 0 || bin >= count) continue;
      const double left = edge.left.At(d, t);
      bins.sums[bin] += (levels[i] - left) / (edge.right.At(d, t) - left);
      bins.pixels[bin] += 1;
      bins.distances[bin] += d - nearest / kBinsPerPixel;
    }
  }
  EdgeSpreads spreads;
  Bins whole(count);
  for (int band = 0; band < kBands; ++band) {
    whole.Add(bands[band]);
    spreads.bands[band] = Means(bands[band], middle * 2 / 5);
  }
  spreads.whole = Means(whole, middle);
  return spreads;
}

EdgeSpread RiseOf(const SlantedEdge& edge) {
  constexpr double kSigmas = 4;
  constexpr double kBeyond = 2;  // pixels
  return ProjectEdge(edge, std::min(kSigmas * edge.sigma_px + kBeyond, edge.room)).whole;
}

cv::Mat NoiselessLight(const SlantedEdge& edge, const EdgeSpread& rise, int margin, double moved) {
  constexpr double kSmoothing = 0.6;  // half the width of the smoothing, in sigmas of the edge
  const std::vector<double> share =
      Smoothed(rise.levels, std::max(1, cvRound(kSmoothing * edge.sigma_px * kBinsPerPixel)));
  const int last = static_cast<int>(share.size()) - 1;
  cv::Mat picture(edge.light.rows + 2 * margin, edge.light.cols + 2 * margin, CV_64F);
  for (int i = 0; i < picture.rows; ++i) {
    const double row = i - margin;
    const double across = 1 / std::hypot(1, edge.curve.Slope(row));
    const double place = edge.curve.Column(row);
    const double t = row - edge.curve.middle_row;
    for (int k = 0; k < picture.cols; ++k) {
      const double d = (k - margin - place - moved) * across;
      const double bin = d * kBinsPerPixel + rise.middle;
      const int below = std::clamp(cvFloor(bin), 0, last - 1);
      double risen = d > 0 ? 1 : 0;
      if (bin >= 0 && bin < last) risen = share[below] + (share[below + 1] - share[below]) * (bin - below);
      const double left = edge.left.At(d, t);
      picture.at<double>(i, k) = left + (edge.right.At(d, t) - left) * risen;
    }
  }
  return picture;
}

SlantedEdge LocateEdge(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer) {
  SlantedEdge edge;
  const auto refuse = [&](const char* reason) {
    edge.reason = reason;
    return edge;
  };
  EdgeRegion& region = edge.region = Describe(corners);
  if (!(region.half_width >= kSmallestReach)) return refuse("the region is too small");
  if (!(cv::norm(region.middle) + region.half_length < kFarthest)) return refuse("the region lies outside the photo");
  const cv::Point2d reach = {
      std::fabs(region.along.x) * region.half_length + std::fabs(region.across.x) * region.half_width,
      std::fabs(region.along.y) * region.half_length + std::fabs(region.across.y) * region.half_width};
  const cv::Point first(cvFloor(region.middle.x - reach.x), cvFloor(region.middle.y - reach.y));
  const cv::Point last(cvCeil(region.middle.x + reach.x), cvCeil(region.middle.y + reach.y));
  const cv::Rect part = cv::Rect(first, last + cv::Point(1, 1)) & cv::Rect({}, gray.size());
  if (part.empty()) return refuse("the region lies outside the photo");
  edge.first = part.tl();
  edge.light = LinearLight(gray(part), transfer);
  region.middle -= cv::Point2d(part.tl());
  edge.lying = std::fabs(region.along.x) > std::fabs(region.along.y);
  if (edge.lying) Transpose(edge.light, region);

  if (const char* reason = LocateRoughly(edge)) return refuse(reason);
  edge.left = {0, 0, 0};
  edge.right = {1, 0, 0};
  const EdgeSpread spread = ProjectEdge(edge, edge.room).whole;
  if (spread.levels.empty()) return refuse("the edge follows the pixel grid, which leaves bins empty");
  const std::optional<double> sigma = RoughWidth(spread, edge.room);
  if (!sigma) return refuse("the response does not fall to one half");
  edge.sigma_px = *sigma;
  LocateClosely(edge);
  FitPlateaus(edge);
  return edge;
}

}  // namespace qv
