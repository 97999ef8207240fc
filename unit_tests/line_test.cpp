// A lot measured by several processes and machines into one PostgreSQL server, which with_postgres.sh starts.
// QV_LOT=1000 makes it that large and measures each photo also by a command of its own.

#include <gmock/gmock.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <sstream>
#include <thread>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::HasSubstr;
using namespace std::chrono_literals;

constexpr int kBroken = 3;

void ReplaceAll(std::string& text, const std::string& word, const std::string& by) {
  for (std::size_t at = text.find(word); at != std::string::npos; at = text.find(word, at + by.size()))
    text.replace(at, word.size(), by);
}

int WholeOf(const std::string& text) { return static_cast<int>(std::strtol(text.c_str(), nullptr, 10)); }

std::string Environment(const char* name) {
  const char* const value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): nobody sets it
  return value == nullptr ? "" : value;
}

class Line : public SimulatedPhotos {
 protected:
  void SetUp() override {
    const char* const server = std::getenv("QV_SERVER");
    if (server == nullptr) GTEST_SKIP() << "runs beside a server: with_postgres.sh";
    if (const char* const lot = std::getenv("QV_LOT")) photos_ = WholeOf(lot);
    const std::string name = ::testing::UnitTest::GetInstance()->current_test_info()->name();
    std::string lower = name;
    for (char& c : lower) c = static_cast<char>(std::tolower(c));
    Shell("psql -qd " + std::string(server) + "/postgres -c 'CREATE DATABASE " + lower + "'");
    store_ = std::string(server) + "/" + lower;
    Photograph();
  }

  // One chart with noise of each photo's own; the last ones are no pictures.
  void Photograph() const {
    std::filesystem::create_directory(folder_.Path("photos"));
    const cv::Mat chart = cv::imread(folder_.Path(Simulate()), cv::IMREAD_COLOR);
    cv::RNG random(1);
    for (int i = 0; i < photos_; ++i) {
      cv::Mat noise(chart.size(), CV_16SC3), photo;
      random.fill(noise, cv::RNG::NORMAL, 0, 2);
      cv::add(chart, noise, photo, cv::noArray(), CV_8U);
      const std::string name = "photos/sn" + std::to_string(10000 + i) + ".jpg";
      folder_.Write(name, photo);
      if (i >= photos_ - kBroken) std::filesystem::resize_file(folder_.Path(name), 20);
    }
  }

  std::string Shell(const std::string& script, const std::string& path = "") const {
    const std::string command =
        "cd '" + folder_.Path("") + "' && PATH=" + path + "$PATH; export PATH; (" + script + ") >shell.out 2>shell.err";
    status_ = std::system(command.c_str());  // NOLINT(cert-env33-c): the tests' own words
    return ReadFile(folder_.Path("shell.out"));
  }

  int Stored() const { return WholeOf(Shell("psql -qtA -d " + store_ + " -c 'SELECT count(*) FROM run'")); }

  // Waits until more than these are stored; false when that takes long.
  bool MoreThan(int runs) const {
    for (int i = 0; i < 600; ++i, std::this_thread::sleep_for(20ms)) {
      if (Stored() > runs) return true;
    }
    return false;
  }

  pid_t Start(const std::string& arguments) const {
    const std::string script = "cd '" + folder_.Path("") + "' && exec '" QVTESTER_PROGRAM "' " + arguments;
    std::array<std::string, 3> words = {"sh", "-c", script};
    std::array<char*, 4> argv = {words[0].data(), words[1].data(), words[2].data(), nullptr};
    pid_t process = 0;
    EXPECT_EQ(0, posix_spawnp(&process, "sh", nullptr, nullptr, argv.data(), environ));
    return process;
  }

  static std::vector<pid_t> Children(pid_t parent) {
    std::ifstream file("/proc/" + std::to_string(parent) + "/task/" + std::to_string(parent) + "/children");
    std::vector<pid_t> children;
    for (pid_t child = 0; file >> child;) children.push_back(child);
    return children;
  }

  // Every photo has one run, with the figures that a command of its own gives (of each seventh, or of all), and the
  // broken ones their reason.
  void ExpectTheWholeLot() const {
    EXPECT_EQ(0, Run("export '" + store_ + "' -o lot.jsonl --no-pictures").status);
    std::map<std::string, json> records;
    std::istringstream lines(ReadFile(folder_.Path("lot.jsonl")));
    for (std::string line; std::getline(lines, line);) {
      const json record = json::parse(line).at("record");
      EXPECT_TRUE(records.emplace(record.at("dut_id"), record).second) << record.at("dut_id") << " is there twice";
    }
    ASSERT_EQ(static_cast<std::size_t>(photos_), records.size());
    int errors = 0;
    for (const auto& [unit, record] : records) {
      if (record.at("outcome") == "ERROR") {
        ++errors;
        EXPECT_THAT(record.at("outcome_details").dump(), HasSubstr(unit + ".jpg"));
      } else if (std::getenv("QV_LOT") != nullptr || std::stoi(unit.substr(2)) % 7 == 0) {
        const json alone = json::parse(Run("autofocus photos/" + unit + ".jpg --json - --quiet").out);
        EXPECT_EQ(alone.at("phases").at(0).at("measurements"), record.at("phases").at(0).at("measurements")) << unit;
      }
    }
    EXPECT_EQ(kBroken, errors);
  }

