// Golden photos measured again, and figures explained.

#include <gmock/gmock.h>

#include <algorithm>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::Not;

using Verify = SimulatedPhotos;
using Explain = SimulatedPhotos;

TEST_F(Verify, EveryCommandsRecordIsMeasuredAgain) {
  Simulate("--turn 4 --noise 1", "chart.png");
  Simulate("--scene preview", "front.png");
  Simulate("--scene pair --size 640x480", "pair.png");
  std::string levels;
  for (int i = 0; i < 256; ++i) levels += "7 ";
  folder_.Write("levels.txt", levels);
  for (const std::string command :
       {"autofocus \"$PWD/chart.png\" --threshold 110", "mtf chart.png", "flash chart.png --vt",
        "capture chart.png --standard front.png --front", "dust chart.png --reference levels.txt",
        "preview front.png front.second.png", "circles chart.png --camera=2", "register pair.png pair.second.png"}) {
    const std::string name = command.substr(0, command.find(' '));
    const std::string drawn = (name == "register" ? " -o " : " --annotate ") + name + ".png";
    const int doubtful = name == "dust" ? 3 : 0;  // a chart is no plain target
    ASSERT_EQ(doubtful, Run(command + drawn + " --quiet --json " + name + ".json").status) << command;
    EXPECT_FALSE(cv::imread(folder_.Path(name + ".png")).empty());
    std::filesystem::remove(folder_.Path(name + ".png"));
  }

  // A station has the files elsewhere.
  const std::filesystem::path station = folder_.Path("station");
  std::filesystem::create_directory(station);
  for (const auto& entry : std::filesystem::directory_iterator(folder_.Path(""))) {
    if (entry.is_regular_file()) std::filesystem::rename(entry, station / entry.path().filename());
  }
  const ProgramRun run = Run("verify station");
  EXPECT_EQ(0, run.status) << run.out << run.err;
  EXPECT_THAT(run.out, AllOf(HasSubstr("8 records"), HasSubstr("0 moved, 0 records could not be verified"),
                             HasSubstr("dust.json  as stored"), Not(HasSubstr("truth"))));
  for (const char* name : {"register.png", "mtf.png"})
    EXPECT_FALSE(std::filesystem::exists(station / name)) << "nothing is written but the report";
}

TEST_F(Verify, TheNumberThatMovedIsNamed) {
  const std::string mtf50_name = "camera_autofocus_mtf50_vertical";
  const json golden = Record("autofocus " + Simulate());
  const auto verify_with = [&](const std::string& name, const json& value) {
    json changed = golden;
    changed["phases"][0]["measurements"][name]["measured_value"] = value;
    folder_.Write("golden.json", changed.dump());
    return Run("verify golden.json");
  };
  const double mtf50 = Measured(golden, mtf50_name);
  EXPECT_EQ(0, verify_with(mtf50_name, mtf50 + 0.00009).status);
  const ProgramRun run = verify_with(mtf50_name, mtf50 + 0.00011);
  EXPECT_EQ(1, run.status);
  EXPECT_THAT(run.out, AllOf(HasSubstr("golden.json  MOVED"), HasSubstr(mtf50_name + " was 0."), HasSubstr("1 moved")));
  EXPECT_EQ(1, verify_with("camera_autofocus_marks_found", 4).status);
  EXPECT_EQ(1, verify_with(mtf50_name, nullptr).status);
  json curve = Measured(golden, "camera_autofocus_sfr_vertical");
  curve[3][1] = curve[3][1].get<double>() + 0.01;
  EXPECT_THAT(verify_with("camera_autofocus_sfr_vertical", curve).out, HasSubstr("its values differ by up to 0.01"));

  Simulate("--seed 2 --noise 1");
  EXPECT_THAT(verify_with(mtf50_name, mtf50).out, HasSubstr("the photo itself has changed"));
  std::filesystem::remove(folder_.Path("photo.png"));
  const ProgramRun lost = Run("verify golden.json");
  EXPECT_EQ(3, lost.status);
  EXPECT_THAT(lost.err, HasSubstr("photo.png: no such file any more"));
  EXPECT_EQ(1, std::count(lost.err.begin(), lost.err.end(), '\n'));
  EXPECT_EQ(2, Run("verify photo.truth.json").status);
  folder_.Write("golden.json", std::string(R"({"schema": "qvtester-record-1", "metadata": {}})"));
  EXPECT_EQ(3, Run("verify golden.json").status);
}

