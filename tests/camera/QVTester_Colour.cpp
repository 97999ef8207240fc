// Colour conversions. Single precision throughout, but where a step says double.
//
// The plain forms of rgb2xyz and xyz2cct, for whole buffers, are in unit_tests/plain/colour.h; these give the same
// bits. rgb2xyz multiplies and adds four pixels at a time, each in the plain order. xyz2cct divides for a stretch of
// pixels first, where divisions overlap, and leaves out powers that can only lead to 0.

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <opencv2/core.hpp>
#include <opencv2/core/hal/intrin.hpp>

#include "qvtester/tester.h"
#include "tests/camera/colour.h"
#include "tests/camera/colour_temperature.h"

namespace {

// sRGB transfer function (IEC 61966-2-1); the power in double.
float Linear(int v) {
  const float c = static_cast<float>(v) / 255.0f;
  if (c <= 0.04045f) return c / 12.92f;
  return static_cast<float>(std::pow(static_cast<double>((c + 0.055f) / 1.055f), 2.4));
}

// Fits to either side of the pivot of 5550 K; breakpoints are held against x in single precision. Chromaticities are
// clamped to 0 to 1, but no x beyond that is looked at further. Black pixels come as 0 / 0, and end here too. The warm
// side is held against 5550 and 0 in double, and narrowed once.
float Temperature(float x, float y) {
  if (!(x > 0 && x <= 0.61f)) return 0;
  y = std::clamp(y, 0.0f, 1.0f);
  const double cct = x <= 0.331f ? CoolTemperature(x, y) : WarmTemperature(x, y);
  return cct == 5550.0 || cct <= 0 ? 0 : static_cast<float>(cct);
}

constexpr std::size_t kStretch = 64;

// Of at most a stretch of pixels, into zeroed memory.
void Temperatures(const float* xyz, std::size_t pixels, float* cct) {
  if (std::all_of(xyz, xyz + 3 * pixels, [](float value) { return value == 0; })) return;
  std::array<float, kStretch> x;
  std::array<float, kStretch> y;
  for (std::size_t i = 0; i < pixels; ++i) {
    const float sum = xyz[3 * i] + xyz[3 * i + 1] + xyz[3 * i + 2];
    x[i] = xyz[3 * i] / sum;
    y[i] = xyz[3 * i + 1] / sum;
  }
  for (std::size_t i = 0; i < pixels; ++i) cct[i] = Temperature(x[i], y[i]);
}

using cv::v_float32x4;

// A row of a matrix times four pixels: left to right, and + 0 at the end, as OpenCV's matrix product, which never gives
// a negative zero.
v_float32x4 Product(const float* row, const v_float32x4& red, const v_float32x4& green, const v_float32x4& blue) {
  return cv::v_setall_f32(row[0]) * red + cv::v_setall_f32(row[1]) * green + cv::v_setall_f32(row[2]) * blue +
         cv::v_setzero_f32();
}

float* AllocateFloats(int rows, int cols, std::size_t per_pixel) {
  const std::size_t pixels = static_cast<std::size_t>(rows) * static_cast<std::size_t>(cols);
  return static_cast<float*>(std::calloc(pixels, per_pixel * sizeof(float)));  // checks the product, where malloc can't
}

}  // namespace

float QVTester::GetLinearRGB(int v) { return Linear(v); }

void QVTester::ConvertRGB2XYZ(int r, int g, int b, float& X, float& Y, float& Z) {
  const float red = Linear(r);
  const float green = Linear(g);
  const float blue = Linear(b);
  const std::array<float, 3> xyz = LinearToXyz(red, green, blue);
  X = xyz[0];
  Y = xyz[1];
  Z = xyz[2];
}

float QVTester::GetFValue(float t) {
  static const float epsilon = 216.0f / 24389.0f;
  static const float kappa = 24389.0f / 27.0f;
  if (t > epsilon) return static_cast<float>(std::pow(static_cast<double>(t), 1.0 / 3.0));
  return static_cast<float>((static_cast<double>(kappa * t) + 16.0) / 116.0);
}

void QVTester::ConvertXYZ2LAB(float X, float Y, float Z, float /*Xw*/, float /*Yw*/, float /*Zw*/, float& L, float& a,
                              float& b) {
  const float fx = GetFValue(X);
  const float fy = GetFValue(Y);
  const float fz = GetFValue(Z);
  L = 116.0f * fy - 16.0f;
  a = 500.0f * (fx - fy);
  b = 200.0f * (fy - fz);
}

float* QVTester::rgb2xyz(float* rgb, int rows, int cols) {
  float* const xyz = AllocateFloats(rows, cols, 3);
  if (xyz == nullptr) return nullptr;
  const std::size_t pixels = static_cast<std::size_t>(rows) * static_cast<std::size_t>(cols);
  const float* const m = prop_color_matrix_;
  std::size_t i = 0;
  for (; i + 4 <= pixels; i += 4) {
    v_float32x4 red;
    v_float32x4 green;
    v_float32x4 blue;
    cv::v_load_deinterleave(rgb + 3 * i, red, green, blue);
    cv::v_store_interleave(xyz + 3 * i, Product(m, red, green, blue), Product(m + 3, red, green, blue),
                           Product(m + 6, red, green, blue));
  }
  for (; i < pixels; ++i) {
    const float* const in = rgb + 3 * i;
    float* const out = xyz + 3 * i;
    for (int k = 0; k < 3; ++k) out[k] = m[3 * k] * in[0] + m[3 * k + 1] * in[1] + m[3 * k + 2] * in[2] + 0.0f;
  }
  return xyz;
}

float* QVTester::xyz2cct(float* xyz, int rows, int cols) {
  float* const cct = AllocateFloats(rows, cols, 1);
  if (cct == nullptr) return nullptr;
  const std::size_t pixels = static_cast<std::size_t>(rows) * static_cast<std::size_t>(cols);
  for (std::size_t i = 0; i < pixels; i += kStretch) {
    Temperatures(xyz + 3 * i, std::min(kStretch, pixels - i), cct + i);
  }
  return cct;
}
