#ifndef QVTESTER_TOOLS_MEASUREMENTS_H_
#define QVTESTER_TOOLS_MEASUREMENTS_H_

#include <string>
#include <string_view>
#include <vector>

// Every figure that a record may hold: name, unit, method, meaning.

/// As OpenHTF writes units: a name, the UNECE code (null where there is none) and the suffix shown behind a value.
struct Unit {
  const char* name;
  const char* code;
  const char* suffix;
};

inline constexpr Unit kNyquist = {"fraction of Nyquist", nullptr, "Nyquist"};
inline constexpr Unit kPixel = {"pixel", "E37", "px"};
inline constexpr Unit kDegree = {"degree [unit of angle]", "DD", "deg"};
inline constexpr Unit kOne = {"one", "C62", "1"};
inline constexpr Unit kGreyLevel = {"grey level", nullptr, "level"};

// What the values of a list stand over.
inline constexpr Unit kFrequencyAxis = {"frequency", nullptr, "Nyquist"};
inline constexpr Unit kColumnAxis = {"column", "E37", "px"};
inline constexpr Unit kPatchAxis = {"patch", "C62", "1"};
inline constexpr Unit kAreaAxis = {"area", "C62", "1"};
inline constexpr Unit kMatrixAxis = {"element", "C62", "1"};
inline constexpr Unit kLevelAxis = {"grey level", nullptr, "level"};

enum class Number { kWhole, kReal };

/// One kind of figure; the measurement's name is that of the test (its phase), "_", and the figure's.
struct Figure {
  const char* name;
  const Unit& unit;
  Number number;
  const Unit* axis;  // null for a single value; otherwise the figure is a list of [axis, value]
  const char* method;
  const char* docstring;
};

struct MeasurementInfo {
  std::string name, phase;
  const Figure* figure;
};

/// All of them, by test.
const std::vector<MeasurementInfo>& AllMeasurements();

/// The one of this name; null for an unknown one.
const MeasurementInfo* FindMeasurement(std::string_view name);

#endif  // QVTESTER_TOOLS_MEASUREMENTS_H_
