#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;

class CameraProgram : public SimulatedPhotos {
 protected:
  json Record(std::vector<std::string> arguments, int status = 0) {
    arguments.insert(arguments.end(), {"--json", "-", "--annotate", folder_.Path("seen.png")});
    const ProgramRun run = RunProgram(arguments);
    EXPECT_EQ(status, run.status) << run.err;
    EXPECT_FALSE(cv::imread(folder_.Path("seen.png")).empty());
    return CheckedRecord(run.out);
  }
};

TEST_F(CameraProgram, PreviewMeasuresMotion) {
  const std::string first = Simulate({"--scene", "preview", "--motion", "7,3", "--blur", "1"});
  const std::string second = folder_.Path("photo.second.png");
  for (const bool front : {false, true}) {
    std::vector<std::string> arguments = {"preview", first, second};
    if (front) arguments.emplace_back("--front");
    const double mean =
        Measured(Record(arguments), front ? "camera_preview_front_difference_mean" : "camera_preview_difference_mean");
    EXPECT_NEAR(Truth()["difference_mean"].get<double>(), mean, 0.5 / 255);  // whole grey levels
    EXPECT_GT(mean, 0.001);
  }
  EXPECT_EQ(0, Measured(Record({"preview", first, first}), "camera_preview_difference_mean"));
  const ProgramRun run = RunProgram({"preview", first, Simulate({"--size", "300x200"}, "small")});
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.err, HasSubstr("of different sizes, 1200 x 900 and 300 x 200"));
}

TEST_F(CameraProgram, RawFramesAreMeasuredAsTheirPictures) {
  const std::string size = "640x480";
  const std::vector<std::string> scene = {"--scene", "target", "--turn", "12", "--size", size};
  const json of_picture = Measured(Record({"circles", Simulate(scene)}), "circle_check_centre");
  std::vector<std::string> simulate = {"simulate", "-o", folder_.Path("raw.nv21"), "--quiet"};
  simulate.insert(simulate.end(), scene.begin(), scene.end());
  ASSERT_EQ(0, RunProgram(simulate).status);
  const std::string raw = folder_.Path("raw.nv21");
  const json of_frame = Measured(Record({"circles", raw, "--raw", size}), "circle_check_centre");
  for (const int i : {0, 1}) EXPECT_NEAR(of_picture[0][i], of_frame[0][i], 0.5) << "levels a few apart after coding";
  EXPECT_EQ(0, Measured(Record({"preview", raw, raw, "--raw", size}), "camera_preview_difference_mean"));

  const std::vector<std::pair<std::vector<std::string>, std::string>> wrong = {
      {{"preview", raw, raw, "--raw", "640x478"}, "460800 bytes are no NV21 frame of 640 x 478, which has 458880"},
      {{"circles", raw}, "a raw frame needs its size: --raw WxH"}};
  for (const auto& [arguments, says] : wrong) {
    const ProgramRun run = RunProgram(arguments);
    EXPECT_EQ(3, run.status);
    EXPECT_THAT(run.err, HasSubstr(says));
  }
}

TEST_F(CameraProgram, CirclesFindTheCentre) {
  const std::string frame = Simulate({"--scene", "target", "--turn", "12", "--size", "640x480", "--noise", "1"});
  const json centre = Measured(Record({"circles", frame}), "circle_check_centre");
  EXPECT_NEAR(Truth()["centre"]["x"], centre[0][0], 1);
  EXPECT_NEAR(Truth()["centre"]["y"], centre[0][1], 1);
  const json miss = Record({"circles", Simulate({"--scene", "dust"}, "blank")}, 3);
  EXPECT_EQ(0, miss["phases"][0]["result_code"]) << "the check's own answer";
  EXPECT_EQ("ERROR", miss["outcome"]);
}

