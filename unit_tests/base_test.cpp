#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <string>

#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/kept_stderr.h"
#include "desk/base/log_lines.h"
#include "desk/base/memory_file.h"
#include "desk/base/text.h"
#include "unit_tests/drawing.h"
#include "unit_tests/sentence.h"

// Stands in for the system's: what the written file was called when it was flushed, and whether that works.
static std::function<int(int)> flush = [](int) { return 0; };
extern "C" int fsync(int fd) { return flush(fd); }  // NOLINT(readability-inconsistent-declaration-parameter-name)

namespace qv {

namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;

struct Refused {
  std::string text, sentence;
};

TEST(JsonReader, RefusesWithTheLineAndInItsOwnWords) {
  const Refused kRefused[] = {
      {"", "f: line 1: ends before the document does"},
      {"{\"a\":\n[1,\n2", "f: line 3: ends before the document does"},
      {"{\"a\": 1,\n\"b\": nul}", "f: line 2: this is no JSON"},
      {R"({"a": 1, "a": 2})", "f: \"a\" stands there twice"},
      {"[1e999]", "f: holds a number that no double can take"},
      {"\"\xff\"", "f: line 1: this is no JSON"},
      {std::string(150000, '['), "f: line 1: nested deeper than 64 levels"},
      {"\"[[[\\\"[\"\n" + std::string(65, '['), "f: line 2: nested deeper than 64 levels"},
  };
  for (const Refused& row : kRefused) {
    EXPECT_EQ(row.sentence, Sentence([&] { ParseJson(row.text, "f"); })) << row.text.substr(0, 40);
  }
  // Brackets in a text are no levels, and the same name may stand in two objects.
  EXPECT_NO_THROW(ParseJson("\"" + std::string(70, '[') + "\"", "f"));
  EXPECT_NO_THROW(ParseJson("[{\"a\": {\"a\": 1}}, {\"a\": 2}]", "f"));
}

TEST(JsonReader, ViewsNameTheWayToWhatIsWrong) {
  const Json json = ParseJson(R"({"steps": [{"inputs": 5, "n": -9e18, "big": 18446744073709551615}]})", "plan.json");
  const JsonView step = JsonView(json, "plan.json").At("steps").Elements().at(0);
  EXPECT_EQ("plan.json: steps[0]: inputs: is 5, not a list", Sentence([&] { step.At("inputs").Elements(); }));
  EXPECT_EQ("plan.json: steps[0]: n: is -9e+18, not a whole number from 0 to 9",
            Sentence([&] { step.At("n").Integer(0, 9); }));
  EXPECT_THAT(Sentence([&] { step.At("big").Integer(0, INT64_MAX); }), HasSubstr("not a whole number"));
  EXPECT_EQ(5, step.At("inputs").Integer(5, 5));
  EXPECT_EQ("plan.json: steps[0]: holds no \"name\"", Sentence([&] { step.At("name"); }));
  EXPECT_EQ("plan.json: steps[0]: inputs: is 5, not an object", Sentence([&] { step.At("inputs").At("x"); }));
  EXPECT_EQ("plan.json: steps[0]: \"inputs\" is not known here; did you mean \"input\"?", Sentence([&] {
              step.KnowOnly({"input", "n", "big"});
            }));
}

TEST(Text, TerminalsSeeNoControlAndWordsFindTheirNeighbour) {
  EXPECT_EQ("a\\x1b[31mb\\x0a\\xc2\\x9b\\xff\\xc0\\xaf\xc3\xa9", Printable("a\x1b[31mb\n\xc2\x9b\xff\xc0\xaf\xc3\xa9"));
  EXPECT_EQ("\\x7f", Printable("\x7f"));
  EXPECT_EQ("ab...", Shortened("ab\xc3\xa9xyz", 6));
  EXPECT_EQ("; did you mean \"autofocus\"?", DidYouMean("autofcus", {"capture", "autofocus"}));
  EXPECT_EQ("", DidYouMean("video", {"capture", "autofocus"}));
}

// Files that this process holds open.
std::ptrdiff_t OpenFiles() { return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator()); }

TEST(Collectors, EachHearsWhatIsSaidWhileItIsTheInnermost) {
  const std::ptrdiff_t before = OpenFiles();
  LogCollector outer;
  {
    LogCollector inner;
    __android_log_print(ANDROID_LOG_DEBUG, "QVTEST", "[OKAPI] inside\r\n");
    ASSERT_EQ(1U, inner.lines().size());
    EXPECT_EQ("inside", inner.lines()[0].text);
  }
  __android_log_print(ANDROID_LOG_DEBUG, "QVTEST", "[OKAPI] outside");
  ASSERT_EQ(1U, outer.lines().size());
  EXPECT_EQ("outside", outer.lines()[0].text);
  for (int i = 0; i < 9; ++i) {
    const KeptStderr kept;
    const MemoryFile file("content");
    EXPECT_EQ("content", ReadWholeFile(file.path(), kWrongUsage));
  }
  EXPECT_EQ(before, OpenFiles()) << "a batch of thousands ends when no more can be opened";
}

class Files : public ::testing::Test {
 protected:
  std::string Path(const std::string& name) { return folder_.Path(name); }
  void Put(const std::string& name, const std::string& text) { std::ofstream(Path(name)) << text; }
  std::string Get(const std::string& name) { return ReadWholeFile(Path(name), kWrongUsage); }
  std::size_t Entries() {
    return static_cast<std::size_t>(std::distance(fs::directory_iterator(Path("")), fs::directory_iterator()));
  }
  TemporaryFolder folder_;
};

