// Slanted-edge MTF50 after ISO 12233 as it is usually taken:
//   1. each row's edge is the centroid of its windowed derivative; a straight line through them, in two passes;
//   2. all pixels of the region are binned by their distance from that line, four bins a pixel: the edge spread;
//   3. the central difference of the edge spread is the line spread, under a Hamming window about its centroid;
//   4. the response is |DFT| / |DFT(0)|, divided by what the difference and the bins take away;
//   5. MTF50 is the lowest frequency at which it falls to one half, less what the window adds to it.
// Distances are taken along the edge's normal, so the frequencies need no correction for the slant, and a region may
// lie in the photo at any turn. Where the standard leaves a choice: the window reaches as far as the blur asks for, no
// further, since what lies beyond adds noise only. All in double precision.

#include "desk/measure/iso_mtf.h"

#include <algorithm>
#include <cmath>
#include <complex>
#include <limits>
#include <vector>

namespace qv {

namespace {

constexpr int kBinsPerPixel = 4;
constexpr std::size_t kFewestRows = 16;  // that show the edge from side to side
constexpr double kFarthest = 1e6;        // pixels from the photo's origin
constexpr double kSmallestReach = 6;     // pixels to each side of the edge
constexpr double kLeastContrast = 0.5;   // of a row, over that of the row that shows most
constexpr double kSurelyAnEdge = 3;      // mean contrast of the rows over its scatter
constexpr double kHighest = 1.0;         // cycles/pixel; a square pixel's own response is 0.5 at 0.603
constexpr double kMostEmptyBins = 0.02;  // share that may be filled from the neighbours

// The window reaches kWindow / (frequency of response 0.5) to each side, and never less than kNarrowest pixels.
constexpr double kWindow = 4;
constexpr double kNarrowest = 12;
constexpr double kMostNarrowing = 0.2;

const double kNone = std::numeric_limits<double>::quiet_NaN();

double Sinc(double x) { return x == 0 ? 1 : std::sin(CV_PI * x) / (CV_PI * x); }

double Hamming(double x, double reach) { return std::fabs(x) < reach ? 0.54 + 0.46 * std::cos(CV_PI * x / reach) : 0; }

// A rectangle whose longer side is nearer to the rows' direction of counting (down) than to the columns'.
struct Region {
  cv::Point2d middle, along, across;  // unit vectors along the longer and the shorter side
  double half_length, half_width;
};

struct Span {
  int first, last;    // columns of one row
  bool side_to_side;  // from one longer side of the region to the other
};

// column = offset + slope * row
struct EdgeLine {
  double offset, slope;
};

struct RowEdge {
  int row;
  double place, contrast;
};

// Mean level of the pixels in each bin; bin `middle` lies about distance 0.
struct EdgeSpread {
  int middle;
  std::vector<double> levels;
};

struct LineSpread {
  std::vector<double> places, weights;  // pixels from the edge
};

Region Describe(const std::array<cv::Point2d, 4>& corners) {
  cv::Point2d along = corners[1] - corners[0];
  cv::Point2d across = corners[3] - corners[0];
  if (cv::norm(along) < cv::norm(across)) std::swap(along, across);
  const double length = cv::norm(along);
  const double width = cv::norm(across);
  return {(corners[0] + corners[2]) / 2, along / length, across / width, length / 2, width / 2};
}

// Turns x and y around, picture and region, so that the edge runs down the rows rather than along them.
void Transpose(cv::Mat& picture, Region& region) {
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

Span SpanOf(const Region& region, int row, int columns) {
  const cv::Point2d start = cv::Point2d(0, row) - region.middle;
  double low = -1e9;
  double high = 1e9;
  Clip(start.dot(region.across), region.across.x, region.half_width, low, high);
  const Span whole = {cvCeil(low), cvFloor(high), true};
  Clip(start.dot(region.along), region.along.x, region.half_length, low, high);
  const Span span = {std::max(cvCeil(low), 0), std::min(cvFloor(high), columns - 1), false};
  return {span.first, span.last, span.first == whole.first && span.last == whole.last};
}

// The edge in each row that shows it from side to side: centroid of the derivative under a window about `centre`.
template <typename Centre>
std::vector<RowEdge> LocateInRows(const cv::Mat& picture, const Region& region, double share, const Centre& centre) {
  std::vector<RowEdge> edges;
  for (int row = 0; row < picture.rows; ++row) {
    const Span span = SpanOf(region, row, picture.cols);
    if (!span.side_to_side) continue;
    const auto* levels = picture.ptr<double>(row);
    const double reach = share * (span.last - span.first) / 2;
    const double middle = centre(row, span);
    double sum = 0;
    double moment = 0;
    for (int i = span.first; i < span.last; ++i) {
      const double weight = Hamming(i + 0.5 - middle, reach) * (levels[i + 1] - levels[i]);
      sum += weight;
      moment += weight * (i + 0.5);
    }
    edges.push_back({row, moment / sum, sum});
  }
  return edges;
}

EdgeLine FitLine(const std::vector<RowEdge>& edges) {
  double row = 0;
  double place = 0;
  for (const RowEdge& edge : edges) {
    row += edge.row / static_cast<double>(edges.size());
    place += edge.place / static_cast<double>(edges.size());
  }
  double squares = 0;
  double products = 0;
  for (const RowEdge& edge : edges) {
    squares += (edge.row - row) * (edge.row - row);
    products += (edge.row - row) * (edge.place - place);
  }
  const double slope = products / squares;
  return {place - slope * row, slope};
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
                             [&](const RowEdge& edge) { return !(edge.contrast / best > kLeastContrast); }),
              edges.end());
  if (edges.size() < std::max(rows / 2, kFewestRows)) return false;
  const auto n = static_cast<double>(edges.size());
  double mean = 0;
  double square = 0;
  for (const RowEdge& edge : edges) {
    mean += edge.contrast / n;
    square += edge.contrast * edge.contrast / n;
  }
  return std::fabs(mean) > kSurelyAnEdge * std::sqrt(std::max(square - mean * mean, 0.0)) && std::fabs(mean) > 1e-6;
}

// Distances up to `reach` pixels from the line, without rows that the edge was looked for and not found in. Empty when
// too many bins see no pixel.
EdgeSpread Project(const cv::Mat& picture, const Region& region, const std::vector<RowEdge>& edges,
                   const EdgeLine& line, double reach) {
  EdgeSpread spread = {static_cast<int>(reach * kBinsPerPixel), {}};
  const int count = 2 * spread.middle + 1;
  std::vector<double> sums(count);
  std::vector<int> pixels(count);
  const double across = 1 / std::hypot(1, line.slope);
  auto edge = edges.begin();
  for (int row = 0; row < picture.rows; ++row) {
    const Span span = SpanOf(region, row, picture.cols);
    const bool found = edge != edges.end() && edge->row == row;
    if (found) ++edge;
    if (span.side_to_side && !found) continue;
    const auto* levels = picture.ptr<double>(row);
    for (int i = span.first; i <= span.last; ++i) {
      const double distance = (i - line.offset - line.slope * row) * across;
      const int bin = spread.middle + static_cast<int>(std::floor(distance * kBinsPerPixel + 0.5));
      if (bin < 0 || bin >= count) continue;
      sums[bin] += levels[i];
      ++pixels[bin];
    }
  }
  int empty = 0;
  for (int k = 0; k < count; ++k) {
    if (pixels[k] > 0) continue;
    if (k == 0 || k == count - 1 || pixels[k - 1] == 0 || pixels[k + 1] == 0) return {};
    ++empty;
  }
  if (empty > kMostEmptyBins * count) return {};
  spread.levels.resize(count);
  for (int k = 0; k < count; ++k) {
    if (pixels[k] > 0) spread.levels[k] = sums[k] / pixels[k];
  }
  for (int k = 0; k < count; ++k) {
    if (pixels[k] == 0) spread.levels[k] = (sums[k - 1] / pixels[k - 1] + sums[k + 1] / pixels[k + 1]) / 2;
  }
  return spread;
}

// Central difference under a Hamming window about the line spread's centroid.
LineSpread Differentiate(const EdgeSpread& spread, double reach) {
  const int last = static_cast<int>(spread.levels.size()) - 1;
  const auto place = [&](int k) { return static_cast<double>(k - spread.middle) / kBinsPerPixel; };
  const auto slope = [&](int k) { return (spread.levels[k + 1] - spread.levels[k - 1]) / 2; };
  double sum = 0;
  double moment = 0;
  for (int k = 1; k < last; ++k) {
    const double weight = Hamming(place(k), reach) * slope(k);
    sum += weight;
    moment += weight * place(k);
  }
  const double centre = moment / sum;
  LineSpread line;
  for (int k = 1; k < last; ++k) {
    const double window = Hamming(place(k) - centre, reach);
    if (window == 0) continue;
    line.places.push_back(place(k));
    line.weights.push_back(window * slope(k));
  }
  return line;
}

// Of the lens and the pixel, at a frequency in cycles/pixel. The difference over two bins takes away sinc(2 f / 4), the
// bins' own width sinc(f / 4).
double Response(const LineSpread& line, double frequency) {
  std::complex<double> sum;
  double whole = 0;
  for (std::size_t k = 0; k < line.places.size(); ++k) {
    sum += line.weights[k] * std::polar(1.0, -2 * CV_PI * frequency * line.places[k]);
    whole += line.weights[k];
  }
  return std::abs(sum / whole) / (Sinc(2 * frequency / kBinsPerPixel) * Sinc(frequency / kBinsPerPixel));
}

// The lowest frequency of response 0.5, cycles/pixel; NaN when there is none.
double HalfPoint(const LineSpread& line) {
  constexpr int kSteps = 400;
  double low = 0;
  for (int i = 1; i <= kSteps; ++i) {
    double high = kHighest * i / kSteps;
    if (Response(line, high) > 0.5) {
      low = high;
      continue;
    }
    for (int bisection = 0; bisection < 20; ++bisection) {
      const double middle = (low + high) / 2;
      (Response(line, middle) > 0.5 ? low : high) = middle;
    }
    return low;
  }
  return kNone;
}

// What the window takes from the square of a line spread's width, as a share of it. About its middle the window is
// 1 - c x^2, which narrows a Gaussian of sigma to 1 / sqrt(1 / sigma^2 + 2 c); the Gaussian that has a response of 0.5
// at this frequency stands in for whatever the line spread is.
double Narrowing(double half, double reach) {
  const double c = 0.46 * CV_PI * CV_PI / 2 / (reach * reach);
  const double sigma_squared = std::log(2) / 2 / (CV_PI * CV_PI * half * half);  // as narrowed
  return 2 * c * sigma_squared;
}

IsoMtf Measure(const cv::Mat& gray, Region region) {
  const auto refuse = [](const char* reason) { return IsoMtf{kNone, kNone, reason}; };
  if (!(region.half_width >= kSmallestReach)) return refuse("the region is too small");
  if (!(cv::norm(region.middle) + region.half_length < kFarthest)) return refuse("the region lies outside the photo");
  // The part of the photo about the region, in double.
  const cv::Point2d reach = {
      std::fabs(region.along.x) * region.half_length + std::fabs(region.across.x) * region.half_width,
      std::fabs(region.along.y) * region.half_length + std::fabs(region.across.y) * region.half_width};
  const cv::Point first(cvFloor(region.middle.x - reach.x), cvFloor(region.middle.y - reach.y));
  const cv::Point last(cvCeil(region.middle.x + reach.x), cvCeil(region.middle.y + reach.y));
  const cv::Rect part = cv::Rect(first, last + cv::Point(1, 1)) & cv::Rect({}, gray.size());
  if (part.empty()) return refuse("the region lies outside the photo");
  cv::Mat picture;
  gray(part).convertTo(picture, CV_64F);
  region.middle -= cv::Point2d(part.tl());
  const bool lying = std::fabs(region.along.x) > std::fabs(region.along.y);
  if (lying) Transpose(picture, region);

  std::vector<RowEdge> edges =
      LocateInRows(picture, region, 1, [](int /*row*/, Span span) { return (span.first + span.last) / 2.0; });
  if (edges.size() < kFewestRows) return refuse("too few rows show the edge from side to side");
  if (!ShowAnEdge(edges)) return refuse("the region does not show one edge along its length");
  EdgeLine line = FitLine(edges);
  edges = LocateInRows(picture, region, 0.5, [&](int row, Span) { return line.offset + line.slope * row; });
  if (!ShowAnEdge(edges)) return refuse("the region does not show one edge along its length");
  line = FitLine(edges);

  const double off = (line.offset + line.slope * region.middle.y - region.middle.x) / std::hypot(1, line.slope);
  const double room = region.half_width - std::fabs(off);
  if (!(room >= kSmallestReach)) return refuse("the edge runs too near to the region's side");
  const EdgeSpread spread = Project(picture, region, edges, line, room);
  if (spread.levels.empty()) return refuse("the edge follows the pixel grid, which leaves bins empty");

  constexpr char kNoFall[] = "the response does not fall to one half";
  const double seen = HalfPoint(Differentiate(spread, room));
  if (!std::isfinite(seen)) return refuse(kNoFall);
  const double window = std::clamp(kWindow / seen, std::min(kNarrowest, room), room);
  const double half = HalfPoint(Differentiate(spread, window));
  if (!std::isfinite(half)) return refuse(kNoFall);
  const double narrowing = Narrowing(half, window);
  if (narrowing > kMostNarrowing) return refuse("the blur is too wide for the region");
  const double angle = std::atan(line.slope) * 180 / CV_PI;
  return {2 * half * std::sqrt(1 - narrowing), lying ? -angle : angle, nullptr};
}

}  // namespace

IsoMtf MeasureIsoMtf(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners) {
  CV_Assert(!gray.empty() && (gray.type() == CV_8UC1 || gray.type() == CV_16UC1 || gray.type() == CV_32FC1));
  return Measure(gray, Describe(corners));
}

}  // namespace qv
