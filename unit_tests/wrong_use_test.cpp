// Wrong uses of the program, each with the status that it ends with and a fragment of the sentence that says why.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <iostream>
#include <opencv2/core.hpp>
#include <sstream>

#include "qvtester/host_properties.h"
#include "unit_tests/drawing.h"

// The program lies above its tests; this is all that they call of it, since a process a row would take minutes.
namespace qv {
int RunProgram(const std::vector<std::string>& words);
}

namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::Not;

struct WrongUse {
  int status;
  std::vector<std::string> words;
  std::string fragment;
  std::string line;
};

// With each of one text in place of another.
std::string Replaced(std::string text, const std::string& from, const std::string& to) {
  for (std::size_t at = text.find(from); at != std::string::npos; at = text.find(from, at + to.size())) {
    text.replace(at, from.size(), to);
  }
  return text;
}

// "flash {a,b}.png" as two lines; "{1}" of what follows is the first choice.
std::vector<std::string> Expanded(const std::string& line, int choice = 1) {
  const std::size_t open = line.find('{');
  if (open == std::string::npos) return {line};
  const std::size_t close = line.find('}', open);
  std::vector<std::string> lines;
  std::istringstream choices(line.substr(open + 1, close - open - 1) + ",");
  for (std::string chosen; std::getline(choices, chosen, ',');) {
    std::string one = line;
    one = Replaced(one.replace(open, close - open + 1, chosen), "{" + std::to_string(choice) + "}", chosen);
    for (std::string& further : Expanded(one, choice + 1)) lines.push_back(std::move(further));
  }
  return lines;
}

// "status | words | fragment"; '' is an empty word, \e the escape character.
WrongUse Read(const std::string& line) {
  const std::size_t first = line.find(" | ");
  const std::size_t last = line.rfind(" | ");
  WrongUse use = {std::stoi(line), {}, line.substr(last + 3), line};
  std::istringstream words(line.substr(first + 3, last - first - 3));
  for (std::string word; words >> word;) {
    use.words.push_back(word == "''" ? "" : Replaced(word, "\\e", "\x1b"));
  }
  return use;
}

class WrongUses : public ::testing::Test {
 protected:
  void SetUp() override {
    std::istringstream files(ReadFile(QVTESTER_WRONG_USES ".files"));
    for (std::string line; std::getline(files, line);) {
      const std::size_t blank = line.find(' ');
      folder_.Write(line.substr(0, blank),
                    blank == std::string::npos ? "" : Replaced(line.substr(blank + 1), "\\n", "\n"));
    }
    std::filesystem::create_directory(folder_.Path("folder.png"));
    std::filesystem::create_symlink("nowhere", folder_.Path("astray.png"));
    mkfifo(folder_.Path("pipe.png").c_str(), 0600);
    ASSERT_EQ(0, Run({"simulate", "-o", "chart.png", "--size", "640x480", "--marks", "coarse"})) << Said();
    folder_.Write("other.png", ReadFile(folder_.Path("chart.png")) + "x");  // the same picture, another file
    folder_.Write("cut.png", ReadFile(folder_.Path("chart.png")).substr(0, 30));
    ASSERT_EQ(0, Run({"batch", "camera_flash", "photos.csv", "-o", "store", "--quiet", "-j", "1"})) << Said();
  }

  // In a process of its own, which shares what is loaded.
  int Run(const std::vector<std::string>& words) const {
    std::cout.flush();
    const pid_t child = fork();
    if (child == 0) {
      const int said = open(said_.Path("said").c_str(), O_CREAT | O_TRUNC | O_WRONLY, 0600);
      dup2(open("/dev/null", O_RDONLY), 0);
      dup2(said, 1);
      dup2(said, 2);
      alarm(20);
      SetHostPropertyStore("/dev/null/nowhere");
      const bool there = chdir(folder_.Path("").c_str()) == 0;
      const int status = there ? qv::RunProgram(words) : -1;
      std::cout.flush();
      _exit(status);
    }
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 1000 + WTERMSIG(status);
  }

  std::string Said() const { return ReadFile(said_.Path("said")); }

  TemporaryFolder folder_, said_;
};

// Gives no memory to a grey picture.
class NoMemoryForGrey : public cv::MatAllocator {
 public:
  cv::UMatData* allocate(int dims, const int* sizes, int type, void* data, std::size_t* step, cv::AccessFlag flags,
                         cv::UMatUsageFlags usage) const override {
    if (type == CV_8UC1 && sizes[0] > 100) CV_Error(cv::Error::StsNoMem, "no memory for a grey picture");
    return cv::Mat::getStdAllocator()->allocate(dims, sizes, type, data, step, flags, usage);
  }
  bool allocate(cv::UMatData* data, cv::AccessFlag flags, cv::UMatUsageFlags usage) const override {
    return cv::Mat::getStdAllocator()->allocate(data, flags, usage);
  }
  void deallocate(cv::UMatData* data) const override { cv::Mat::getStdAllocator()->deallocate(data); }
};

TEST_F(WrongUses, ExhaustedMemoryIsNoFaultOfThePhoto) {
  NoMemoryForGrey allocator;
  cv::MatAllocator* const before = cv::Mat::getDefaultAllocator();
  cv::Mat::setDefaultAllocator(&allocator);
  const int status = Run({"autofocus", "chart.png"});
  cv::Mat::setDefaultAllocator(before);
  EXPECT_EQ(4, status);
  EXPECT_THAT(Said(), AllOf(HasSubstr("code -99"), HasSubstr("no memory for a grey picture")));
}

TEST_F(WrongUses, EachEndsWithItsStatusAndASentence) {
  std::istringstream table(ReadFile(QVTESTER_WRONG_USES));
  int count = 0;
  for (std::string row; std::getline(table, row);) {
    if (row.empty() || row[0] == '#') continue;
    for (const std::string& line : Expanded(row)) {
      const WrongUse use = Read(line);
      EXPECT_EQ(use.status, Run(use.words)) << line;
      EXPECT_THAT(Said(), AllOf(HasSubstr(use.fragment), Not(HasSubstr("internal fault")), Not(HasSubstr("exception")),
                                Not(HasSubstr("OpenCV(")), Not(HasSubstr("\x1b"))))
          << line << std::endl
          << Said();
      ++count;
    }
  }
  EXPECT_GE(count, 400);
}

TEST_F(WrongUses, HelpFitsATerminalAndTellsRanges) {
  std::vector<std::vector<std::string>> commands = {{}};
  for (std::size_t i = 0; i < commands.size(); ++i) {
    std::vector<std::string> words = commands[i];
    words.emplace_back("--help");
    ASSERT_EQ(0, Run(words));
    bool listed = false;
    std::istringstream lines(Said());
    for (std::string line; std::getline(lines, line);) {
      EXPECT_LT(line.size(), 100U) << line;
      if (line == "Subcommands:") {
        listed = true;
      } else if (line.empty()) {
        listed = false;
      } else if (listed && line[2] != ' ') {
        words.back() = line.substr(2, line.find(' ', 2) - 2);
        commands.push_back(words);
      }
    }
  }
  EXPECT_GT(commands.size(), 30U);
  ASSERT_EQ(0, Run({"autofocus", "--help"}));
  EXPECT_THAT(Said(), AllOf(HasSubstr("[125; 0 to 255]"), HasSubstr("--set PROPERTY=VALUE")));
  ASSERT_EQ(0, Run({"simulate", "--help"}));
  EXPECT_THAT(Said(), AllOf(HasSubstr("phone: 0.8; 0 to 0.99]"), HasSubstr("; auto, none or srgb]")));
}

}  // namespace