TEST_F(Verify, AnotherPhotoOfTheSameNameIsPassedOver) {
  std::filesystem::create_directory(folder_.Path("station"));
  Run("flash \"$PWD/" + Simulate() + "\" --json station/record.json --quiet");
  std::filesystem::rename(folder_.Path("photo.png"), folder_.Path("station/photo.png"));
  Simulate("--seed 2 --noise 1");
  EXPECT_THAT(Run("verify station").out, HasSubstr("record.json  as stored"));
}

TEST_F(Verify, FoldersAreSearchedAndWhatCannotBeReadCounts) {
  const std::string record = Record("flash " + Simulate("--size 640x480")).dump();
  std::filesystem::create_directories(folder_.Path("golden/deep\x1b[2J"));
  folder_.Write("golden/deep\x1b[2J/flash.json", record);
  EXPECT_THAT(Run("verify golden").out, AllOf(HasSubstr("golden/deep\\x1b[2J/flash.json  as stored"),
                                              HasSubstr("1 record, "), Not(HasSubstr("\x1b"))));
  folder_.Write("golden/torn.json", record.substr(0, record.size() / 2));
  const ProgramRun run = Run("verify golden");
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.err, HasSubstr("golden/torn.json: line 1: ends before"));
  EXPECT_THAT(run.out, HasSubstr("2 records, "));
  EXPECT_THAT(run.out, HasSubstr("0 moved, 1 record could not be verified"));
}

TEST_F(Verify, OutcomesAreHeldAgainstTheRecordsLimitsAndDecodersAreTold) {
  folder_.Write("limits.json", R"({"limits": {"camera_flash_mean": {"min": 10}}})");
  const json golden = Record("flash " + Simulate("--size 640x480") + " --limits limits.json");
  ASSERT_EQ("PASS", golden["outcome"]);
  json stricter = golden;
  stricter["phases"][0]["measurements"]["camera_flash_mean"]["limits"]["min"] = 254;
  stricter["inputs"][0]["pixels_hash"] = std::string(32, '0');
  folder_.Write("golden.json", stricter.dump());
  const ProgramRun run = Run("verify golden.json");
  EXPECT_EQ(1, run.status);
  EXPECT_THAT(run.out, AllOf(HasSubstr("the outcome was \"PASS\", is \"FAIL\""),
                             HasSubstr("the outcome of camera_flash_mean was"), HasSubstr("another decoder: ")));
}

TEST_F(Explain, EveryFigureOfARecordIsExplained) {
  EXPECT_THAT(Run("explain").out, HasSubstr("\n  lens_dust_blob_count "));
  const ProgramRun one = Run("explain camera_autofocus_mtf50_vertical");
  EXPECT_EQ(0, one.status);
  EXPECT_THAT(one.out, AllOf(HasSubstr("fraction of Nyquist"), HasSubstr("slanted edge"), HasSubstr("known law"),
                             HasSubstr("0.0001 more or less on another"), Not(HasSubstr("horizontal"))));
  EXPECT_THAT(Run("explain camera_flash").out, AllOf(HasSubstr("test 15"), Not(HasSubstr("camera_flash_vt"))));
  EXPECT_THAT(Run("explain dots").out, AllOf(HasSubstr("hdr_dots_dot_count"), HasSubstr("hdr_dots_areas")));
}

}  // namespace
