#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <thread>
#include <unordered_map>

#include "desk/base/files.h"
#include "desk/batch/batch.h"
#include "desk/batch/worker.h"
#include "unit_tests/drawing.h"
#include "unit_tests/sentence.h"

namespace qv {

namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;

TEST(Plans, WhatCantBeRunAsItStandsIsRefused) {
  const TemporaryFolder folder;
  const std::string limits = R"("limits": {"limits": {"camera_flash_mean": {"min": 1}}})";
  const std::string step = R"({"measurement": "camera_autofocus", "inputs": ["{unit}.jpg"]})";
  const std::pair<std::string, const char*> kRefused[] = {
      {R"({"name": "", "steps": [)" + step + "]}", "name: is empty"},
      {R"({"steps": [)" + step + "]}", "holds no \"name\""},
      {R"({"name": "a", "steps": []})", "nothing would be measured"},
      {R"({"name": "a", "stop": true, "steps": [)" + step + "]}", "\"stop\" is not known here"},
      {R"({"name": "a", "steps": [)" + step + "," + step + "]}",
       "steps[1]: the name \"camera_autofocus\" is given twice"},
      {R"({"name": "a", "steps": [{"measurement": "autofocus", "inputs": []}]})", "steps[0]: autofocus: no such"},
      {R"({"name": "a", "steps": [{"measurement": "camera_flash", "inputs": ["a", "b"]}]})", "2 inputs given"},
      {R"({"name": "a", "steps": [{"measurement": "camera_flash", "inputs": ["a"], "parameters": {"x": 1}}]})",
       "no parameter x"},
      {R"({"name": "a", "steps": [{"measurement": "camera_flash", "inputs": ["a"], "properties": {"999": 1}}]})",
       "999"},
      {R"({"name": "a", )" + limits + R"(, "steps": [)" + step + "]}", "camera_flash_mean, which no step measures"},
  };
  for (const auto& [plan, complaint] : kRefused) {
    const std::string path = folder.Write("plan.json", plan);
    EXPECT_THAT(Sentence([&] { ReadPlan(path); }), AllOf(HasSubstr("plan.json"), HasSubstr(complaint))) << plan;
  }
  const Plan plan = ReadPlan(folder.Write("plan.json", R"({"name": "a", "steps": [)" + step + "]}"));
  EXPECT_EQ(folder.Path("sn1.jpg"), RequestFor(plan, plan.steps[0], "sn1").inputs.at(0).name);
  Plan elsewhere = plan;
  elsewhere.unit_folder = "/lots/7";
  EXPECT_EQ("/lots/7/sn1.jpg", RequestFor(elsewhere, plan.steps[0], "sn1").inputs.at(0).name);
  for (const char* const unit : {"../sn1", "/etc/sn1", "a/../../sn1", "../7x/sn1"}) {
    for (const char* const name : {"{unit}.jpg", "{unit}/{unit}.jpg"}) {
      elsewhere.steps[0].request.inputs[0].name = name;
      EXPECT_THAT(Sentence([&] { RequestFor(elsewhere, elsewhere.steps[0], unit); }), HasSubstr("out of the folder"))
          << name << " " << unit;
    }
  }
  elsewhere.steps[0].request.inputs[0].name = "/photos/{unit}.jpg";
  EXPECT_THAT(Sentence([&] { RequestFor(elsewhere, elsewhere.steps[0], "../sn1"); }), HasSubstr("folder \"/photos\""));
  EXPECT_EQ("no failure", Sentence([&] { ReadPlan(folder.Write("new.json", NewPlan())); }));
}

TEST(Manifests, RowsBecomeJobs) {
  const std::vector<Job> jobs = JobsOfManifest(
      "\xef\xbb\xbfpath,unit,lot,\"my, column\"\r\na.jpg,,L1,\"say \"\"hi\"\"\nthere\"\r\n\r\nb.jpg,SN2,,\r\n", "m",
      "/lots");
  ASSERT_EQ(2U, jobs.size());
  EXPECT_EQ("a", jobs[0].unit);
  EXPECT_THAT(jobs[0].inputs, ElementsAre("/lots/a.jpg"));
  EXPECT_THAT(jobs[0].columns, ElementsAre(std::pair("my, column", "say \"hi\"\nthere")));
  EXPECT_EQ("SN2", jobs[1].unit);
  EXPECT_EQ("5\" wide", JobsOfManifest("path,note\na.jpg,5\" wide\n", "m", "").at(0).columns.at("note"));
  EXPECT_THAT(JobsOfManifest("path2,path\nb,a\n", "m", "/l").at(0).inputs, ElementsAre("/l/a", "/l/b"));
  EXPECT_EQ(7U, std::stoul(JobsOfManifest(R"({"path": "a", "n": 7})", "m", "").at(0).columns.at("n")));
  EXPECT_EQ("m: row 2: 1 values for 2 columns", Sentence([] { JobsOfManifest("path,unit\na,b\nc\n", "m", ""); }));
  EXPECT_THAT(Sentence([] { JobsOfManifest("path\n\"a", "m", ""); }), HasSubstr("a quote stays open"));
  EXPECT_THAT(Sentence([] { JobsOfManifest("{\"unit\": \"a\"}\n{\"unit\"", "m", ""); }), HasSubstr("m: line 2"));
  for (const char* shard : {"0/2", "3/2", "1", "1/0", "-1/2", "1/2x"})
    EXPECT_THROW(ParseShard(shard), Failure) << shard;
}

TEST(Manifests, ShardsShareOutEveryJobOnce) {
  std::map<unsigned, int> taken;
  for (int i = 0; i < 300; ++i) {
    Job job;
    job.unit = "SN" + std::to_string(i);
    job.inputs = {"/lots/" + job.unit + ".png"};
    Job elsewhere = job;
    elsewhere.inputs = {"/mnt/" + job.unit + ".png"};
    EXPECT_EQ(FallsTo({1, 3}, job), FallsTo({1, 3}, elsewhere)) << "where a machine has mounted them";
    int times = 0;
    for (unsigned k = 1; k <= 3; ++k) {
      if (!FallsTo({k, 3}, job)) continue;
      ++taken[k];
      ++times;
    }
    EXPECT_EQ(1, times) << job.unit;
  }
  for (unsigned k = 1; k <= 3; ++k) EXPECT_GT(taken[k], 60);
}

// The processes that this one, or another, has started and that still live.
std::vector<pid_t> Children(pid_t parent = getpid()) {
  std::vector<pid_t> children;
  const std::string process = std::to_string(parent);
  std::ifstream file("/proc/" + process + "/task/" + process + "/children");
  for (pid_t child = 0; file >> child;) children.push_back(child);
  return children;
}

class Batches : public ::testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::create_directory(folder_.Path("photos"));
    for (int i = 0; i < 6; ++i) {
      cv::Mat photo(40, 60, CV_8UC3, cv::Scalar(i, 100 + i, 200));
      folder_.Write("photos/sn" + std::to_string(i) + ".png", photo);
    }
  }

  BatchProgress Run(double timeout = 60) {
    Store store(folder_.Path("results.db"), Store::Use::kWrite);
    Request request;
    request.measurement = "camera_flash";
    BatchOptions options;
    options.workers = 2;
    options.timeout_seconds = timeout;
    return RunBatch(PlanOf(request, {}), JobsOfPhotos(folder_.Path("photos")), nullptr, store, options,
                    [](const BatchProgress&) {});
  }

  // Unit to what its only run says: the mean, or why there is none.
  std::map<std::string, std::string> Stored() {
    std::map<std::string, std::string> found;
    Store(folder_.Path("results.db"), Store::Use::kRead).EachRun({}, false, [&](const RunRow& row, StoredRun&& run) {
      const Json& measurements = run.record.at("phases").at(0).at("measurements");
      const std::string text = measurements.contains("camera_flash_mean")
                                   ? measurements.at("camera_flash_mean").at("measured_value").dump()
                                   : run.record.at("outcome_details").dump();
      EXPECT_TRUE(found.emplace(row.unit, text).second) << row.unit << " is stored twice";
    });
    return found;
  }

  TemporaryFolder folder_;
};

