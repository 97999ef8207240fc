#include <algorithm>
#include <array>
#include <cmath>
#include <filesystem>
#include <iostream>
#include <map>
#include <memory>
#include <sstream>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/measure/record.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

constexpr char kSchema[] = "qvtester-record-1";

// What a command was told beyond the measurement: left out when it is run again.
constexpr std::array<const char*, 9> kOutputOptions = {"--json",    "--annotate", "--matches", "--limits", "--dut",
                                                       "--station", "--truth",    "--output",  "-o"};
constexpr std::array<const char*, 3> kOutputFlags = {"--quiet", "--verbose", "--publish"};

template <typename Names>
bool IsOneOf(const Names& names, const std::string& word) {
  return std::find(names.begin(), names.end(), word) != names.end();
}

// A file that the record names: seen from the record's folder, as named, or beside the record; of a photo, the first
// with the content that was measured.
std::string Locate(const std::string& named, const fs::path& folder, const std::string& sha256) {
  std::string found = named;
  bool any = false;
  for (const fs::path& place : {folder / named, fs::path(named), folder / fs::path(named).filename()}) {
    std::error_code error;
    if (!fs::is_regular_file(place, error)) continue;
    if (!any) found = place;
    any = true;
    if (sha256.empty()) break;
    if (HexDigest(ReadWholeFile(place, kCouldNotMeasure), "SHA256") == sha256) return place;
  }
  return found;
}

// The record's command without what concerns its outputs.
std::vector<std::string> CommandAgain(const Json& record, const fs::path& folder) {
  std::map<std::string, std::string> digests;
  for (const Json& input : record.at("inputs")) digests[input.at("path")] = input.at("sha256");
  const Json& command = record.at("metadata").at("command");
  std::vector<std::string> words;
  for (std::size_t i = 0; i < command.size(); ++i) {
    const std::string word = command[i];
    if (IsOneOf(kOutputFlags, word)) continue;
    if (IsOneOf(kOutputOptions, word)) {
      ++i;  // and its value
    } else {
      words.push_back(i == 0 ? word : Locate(word, folder, digests[word]));
    }
  }
  return words;
}

// While it lives, what is written to a stream is kept.
class Kept {
 public:
  explicit Kept(std::ostream& stream) : stream_(stream), saved_(stream.rdbuf(text_.rdbuf())) {}
  ~Kept() { stream_.rdbuf(saved_); }
  Kept(const Kept&) = delete;
  Kept& operator=(const Kept&) = delete;
  std::string Text() const { return text_.str(); }

 private:
  std::ostringstream text_;
  std::ostream& stream_;
  std::streambuf* saved_;
};

// The largest difference between two measured values, single or lists of pairs; infinity when they can't be compared.
double Difference(const Json& was, const Json& is) {
  if (was == is) return 0;
  if (was.is_number() && is.is_number()) return std::fabs(was.get<double>() - is.get<double>());
  if (!was.is_array() || !is.is_array() || was.size() != is.size()) return INFINITY;
  double largest = 0;
  for (std::size_t i = 0; i < was.size(); ++i) largest = std::max(largest, Difference(was[i], is[i]));
  return largest;
}

struct Check {
  int numbers = 0;
  std::vector<std::string> moved;  // a sentence each
};

Check Compare(const Json& was, const Json& is) {
  Check check;
  const Json& stored = was.at("phases").at(0);
  const Json& measured = is.at("phases").at(0);
  for (std::size_t i = 0; i < was.at("inputs").size(); ++i) {
    if (i < is.at("inputs").size() && was.at("inputs")[i].at("sha256") != is.at("inputs")[i].at("sha256")) {
      check.moved.push_back("the photo itself has changed: " + is.at("inputs")[i].at("path").get<std::string>());
    }
  }
  if (!check.moved.empty()) return check;  // figures of another photo say nothing
  if (stored.at("result_code") != measured.at("result_code")) {
    check.moved.push_back("the result code was " + stored.at("result_code").dump() + ", is " +
                          measured.at("result_code").dump());
  }
  for (const auto& [name, m] : stored.at("measurements").get_ref<const Json::object_t&>()) {
    if (!m.contains("measured_value")) continue;
    ++check.numbers;
    const Json& now = measured.at("measurements");
    if (!now.contains(name) || !now[name].contains("measured_value")) {
      check.moved.push_back(name + " is no longer measured");
      continue;
    }
    const MeasurementInfo* const info = FindMeasurement(name);
    const double allowed = info == nullptr ? 0 : Repeatability(*info->figure);
    const Json& value = now[name].at("measured_value");
    const double difference = Difference(m.at("measured_value"), value);
    if (difference <= allowed) continue;
    const std::string what = value.is_array() ? Format(": its values differ by up to %g", difference)
                                              : " was " + m.at("measured_value").dump() + ", is " + value.dump();
    check.moved.push_back(name + what + Format("; the same photo may differ by %g", allowed));
  }
  return check;
}

