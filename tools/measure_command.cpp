#include "tools/measure_command.h"

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <iostream>
#include <iterator>
#include <map>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/log_lines.h"
#include "desk/base/text.h"
#include "desk/measure/library_tables.h"
#include "desk/measure/limits.h"
#include "desk/measure/measure.h"
#include "desk/measure/measurement.h"
#include "desk/measure/properties.h"
#include "qvtester/host_properties.h"
#include "tools/film_progress.h"
#include "tools/program.h"

namespace qv {

struct MeasureOptions {
  std::vector<std::string> inputs;                          // by their place in the row; empty: left out
  std::map<std::string, std::optional<std::string>> words;  // parameters by name
  std::map<std::string, bool> flags;                        // and those that are one
  std::vector<std::string> set, repeats;
  std::string json, annotate, limits, dut, station;
  bool flag = false, fake = false, publish = false, verbose = false, quiet = false;
};

namespace {

std::string Capitals(std::string text) {
  for (char& c : text) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return text;
}

std::string OptionOf(std::string name) {
  std::replace(name.begin(), name.end(), '_', '-');
  return "--" + name;
}

// Read by the test frame by frame from its file, from the start for every run.
bool IsFilm(const InputSpec& input) { return KindOfSlot(input.slot) == SlotKind::kVideo; }

void DeclareInputs(Options& command, const Spec& spec, MeasureOptions& options) {
  options.inputs.resize(spec.inputs.size());
  for (std::size_t i = 0; i < spec.inputs.size(); ++i) {
    const InputSpec& input = spec.inputs[i];
    if (input.optional) {
      command.Text(OptionOf(input.name).c_str(), options.inputs[i], input.help, "FILE");
    } else if (input.list) {
      command.Text(OptionOf(input.name).c_str(), options.inputs[i], input.help, "DIR", true);
    } else {
      command.Argument(Capitals(input.name).c_str(), options.inputs[i],
                       i == 0 && !IsFilm(input) ? std::string(input.help) + "; - is standard input" : input.help);
    }
  }
}

void DeclareOutputs(Options& command, const MeasuringCommand& row, MeasureOptions& options) {
  command.Text("--json", options.json, "Write the record to FILE; - is standard output", "FILE");
  command.Text(row.picture, options.annotate, row.picture_help, "PNG");
  command.Text("--limits", options.limits, "Judge the figures by this limits file", "FILE");
  command.Text("--dut", options.dut, "Serial number of the unit, for the record", "ID");
  command.Text("--station", options.station, "Name of the station, for the record", "ID");
  command.Flag("--verbose", options.verbose, "Show the library's log and what decoders say");
  command.Flag("--quiet", options.quiet, "Print nothing but what was asked for and errors");
}

Request RequestOf(const Spec& spec, const MeasureOptions& options, const CommandExtra* extra) {
  Request request;
  request.measurement = spec.name;
  for (std::size_t i = 0; i < options.inputs.size(); ++i) {
    const std::string& input = options.inputs[i];
    if (input == "-" && IsFilm(spec.inputs[i])) {
      throw Failure(kWrongUsage, "-: a film is read from its file, again from the start by each run: give a path");
    }
    if (input == "-") {
      request.inputs.emplace_back("standard input", std::string(std::istreambuf_iterator<char>(std::cin), {}));
    } else if (!input.empty()) {
      request.inputs.emplace_back(input);
    }
  }
  for (const Parameter& parameter : spec.parameters) {
    if (parameter.type == Parameter::kFlag) {
      if (options.flags.at(parameter.name)) request.parameters[parameter.name] = true;
      continue;
    }
    const std::optional<std::string>& word = options.words.at(parameter.name);
    if (word) request.parameters[parameter.name] = Parsed(parameter, *word);
  }
  for (const std::string& photo : options.repeats) request.repeats.emplace_back(photo);
  for (const std::string& words : options.set) AddProperty(request.properties, words);
  request.fake = options.fake;
  request.publish = options.publish;
  if (extra != nullptr) extra->Complete(request);
  return Resolved(request);
}

// What can be known before anything is measured.
void CheckFiles(const Spec& spec, const MeasureOptions& options, const CommandExtra* extra) {
  std::vector<NamedFile> inputs;
  for (std::size_t i = 0; i < options.inputs.size(); ++i) {
    inputs.push_back({std::string("the ") + spec.inputs[i].name, options.inputs[i]});
    std::error_code ignored;
    if (!spec.inputs[i].list || !std::filesystem::is_directory(options.inputs[i], ignored)) continue;
    for (const auto& entry : std::filesystem::directory_iterator(options.inputs[i], ignored)) {
      inputs.push_back({std::string("one of the ") + spec.inputs[i].name, entry.path().string()});
    }
  }
  for (const std::string& photo : options.repeats) inputs.push_back({"a repeated photo", photo});
  inputs.push_back({"the limits", options.limits});
  std::vector<NamedFile> outputs = {{"the record", options.json}, {"the picture", options.annotate}};
  if (extra != nullptr) {
    for (const NamedFile& output : extra->Outputs()) outputs.push_back(output);
  }
  CheckOutputs(inputs, outputs);
  if (!options.annotate.empty() && options.annotate != "-" && LowerExtension(options.annotate) != ".png") {
    throw Failure(kWrongUsage, options.annotate + ": the picture is a PNG: name a .png file");
  }
}

std::string Verdict(const Record& record) {
  std::string text = Name(record.outcome());
  if (record.marginal()) text += ", marginal";
  return Format("%s  code %d, %s, %lld ms\n", text.c_str(), record.phase.code, FindCode(record.phase.code).name,
                static_cast<long long>(record.phase.end_millis - record.phase.start_millis));
}

// Why there is no result, or what to know of it.
void Warn(const Record& record, const MeasureOptions& options) {
  if (options.verbose) {
    for (const std::string& line : record.chatter) std::cerr << Printable(line) << '\n';
  }
  if (!record.measured()) {
    std::cerr << Printable(record.MissSentence()) << '\n';
    return;
  }
  for (const Remark& remark : record.remarks) {
    std::cerr << (remark.doubts() ? "doubt: " : "warning: ") << Printable(remark.sentence()) << '\n';
  }
}

std::string Told(const Record& record, const MeasureOptions& options, const CommandExtra* extra) {
  if (!record.measured() || options.quiet) return "";
  std::string text;
  for (const RecordedInput& input : record.inputs) {
    text += Format("%s  %d x %d\n", Printable(input.path).c_str(), input.width, input.height);
  }
  if (!options.repeats.empty()) text += Format("medians of %zu photos\n", options.repeats.size() + 1);
  text += record.finding->Report(record);
  if (extra != nullptr) text += extra->Report(record);
  return text + Verdict(record);
}

bool TakesStandardOutput(const MeasureOptions& options, const CommandExtra* extra) {
  bool taken = options.json == "-" || options.annotate == "-";
  for (const NamedFile& output : extra == nullptr ? std::vector<NamedFile>() : extra->Outputs()) {
    taken = taken || output.path == "-";
  }
  return taken;
}

std::string DrawInto(Record& record, const std::string& path) {
  const std::optional<Picture> picture = record.finding == nullptr ? std::nullopt : record.finding->Draw(record);
  if (!picture) {
    std::cerr << "no picture: there is nothing to show\n";
    std::error_code ignored;
    std::filesystem::remove(path, ignored);  // one of an earlier run would be taken for this run's
    return "";
  }
  std::string png = picture->Png();
  record.phase.attachments.push_back(
      {std::filesystem::path(path).filename().string(), "image/png", path, HexDigest(png, "SHA1")});
  return png;
}

int StatusOf(const Record& record) {
  if (!record.measured()) {
    return record.phase.code == QV_ERROR_INTERNAL ? kExitInternalFault : kExitCouldNotMeasure;
  }
  if (record.outcome() == Outcome::kError) return kExitCouldNotMeasure;
  return record.outcome() == Outcome::kFail ? kExitLimitBroken : kExitWithinLimits;
}

int RunMeasuring(const Spec& spec, const MeasureOptions& options, CommandExtra* extra) {
  if (extra != nullptr) extra->Prepare();
  CheckFiles(spec, options, extra);
  const Limits limits = options.limits.empty() ? Limits() : ReadLimits(options.limits);
  if (options.verbose) ShowLogLines();
  QVTester tester;
  Record record = [&] {
    const FilmProgress progress(tester, options.quiet);
    return Measure(tester, RequestOf(spec, options, extra), limits);
  }();
  if (options.publish && record.measured() && tester.kept_->published == 0) {
    throw Failure(kWrongUsage, "--publish: nothing was written: the property store is not this user's own, or full");
  }
  record.dut_id = options.dut;
  record.station_id = options.station;
  record.command = CommandLine();
  Warn(record, options);
  const std::string told = Told(record, options, extra);
  const std::string picture = options.annotate.empty() ? "" : DrawInto(record, options.annotate);
  // What was asked for by name comes last: one that can't be written loses none of the others.
  if (!options.json.empty()) WriteOutput(options.json, record.ToText());
  if (!picture.empty()) WriteOutput(options.annotate, picture);
  if (extra != nullptr) extra->Write(record);
  (TakesStandardOutput(options, extra) ? std::cerr : std::cout) << told;  // a verdict is of what is on disk
  return StatusOf(record);
}

}  // namespace

std::string HelpOf(const Parameter& parameter) {
  const Json initial = InitialValue(parameter);
  const bool number = parameter.type == Parameter::kWhole || parameter.type == Parameter::kReal;
  if (parameter.type == Parameter::kFlag) return parameter.help;
  return InBrackets(parameter.help,
                    initial.is_string()   ? initial.get<std::string>()
                    : initial.is_number() ? Format("%.6g", initial.get<double>())
                                          : "",
                    !parameter.words.empty() ? Listed(parameter.words)
                    : number                 ? RangeText(parameter.low, parameter.high)
                                             : "");
}

CommandBody MeasuringCommand::operator()(Options& command) const {
  const Spec& spec = FindMeasurement(measurement)->spec();
  auto options = std::make_shared<MeasureOptions>();
  const std::shared_ptr<CommandExtra> more = extra == nullptr ? nullptr : extra();
  DeclareInputs(command, spec, *options);
  if (flag != nullptr) command.Flag(flag, options->flag, flag_help);
  for (const Parameter& parameter : spec.parameters) {
    if (parameter.type == Parameter::kFlag) {
      command.Flag(OptionOf(parameter.name).c_str(), options->flags[parameter.name], HelpOf(parameter));
      continue;
    }
    command.Text(OptionOf(parameter.name).c_str(), options->words[parameter.name], HelpOf(parameter), parameter.value);
  }
  command.Texts("--set", options->set, "Set a property of the tester by its index or name; may be repeated",
                "PROPERTY=VALUE");
  command.List("--repeat", options->repeats, "Further photos of the same unit: medians and their spread are told",
               "PHOTO");
  if (spec.test) command.Flag("--fake", options->fake, "Run the test in its fake mode");
  if (spec.publishes) {
    command.Flag("--publish", options->publish, "Write the findings to the system properties that other programs read");
  }
  if (more != nullptr) more->Declare(command);
  DeclareOutputs(command, *this, *options);
  const Spec& other = flagged == nullptr ? spec : FindMeasurement(flagged)->spec();
  return [options, more, &spec, &other] { return RunMeasuring(options->flag ? other : spec, *options, more.get()); };
}

}  // namespace qv