TEST_F(Batches, WhatIsStoredIsNotMeasuredAgain) {
  folder_.Write("photos/broken.png", std::string("\x89PNG\r\n\x1a\n no picture"));
  std::filesystem::copy_file(folder_.Path("photos/sn4.png"), folder_.Path("photos/sn4.bmp"));  // unit and photo again
  const BatchProgress first = Run();
  EXPECT_EQ(7U, first.runs);
  EXPECT_EQ(1U, first.known);
  EXPECT_EQ(1U, first.outcomes.at("ERROR"));
  const std::map<std::string, std::string> stored = Stored();
  EXPECT_EQ("3.0", stored.at("sn3"));
  EXPECT_THAT(stored.at("broken"), HasSubstr("broken.png"));
  folder_.Write("photos/sn3.png", cv::Mat(40, 60, CV_8UC3, cv::Scalar(33, 0, 0)));  // another photo of the unit
  const BatchProgress second = Run();
  EXPECT_EQ(1U, second.runs);
  EXPECT_EQ(7U, second.known);
  EXPECT_EQ(1U, second.outcomes.at("ERROR")) << "a known run counts in the verdict";
}

// Those there before, renamed into the folder and closed in it; no others, and of them one machine's share.
TEST_F(Batches, AWatchedFolderIsMeasuredAsItFills) {
  const std::string photos = folder_.Path("photos");
  FolderWatch watch(photos);
  const Shard shard = {1, 2};
  watch.Take(shard);
  std::vector<Job> expected = JobsOfPhotos(photos);
  const std::vector<Job> first = ShareOf(shard, expected);
  const std::string aside = folder_.Write("aside.png", ReadFile(folder_.Path("photos/sn0.png")));
  folder_.Write("photos/.sn7.png", std::string("half a picture"));
  folder_.Write("photos/notes.txt", std::string("no picture"));
  for (int i = 10; i < 20; ++i) {
    Job& job = expected.emplace_back();
    job.unit = "sn" + std::to_string(i);
    job.inputs = {photos + "/" + job.unit + ".png"};
    std::filesystem::copy_file(aside, i % 2 == 0 ? job.inputs[0] : aside + "2");
    if (i % 2 != 0) std::filesystem::rename(aside + "2", job.inputs[0]);
  }
  const std::size_t wanted = ShareOf(shard, expected).size();
  Store store(folder_.Path("watched.db"), Store::Use::kWrite);
  Request request;
  request.measurement = "camera_flash";
  std::size_t done = 0;
  const auto late = std::chrono::steady_clock::now() + std::chrono::seconds(60);
  const BatchProgress progress = RunBatch(
      PlanOf(request, {}), first, &watch, store, {}, [&](const BatchProgress& p) { done = p.jobs_done; },
      [&] { return done >= wanted || std::chrono::steady_clock::now() > late; });
  EXPECT_EQ(wanted, progress.runs);
  EXPECT_EQ(0U, progress.outcomes.count("ERROR"));
  EXPECT_EQ(static_cast<std::int64_t>(wanted), store.Count());
}

