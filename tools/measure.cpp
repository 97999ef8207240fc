#include "tools/measure.h"

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <iostream>
#include <iterator>

#include "core/property_table.h"
#include "desk/base/clock.h"
#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/side_output.h"
#include "desk/base/text.h"
#include "desk/measure/codes.h"
#include "desk/measure/limits.h"
#include "qvtester/host_properties.h"
#include "tools/options.h"
#include "tools/program.h"

namespace qv {

namespace {

// A tester of this run's own: nothing carries over from another unit.
class FreshTester {
 public:
  FreshTester() {
    if (theTester != nullptr) FinalizeTestModule();
    if (InitTestModule() != QV_SUCCESS) throw Failure(kInternalFault, "the library can't be started");
  }
  ~FreshTester() { FinalizeTestModule(); }
  FreshTester(const FreshTester&) = delete;
  FreshTester& operator=(const FreshTester&) = delete;
};

struct ValueReader {
  QVTester& tester;
  QV_PROPERTY_INDEX index;

  Json operator()(const IntProperty& /*kind*/) const { return Get<int, 1>()[0]; }
  Json operator()(const FloatProperty& /*kind*/) const { return Get<float, 1>()[0]; }
  Json operator()(const FloatArray& /*kind*/) const { return Get<float, 9>(); }
  Json operator()(const MatrixProperty& /*kind*/) const { return Get<float, 9>(); }
  Json operator()(const RegionList& /*kind*/) const { return nullptr; }
  Json operator()(const SharedTable& /*kind*/) const { return Get<int, 256>(); }
  Json operator()(const PatchValues& /*kind*/) const { return Get<float, 72>(); }