// 0 when a file of more bytes than may be written is answered as it should be.
int WriteBeyondLimit(const std::string& path) {
  signal(SIGXFSZ, SIG_IGN);
  const rlimit limit = {4096, 4096};
  setrlimit(RLIMIT_FSIZE, &limit);
  const std::string said = Sentence([&] { WriteWholeFile(path, std::string(8192, 'x')); });
  return said.find("can't be written") != std::string::npos ? 0 : 1;
}

TEST_F(Files, NothingIsWaitedForAndNoDeviceIsRead) {
  ASSERT_EQ(0, mkfifo(Path("fifo").c_str(), 0600));
  EXPECT_EQ("", Get("fifo"));  // at once, without a writer
  for (const char* path : {"/dev/zero", "/dev/null"}) {
    EXPECT_EQ(std::string(path) + ": is no regular file", Sentence([&] { ReadWholeFile(path, kWrongUsage); }));
  }
  EXPECT_THAT(Sentence([&] { ReadWholeFile(Path(""), kWrongUsage); }), HasSubstr("is a directory"));
  Put("long", std::string(3 << 20, 'x'));
  EXPECT_THAT(Sentence([&] { ReadWholeFile(Path("long"), kWrongUsage, 2 << 20); }), HasSubstr("longer than 2 MB"));
  EXPECT_EQ(std::size_t{3} << 20, ReadWholeFile(Path("long"), kWrongUsage, 3 << 20).size());
  EXPECT_EQ(std::size_t{3} << 20, Get("long").size());
}

TEST_F(Files, AWriteThatFailsKeepsWhatWasThere) {
  Put("record", "whole");
  ASSERT_EQ(0, chmod(Path("record").c_str(), 0640));
  fs::create_symlink("record", Path("link"));
  WriteWholeFile(Path("link"), "new");
  EXPECT_TRUE(fs::is_symlink(Path("link")));
  EXPECT_EQ("new", Get("record"));
  struct stat status = {};
  stat(Path("record").c_str(), &status);
  EXPECT_EQ(0640U, status.st_mode & 0777U);

  // A limit on the file's size stands for a full disk.
  EXPECT_EXIT(_exit(WriteBeyondLimit(Path("record"))), ::testing::ExitedWithCode(0), "");
  EXPECT_EQ("new", Get("record"));
  EXPECT_EQ(2U, Entries());
}

TEST_F(Files, ANameIsTakenOverByAFileThatIsOnTheDisk) {
  Put("record", "whole");
  std::string before;
  flush = [&](int) {
    before = Get("record");
    return 0;
  };
  WriteWholeFile(Path("record"), "new");
  EXPECT_EQ("whole", before);
  EXPECT_EQ("new", Get("record"));
  flush = [](int) {
    errno = EIO;
    return -1;
  };
  EXPECT_THAT(Sentence([&] { WriteWholeFile(Path("record"), "lost"); }), HasSubstr("can't be written"));
  flush = [&](int) {  // another takes the name for a folder meanwhile
    fs::remove(Path("record"));
    fs::create_directories(Path("record/full"));
    return 0;
  };
  EXPECT_THAT(Sentence([&] { WriteWholeFile(Path("record"), "lost"); }), HasSubstr("can't be written"));
  flush = [](int) { return 0; };
  EXPECT_EXIT(WriteWholeFile(Path("other"),
                             [](const Sink& sink) {
                               sink("half");
                               ScratchFolder::RemoveForGood();
                               _exit(0);
                             }),
              ::testing::ExitedWithCode(0), "");
  EXPECT_EQ(1U, Entries()) << "nothing is left beside it";
}

TEST_F(Files, AScratchFolderLivesAsLongAsItsOwner) {
  auto owner = std::make_unique<ScratchFolder>();
  const std::string path = owner->path();
  WriteWholeFile(path + "/part", "x");
  owner.reset();
  EXPECT_FALSE(fs::exists(path));
}

TEST_F(Files, OutputsAreCheckedBeforeAnythingIsDone) {
  Put("photo", "x");
  fs::create_hard_link(Path("photo"), Path("same"));
  fs::create_directory(Path("folder"));
  const auto said = [&](const std::string& first, const std::string& second = "") {
    return Sentence([&] {
      CheckOutputs({{"the photo", Path("photo")}}, {{"the record", first}, {"the picture", second}});
    });
  };
  EXPECT_EQ("no failure", said(Path("record"), "-"));
  EXPECT_THAT(said(Path("same")), HasSubstr("same: the record would overwrite the photo"));
  EXPECT_THAT(said(Path("folder/../new"), Path("new")), HasSubstr("can't take both the record and the picture"));
  EXPECT_THAT(said("-", "-"), HasSubstr("standard output: can't take both"));
  EXPECT_THAT(said(Path("folder")), HasSubstr("is a directory"));
  EXPECT_THAT(said(Path("none/record")), HasSubstr("can't be written"));
  EXPECT_EQ(3U, Entries());

  ASSERT_EQ(0, mkfifo(Path("fifo").c_str(), 0600));  // nobody reads it: it would be waited for
  EXPECT_EQ(Path("fifo") + ": is no regular file", said(Path("fifo")));
  EXPECT_THAT(Sentence([&] { WriteWholeFile(Path("fifo"), "x"); }), HasSubstr("is no regular file"));
  std::array<int, 2> ends = {};  // as a shell gives them: >(command), /dev/stdout
  ASSERT_EQ(0, pipe(ends.data()));
  const std::string end = "/dev/fd/" + std::to_string(ends[1]);
  EXPECT_EQ("no failure", said(end, "/dev/null"));
  WriteWholeFile(end, "record");
  std::array<char, 9> got = {};
  EXPECT_EQ(6, read(ends[0], got.data(), got.size()));
  for (const int one : ends) close(one);
}

}  // namespace

}  // namespace qv
