// Interest points of SURF by the Fast Hessian of box sums (Bay, Tuytelaars, Van Gool 2006): five octaves of six
// intervals. Sums are of whole numbers and exact, so their order is free; what is rounded is rounded in the order of
// dlib's Fast Hessian, whose points these are to the bit (unit_tests/plain/surf.h). Only samples that can lead to a
// wanted point are computed, row by row; of an octave's rows no more are kept than a maximum is looked for in.

#include "chart/surf_points.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>

namespace {

constexpr int kOctaves = 5;
constexpr int kIntervals = 6;
constexpr int kStep = 2;  // pixels between the first octave's samples
constexpr int kLargestStep = kStep << (kOctaves - 1);
constexpr double kThreshold = 30;
constexpr int kRowsKept = 3;

// The table of sums with each row's columns sorted by their remainder modulo the step: what neighbouring samples read
// lies side by side. One memory serves all octaves, since new pages cost more than what is written to them.
class SortedSums {
 public:
  explicit SortedSums(const SurfSums& sums)
      : sums_(sums), sorted_(new std::uint32_t[(sums.rows() + std::size_t{1}) * (sums.cols() + kLargestStep)]) {}

  void Sort(int step) {
    step_ = step;
    part_ = sums_.cols() / step + 1;
    std::uint32_t* part = sorted_.get();
    for (int y = 0; y <= sums_.rows(); ++y) {
      for (int phase = 0; phase < step; ++phase, part += part_) {
        const std::uint32_t* const row = sums_.Row(y);
        for (int x = phase, i = 0; x <= sums_.cols(); x += step, ++i) part[i] = row[x];
      }
    }
  }
  const SurfSums& sums() const { return sums_; }
  const std::uint32_t* At(int x, int y) const {
    return sorted_.get() + (static_cast<std::size_t>(y) * step_ + x % step_) * part_ + x / step_;
  }

 private:
  const SurfSums& sums_;
  std::unique_ptr<std::uint32_t[]> sorted_;
  int step_ = 1;
  std::size_t part_ = 0;
};

// Sums of one box after the other, a step apart; both ends exclusive of what lies beyond.
struct Boxes {
  const std::uint32_t *top_left, *top_right, *bottom_left, *bottom_right;

  Boxes(const SortedSums& sums, int left, int top, int right, int bottom)
      : top_left(sums.At(left, top)),
        top_right(sums.At(right, top)),
        bottom_left(sums.At(left, bottom)),
        bottom_right(sums.At(right, bottom)) {}
  std::uint32_t operator[](int k) const { return bottom_right[k] - bottom_left[k] - top_right[k] + top_left[k]; }
};

// Determinants of the Hessian for `count` samples a step apart, the first at (x, y); below 0 where there is none.
void Determinants(const SortedSums& sums, int lobe, int x, int y, int count, double* out) {
  const int m = lobe / 2;
  const Boxes across(sums, x - 3 * m - 1, y - 2 * m, x + 3 * m + 2, y + 2 * m + 1);
  const Boxes across_middle(sums, x - m, y - 2 * m, x + m + 1, y + 2 * m + 1);
  const Boxes down(sums, x - 2 * m, y - 3 * m - 1, x + 2 * m + 1, y + 3 * m + 2);
  const Boxes down_middle(sums, x - 2 * m, y - m, x + 2 * m + 1, y + m + 1);
  const Boxes upper_left(sums, x - 2 * m - 1, y - 2 * m - 1, x, y);
  const Boxes upper_right(sums, x + 1, y - 2 * m - 1, x + 2 * m + 2, y);
  const Boxes lower_left(sums, x - 2 * m - 1, y + 1, x, y + 2 * m + 2);
  const Boxes lower_right(sums, x + 1, y + 1, x + 2 * m + 2, y + 2 * m + 2);
  const double area_inv = 1.0 / std::pow(3.0 * lobe, 2.0);
  for (int k = 0; k < count; ++k) {
    const double xx = static_cast<std::int32_t>(across[k] - 3 * across_middle[k]) * area_inv;
    const double yy = static_cast<std::int32_t>(down[k] - 3 * down_middle[k]) * area_inv;
    const double xy =
        static_cast<std::int32_t>(lower_left[k] + upper_right[k] - upper_left[k] - lower_right[k]) * area_inv;
    out[k] = xx * yy - 0.81 * xy * xy;
  }
}

// Samples on each side of an interval's filter that dlib leaves alone.
int BorderOf(int interval) { return 3 * interval + 5; }

int LobeOf(int octave, int interval) { return (2 << octave) * (interval + 1) + 1; }

double ScaleOf(int octave, double interval) {
  const double lobe = std::pow(2.0, octave + 1.0) * (interval + 1) + 1;
  return 1.2 / 9.0 * (3 * lobe);
}

// Samples first to last, last not included.
struct Range {
  int first, last;
};

// Three by three by three determinants about a sample: interval, row, column, each from -1 to 1.
class Neighbourhood {
 public:
  Neighbourhood(const std::array<std::array<const double*, 3>, 3>& rows, int column) : rows_(rows), column_(column) {}

  bool MiddleIsLargest() const {
    const double value = rows_[1][1][column_];
    for (const auto& interval : rows_) {
      for (const double* row : interval) {
        if (row[column_ - 1] > value || row[column_] > value || row[column_ + 1] > value) return false;
      }
    }
    return true;
  }