 private:
  template <typename T, std::size_t n>
  Json Get() const {
    std::array<T, n> values = {};
    return tester.GetProperty(index, values.data()) == QV_SUCCESS ? Json(values) : Json(nullptr);
  }
};

Json PropertiesOffDefault(QVTester& tester) {
  QVTester defaults;
  Json changed = Json::object();
  for (const QVProperty& property : kProperties) {
    const auto index = static_cast<QV_PROPERTY_INDEX>(property.index);
    const Json value = std::visit(ValueReader{tester, index}, property.kind);
    if (value != std::visit(ValueReader{defaults, index}, property.kind))
      changed[std::to_string(property.index)] = value;
  }
  return changed;
}

std::string ReadInput(const std::string& path) {
  if (path == "-") return {std::istreambuf_iterator<char>(std::cin), {}};
  if (!std::filesystem::exists(path)) throw Failure(kCouldNotMeasure, "no such file");
  if (std::filesystem::is_directory(path)) throw Failure(kCouldNotMeasure, "is a directory, not a photo");
  return ReadWholeFile(path, kCouldNotMeasure);
}

// Width and height of what a slot holds.
cv::Size SlotSize(QV_RESOURCE_INDEX slot) {
  cv::Size size;
  if (const auto& held = theTester->resources_[slot]; held != nullptr) {
    if (slot <= QV_RESOURCE_HDR_LAST) {
      held->GetHDRWidth(&size.width);
      held->GetHDRHeight(&size.height);
    } else {
      size = SlotPhoto(slot).size();
    }
  }
  return size;
}

// Hands the slot a preview frame as a phone's camera delivers it.
int LoadRaw(QV_RESOURCE_INDEX slot, cv::Size size, std::string& content) {
  const std::size_t bytes = std::size_t{3} * static_cast<std::size_t>(size.area()) / 2;
  if (content.size() != bytes) {
    throw Failure(kCouldNotMeasure, Format("%zu bytes are no NV21 frame of %d x %d, which has %zu", content.size(),
                                           size.width, size.height, bytes));
  }
  return SetResource(slot, size.width, size.height, content.data());
}

// Loads one slot. What can't be read becomes the run's code and a sentence; what the decoder says, a warning.
bool Load(Record& record, const Measuring& measuring, cv::Size raw_size, const SlotInput& input, ScratchFolder& scratch,
          SideOutput& side) {
  const std::string shown = input.path == "-" ? "standard input" : input.path;
  const auto refuse = [&](int code, const std::string& why) {
    record.phase.code = code;
    record.details = {shown + ": " + why};
    return false;
  };
  std::string content;
  try {
    content = ReadInput(input.path);
  } catch (const Failure& e) {
    return refuse(QV_ERROR_INVALID_ARGUMENT, e.what());
  }
  Input& entry = record.inputs.emplace_back(Input{input.slot, shown, HexDigest(content, "SHA256"), 0, 0});
  if (content.empty()) return refuse(QV_ERROR_INVALID_ARGUMENT, "the file is empty");

  // The library reads a file of its own accord, and a pipe can be read but once.
  std::string path = input.path;
  if (raw_size.empty() && (path == "-" || !std::filesystem::is_regular_file(path))) {
    path = scratch.path() + "/input";
    WriteWholeFile(path, content);
  }
  int code = QV_SUCCESS;
  try {
    code = !raw_size.empty() ? LoadRaw(input.slot, raw_size, content)
           : measuring.load  ? measuring.load(path)
                             : SetResource(input.slot, path.data());
  } catch (const Failure& e) {
    return refuse(QV_ERROR_INVALID_ARGUMENT, e.what());
  }
  const std::vector<std::string> chatter = side.TakeChatter();
  const std::string said = chatter.empty() ? "" : "the decoder says \"" + chatter.front() + "\"";
  if (code == QV_ERROR_INVALID_ARGUMENT) {
    const bool frame = LowerExtension(input.path) == ".nv21";
    return refuse(code, "not a picture that can be decoded" + (said.empty() ? "" : "; " + said) +
                            (frame ? "; a raw frame needs its size: --raw WxH, where the command takes it" : ""));
  }
  if (code != QV_SUCCESS) return refuse(code, FindCode(code).meaning);
  if (!said.empty()) record.details.push_back(shown + ": " + said + "; is the file cut?");
  const cv::Size size = SlotSize(input.slot);
  entry.width = size.width;
  entry.height = size.height;
  return true;
}

// Runs the test on what is loaded and takes its figures.
void Run(Record& record, const Measuring& measuring) {
  record.phase.code = measuring.run();
  record.phase.end_millis = MillisSinceEpoch();
  if (record.phase.code == QV_SUCCESS && measuring.collect) {
    QVResultData* results = nullptr;
    GetResult(&results);
    measuring.collect(record.phase, *results);
  }
  if (measuring.look) measuring.look(record);
  if (record.phase.code == QV_ERROR_UNUSABLE_INPUT || record.phase.code == QV_ERROR_INTERNAL) {
    // The library's last line says what was refused.
    record.details.push_back(record.inputs[0].path + ": " + SideOutput::Lines().back().text);
  }
}

// A picture for --annotate, or nothing where there is nothing to show.
std::string Annotate(const Record& record, const Measuring& measuring) {
  const int code = record.phase.code;
  const bool missed = code == QV_ERROR_PATTERN_NOT_FOUND || code == QV_DONE || code == QV_ERROR_UNUSABLE_INPUT;
  const bool shows = code == QV_SUCCESS || (missed && measuring.annotates_misses);
  return shows ? measuring.annotate(record) : std::string();
}

void CheckOutputs(const MeasureOptions& options, const Measuring& measuring) {
  for (const std::string& output : {options.json, options.annotate}) RefuseInputAsOutput(output, measuring.inputs);
  if (options.json == "-" && options.annotate == "-") {
    throw Failure(kWrongUsage, "the record and the picture: standard output takes one of them");
  }
  const std::filesystem::path picture(options.annotate);
  if (!options.annotate.empty() && options.annotate != "-" && picture.extension() != ".png") {
    throw Failure(kWrongUsage, options.annotate + ": the picture is a PNG: name a .png file");
  }
}

std::string Verdict(const Record& record) {
  std::string text = Name(record.outcome());
  if (record.marginal()) text += ", marginal";
  return Format("%s  code %d, %s, %lld ms\n", text.c_str(), record.phase.code, FindCode(record.phase.code).name,
                static_cast<long long>(record.phase.end_millis - record.phase.start_millis));
}

std::string Report(const Record& record, const Measuring& measuring) {
  std::string text;
  for (const Input& input : record.inputs)
    text += Format("%s  %d x %d\n", input.path.c_str(), input.width, input.height);
  return text + measuring.report(record) + Verdict(record);
}

// Where, why, which code, what to do about it.
std::string MissSentence(const Record& record, const std::string& look_at) {
  std::string text;
  for (const std::string& sentence : record.details) text += (text.empty() ? "" : "; ") + sentence;
  if (record.phase.code == QV_SUCCESS) return text;
  // The circle check answers a miss with 0.
  const ResultCode& row = FindCode(record.phase.code == QV_DONE ? QV_ERROR_PATTERN_NOT_FOUND : record.phase.code);
  if (text.empty()) text = row.meaning;
  const std::string advice = look_at.empty() || row.code != QV_ERROR_INVALID_ARGUMENT ? row.look_at : look_at;
  if (row.code != record.phase.code) {
    return Format("%s (code %d: %s); %s", text.c_str(), record.phase.code, row.meaning, advice.c_str());
  }
  return Format("%s (code %d, %s: %s); %s", text.c_str(), row.code, row.name, row.meaning, advice.c_str());
}

}  // namespace

void MeasureOptions::DeclareOn(Options& command, const char* picture, const char* shows) {
  command.Text("--json", json, "Write the record to FILE; - is standard output", "FILE");
  command.Text(picture, annotate, shows, "PNG");
  command.Text("--limits", limits, "Judge the figures by this limits file", "FILE");
  command.Text("--dut", dut, "Serial number of the unit, for the record", "ID");
  command.Text("--station", station, "Name of the station, for the record", "ID");
  command.Flag("--verbose", verbose, "Show the library's log and what decoders say");
  command.Flag("--quiet", quiet, "Print nothing but what was asked for and errors");
}

void MeasureOptions::DeclareThresholdOn(Options& command) {
  command.Whole("--threshold", threshold, 0, 255, "Grey level above which a pixel is light [125]", "N");
}

void MeasureOptions::DeclareRawOn(Options& command) {
  command.Text("--raw", raw_size, "Frames are raw NV21 of this size, not picture files", "WxH");
}

void MeasureOptions::DeclarePublishOn(Options& command) {
  command.Flag("--publish", publish, "Write the findings to the system properties that other programs read");
}

void RefuseInputAsOutput(const std::string& output, const std::vector<SlotInput>& inputs) {
  for (const SlotInput& input : inputs) {
    std::error_code none;
    if (output != "-" && std::filesystem::equivalent(output, input.path, none)) {
      throw Failure(kWrongUsage, output + ": would overwrite the photo that is measured");
    }
  }
}

cv::Mat SlotPhoto(QV_RESOURCE_INDEX slot) {
  cv::Mat photo;
  if (theTester->resources_[slot] != nullptr) theTester->resources_[slot]->GetImage(&photo);
  return photo;
}

std::string FrequencyText(double nyquist, int photo_height, double pixel_pitch_um) {
  if (!std::isfinite(nyquist)) return "none (the curve gives no figure)";
  std::string text = Format("%.4f Nyquist  %.4f c/p  %.0f LW/PH", nyquist, nyquist / 2, nyquist * photo_height);
  if (pixel_pitch_um > 0) text += Format("  %.1f lp/mm", nyquist / 2 * 1000 / pixel_pitch_um);
  return text;
}

std::string LimitText(const Measurement& m) {
  if (!m.limit.given()) return "";
  std::string text = "  (";
  if (m.limit.min) text += Format("at least %g, ", *m.limit.min);
  if (m.limit.max) text += Format("at most %g, ", *m.limit.max);
  return text + Name(m.outcome) + (m.marginal ? ", marginal)" : ")");
}

int Measure(const MeasureOptions& options, const Measuring& measuring) {
  CheckOutputs(options, measuring);
  const cv::Size raw_size = options.raw_size.empty() ? cv::Size() : ParseSize("--raw", options.raw_size);
  if (raw_size.width % 2 != 0 || raw_size.height % 2 != 0) {
    throw Failure(kWrongUsage, "--raw " + options.raw_size + ": an NV21 frame has an even width and height");
  }
  Record record;
  record.start_millis = MillisSinceEpoch();
  record.command = CommandLine();
  record.dut_id = options.dut;
  record.station_id = options.station;
  record.test_name = measuring.test_name;
  record.test_index = measuring.test_index;
  record.phase.name = measuring.phase;
  if (!options.limits.empty()) record.limits = ReadLimits(options.limits);

  std::string picture;
  {
    ScratchFolder scratch;
    SideOutput side(options.verbose);
    const FreshTester fresh;
    SetHostPropertyStore(options.publish || !measuring.publishes ? nullptr : (scratch.path() + "/properties").c_str());
    if (options.threshold) setWorkingBinaryThresh(*options.threshold);
    if (measuring.prepare) measuring.prepare();
    const bool loaded = std::all_of(measuring.inputs.begin(), measuring.inputs.end(), [&](const SlotInput& input) {
      return Load(record, measuring, raw_size, input, scratch, side);
    });
    record.phase.start_millis = record.phase.end_millis = MillisSinceEpoch();
    if (loaded) Run(record, measuring);
    record.properties = PropertiesOffDefault(*theTester);
    record.Judge();
    if (!options.annotate.empty() && loaded) picture = Annotate(record, measuring);
    record.log_lines = SideOutput::Lines();
  }
  if (!picture.empty()) {
    record.phase.attachments.push_back({std::filesystem::path(options.annotate).filename().string(), "image/png",
                                        options.annotate, HexDigest(picture, "SHA1")});
  }
  record.end_millis = MillisSinceEpoch();

  const bool measured = record.phase.code == QV_SUCCESS && !record.cannot_judge;
  if (!measured) {
    const bool raw = !raw_size.empty();
    std::cerr << MissSentence(record, raw ? "is that the frame's size, and the file whole?" : measuring.look_at)
              << '\n';
  } else {
    for (const std::string& sentence : record.details) std::cerr << "warning: " << sentence << '\n';
    if (record.limits.given() && !record.limited()) {
      std::cerr << "warning: " << options.limits << ": holds no limit for " << record.phase.name << '\n';
    }
    std::ostream& out = options.json == "-" || options.annotate == "-" ? std::cerr : std::cout;
    if (!options.quiet) out << Report(record, measuring);
  }
  if (!options.annotate.empty() && picture.empty()) {
    std::cerr << "no picture: there is nothing to show\n";
    std::error_code ignored;
    std::filesystem::remove(options.annotate, ignored);  // one of an earlier run would be taken for this run's
  }
  // What was asked for by name comes last: one that can't be written loses none of the others.
  if (!options.json.empty()) WriteOutput(options.json, record.ToText());
  if (!picture.empty()) WriteOutput(options.annotate, picture);

  if (!measured) return record.phase.code == QV_ERROR_INTERNAL ? kExitInternalFault : kExitCouldNotMeasure;
  return record.outcome() == Outcome::kPass ? kExitWithinLimits : kExitLimitBroken;
}

}  // namespace qv