  void ClearStore() const { Shell("psql -qd " + store_ + " -c 'TRUNCATE run, run_column, figure, picture'"); }

  int photos_ = 120;
  std::string store_;
  mutable int status_ = 0;
};

TEST_F(Line, GoesOnAfterKillsAndARestartOfTheServer) {
  const std::string batch = "batch camera_autofocus photos -j 2 --quiet -o '" + store_ + "'";
  const std::string restart = Environment("QV_PG_CTL") + " restart -m immediate";
  Shell(Environment("QV_PG_CTL") + " stop -m immediate");
  ExpectComplaint(batch + " --wait 0.3", 4, "trying again for 0.3 s");
  const pid_t first = Start(batch);  // before its server
  std::this_thread::sleep_for(1s);
  Shell(restart);
  ExpectComplaint(batch + "_none", 2, "does not exist");
  ASSERT_TRUE(MoreThan(0));
  const std::vector<pid_t> workers = Children(first);
  ASSERT_FALSE(workers.empty());
  kill(workers[0], SIGKILL);
  Shell(restart);
  kill(first, SIGKILL);
  int status = 0;
  waitpid(first, &status, 0);
  ASSERT_TRUE(WIFSIGNALED(status)) << "it was done before it was killed";
  const int before = Stored();
  EXPECT_LT(before, photos_);

  const pid_t second = Start(batch);
  MoreThan(before);
  Shell(restart);
  waitpid(second, &status, 0);
  EXPECT_EQ(3, WEXITSTATUS(status));  // three could not be measured
  EXPECT_THAT(Run(batch.substr(0, batch.find(" --quiet")) + " -o '" + store_ + "'").out,
              HasSubstr("0 runs stored, " + std::to_string(photos_) + " there before"));
  ExpectTheWholeLot();
  EXPECT_THAT(Run("import lot.jsonl -o '" + store_ + "'").out, HasSubstr("read, 0 new"));
}

// The commands that docs/plans.md gives for each scheduler, with the lot's own places in them.
class Schedulers : public Line {
 protected:
  Schedulers() { photos_ = 40; }
  void SetUp() override {
    Line::SetUp();
    if (IsSkipped()) return;
    std::filesystem::create_directory(folder_.Path("bin"));
    std::filesystem::create_symlink(QVTESTER_PROGRAM, folder_.Path("bin/qvtester"));
    std::filesystem::create_directory(folder_.Path("hosts"));
    // A host is a folder, and knows nothing of this one's environment.
    Tool("ssh",
         "while [ \"${1#-}\" != \"$1\" ]; do shift; done\nhost=$1; shift\n[ \"$1\" != -- ] || shift\nmkdir -p '" +
             folder_.Path("hosts") + "/'$host && cd '" + folder_.Path("hosts") + "/'$host || exit 255\ntouch used\n" +
             "exec env -i SHELL=/bin/sh PATH=\"$PATH\" HOME=\"$PWD\" sh -c \"$*\"\n");
    Tool("sbatch", "i=1; while [ $i -le 8 ]; do SLURM_ARRAY_TASK_ID=$i sh -c \"$3\"; i=$((i + 1)); done\n");
  }

  void Tool(const std::string& name, const std::string& script) const {
    std::filesystem::permissions(folder_.Write("bin/" + name, "#!/bin/sh\n" + script),
                                 std::filesystem::perms::owner_all);
  }

  // What stands from one word to another, with this lot's photos and store.
  std::string Documented(const std::string& from, const std::string& to) const {
    const std::string text = ReadFile(QVTESTER_DOCS "/plans.md");
    const std::size_t start = text.find(from);
    std::string words = text.substr(start, text.find(to, start) - start);
    ReplaceAll(words, "/photos", folder_.Path("photos"));
    ReplaceAll(words, "postgresql://qv@db/results", store_);
    return words;
  }

  void ExpectItSharesOutTheLot(const std::string& script) const {
    ClearStore();
    Shell(script, folder_.Path("bin") + ":");
    EXPECT_EQ(photos_, Stored()) << script << ReadFile(folder_.Path("shell.err"));
  }
};

TEST_F(Schedulers, DocumentedCommandsMeasureEachPhotoOnce) {
  ExpectItSharesOutTheLot(Documented("sbatch --array", "\n```"));
  const json args = json::parse(Documented("args: [", "\n```").substr(6));
  ExpectItSharesOutTheLot("i=0; while [ $i -lt 8 ]; do JOB_COMPLETION_INDEX=$i sh -c '" +
                          args.at(0).get<std::string>() + "' || exit; i=$((i + 1)); done");
  EXPECT_EQ(0, status_) << "photos that can't be measured are no reason for another try";
  Shell("command -v parallel");
  if (status_ != 0) GTEST_SKIP() << "GNU parallel (Debian's package parallel) is not on this machine";
  ExpectItSharesOutTheLot(Documented("parallel --jobs", "\n\n"));
  ExpectTheWholeLot();
  for (const char* const host : {"hosts/host1/used", "hosts/host2/used"})
    EXPECT_TRUE(std::filesystem::exists(folder_.Path(host))) << host;
}

}  // namespace
