#ifndef QVTESTER_UNIT_TESTS_PLAIN_COLOUR_H_
#define QVTESTER_UNIT_TESTS_PLAIN_COLOUR_H_

#include <algorithm>
#include <cstddef>

#include "tests/camera/colour_temperature.h"

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
