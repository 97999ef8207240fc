#ifndef QVTESTER_UNIT_TESTS_PLAIN_COLOUR_H_
#define QVTESTER_UNIT_TESTS_PLAIN_COLOUR_H_

#include <algorithm>
#include <cmath>
#include <cstddef>

// Colour conversions of whole buffers as their method is written: what tests/camera/QVTester_Colour.cpp is compared
// with.

namespace plain {

// Left to right, and + 0 at the end: as OpenCV's matrix product, which never gives a negative zero.
inline void rgb2xyz(const float* matrix, const float* rgb, std::size_t pixels, float* xyz) {
  for (std::size_t i = 0; i < pixels; ++i) {
    const float* const in = rgb + 3 * i;
    for (int k = 0; k < 3; ++k) {
      const float* const m = matrix + 3 * k;
      xyz[3 * i + k] = m[0] * in[0] + m[1] * in[1] + m[2] * in[2] + 0.0f;
    }
  }
}

// Cool side of the Planckian locus, 0 < x <= 0.331; in double, A narrowed to float.
inline float CoolTemperature(float xf, float yf) {
  const double x = xf;
  const double y = yf;
  float a = 0;
  if (xf >= 0.235f && xf <= 0.252f) {
    const float square = xf * xf;
    a = static_cast<float>(100000 * (1.6 * square - 0.89553 * x + 0.12932));
  } else if (xf > 0.252f) {
    a = static_cast<float>(10000 * (1.8785 * (x * x) - 1.7555 * x + 0.3756));
  }
  const double s = y + 0.6886 * x - 0.3993;
  const double p = 2.4319 * x + 0.3871;
  if (s < 0) return 0;
  const double power = std::pow(s, p);
  return power == 0 ? 0.0f : static_cast<float>(a / power + 5550.0);
}

// Warm side, 0.331 < x <= 0.61; in double, A and k narrowed to float, the last power in single precision.
inline double WarmTemperature(float xf, float yf) {
  const double x = xf;
  const auto a = static_cast<float>(xf <= 0.556f ? 2267.8 * x - 1702 : 1167.8 * x - 1080);
  const double e = std::exp((x - 0.331) / (0.1118 * x - 0.0928));
  const auto k = static_cast<float>(1282240.0 * std::pow(x - 0.29, 1.664) * std::exp(-15.69 * (x - 0.29)) + 3200.0);
  const float power = std::pow(yf, static_cast<float>(1 - e));
  return a + static_cast<double>(k) * power;
}

// Fits to either side of the pivot of 5550 K; breakpoints are held against x in single precision.
inline float Temperature(float X, float Y, float Z) {
  if (X == 0 && Y == 0 && Z == 0) return 0;
  const float sum = X + Y + Z;
  const float x = std::clamp(X / sum, 0.0f, 1.0f);
  const float y = std::clamp(Y / sum, 0.0f, 1.0f);
  if (!(x > 0 && x <= 0.61f)) return 0;
  const double cct = x <= 0.331f ? CoolTemperature(x, y) : WarmTemperature(x, y);
  return cct == 5550.0 || cct <= 0 ? 0 : static_cast<float>(cct);
}

inline void xyz2cct(const float* xyz, std::size_t pixels, float* cct) {
  for (std::size_t i = 0; i < pixels; ++i) cct[i] = Temperature(xyz[3 * i], xyz[3 * i + 1], xyz[3 * i + 2]);
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_COLOUR_H_