// A pipe that is open for writing, but to which nobody writes, holds up whoever reads it.
TEST_F(Batches, AWorkerThatHangsOrDiesCostsItsOwnUnit) {
  const std::string pipe = folder_.Path("photos/hung.png");
  ASSERT_EQ(0, mkfifo(pipe.c_str(), 0600));
  const int held = open(pipe.c_str(), O_RDWR);
  EXPECT_EQ(7U, Run(2).runs);
  EXPECT_THAT(Stored().at("hung"), HasSubstr("took longer than 2 s"));
  EXPECT_EQ(1U, Run(2).runs) << "it is tried again";

  ASSERT_EQ(0, unlink(folder_.Path("results.db").c_str()));
  std::thread killer([] {
    // The others are done by then; the one that hangs dies.
    std::this_thread::sleep_for(std::chrono::seconds(1));
    for (const pid_t child : Children()) kill(child, SIGSEGV);
  });
  EXPECT_EQ(7U, Run().runs);
  killer.join();
  close(held);
  EXPECT_THAT(Stored().at("hung"), AnyOf(HasSubstr("SIGSEGV"), HasSubstr("status")));
  EXPECT_EQ("5.0", Stored().at("sn5"));
}

TEST_F(Batches, WhatComesBehindAHungStepIsMeasured) {
  std::filesystem::create_directory(folder_.Path("u1"));
  cv::Mat noise(700, 900, CV_8UC3);  // its picture comes in many pieces
  cv::randu(noise, 0, 256);
  folder_.Write("u1/flash.png", noise);
  ASSERT_EQ(0, mkfifo(folder_.Path("u1/hung.png").c_str(), 0600));
  const int held = open(folder_.Path("u1/hung.png").c_str(), O_RDWR);
  Plan plan;
  plan.name = "p";
  plan.folder = folder_.Path("");
  for (const char* const name : {"a", "hung", "b", "c"}) {
    const std::string file = name == std::string("hung") ? "{unit}/hung.png" : "{unit}/flash.png";
    plan.steps.push_back({name, {"camera_flash", {file}}, {}});
  }
  plan.steps.push_back({"focus", {"camera_autofocus", {"{unit}/flash.png"}}, {}});
  BatchOptions options;
  options.timeout_seconds = 2;
  options.pictures = KeepPictures::kFailures;
  Job job;
  job.unit = "u1";
  Store store(folder_.Path("results.db"), Store::Use::kWrite);
  RunBatch(plan, {job}, nullptr, store, options, [](const BatchProgress&) {});
  plan.stop_on_error = true;
  Store stopped(folder_.Path("stopped.db"), Store::Use::kWrite);
  EXPECT_EQ(2U, RunBatch(plan, {job}, nullptr, stopped, options, [](const BatchProgress&) {}).runs);
  close(held);
  std::map<std::string, std::string> outcomes;
  store.EachRun({}, true, [&](const RunRow& row, StoredRun&& run) {
    outcomes[row.step] = row.outcome + " " + std::to_string(run.pictures.size());
  });
  EXPECT_EQ(
      (std::map<std::string, std::string>{
          {"a", "MEASURED 0"}, {"hung", "ERROR 0"}, {"b", "MEASURED 0"}, {"c", "MEASURED 0"}, {"focus", "ERROR 1"}}),
      outcomes)
      << "the picture of a miss is kept with the failures'";
}

