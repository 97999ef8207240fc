#ifndef QVTESTER_TESTS_CAMERA_COLOUR_TEMPERATURE_H_
#define QVTESTER_TESTS_CAMERA_COLOUR_TEMPERATURE_H_

#include <cmath>

// The two fits behind QVTester::xyz2cct, from chromaticities x and y.

// Cool side of the Planckian locus, 0 < x <= 0.331; in double, A narrowed to float. Below 0.235 A is 0, which leaves
// 5550 K, and that is no answer.
inline float CoolTemperature(float xf, float yf) {
  if (xf < 0.235f) return 0;
  const double x = xf;
  const double y = yf;
  float a = 0;
  if (xf <= 0.252f) {
    const float square = xf * xf;
    a = static_cast<float>(100000 * (1.6 * square - 0.89553 * x + 0.12932));
  } else {
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

#endif  // QVTESTER_TESTS_CAMERA_COLOUR_TEMPERATURE_H_
