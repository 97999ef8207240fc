#ifndef QVTESTER_TOOLS_MEASUREMENTS_H_
#define QVTESTER_TOOLS_MEASUREMENTS_H_

#include <string_view>

// Every figure that a record may hold, in one row: name, unit, method, meaning.

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

enum class Shape { kCount, kValue, kResponse, kPlaces };  // responses are [frequency, value], places [column, row]

constexpr bool IsList(Shape shape) { return shape == Shape::kResponse || shape == Shape::kPlaces; }

struct MeasurementInfo {
  const char* name;
  const Unit& unit;
  Shape shape;
  const char* method;
  const char* docstring;
};

/// The row of a name; null for an unknown one.
const MeasurementInfo* FindMeasurement(std::string_view name);

#endif  // QVTESTER_TOOLS_MEASUREMENTS_H_
