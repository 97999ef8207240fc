#include <gmock/gmock.h>

#include <array>
#include <cmath>
#include <cstdlib>
#include <map>
#include <memory>

#include "qvtester/tester.h"
#include "unit_tests/agreement_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::FloatNear;
using ::testing::Pointwise;

using Buffer = std::unique_ptr<float, decltype(&std::free)>;

float Temperature(std::array<float, 3> xyz) { return *Buffer(QVTester().xyz2cct(xyz.data(), 1, 1), &std::free); }

float Temperature(float x, float y) { return Temperature({x, y, 1 - x - y}); }

TEST(Colour, TheCurvesAreThoseOfSrgbAndLab) {
  QVTester tester;
  EXPECT_EQ(1.0f, tester.GetLinearRGB(255));
  EXPECT_FLOAT_EQ(10 / 255.0f / 12.92f, tester.GetLinearRGB(10)) << "the straight part";
  EXPECT_NEAR(0.21586, tester.GetLinearRGB(128), 5e-6);  // published tables of sRGB
  EXPECT_NEAR(0.0033465, tester.GetLinearRGB(11), 5e-7);
  for (int v = 1; v < 256; ++v) EXPECT_GT(tester.GetLinearRGB(v), tester.GetLinearRGB(v - 1));
  EXPECT_FLOAT_EQ(0.5f, tester.GetFValue(0.125f));
  EXPECT_FLOAT_EQ(16 / 116.0f, tester.GetFValue(0));
  const float epsilon = 0.008856452f;
  const auto straight = static_cast<float>((static_cast<double>(24389.0f / 27.0f * epsilon) + 16) / 116);
  EXPECT_EQ(straight, tester.GetFValue(epsilon));
  EXPECT_EQ(static_cast<float>(std::cbrt(static_cast<double>(0.0089f))), tester.GetFValue(0.0089f));
}

TEST(Colour, TheWhiteIsThatOfD65AndLabRelativeToUnity) {
  QVTester tester;
  const auto xyz = [&](int r, int g, int b) {
    std::vector<float> values(3);
    tester.ConvertRGB2XYZ(r, g, b, values[0], values[1], values[2]);
    return values;
  };
  EXPECT_THAT(xyz(255, 0, 0), ElementsAre(0.4124f, 0.2126f, 0.0193f));
  EXPECT_THAT(xyz(0, 0, 255), ElementsAre(0.1805f, 0.0722f, 0.9505f));
  EXPECT_THAT(xyz(255, 255, 255), Pointwise(FloatNear(1e-6f), {0.9505f, 1.0f, 1.089f}));  // three roundings
  for (const float white : {1.0f, 0.5f, 0.0f}) {                                          // whatever white is named
    std::vector<float> lab(3);
    tester.ConvertXYZ2LAB(0.9505f, 1, 1.089f, white, white, white, lab[0], lab[1], lab[2]);
    EXPECT_THAT(lab, Pointwise(FloatNear(1e-4f), {100.0, 500 * (std::cbrt(0.9505) - 1), 200 * (1 - std::cbrt(1.089))}));
  }
}

TEST(Colour, TemperaturesAreThePublishedOnes) {  // CIE 15's A, D50, D65, D75 and F2, and the Planckian locus
  const std::map<float, std::pair<float, float>> lights = {
      {2856.0f, {0.44757f, 0.40745f}}, {5003.0f, {0.34567f, 0.35850f}}, {6504.0f, {0.31271f, 0.32902f}},
      {7504.0f, {0.29902f, 0.31485f}}, {4230.0f, {0.37208f, 0.37529f}}, {2000.0f, {0.5267f, 0.4133f}},
      {1500.0f, {0.5857f, 0.3931f}},   {25000.0f, {0.2525f, 0.2522f}}};
  for (const auto& [kelvin, xy] : lights) {
    EXPECT_NEAR(kelvin, Temperature(xy.first, xy.second), 0.005 * kelvin);  // the fit's own error
  }
  // They end where the fits do.
  EXPECT_EQ(0.0f, Temperature(0.6101f, 0.38f));
  EXPECT_GT(Temperature(0.61f, 0.38f), 0.0f);
  EXPECT_EQ(0.0f, Temperature(0.0f, 0.5f));
  EXPECT_EQ(0.0f, Temperature(0.1f, 0.1f)) << "s is negative";
  EXPECT_EQ(0.0f, Temperature(0.2f, 0.4f)) << "exactly 5550 is no answer";
  for (const auto& xyz : {std::array{0.0f, 0.0f, 0.0f}, {NAN, 1.0f, 1.0f}, {1.0f, -1.0f, 0.0f}}) {
    EXPECT_EQ(0.0f, Temperature(xyz));
  }
  EXPECT_EQ(5550.0f, Temperature({0.333083928f, 0.464719504f, 0.202196568f})) << "in double it is not 5550";
  // x = 0.331 in single precision belongs to the cool side: sums that are exact, so that x is the quotient itself.
  EXPECT_EQ(static_cast<float>(CoolTemperature(0.331f, 0.34f)), Temperature({0.331f, 0.34f, 0.329f}));
  EXPECT_NE(static_cast<float>(WarmTemperature(0.331f, 0.34f)), Temperature({0.331f, 0.34f, 0.329f}));
}

// Worked out once from the fits as they are published, each step in its own width; a last digit would show.
TEST(Colour, TemperaturesAreExactToTheLastBit) {
  const std::pair<std::array<float, 3>, float> lights[] = {
      {{0.24f, 0.25f, 0.51f}, 0x1.477f24p+15f}, {{0.25f, 0.28f, 0.47f}, 0x1.ea551ap+13f},
      {{0.3f, 0.32f, 0.38f}, 0x1.cb634p+12f},   {{0.33f, 0.34f, 0.33f}, 0x1.5f54b8p+12f},
      {{0.35f, 0.36f, 0.29f}, 0x1.304d06p+12f}, {{0.45f, 0.41f, 0.14f}, 0x1.62ff64p+11f},
      {{0.5f, 0.25f, 0.25f}, 0x1.1d59cep+10f},  {{0.6f, 0.35f, 0.05f}, 0x1.348f6cp+10f}};
  for (const auto& [xyz, kelvin] : lights) EXPECT_EQ(kelvin, Temperature(xyz));
}

TEST(Colour, WholeBuffersAreAsTheirPixels) {
  ExpectAgreement(plain::Colours, 600, 0.1);
  QVTester tester;
  float pixel[3] = {};
  EXPECT_EQ(nullptr, tester.rgb2xyz(pixel, 1 << 30, 1 << 30)) << "no memory for such a one";
  EXPECT_EQ(nullptr, tester.xyz2cct(pixel, 1 << 30, 1 << 30));
}

}  // namespace
