#ifndef QVTESTER_DESK_MEASURE_LINE_SPREAD_H_
#define QVTESTER_DESK_MEASURE_LINE_SPREAD_H_

#include <vector>

// From the rise of an edge to the response of what photographed it. Distances in pixels, frequencies in cycles/pixel.

namespace qv {

inline constexpr int kBinsPerPixel = 4;

/// Mean level by distance from the edge: bin `middle` lies about distance 0, bins are 1 / kBinsPerPixel pixels wide.
struct EdgeSpread {
  int middle = 0;
  std::vector<double> levels;

  double Place(double bin) const { return (bin - middle) / kBinsPerPixel; }
};

/// Derivative of an edge spread under a window about its centroid.
struct LineSpread {
  double first = 0;             // place of weights[0]; the others follow bin by bin
  std::vector<double> weights;  // empty where the spread does not rise
};

/// Tukey window: level over the inner half of `reach` to each side, a cosine down to nothing over the outer.
LineSpread Differentiate(const EdgeSpread& spread, double reach);

/// Magnitude of the transform over that at 0, of the lens and the pixel: what the derivative and the bins' width take
/// away is given back.
double Response(const LineSpread& line, double frequency);

/// The same at frequencies 0, step, 2 step, ...
std::vector<double> ResponseCurve(const LineSpread& line, double step, int count);

/// Of the curves that FirstFall looks at, cycles/pixel.
inline constexpr double kCurveStep = 0.0025;
inline constexpr double kHighest = 1.0;  // a square pixel's own response is 0.5 at 0.603

/// A Gaussian of sigma has a response of one half at kHalfOfSigma / sigma: sqrt(ln(2) / 2) / pi.
inline constexpr double kHalfOfSigma = 0.18739;

/// The lowest frequency from `curve[from]` on at which the response falls to `level`; NaN when it stays above.
double FirstFall(const LineSpread& line, const std::vector<double>& curve, double level, std::size_t from = 0);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LINE_SPREAD_H_
