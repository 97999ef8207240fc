#ifndef QVTESTER_TOOLS_MEASURE_COMMAND_H_
#define QVTESTER_TOOLS_MEASURE_COMMAND_H_

#include <memory>
#include <string>
#include <vector>

#include "desk/base/files.h"
#include "desk/measure/record.h"
#include "tools/options.h"

namespace qv {

struct MeasureOptions;
struct Parameter;

/// What help says of a parameter: meaning, words, default and range.
std::string HelpOf(const Parameter& parameter);

/// What one command adds to what all measuring commands do.
class CommandExtra {
 public:
  CommandExtra() = default;
  virtual ~CommandExtra() = default;
  CommandExtra(const CommandExtra&) = delete;
  CommandExtra& operator=(const CommandExtra&) = delete;

  virtual void Declare(Options& command) = 0;
  /// Before anything is measured: throws Failure (wrong usage) for what can be known then.
  virtual void Prepare() {}
  /// What it knows of the photo goes into the request, where nothing was given.
  virtual void Complete(Request& /*request*/) const {}
  virtual std::vector<NamedFile> Outputs() const { return {}; }
  /// Lines after the measurement's own report.
  virtual std::string Report(const Record& /*record*/) const { return ""; }
  virtual void Write(const Record& /*record*/) const {}
};

/// A command that measures: arguments and options come from the measurement's row.
struct MeasuringCommand {
  const char* measurement;
  // A flag that chooses another measurement of the same inputs and parameters.
  const char* flag = nullptr;
  const char* flag_help = nullptr;
  const char* flagged = nullptr;
  const char* picture = "--annotate";
  const char* picture_help = "Write a picture of what was measured";
  std::shared_ptr<CommandExtra> (*extra)() = nullptr;

  CommandBody operator()(Options& command) const;
};

}  // namespace qv

#endif  // QVTESTER_TOOLS_MEASURE_COMMAND_H_