// Each step has the whole time; of a picture that does not fit into the line's buffer the first part comes alone.
TEST_F(Batches, StepsHaveTheirOwnTimeAndComeInPieces) {
  cv::Mat noise(700, 900, CV_8UC3);
  cv::randu(noise, 0, 256);
  Plan plan;
  for (const char* const name : {"first", "second"}) {
    plan.steps.push_back({name, {"camera_autofocus", {folder_.Write("noise.png", noise)}}, {}});
  }
  BatchOptions options;
  options.pictures = KeepPictures::kFailures;
  const std::unordered_map<std::string, std::string> none;
  Worker worker({plan, options, none});
  ASSERT_TRUE(worker.Give({0, 0}, {}));
  Job long_row;
  long_row.columns["note"] = std::string(1 << 20, 'n');
  EXPECT_FALSE(worker.Give({1, 0}, long_row)) << "it would fill the line, and both would wait for each other";
  const auto begun = worker.since();
  std::vector<StepDone> done;
  std::size_t finished = 0;
  while (finished == 0) {
    usleep(20'000);  // the line's buffer fills
    ASSERT_TRUE(worker.Receive(done, finished));
    EXPECT_TRUE(worker.idle() || worker.given().front().first_step == done.size());
    EXPECT_EQ(!done.empty(), worker.since() > begun);
  }
  ASSERT_EQ(2U, done.size());
  for (const StepDone& step : done) EXPECT_THAT(step.run->pictures.at(0).content, EndsWith("IEND\xae\x42\x60\x82"));
}

TEST_F(Batches, FilesThatAreStillHiddenHaveNotArrived) {
  FolderWatch watch(folder_.Path("photos"));
  for (const char* const name : {".half.png", "whole.png", "notes.txt"}) {
    folder_.Write(std::string("photos/") + name, std::string("x"));
  }
  const std::vector<Job> jobs = watch.Arrived();
  ASSERT_EQ(1U, jobs.size());
  EXPECT_EQ("whole", jobs[0].unit);
}

// "Z" when it has ended and waits to be missed, or "" when it is gone.
std::string StateOf(pid_t process) {
  std::ifstream file("/proc/" + std::to_string(process) + "/stat");
  std::string number;
  std::string name;
  std::string state;
  file >> number >> name >> state;
  return state;
}

TEST_F(Batches, WorkersEndWithWhoStartedThem) {
  ASSERT_EQ(0, mkfifo(folder_.Path("photos/hung.png").c_str(), 0600));
  const int held = open(folder_.Path("photos/hung.png").c_str(), O_RDWR);
  const pid_t batch = fork();
  if (batch == 0) {
    Run();
    _exit(0);
  }
  std::vector<pid_t> workers;
  for (int tries = 0; tries < 1000 && workers.size() < 2; ++tries) {
    usleep(10'000);
    workers = Children(batch);
  }
  ASSERT_EQ(2U, workers.size());
  kill(batch, SIGKILL);
  waitpid(batch, nullptr, 0);
  for (const pid_t worker : workers) {
    for (int tries = 0; tries < 1000 && StateOf(worker) != "Z" && !StateOf(worker).empty(); ++tries) usleep(10'000);
    EXPECT_TRUE(StateOf(worker) == "Z" || StateOf(worker).empty()) << kill(worker, SIGKILL);
  }
  close(held);
}

}  // namespace

}  // namespace qv
