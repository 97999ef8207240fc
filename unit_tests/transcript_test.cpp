// Sessions with the program, each a file in unit_tests/transcripts: what was typed, and all that came of it. A line
// "$ words" is run as `qvtester words`; what it says follows, then "= status" unless that is 0. Other commands are
//   $ write FILE TEXT   with \n for a new line       $ sh WORDS   in the session's folder
//   $ json FILE   every value of a record, a truth or a report's data; of curves the mean and four points
//   $ sweep A B C: words | words   both with each value for @; status and figures of the last, where they change
//   $ picture FILE   its size, each channel's mean and deviation, its grey and its red less blue in 32 x 12 cells
// QV_WRITE_GOLDEN=1 writes what comes now, to be read before it is kept.

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <regex>
#include <set>
#include <sstream>

#include "desk/results/pack.h"
#include "unit_tests/program.h"

namespace {

using nlohmann::json;

#ifdef QVTESTER_SANITIZED
constexpr bool kSanitized = true;
#else
constexpr bool kSanitized = false;
#endif

std::string Number(double value) {
  std::ostringstream text;
  text << (std::abs(value) < 1e-9 ? 0 : value);  // six digits; what is less is rounding
  return text.str();
}

bool AllNumbers(const json& value) {
  return value.is_array() && !value.empty() &&
         std::all_of(value.begin(), value.end(), [](const json& v) { return v.is_number(); });
}

// Of a list or each column of a table of numbers.
std::string Course(const json& list, const std::function<double(const json&)>& of) {
  double sum = 0;
  for (const json& v : list) sum += of(v);
  std::string text = " mean " + Number(sum / static_cast<double>(list.size())) + ":";
  for (int i = 0; i < 4; ++i) text += " " + Number(of(list[i * (list.size() - 1) / 3]));
  return text;
}

std::string Scalar(const json& value) {
  if (value.is_string() && value.get_ref<const std::string&>().size() > 1000) return "(a picture)";
  return value.is_number_float() ? Number(value.get<double>()) : value.dump();
}

// A line for what an object says itself, then its lists and objects.
void Flatten(const json& value, const std::string& name, std::string& text) {
  static const std::set<std::string> kMoving = {"command",
                                                "docstring",
                                                "end_time_millis",
                                                "level",
                                                "library_version",
                                                "logger_name",
                                                "made_millis",
                                                "method",
                                                "name",
                                                "pixels_hash",
                                                "sha1",
                                                "sha256",
                                                "sha512",
                                                "start_millis",
                                                "start_time_millis",
                                                "timestamp_millis",
                                                "units"};
  if (AllNumbers(value) && value.size() > 12) {
    text += name + " =" + Course(value, [](const json& v) { return v.get<double>(); }) + "\n";
  } else if (value.is_array() && value.size() > 4 && AllNumbers(value[0])) {
    for (std::size_t k = 0; k < value[0].size(); ++k) {
      text += name + "[" + std::to_string(k) + "] of " + std::to_string(value.size()) + " =" +
              Course(value, [k](const json& v) { return v.at(k).is_number() ? v.at(k).get<double>() : -999; }) + "\n";
    }
  } else {
    std::string line;
    for (const auto& [key, v] : value.items()) {
      const bool own = value.is_array() ? v.is_primitive() : v.is_primitive() && kMoving.count(key) == 0;
      if (own) line += (value.is_array() ? " " : " " + key + " ") + Scalar(v);
    }
    if (!line.empty()) text += name + ":" + line + "\n";
    for (const auto& [key, v] : value.items()) {
      if (v.is_structured() && (value.is_array() || kMoving.count(key) == 0))
        Flatten(v, name + (name.empty() ? "" : ".") + key, text);
    }
  }
}

const std::string kLevels = "0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ!?";

std::string Cells(const cv::Mat& levels) {
  std::string text;
  for (int i = 0; i < levels.cols; ++i) text += kLevels[static_cast<std::size_t>(levels.at<uchar>(0, i) / 4)];
  return text;
}

std::string PictureText(const std::string& file) {
  const cv::Mat image = cv::imread(file, cv::IMREAD_UNCHANGED);
  if (image.empty()) return "no picture\n";
  cv::Scalar mean, deviation;
  cv::meanStdDev(image, mean, deviation);
  std::string text =
      std::to_string(image.cols) + "x" + std::to_string(image.rows) + ", depth " + std::to_string(image.depth()) + "\n";
  for (int c = 0; c < image.channels(); ++c) text += "mean " + Number(mean[c]) + ", " + Number(deviation[c]) + "\n";
  cv::Mat bytes, cells;
  image.convertTo(bytes, CV_8U, image.depth() == CV_16U ? 1 / 257.0 : image.depth() == CV_8U ? 1 : 200);
  cv::resize(bytes, cells, {32, 12}, 0, 0, cv::INTER_AREA);
  std::vector<cv::Mat> of(3, cells);
  if (image.channels() > 1) cv::split(cells, of);
  for (int i = 0; i < cells.rows; ++i) {
    const cv::Mat red_less_blue = (of[2].row(i) - of[0].row(i)) / 2 + (255 - of[0].row(i)) / 2;
    text += "|" + Cells(of[1].row(i)) + "|" + Cells(red_less_blue) + "|\n";
  }
  return text;
}

// A word for each figure: a number, or of a list its length and mean.
void AddFigures(const json& record, std::map<std::string, std::string>& figures) {
  for (const json& detail : record.at("outcome_details"))
    figures[detail.value("name", detail.value("weight", "?"))] = detail.value("description", "");
  for (const auto& [name, figure] : record.at("phases").at(0).at("measurements").items()) {
    const json value = figure.at("measured_value").flatten();
    double sum = 0;
    for (const auto& item : value.items()) sum += item.value().is_number() ? item.value().get<double>() : -999;
    figures[name] = value.size() == 1
                        ? Number(sum)
                        : std::to_string(value.size()) + "*" + Number(sum / static_cast<double>(value.size()));
  }
}

class Transcripts : public SimulatedPhotos, public ::testing::WithParamInterface<std::string> {
 protected:
  std::string Answer(const std::string& words) const {
    const std::string first = words.substr(0, words.find(' '));
    const std::string rest = words.size() > first.size() ? words.substr(first.size() + 1) : "";
    if (first == "write") {
      const std::size_t blank = rest.find(' ');
      folder_.Write(rest.substr(0, blank), std::regex_replace(rest.substr(blank + 1), std::regex(R"(\\n)"), "\n"));
      return "";
    }
    if (first == "sh") {
      const std::string command = "cd '" + folder_.Path("") + "' && { " + rest + "; } >said 2>&1";
      const int status = std::system(command.c_str());  // NOLINT(cert-env33-c): the session's own words
      return Settled(ReadFile(folder_.Path("said"))) +
             (status == 0 ? "" : "= " + std::to_string(WEXITSTATUS(status)) + "\n");
    }
    if (first == "sweep") return Sweep(rest);
    if (first == "picture") return PictureText(folder_.Path(rest));
    if (first == "json") {
      std::string text;
      std::string content = ReadFile(folder_.Path(rest));
      const std::size_t packed = content.find("id=\"data\">");  // of a report
      if (packed != std::string::npos)
        content = qv::Unpack(content.substr(packed + 10, content.find("</script>", packed) - packed - 10));
      Flatten(json::parse(content, nullptr, false), "", text);
      return text;
    }
    const ProgramRun run = Run(words);
    return Settled(run.out + run.err) + (run.status == 0 ? "" : "= " + std::to_string(run.status) + "\n");
  }

