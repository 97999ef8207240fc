#ifndef QVTESTER_DESK_MEASURE_FIGURES_H_
#define QVTESTER_DESK_MEASURE_FIGURES_H_

#include <string>
#include <string_view>
#include <vector>

namespace qv {

// Every figure that a record may hold: name, unit, method, meaning. Each measurement names its own in its row.

/// As OpenHTF writes units: a name, the UNECE code (null where there is none) and the suffix shown behind a value.
struct Unit {
  const char* name;
  const char* code;
  const char* suffix;
  double repeatability = 0;  // how much a real figure of one photo may differ from one machine to another
};

inline constexpr Unit kNyquist = {"fraction of Nyquist", nullptr, "Nyquist", 1e-4};
inline constexpr Unit kPixel = {"pixel", "E37", "px", 0.01};
inline constexpr Unit kDegree = {"degree [unit of angle]", "DD", "deg", 0.001};
inline constexpr Unit kOne = {"one", "C62", "1", 1e-3};
inline constexpr Unit kKelvin = {"kelvin", "KEL", "K", 0.1};
inline constexpr Unit kGreyLevel = {"grey level", nullptr, "level", 1e-3};

// What the values of a list stand over.
inline constexpr Unit kFrequencyAxis = {"frequency", nullptr, "Nyquist"};
inline constexpr Unit kColumnAxis = {"column", "E37", "px"};
inline constexpr Unit kPatchAxis = {"patch", "C62", "1"};
inline constexpr Unit kAreaAxis = {"area", "C62", "1"};
inline constexpr Unit kRegionAxis = {"region", "C62", "1"};
inline constexpr Unit kMatrixAxis = {"element", "C62", "1"};
inline constexpr Unit kLevelAxis = {"grey level", nullptr, "level"};

enum class Number { kWhole, kReal };

/// How figures are taken: the sentences stand in records and are what `explain` prints.
struct Method {
  const char* name;
  const char* accuracy;  // how true they are; promised numbers by their names in braces (promises.h)
  const char* moved_by;  // what changes them
};

/// The grey levels of a photo, counted.
inline constexpr Method kBins = {"256 bins of one grey level", "Exact for the photo as stored.",
                                 "Moved by exposure, shading and noise."};

/// One kind of figure; in a record its name follows that of the measurement and "_".
struct Figure {
  const char* name;
  Unit unit;
  Number number;
  const Unit* axis;  // null for a single value; otherwise the figure is a list of [axis, value]
  Method method;
  const char* docstring;  // what it means
};

struct FigureInfo {
  std::string name;         // in full: camera_autofocus_mtf50_vertical
  std::string measurement;  // camera_autofocus
  const Figure* figure;
};

/// How true figures of this method are, promised numbers filled in.
std::string Accuracy(const Method& method);

/// Meaning, accuracy and what moves it, as one text.
std::string Explanation(const Figure& figure);

/// The largest difference that the same photo may show; whole numbers show none.
double Repeatability(const Figure& figure);

/// All of them, by measurement.
const std::vector<FigureInfo>& AllFigures();

/// The one of this full name; null for an unknown one.
const FigureInfo* FindFigure(std::string_view name);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_FIGURES_H_
