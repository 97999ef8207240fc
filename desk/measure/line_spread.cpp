#include "desk/measure/line_spread.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <limits>

namespace qv {

namespace {

constexpr double kPi = 3.14159265358979323846;

double Sinc(double x) { return x == 0 ? 1 : std::sin(kPi * x) / (kPi * x); }

double Window(double x, double reach) {
  const double share = 2 * std::fabs(x) / reach - 1;
  if (share <= 0) return 1;
  return share < 1 ? 0.5 + 0.5 * std::cos(kPi * share) : 0;
}

// The central difference over two bins takes away sinc(2 f / 4), the bins' own width sinc(f / 4).
double Kept(double frequency) { return Sinc(2 * frequency / kBinsPerPixel) * Sinc(frequency / kBinsPerPixel); }

}  // namespace

LineSpread Differentiate(const EdgeSpread& spread, double reach) {
  const int last = static_cast<int>(spread.levels.size()) - 1;
  const auto slope = [&](int k) { return (spread.levels[k + 1] - spread.levels[k - 1]) / 2; };
  double centre = 0;
  for (int pass = 0; pass < 2; ++pass) {
    double sum = 0;
    double moment = 0;
    for (int k = 1; k < last; ++k) {
      const double weight = Window(spread.Place(k) - centre, reach) * slope(k);
      sum += weight;
      moment += weight * spread.Place(k);
    }
    centre = moment / sum;
  }
  LineSpread line;
  if (!(std::fabs(centre) < reach)) return line;
  for (int k = 1; k < last; ++k) {
    const double window = Window(spread.Place(k) - centre, reach);
    if (window == 0) continue;
    if (line.weights.empty()) line.first = spread.Place(k);
    line.weights.push_back(window * slope(k));
  }
  return line;
}

std::vector<double> ResponseCurve(const LineSpread& line, double step, int count) {
  constexpr std::size_t kAtOnce = 4;  // turns that wait for nothing but themselves; all are added one after the other
  std::vector<std::complex<double>> sums(count);
  for (std::size_t first = 0; first < line.weights.size(); first += kAtOnce) {
    std::array<double, kAtOnce> c = {};
    std::array<double, kAtOnce> s = {};
    std::array<double, kAtOnce> re = {};
    std::array<double, kAtOnce> im = {};
    for (std::size_t i = 0; i < kAtOnce && first + i < line.weights.size(); ++i) {
      const double turn = -2 * kPi * step * (line.first + static_cast<double>(first + i) / kBinsPerPixel);
      c[i] = std::cos(turn);
      s[i] = std::sin(turn);
      re[i] = line.weights[first + i];
    }
    for (auto& sum : sums) {
      for (std::size_t i = 0; i < kAtOnce; ++i) {
        sum += std::complex<double>(re[i], im[i]);
        const double next = re[i] * c[i] - im[i] * s[i];
        im[i] = re[i] * s[i] + im[i] * c[i];
        re[i] = next;
      }
    }
  }
  std::vector<double> curve(count);
  for (int i = 0; i < count; ++i) curve[i] = std::abs(sums[i]) / std::abs(sums[0]) / Kept(step * i);
  return curve;
}

double Response(const LineSpread& line, double frequency) { return ResponseCurve(line, frequency, 2)[1]; }

double FirstFall(const LineSpread& line, const std::vector<double>& curve, double level, std::size_t from) {
  const auto fallen = std::find_if(curve.begin() + static_cast<std::ptrdiff_t>(from), curve.end(),
                                   [&](double response) { return !(response > level); });
  if (fallen == curve.end() || fallen == curve.begin()) return std::numeric_limits<double>::quiet_NaN();
  double high = kCurveStep * static_cast<double>(fallen - curve.begin());
  double low = high - kCurveStep;
  double above = *(fallen - 1) - level;
  double below = *fallen - level;
  for (int step = 0; step < 4 && below < 0; ++step) {  // false position; the curve is all but straight here
    const double middle = low + (high - low) * above / (above - below);
    const double response = Response(line, middle) - level;
    (response > 0 ? low : high) = middle;
    (response > 0 ? above : below) = response;
  }
  return below < 0 ? low + (high - low) * above / (above - below) : high;
}

}  // namespace qv
