// Golden photos measured again, and figures explained.

#include <gmock/gmock.h>

#include <filesystem>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::Not;

class Verify : public SimulatedPhotos {
 protected:
  // Measures a photo into a record beside it.
  void Store(std::vector<std::string> command, const std::string& name) {
    command.insert(command.end(), {"--json", folder_.Path(name), "--quiet"});
    const ProgramRun run = RunProgram(command);
    ASSERT_EQ(0, run.status) << run.err;
  }
};

TEST_F(Verify, EveryCommandsRecordIsMeasuredAgain) {
  const std::string chart = Simulate({"--turn", "4", "--noise", "1"}, "chart");
  const std::string front = Simulate({"--scene", "preview"}, "front");
  const std::string pair = Simulate({"--scene", "pair", "--size", "640x480"}, "pair");
  Store({"autofocus", chart, "--threshold", "110", "--annotate", folder_.Path("seen.png")}, "autofocus.json");
  Store({"mtf", chart}, "mtf.json");
  Store({"flash", chart, "--vt"}, "flash.json");
  Store({"capture", chart, "--standard", front, "--front"}, "capture.json");
  std::string levels;
  for (int i = 0; i < 256; ++i) levels += "7 ";
  Store({"dust", chart, "--reference", folder_.Write("levels.txt", levels)}, "dust.json");
  Store({"preview", front, folder_.Path("front.second.png")}, "preview.json");
  Store({"circles", chart, "--camera=2"}, "circles.json");
  Store({"register", pair, folder_.Path("pair.second.png"), "-o", folder_.Path("out.png")}, "register.json");
  std::filesystem::remove(folder_.Path("out.png"));

  // A station has the files elsewhere.
  const std::string station = folder_.Path("station");
  std::filesystem::create_directory(station);
  for (const auto& entry : std::filesystem::directory_iterator(folder_.Path(""))) {
    if (entry.is_regular_file())
      std::filesystem::rename(entry.path(), station + "/" + entry.path().filename().string());
  }
  const ProgramRun run = RunProgram({"verify", station});
  EXPECT_EQ(0, run.status) << run.out << run.err;
  EXPECT_THAT(run.out, AllOf(HasSubstr("8 records"), HasSubstr("0 moved, 0 records could not be verified"),
                             HasSubstr("dust.json  as stored"), Not(HasSubstr("truth"))));
  EXPECT_FALSE(std::filesystem::exists(station + "/out.png")) << "nothing is written but the report";
}

TEST_F(Verify, TheNumberThatMovedIsNamed) {
  const std::string photo = Simulate();
  const std::string file = folder_.Path("golden.json");
  Store({"autofocus", photo}, "golden.json");
  const json golden = json::parse(ReadFile(file));
  const auto verify_with = [&](const std::string& name, const json& value) {
    json changed = golden;
    changed["phases"][0]["measurements"][name]["measured_value"] = value;
    folder_.Write("golden.json", changed.dump());
    return RunProgram({"verify", file});
  };
  const double mtf50 = Measured(golden, "camera_autofocus_mtf50_vertical");
  EXPECT_EQ(0, verify_with("camera_autofocus_mtf50_vertical", mtf50 + 0.00009).status);
  const ProgramRun run = verify_with("camera_autofocus_mtf50_vertical", mtf50 + 0.00011);
  EXPECT_EQ(1, run.status);
  EXPECT_THAT(run.out, AllOf(HasSubstr("golden.json  MOVED"), HasSubstr("camera_autofocus_mtf50_vertical was 0."),
                             HasSubstr("1 moved")));
  EXPECT_EQ(1, verify_with("camera_autofocus_marks_found", 4).status);
  EXPECT_EQ(1, verify_with("camera_autofocus_mtf50_vertical", nullptr).status);
  json curve = Measured(golden, "camera_autofocus_sfr_vertical");
  curve[3][1] = curve[3][1].get<double>() + 0.01;
  EXPECT_THAT(verify_with("camera_autofocus_sfr_vertical", curve).out, HasSubstr("its values differ by up to 0.01"));

  folder_.Write("golden.json", golden.dump());
  Simulate({"--seed", "2", "--noise", "1"});
  EXPECT_THAT(RunProgram({"verify", file}).out, HasSubstr("the photo itself has changed"));
  std::filesystem::remove(photo);
  EXPECT_EQ(1, RunProgram({"verify", file}).status) << "no longer measured";
  EXPECT_EQ(2, RunProgram({"verify", folder_.Path("photo.truth.json")}).status);
  folder_.Write("golden.json", R"({"schema": "qvtester-record-1", "metadata": {}})");
  EXPECT_EQ(3, RunProgram({"verify", file}).status);
}

TEST(Explain, EveryFigureOfARecordIsExplained) {
  const ProgramRun all = RunProgram({"explain"});
  EXPECT_THAT(all.out, HasSubstr("lens_dust_blob_count\n"));
  const ProgramRun one = RunProgram({"explain", "camera_autofocus_mtf50_vertical"});
  EXPECT_EQ(0, one.status);
  EXPECT_THAT(one.out, AllOf(HasSubstr("fraction of Nyquist"), HasSubstr("slanted edge"), HasSubstr("known law"),
                             HasSubstr("0.0001 from one machine"), Not(HasSubstr("horizontal"))));
  EXPECT_THAT(RunProgram({"explain", "dots"}).out, AllOf(HasSubstr("hdr_dots_dot_count"), HasSubstr("hdr_dots_areas")));
  EXPECT_EQ(2, RunProgram({"explain", "sharpnes"}).status);
}

}  // namespace
