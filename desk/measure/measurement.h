#ifndef QVTESTER_DESK_MEASURE_MEASUREMENT_H_
#define QVTESTER_DESK_MEASURE_MEASUREMENT_H_

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "desk/base/json.h"
#include "desk/drawing/picture.h"
#include "desk/measure/figures.h"
#include "desk/measure/request.h"
#include "qvtester/tester.h"

namespace qv {

struct Record;

/// Declared once: from it come a plan's key, a command's option with its help, and what a record keeps.
struct Parameter {
  enum Type {
    kWhole,
    kReal,
    kWord,       // one of `words`
    kFlag,       // true or false
    kTransfer,   // "srgb", "linear", "gamma:G"
    kSize,       // "4000x3000"
    kRegions,    // rectangles with labels, or a file that holds them
    kHistogram,  // 256 whole numbers, or a file that holds them: a dust record or a list
    kPatches,    // [number, L*, a*, b*] of patches, or a file that holds them: a capture record or lines of numbers
  };
  const char* name;  // "pixel_pitch"; the option is --pixel-pitch
  Type type;
  const char* value;  // what stands for a value in help: its unit, say
  const char* help;
  Json initial = nullptr;  // null: none
  double low = 0, high = 0;
  std::vector<std::string> words = {};             // the only ones; numbers too
  std::optional<QV_PROPERTY_INDEX> property = {};  // that it sets, whose default is its own
  bool required = false;
};

/// The value as it is stored; throws Failure (wrong usage) for one that the parameter can't have.
Json Checked(const Parameter& parameter, const Json& value);
/// The same from a word of a command line.
Json Parsed(const Parameter& parameter, const std::string& text);
/// The value where none is given: its own, or its property's.
Json InitialValue(const Parameter& parameter);
/// "4000x3000", 16 to 30000 each; empty for other words.
cv::Size SizeOf(const std::string& text);

struct InputSpec {
  const char* name;
  QV_RESOURCE_INDEX slot;
  const char* help;
  bool optional = false;  // given among the parameters, by its name
  bool list = false;      // the last: one file or more, or a folder that holds them
};

/// A measurement's row.
struct Spec {
  const char* name;                   // of the measurement, of its figures' first part and of the record's phase
  std::optional<QV_TEST_INDEX> test;  // that it runs
  const char* routine;                // that it calls otherwise
  std::vector<InputSpec> inputs;
  std::vector<Parameter> parameters;
  std::vector<Figure> figures;
  bool publishes = false;   // the library writes system properties
  const char* advice = "";  // when an input is refused, where the code's own does not fit

  /// The test's name, or the routine's.
  const char* test_name() const;
};

/// What a measurement leaves for people: told and drawn when asked for. It keeps what it needs; the tester may go.
class Finding {
 public:
  Finding() = default;
  virtual ~Finding() = default;
  Finding(const Finding&) = delete;
  Finding& operator=(const Finding&) = delete;

  /// Lines with the figures of a record whose code is 1.
  virtual std::string Report(const Record& record) const = 0;
  /// A picture of what was measured, or of why it could not be; none where there is nothing to show.
  virtual std::optional<Picture> Draw(const Record& record) const = 0;
  /// The picture that the measurement makes of its inputs; empty for all but registration.
  virtual cv::Mat Product() const { return {}; }
};

class Measurement {
 public:
  Measurement() = default;
  virtual ~Measurement() = default;
  Measurement(const Measurement&) = delete;
  Measurement& operator=(const Measurement&) = delete;

  virtual const Spec& spec() const = 0;
  /// Measures what the tester's slots hold: sets the record's code, adds figures and remarks. The request is resolved.
  virtual std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const = 0;
};

/// All of them.
const std::vector<const Measurement*>& Measurements();

/// The one of this name; null for an unknown one.
const Measurement* FindMeasurement(std::string_view name);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_MEASUREMENT_H_