  std::string Sweep(const std::string& words) const {
    const std::size_t colon = words.find(": ");
    std::istringstream values(words.substr(0, colon));
    std::map<std::string, std::string> before;
    std::string text;
    for (std::string value; values >> value;) {
      const std::string all = std::regex_replace(words.substr(colon + 2), std::regex("@"), value);
      const std::size_t bar = all.rfind(" | ");
      std::map<std::string, std::string> figures;
      if (bar != std::string::npos) figures["before"] = Run(all.substr(0, bar) + " --quiet").err;
      std::filesystem::remove(folder_.Path("sweep.json"));
      const std::string last = all.substr(bar == std::string::npos ? 0 : bar + 3);
      figures["status"] = std::to_string(Run(last + " --quiet --json sweep.json").status);
      const json record = json::parse(ReadFile(folder_.Path("sweep.json")), nullptr, false);
      if (record.is_object()) AddFigures(record, figures);
      text += value + ":";
      for (const auto& [name, figure] : figures) text += before[name] == figure ? "" : " " + name + " " + figure;
      for (const auto& [name, figure] : before) text += figures.count(name) == 1 || figure.empty() ? "" : " no " + name;
      text += "\n";
      before = figures;
    }
    return text;
  }

  // Times, names of the folder and digests are this run's own.
  std::string Settled(std::string text) const {
    for (const auto& [what, by] : {std::pair(folder_.Path("."), "FOLDER"),
                                   {R"(\d{4}-\d\d-\d\d[T ]\d\d:\d\d(:\d\d)?Z?)", "TIME"},
                                   {"[0-9a-f]{40,}", "DIGEST"},
                                   {", \\d+ ms\n", ", TIME\n"},
                                   {"there before; [0-9.]+ s", "there before; TIME"}}) {
      text = std::regex_replace(text, std::regex(what), by);
    }
    return text;
  }
};

// Numbers may differ in their sixth digit, cells of a picture by a level; all else is equal.
bool Agree(const std::string& a, const std::string& b) {
  if (a == b) return true;
  if (a.size() == b.size() && a[0] == '|') {
    for (std::size_t i = 0; i < a.size(); ++i) {
      const auto level = [](char c) { return static_cast<int>(kLevels.find(c)); };
      if (a[i] != b[i] && std::abs(level(a[i]) - level(b[i])) > 1) return false;
    }
    return true;
  }
  static const std::regex kNumber(R"(\d+(\.\d+)?(e[-+]?\d+)?)");
  if (std::regex_replace(a, kNumber, "#") != std::regex_replace(b, kNumber, "#")) return false;
  for (std::sregex_iterator i(a.begin(), a.end(), kNumber), k(b.begin(), b.end(), kNumber), end; i != end; ++i, ++k) {
    const double x = std::stod(i->str());
    const double y = std::stod(k->str());
    if (std::abs(x - y) > 1.1e-5 * std::max(x, y)) return false;
  }
  return true;
}

TEST_P(Transcripts, ComeOutAsTheyDid) {
  const std::string file = QVTESTER_TRANSCRIPTS "/" + GetParam() + ".txt";
  std::istringstream kept(ReadFile(file));
  std::ostringstream anew;
  std::string said, command;
  for (std::string line; std::getline(kept, line);) {
    if (line.rfind("$ ", 0) == 0 || line.rfind("# ", 0) == 0) {
      anew << line << "\n";
      command = line;
      said.clear();
      if (line[0] == '$') said = Answer(line.substr(2));
      anew << said;
      if (!said.empty() && said.back() != '\n') anew << "\n";
    }
  }
  if (std::getenv("QV_WRITE_GOLDEN") != nullptr) std::ofstream(file) << anew.str();
  std::istringstream expected(ReadFile(file)), got(anew.str());
  std::string a, b;
  while (std::getline(expected, a)) {
    ASSERT_TRUE(std::getline(got, b)) << "nothing more after " << command << ", where there was " << a;
    if (a.rfind("$ ", 0) == 0) command = a;
    ASSERT_TRUE(Agree(a, b)) << command << "\n  was " << a << "\n  is  " << b;
  }
  EXPECT_FALSE(std::getline(got, b)) << command << ": " << b;
}

std::vector<std::string> Names() {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(QVTESTER_TRANSCRIPTS)) {
    const std::string name = entry.path().stem();
    if (!kSanitized || name.rfind("sweep", 0) != 0)
      names.push_back(name);  // minutes there, for paths that the others go
  }
  std::sort(names.begin(), names.end());
  return names;
}

INSTANTIATE_TEST_SUITE_P(Sessions, Transcripts, ::testing::ValuesIn(Names()),
                         [](const auto& name) { return name.param; });

}  // namespace
