#ifndef QVTESTER_DESK_MEASURE_RECORD_H_
#define QVTESTER_DESK_MEASURE_RECORD_H_

#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "desk/base/json.h"
#include "desk/base/log_lines.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/decision.h"
#include "desk/measure/doubt_names.h"
#include "desk/measure/figures.h"
#include "desk/measure/limits.h"
#include "desk/measure/request.h"
#include "desk/measure/uncertainty.h"

namespace qv {

class Finding;

// One run as OpenHTF records it, with request, limits, method and the inputs' hashes (docs/record.schema.json).

inline constexpr const char kRecordSchema[] = "qvtester-record-1";

/// A figure: PASS or FAIL only against a limit, MEASURED without one, UNSET when a limit asks for it and it was not
/// measured. A run: ERROR when it could not measure, lacks a figure that a limit asks for, or is in doubt; else FAIL
/// with a broken limit; else PASS with at least one limit; else MEASURED.
enum class Outcome { kPass, kFail, kMeasured, kError, kUnset };
const char* Name(Outcome outcome);

/// An entry of a list against its limit.
struct EntryVerdict {
  std::size_t place = 0;  // among the list's values
  Decision decision;
  bool marginal = false;
};

/// A figure's value.
struct Reading {
  const FigureInfo* info = nullptr;
  std::vector<double> values;              // one, or those of a list
  std::vector<double> axis;                // of a list: frequencies in units of Nyquist, or columns
  std::vector<double> repeats;             // of several photos of one unit: what a single value is the median of
  std::vector<Uncertainty> uncertainties;  // one, or one for each value; none where nothing is known
  std::optional<Decision> decision;        // how the verdict came about, where a limit is set; of a list, the worst
  std::vector<EntryVerdict> entries;       // of a list: those that have a limit, in their order
  FigureLimit limit;
  Outcome outcome = Outcome::kMeasured;
  bool marginal = false;

  /// NaN where it was not measured.
  double value() const { return values.empty() ? std::numeric_limits<double>::quiet_NaN() : values[0]; }
  /// Of a single value; zero where nothing is known.
  Uncertainty uncertainty() const { return uncertainties.size() == 1 ? uncertainties[0] : Uncertainty(); }
  /// Keeps them where they say something: all must be numbers.
  void Trust(std::vector<Uncertainty> known);
  /// Holds the value, or each that has one, against its limit. A list that lacks an entry with a limit is UNSET.
  void Judge(const DecisionRule& rule);

 private:
  void JudgeEntries(const DecisionRule& rule);
};

struct Attachment {
  std::string name, mimetype, path, sha1;
};

struct Phase {
  std::string name;
  int code = 0;
  std::int64_t start_millis = 0, end_millis = 0;
  std::vector<Reading> readings;
  std::vector<Attachment> attachments;

  /// Adds a figure by the last part of its name ("mtf50_vertical"); the phase's name is put in front.
  Reading& Add(const std::string& figure, double value);
  Reading& Add(const std::string& figure, std::vector<double> axis, std::vector<double> values);
  const Reading* Find(const std::string& figure) const;
  Reading* Find(const std::string& figure);

 private:
  Reading& New(const std::string& figure);
};

struct RecordedInput {
  int slot = 0;
  std::string path;         // or what people call it
  std::string sha256;       // of the file; empty for a picture from memory
  std::string pixels_hash;  // of the pixels as they lie in the slot: 128 bits of XXH3
  int width = 0, height = 0;
  CodecSteps codec = {};  // of the file; not stored
};

/// A sentence about a run: a note under any name, or one of Doubts(), which a limits file may accept by its name.
class Remark {
 public:
  enum Note {
    kWarning,      // worth knowing
    kMiss,         // why there is no result
    kNoJudgement,  // the test ran, but its figures say nothing about the unit
  };
  Remark(Note note, std::string name, std::string sentence, std::string figure = {})
      : name_(std::move(name)), sentence_(std::move(sentence)), figure_(std::move(figure)), note_(note) {}
  Remark(Doubt doubt, std::string sentence, std::string figure = {})
      : name_(Info(doubt).name), sentence_(std::move(sentence)), figure_(std::move(figure)) {}

  const std::string& name() const { return name_; }  // "clipped": by which it may be told from others
  const std::string& sentence() const { return sentence_; }
  const std::string& figure() const { return figure_; }  // that it rests on, without the phase's name; may be empty
  bool Is(Note note) const { return note_ == note; }
  /// Measured, but not to be trusted: an ERROR, unless the limits file accepts it.
  bool doubts() const { return !note_ && !accepted_; }
  bool accepted() const { return accepted_; }
  /// As records call it: "warning", "accepted doubt".
  const char* weight() const;
  /// Changes nothing but a doubt.
  void Accept() { accepted_ = !note_; }

 private:
  std::string name_, sentence_, figure_;
  std::optional<Note> note_;  // none: a doubt
  bool accepted_ = false;
};

struct Record {
  std::string dut_id, station_id, test_name;
  std::optional<int> test_index;
  std::int64_t start_millis = 0, end_millis = 0;
  Request request;                   // resolved: what to run again
  std::vector<std::string> command;  // that made it, for people
  Limits limits;
  Json properties = Json::object();  // those that differ from their defaults, by index
  Phase phase;
  std::vector<RecordedInput> inputs;
  std::vector<LogLine> log_lines;
  std::vector<std::string> chatter;  // what decoders wrote on the side; not stored
  std::vector<Remark> remarks;
  std::optional<std::size_t> refused;      // the input that the library refused, where that is known
  std::string meaning;                     // of a miss, where it is not the code's own
  std::string advice;                      // what to look at when an input is refused; empty: the code's own
  std::shared_ptr<const Finding> finding;  // none when an input could not be loaded

  void Say(Remark::Note note, std::string name, std::string sentence, std::string figure = {}) {
    remarks.emplace_back(note, std::move(name), std::move(sentence), std::move(figure));
  }
  void Say(Doubt doubt, std::string sentence, std::string figure = {}) {
    remarks.emplace_back(doubt, std::move(sentence), std::move(figure));
  }

  /// Holds every figure against its limit. Call once, when all figures are in.
  void Judge();
  Outcome outcome() const;
  /// Code 1, and nothing that forbids a judgement.
  bool measured() const;
  /// Measured, but not to be trusted.
  bool doubtful() const;
  bool marginal() const;
  bool limited() const;  // some figure of this test has a limit
  /// Why it could not be measured: where, why, which code, what to do about it.
  std::string MissSentence() const;
  Json ToJson() const;
  /// The record as a file's content; what is not UTF-8 is replaced.
  std::string ToText() const;
};

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_RECORD_H_
