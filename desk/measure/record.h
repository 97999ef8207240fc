#ifndef QVTESTER_DESK_MEASURE_RECORD_H_
#define QVTESTER_DESK_MEASURE_RECORD_H_

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "desk/base/json.h"
#include "desk/base/side_output.h"
#include "desk/measure/limits.h"
#include "desk/measure/measurements.h"

namespace qv {

// One run as OpenHTF records it, with limits, method and the input's hash (docs/record.schema.json).

enum class Outcome { kPass, kFail, kError, kUnset };
const char* Name(Outcome outcome);

struct Measurement {
  const MeasurementInfo* info = nullptr;
  std::vector<double> values;  // one, or those of a list
  std::vector<double> axis;    // of a list: frequencies in units of Nyquist, or columns
  Limit limit;
  Outcome outcome = Outcome::kPass;
  bool marginal = false;

  double value() const { return values.at(0); }
};

struct Attachment {
  std::string name, mimetype, path, sha1;
};

struct Phase {
  std::string name;
  int code = 0;
  std::int64_t start_millis = 0, end_millis = 0;
  std::vector<Measurement> measurements;
  std::vector<Attachment> attachments;

  /// Adds a figure by the last part of its name ("mtf50_vertical"); the phase's name is put in front.
  void Add(const std::string& figure, double value);
  void Add(const std::string& figure, std::vector<double> axis, std::vector<double> values);
  const Measurement* Find(const std::string& figure) const;

 private:
  Measurement& New(const std::string& figure);
};

struct Input {
  int slot = 0;
  std::string path, sha256;
  int width = 0, height = 0;
};

struct Record {
  std::string dut_id, station_id, test_name;
  std::optional<int> test_index;
  std::int64_t start_millis = 0, end_millis = 0;
  std::vector<std::string> command;  // that made it, for people
  Limits limits;
  Json properties = Json::object();  // those that differ from their defaults, by index
  Phase phase;
  std::vector<Input> inputs;
  std::vector<LogLine> log_lines;
  std::vector<std::string> details;  // why a run is an ERROR or what to doubt, a sentence each
  bool doubtful = false;             // measured, but not to be trusted: never a PASS
  bool cannot_judge = false;         // the test ran, but its figures say nothing about the unit

  /// Holds every figure against its limit. Call once, when all figures are in.
  void Judge();
  Outcome outcome() const;
  bool marginal() const;
  bool limited() const;  // some figure of this test has a limit
  Json ToJson() const;
  /// The record as a file's content; what is not UTF-8 is replaced.
  std::string ToText() const;
};

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_RECORD_H_