Check VerifyRecord(const fs::path& path, const Json& record) {
  try {
    std::vector<std::string> words = CommandAgain(record, path.parent_path());
    if (words.empty())
      throw Failure(kCouldNotMeasure, path.string() + ": the record does not say which command made it");
    if (IsOneOf(words, "-")) {
      throw Failure(kCouldNotMeasure, path.string() + ": made from standard input, which is gone");
    }
    words.insert(words.end(), {"--json", "-"});
    std::string text;
    std::string errors;
    {
      const Kept out(std::cout);
      const Kept err(std::cerr);
      RunCommand(words);
      text = out.Text();
      errors = err.Text();
    }
    const Json again = Json::parse(text, nullptr, false);
    if (again.is_discarded()) throw Failure(kCouldNotMeasure, path.string() + ": can't be run again: " + errors);
    return Compare(record, again);
  } catch (const Json::exception& e) {
    throw Failure(kCouldNotMeasure, path.string() + ": not a whole record (" + e.what() + ")");
  }
}

// Files as named; of a folder, those that hold records.
std::vector<std::pair<fs::path, Json>> ReadRecords(const std::vector<std::string>& paths) {
  std::vector<std::pair<fs::path, Json>> records;
  for (const std::string& path : paths) {
    const bool whole_folder = fs::is_directory(path);
    std::vector<fs::path> files;
    if (whole_folder) {
      for (const fs::directory_entry& entry : fs::directory_iterator(path)) {
        if (entry.path().extension() == ".json") files.push_back(entry.path());
      }
      std::sort(files.begin(), files.end());
    } else {
      files.emplace_back(path);
    }
    for (const fs::path& file : files) {
      Json json = Json::parse(ReadWholeFile(file, kWrongUsage), nullptr, false);
      const bool is_record = json.is_object() && json.value("schema", Json()) == kSchema;
      if (!is_record && !whole_folder) throw Failure(kWrongUsage, file.string() + ": not a record");
      if (is_record) records.emplace_back(file, std::move(json));
    }
  }
  if (records.empty()) throw Failure(kWrongUsage, "no record there to verify");
  return records;
}

}  // namespace

CommandBody DeclareVerify(Options& command) {
  auto paths = std::make_shared<std::vector<std::string>>();
  command.Arguments(
      "RECORD", *paths,
      "Records of golden photos, as --json wrote them, or folders of them; a photo is looked for where the "
      "record says and beside the record, by its content",
      "PATH", true);
  return [paths] {
    int numbers = 0;
    int moved = 0;
    int failed = 0;
    const auto records = ReadRecords(*paths);
    for (const auto& [path, record] : records) {
      try {
        const Check check = VerifyRecord(path, record);
        numbers += check.numbers;
        moved += static_cast<int>(check.moved.size());
        std::cout << Format("%s  %s, %d numbers\n", path.c_str(), check.moved.empty() ? "as stored" : "MOVED",
                            check.numbers);
        for (const std::string& sentence : check.moved) std::cout << "  " << sentence << '\n';
      } catch (const Failure& e) {
        ++failed;
        std::cerr << e.what() << '\n';
      }
    }
    std::cout << Format("%zu records, %d numbers: %d moved, %d records could not be verified\n", records.size(),
                        numbers, moved, failed);
    return static_cast<int>(failed > 0 ? kExitCouldNotMeasure : moved > 0 ? kExitLimitBroken : kExitWithinLimits);
  };
}

}  // namespace qv