TEST_F(CameraProgram, CaptureReadsThePatchesAsDrawn) {
  for (const std::string turn : {"0", "10"}) {
    const std::string photo = Simulate({"--turn", turn, "--gain", "0.8", "--size", "1600x1200"});
    const std::string standard = Simulate({"--size", "1600x1200"}, "standard");
    const json record = Record({"capture", photo, "--standard", standard});
    double error = 0;
    for (int i = 0; i < 24; ++i) {
      const json truth = Truth()["patches"][i]["lab"];
      double square = 0;
      int k = 0;
      for (const char* name : {"camera_capture_lab_l", "camera_capture_lab_a", "camera_capture_lab_b"}) {
        const json entry = Measured(record, name)[i];
        EXPECT_EQ(i, entry[0]);
        square += std::pow(entry[1].get<double>() - truth[k++].get<double>(), 2);
      }
      error += std::sqrt(square) / 24;
    }
    EXPECT_LT(error, 0.7) << "patch means are cut to whole levels, half a level on average";
    const json delta = Measured(record, "camera_capture_delta_e_76");
    double largest = 0;
    for (const json& entry : delta) largest = std::max(largest, entry[1].get<double>());
    EXPECT_EQ(largest, Measured(record, "camera_capture_delta_e_76_max"));
  }
  const json alone = Record({"capture", folder_.Path("photo.png"), "--front"});
  EXPECT_EQ(20, alone["metadata"]["test_index"]);
  EXPECT_EQ(4u, Measured(alone, "camera_capture_front_lab_l").size());
  EXPECT_EQ(9, Measured(alone, "camera_capture_front_lab_l")[3][0]);
  const ProgramRun run =
      RunProgram({"capture", folder_.Path("photo.png"), "--standard", Simulate({"--scene", "dust"}, "blank")});
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.err, HasSubstr("blank.png: no finder mark was found"));
}

TEST_F(CameraProgram, DustIsFoundWhereItLies) {
  const std::string photo = Simulate({"--scene", "dust", "--specks", "4", "--blur", "0.7", "--noise", "0.5"});
  const std::string file = folder_.Path("dust.json");
  ASSERT_EQ(0, RunProgram({"dust", photo, "--json", file}).status);
  const json record = CheckedRecord(ReadFile(file));
  EXPECT_EQ(4, Measured(record, "lens_dust_blob_count"));
  for (const json& blob : Measured(record, "lens_dust_blobs")) {
    const json specks = Truth()["specks"];
    EXPECT_TRUE(std::any_of(specks.begin(), specks.end(), [&](const json& speck) {
      return std::hypot(speck["x"].get<double>() - blob[0].get<double>(),
                        speck["y"].get<double>() - blob[1].get<double>()) < 1;
    }));
  }

  const json again = Record({"dust", photo, "--reference", file, "--front"});
  EXPECT_EQ(0, Measured(again, "lens_dust_front_histogram_difference"));
  EXPECT_EQ(256u, again["metadata"]["properties"]["87"].size());
  std::string numbers;
  for (int i = 0; i < 256; ++i) numbers += i == 3 ? "5 " : "0\n";
  const std::string bare = folder_.Write("reference.txt", numbers);
  EXPECT_EQ(1200 * 900 + 5, Measured(Record({"dust", photo, "--reference", bare}), "lens_dust_histogram_difference"));
  for (const std::string& bad : {std::string("[1, 2]"), std::string("1 2 x"), std::string("{}"), numbers + " 7"}) {
    const ProgramRun run = RunProgram({"dust", photo, "--reference", folder_.Write("bad.txt", bad)});
    EXPECT_EQ(2, run.status) << bad;
    EXPECT_THAT(run.err, HasSubstr("neither a dust record nor 256 whole numbers"));
  }
}

TEST_F(CameraProgram, DarkPhotosAreNotJudged) {
  const std::string photo = Simulate({"--scene", "dust", "--gain", "0.4"});
  const ProgramRun run = RunProgram({"dust", photo, "--json", "-"});
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.err, AllOf(HasSubstr("too dark to judge"), HasSubstr("mean grey level is 1")));
  const json record = CheckedRecord(run.out);
  EXPECT_EQ("ERROR", record["outcome"]);
  EXPECT_FALSE(record["phases"][0]["measurements"].contains("lens_dust_blob_count"));
}

TEST_F(CameraProgram, OnlyPublishReachesTheSharedStore) {
  // The shared store is the user's own: only that nothing is written without --publish can be tested here.
  const std::string store = "/dev/shm/qvtester-" + std::to_string(geteuid()) + "/properties/t82.vi424242_mung_loc";
  ASSERT_FALSE(std::filesystem::exists(store));
  EXPECT_EQ(0, RunProgram({"dust", Simulate({"--scene", "dust"}), "--step", "424242"}).status);
  EXPECT_FALSE(std::filesystem::exists(store));
}

}  // namespace
