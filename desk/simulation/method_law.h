#ifndef QVTESTER_DESK_SIMULATION_METHOD_LAW_H_
#define QVTESTER_DESK_SIMULATION_METHOD_LAW_H_

#include <cmath>

// What the sharpness measure reads of a known lens, from theory alone. Frequencies in cycles/pixel.
//
// The measure takes a three-tap derivative of one-pixel bins and only the real part of the transform, so its response
// is the true one times sinc(2 f) sinc(f) |cos(2 pi f d)|, with d the distance in pixels of the line spread's centre
// from the middle of npix bins: 0 to 0.5 for an even npix, 0 to 1 for an odd one. It therefore reads low, by a known
// amount.

namespace qv::method_law {

inline constexpr double kPi = 3.14159265358979323846;

inline double Sinc(double x) { return x == 0 ? 1 : std::sin(kPi * x) / (kPi * x); }

/// Gaussian blur of sigma pixels seen through square pixels, across an edge turned by angle_deg from the pixel columns.
inline double TrueResponse(double f, double sigma_px, double angle_deg = 0) {
  const double angle = angle_deg * kPi / 180;
  return std::exp(-2 * kPi * kPi * sigma_px * sigma_px * f * f) * Sinc(f * std::cos(angle)) * Sinc(f * std::sin(angle));
}

/// What the measure itself multiplies every response with.
inline double MethodFactor(double f, double d) { return Sinc(2 * f) * Sinc(f) * std::fabs(std::cos(2 * kPi * f * d)); }

/// The lowest frequency at which a response that starts at 1 falls to 0.5; `limit` if it stays above up to there.
template <typename Response>
double HalfPoint(const Response& response, double limit) {
  constexpr int kSteps = 4096;
  for (int i = 1; i <= kSteps; ++i) {
    double high = limit * i / kSteps;
    if (response(high) > 0.5) continue;
    double low = limit * (i - 1) / kSteps;
    for (int bisection = 0; bisection < 40; ++bisection) {
      const double middle = (low + high) / 2;
      (response(middle) > 0.5 ? low : high) = middle;
    }
    return low;
  }
  return limit;
}

/// True MTF50 in units of Nyquist (1.0 = 0.5 cycles/pixel).
inline double TrueMtf50(double sigma_px, double angle_deg = 0) {
  return 2 * HalfPoint([&](double f) { return TrueResponse(f, sigma_px, angle_deg); }, 1.0);
}

struct Bounds {
  double low, high;
};

/// What the measure may read of a lens of this response, in units of Nyquist, for a region of npix columns.
template <typename Response>
Bounds MeasuredMtf50(const Response& response, int npix) {
  const double worst = npix % 2 == 0 ? 0.5 : 1.0;
  const auto at = [&](double d) {
    return 2 * HalfPoint([&](double f) { return response(f) * MethodFactor(f, d); }, 0.5);
  };
  return {at(worst), at(0)};
}

/// The same for a Gaussian blur of sigma pixels.
inline Bounds MeasuredMtf50(double sigma_px, int npix) {
  return MeasuredMtf50([&](double f) { return TrueResponse(f, sigma_px); }, npix);
}

}  // namespace qv::method_law

#endif  // QVTESTER_DESK_SIMULATION_METHOD_LAW_H_