  // Of the parabola through them, from the middle: column, row, interval; along the gradient where it has no top.
  std::array<double, 3> Top() const {
    const double v = At(0, 0, 0);
    const double gx = (At(0, 0, 1) - At(0, 0, -1)) / 2.0;
    const double gy = (At(0, 1, 0) - At(0, -1, 0)) / 2.0;
    const double gs = (At(1, 0, 0) - At(-1, 0, 0)) / 2.0;
    const double a = (At(0, 0, 1) + At(0, 0, -1)) - 2 * v;
    const double e = (At(0, 1, 0) + At(0, -1, 0)) - 2 * v;
    const double i = (At(1, 0, 0) + At(-1, 0, 0)) - 2 * v;
    const double b = (At(0, 1, 1) + At(0, -1, -1) - At(0, -1, 1) - At(0, 1, -1)) / 4.0;
    const double c = (At(1, 0, 1) + At(-1, 0, -1) - At(-1, 0, 1) - At(1, 0, -1)) / 4.0;
    const double f = (At(1, 1, 0) + At(-1, -1, 0) - At(-1, 1, 0) - At(1, -1, 0)) / 4.0;
    const double determinant = a * (e * i - f * f) - b * (b * i - f * c) + c * (b * f - e * c);
    if (determinant == 0) return {-gx, -gy, -gs};
    const double d = 1.0 / determinant;
    const double xx = (e * i - f * f) * d;
    const double xy = (c * f - b * i) * d;
    const double xs = (b * f - c * e) * d;
    const double yy = (a * i - c * c) * d;
    const double ys = (c * b - a * f) * d;
    const double ss = (a * e - b * b) * d;
    return {-xx * gx - xy * gy - xs * gs, -xy * gx - yy * gy - ys * gs, -xs * gx - ys * gy - ss * gs};
  }

 private:
  double At(int interval, int row, int column) const {
    const double value = rows_[interval + 1][row + 1][column_ + column];
    return value > 0 ? value : 0;
  }

  const std::array<std::array<const double*, 3>, 3>& rows_;
  int column_;
};

class Octave {
 public:
  Octave(SortedSums& sorted, const cv::Rect& inside, int octave)
      : octave_(octave), step_(kStep << octave), sorted_(sorted) {
    const SurfSums& sums = sorted.sums();
    while (first_ + 1 < kIntervals && ScaleOf(octave, first_ + 0.5) <= kSmallestSurfScale) ++first_;
    const int border = BorderOf(first_ + 1) + 1;
    rows_ = Between(border, sums.rows() / step_, inside.y, inside.y + inside.height);
    cols_ = Between(border, sums.cols() / step_, inside.x, inside.x + inside.width);
    all_rows_ = sums.rows() / step_;
    all_cols_ = sums.cols() / step_;
  }

  void Find(std::vector<SurfPoint>& points) {
    if (rows_.first >= rows_.last || cols_.first >= cols_.last) return;
    sorted_.Sort(step_);
    width_ = cols_.last - cols_.first + 2;
    kept_.resize(static_cast<std::size_t>(kIntervals * kRowsKept) * width_);
    for (int r = rows_.first - 1; r <= rows_.last; ++r) {
      for (int i = first_ - 1; i < kIntervals; ++i) ComputeRow(i, r);
      if (r <= rows_.first) continue;
      for (int i = first_; i + 1 < kIntervals; ++i) FindInRow(i, r - 1);
    }
    for (const auto& found : found_) points.insert(points.end(), found.begin(), found.end());
  }

 private:
  // Samples whose point may lie from low to high, off the border.
  Range Between(int border, int samples, int low, int high) const {
    return {std::max(border, low / step_), std::min(samples - border, high / step_ + 2)};
  }

  double* Row(int interval, int r) {
    return kept_.data() + static_cast<std::size_t>((interval * kRowsKept + r % kRowsKept) * width_);
  }

  // A sample beyond the interval's border is never looked at.
  void ComputeRow(int interval, int r) {
    const int border = BorderOf(interval);
    if (r < border || r >= all_rows_ - border) return;
    const int first = std::max(cols_.first - 1, border);
    const int last = std::min(cols_.last + 1, all_cols_ - border);
    if (first >= last) return;
    Determinants(sorted_, LobeOf(octave_, interval), first * step_, r * step_, last - first,
                 Row(interval, r) + (first - cols_.first + 1));
  }

  void FindInRow(int interval, int r) {
    const int border = BorderOf(interval + 1) + 1;
    if (r < border || r >= all_rows_ - border) return;
    std::array<std::array<const double*, 3>, 3> rows = {};
    for (int i = 0; i < 3; ++i) {
      for (int k = 0; k < 3; ++k) rows[i][k] = Row(interval + i - 1, r + k - 1);
    }
    const int last = std::min(cols_.last, all_cols_ - border);
    for (int c = std::max(cols_.first, border); c < last; ++c) {
      const int column = c - cols_.first + 1;
      if (rows[1][1][column] < kThreshold) continue;
      const Neighbourhood about(rows, column);
      if (!about.MiddleIsLargest()) continue;
      const auto [dx, dy, di] = about.Top();
      if (std::max({std::abs(dx), std::abs(dy), std::abs(di)}) >= 0.5) continue;
      found_[interval].push_back(
          {{(c + dx) * step_, (r + dy) * step_}, ScaleOf(octave_, interval + di), rows[1][1][column]});
    }
  }

  int octave_, step_;
  SortedSums& sorted_;
  int first_ = 1;  // interval in which maxima are looked for
  Range rows_, cols_;
  int all_rows_, all_cols_, width_ = 0;
  std::vector<double> kept_;
  std::array<std::vector<SurfPoint>, kIntervals> found_;
};

}  // namespace

std::vector<SurfPoint> FindSurfPoints(const SurfSums& sums, const cv::Rect& inside) {
  std::vector<SurfPoint> points;
  SortedSums sorted(sums);
  for (int octave = 0; octave < kOctaves; ++octave) Octave(sorted, inside, octave).Find(points);
  return points;
}
