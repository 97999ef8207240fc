#include "tools/commands.h"

#include <cstdint>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <iostream>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "qvtester/resource.h"
#include "tools/program.h"

namespace qv {

// Each declares its options and hands back what runs once they are parsed.
CommandBody DeclareBatch(Options& command);
CommandBody DeclareChart(Options& command);
CommandBody DeclareExplain(Options& command);
CommandBody DeclareExport(Options& command);
CommandBody DeclareImport(Options& command);
CommandBody DeclareJudge(Options& command);
CommandBody DeclareList(Options& command);
CommandBody DeclarePlan(Options& command);
CommandBody DeclareReport(Options& command);
CommandBody DeclareRun(Options& command);
CommandBody DeclareShow(Options& command);
CommandBody DeclareSimulate(Options& command);
CommandBody DeclareStudy(Options& command);
CommandBody DeclareVerify(Options& command);

namespace {

MeasuringCommand Sharpness(const char* measurement) {
  MeasuringCommand command = {measurement};
  command.extra = MakeTruthComparison;
  return command;
}

MeasuringCommand Registration() {
  MeasuringCommand command = {"registration"};
  command.picture = "--matches";
  command.picture_help = "Draw the good matches between both pictures";
  command.extra = MakeProductOutput;
  return command;
}

MeasuringCommand TouchPrint() {
  MeasuringCommand command = {"touch_panel_print"};
  command.extra = MakeProductOutput;
  return command;
}

const std::vector<Command> kCommands = {
    {"autofocus", "Measure the sharpness of a chart photo (test 14)", Sharpness("camera_autofocus")},
    {"mtf", "Measure the two MTF50 values of a chart photo, outside the numbered tests", Sharpness("mtf_check")},
    {"flash", "Measure the mean brightness of a flash photo (tests 15 and 18)",
     MeasuringCommand{"camera_flash", "--vt", "The second camera's flash (test 18)", "camera_flash_vt"}},
    {"capture", "Measure the colour patches of a chart photo (tests 16 and 20)",
     MeasuringCommand{"camera_capture", "--front", "The front camera (test 20)", "camera_capture_front"}},
    {"dust", "Find dust on the lens in a photo of a plain target (tests 17 and 21)",
     MeasuringCommand{"lens_dust", "--front", "The front camera (test 21)", "lens_dust_front"}},
    {"preview", "Measure how much two preview frames differ (tests 13 and 19)",
     MeasuringCommand{"camera_preview", "--front", "The front camera's preview (test 19)", "camera_preview_front"}},
    {"circles", "Look for the chart's three marks in a preview frame", MeasuringCommand{"circle_check"}},
    {"dots", "Find bright and dark dots in a high-dynamic-range picture of a lit panel", MeasuringCommand{"hdr_dots"}},
    {"lcd", "Judge the pattern that a display shows", MeasuringCommand{"lcd"}},
    {"led", "Measure light, colour and dark spots of an indicator light (test 27)", MeasuringCommand{"led_light"}},
    {"touch-led", "Measure light, colour and dark spots of a touch panel's lights (test 28)",
     MeasuringCommand{"touch_panel_led"}},
    {"touch-print", "Hold a touch panel's print against photos of good ones (test 29)", TouchPrint()},
    {"register", "Bring a picture into the frame of a reference", Registration()},
    {"video", "Measure films, or the video camera's preview (tests 22 to 26)", nullptr},
    {"video preview", "Measure how much two preview frames of the video camera differ (test 22)",
     MeasuringCommand{"video_preview"}},
    {"video autofocus", "Measure the sharpness over a film of the chart, and when it settles (test 23)",
     MeasuringCommand{"video_autofocus"}},
    {"video flash", "Measure the flash's pulse in a film (test 24)", MeasuringCommand{"video_flash"}},
    {"video record", "Look for lost frames and for the chart in a film that the phone has recorded (test 25)",
     MeasuringCommand{"video_record"}},
    {"video play", "The same in a film of the phone that plays one (test 26)", MeasuringCommand{"video_play"}},
    {"run", "Measure one unit by a plan", DeclareRun},
    {"batch", "Measure a folder or a list of photos or units into a store", DeclareBatch},
    {"plan", "Check a plan, or write one to start from", DeclarePlan},
    {"chart", "Draw the test chart", DeclareChart},
    {"simulate", "Take a photo of the chart with a camera of known faults", DeclareSimulate},
    {"verify", "Measure golden photos again and tell which number moved", DeclareVerify},
    {"show", "List a store's runs with their verdicts, or a unit's figures", DeclareShow},
    {"judge", "Judge a store's runs by new limits, without measuring", DeclareJudge},
    {"study", "Statistics of a store's figures: capability, gauge study, proposed limits", DeclareStudy},
    {"report", "Make a page of a store's runs, or of a record", DeclareReport},
    {"export", "Write a store's runs as an archive or a table", DeclareExport},
    {"import", "Take archives or records into a store", DeclareImport},
    {"explain", "Say what a number means, how true it is and what moves it", DeclareExplain},
    {"list", "List the library's tests, slots, properties and codes, and what can be measured", DeclareList},
};

constexpr char kFooter[] =
    "Exit status: 0 measured, within all limits; 1 measured, a limit broken; 2 wrong usage;\n"
    "3 could not measure, or not to be trusted; 4 internal fault or a full disk; 130 interrupted.\n"
    "`qvtester COMMAND --help` shows a command's options. `qvtester --most-megapixels N COMMAND ...`\n"
    "reads pictures and films of up to N megapixels, 1 to 1000, in place of 200.";

// Options and their values as words of their own: "--json=FILE" and "-oFILE" taken apart.
std::vector<std::string> Separate(const std::vector<std::string>& words) {
  std::vector<std::string> parts;
  for (const std::string& word : words) {
    const std::size_t equals = word.find('=');
    if (word.rfind("--", 0) == 0 && equals != std::string::npos) {
      parts.insert(parts.end(), {word.substr(0, equals), word.substr(equals + 1)});
    } else if (word.rfind("-o", 0) == 0 && word.size() > 2) {
      parts.insert(parts.end(), {"-o", word.substr(2)});
    } else {
      parts.push_back(word);
    }
  }
  return parts;
}

// What stands before any command: how large a picture or film may be. Takes it, and leaves the command.
std::vector<std::string> WithoutMostMegapixels(const std::vector<std::string>& words) {
  constexpr std::int64_t kMega = 1'000'000;
  const std::vector<std::string> parts = Separate({words.begin(), words.begin() + (words.empty() ? 0 : 1)});
  static const std::int64_t usual = QVResource::most_pixels_;  // a test runs several commands
  QVResource::most_pixels_ = usual;
  if (parts.empty() || parts[0] != "--most-megapixels") return words;
  const std::size_t taken = parts.size() == 2 ? 1 : 2;
  const std::string number = parts.size() == 2 ? parts[1] : words.size() > 1 ? words[1] : "";
  const bool whole =
      !number.empty() && number.size() <= 4 && number.find_first_not_of("0123456789") == std::string::npos;
  const std::int64_t most = whole ? std::stoll(number) : 0;
  if (most < 1 || most > 1000) {
    throw Failure(kWrongUsage, "--most-megapixels " + number + ": give a whole number from 1 to 1000");
  }
  QVResource::most_pixels_ = most * kMega;
  return {words.begin() + static_cast<std::ptrdiff_t>(taken), words.end()};
}

int RunCommand(const std::vector<std::string>& words) {
  const CommandBody body =
      Parse({"qvtester", "Judges a phone's camera hardware from photos of test charts.", QVTESTER_VERSION, kFooter},
            kCommands, WithoutMostMegapixels(words));
  SetCommandLine(Separate(words));
  const int status = body();
  if (!std::cout.flush()) throw Failure(kInternalFault, "standard output can't be written");
  return status;
}

}  // namespace

int RunProgram(const std::vector<std::string>& words) {
  try {
    return RunCommand(words);
  } catch (const Failure& e) {
    std::fprintf(stderr, "qvtester: %s\n", Printable(e.what()).c_str());
    return StatusOf(e.kind);
  } catch (const std::filesystem::filesystem_error& e) {
    std::fprintf(stderr, "qvtester: %s: %s\n", Printable(e.path1().string()).c_str(), e.code().message().c_str());
    return kExitWrongUsage;
  } catch (const std::exception& e) {
    std::fprintf(stderr, "qvtester: internal fault: %s\n", Printable(e.what()).c_str());
    return kExitInternalFault;
  }
}

}  // namespace qv
