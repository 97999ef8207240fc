#include <gmock/gmock.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::HasSubstr;

using CameraProgram = SimulatedPhotos;

TEST_F(CameraProgram, PreviewMeasuresMotion) {
  Simulate("--scene preview --motion 7,3 --blur 1");
  for (const auto& [camera, phase] : {std::pair("", "camera_preview"), {" --front", "camera_preview_front"}}) {
    const json record = Record(std::string("preview photo.png photo.second.png") + camera);
    const double mean = Measured(record, std::string(phase) + "_difference_mean");
    EXPECT_NEAR(Truth()["difference_mean"].get<double>(), mean, 0.5 / 255);  // whole grey levels
    EXPECT_GT(mean, 0.001);
  }
  EXPECT_EQ(0, Measured(Record("preview photo.png photo.png"), "camera_preview_difference_mean"));
  Simulate("--scene preview --motion 0,0 --noise 4", "still.png");
  EXPECT_GT(Measured(Record("preview still.png still.second.png"), "camera_preview_difference_mean"), 0.01)
      << "each photo has noise of its own";
  ExpectComplaint("preview photo.png " + Simulate("--size 300x200", "small.png"), 3,
                  "of different sizes, 1200 x 900 and 300 x 200");
}

TEST_F(CameraProgram, CirclesFindTheCentreInPicturesAndRawFrames) {
  const std::string scene = "--scene target --turn 12 --size 640x480 --noise 1";
  const json centre = Measured(Record("circles " + Simulate(scene)), "circle_check_centre")[0];
  EXPECT_NEAR(Truth()["centre"]["x"], centre[0], 1);
  EXPECT_NEAR(Truth()["centre"]["y"], centre[1], 1);
  const json miss = Record("circles " + Simulate("--scene dust", "blank.png") + " --annotate seen.png", 3);
  EXPECT_FALSE(cv::imread(folder_.Path("seen.png")).empty());
  EXPECT_EQ(0, miss["phases"][0]["result_code"]) << "the check's own answer";
  EXPECT_EQ("ERROR", miss["outcome"]);

  Simulate(scene, "raw.nv21");
  const json of_frame = Measured(Record("circles raw.nv21 --raw 640x480"), "circle_check_centre")[0];
  for (const int i : {0, 1}) EXPECT_NEAR(centre[i], of_frame[i], 0.5) << "levels a few apart after coding";
  EXPECT_EQ(0, Measured(Record("preview raw.nv21 raw.nv21 --raw 640x480"), "camera_preview_difference_mean"));
  ExpectComplaint("preview raw.nv21 raw.nv21 --raw 640x478", 3,
                  "460800 bytes are no NV21 frame of 640 x 478, which has 458880");
  ExpectComplaint("circles raw.nv21", 3, "a raw frame needs its size: --raw WxH");
}

TEST_F(CameraProgram, CaptureReadsThePatchesAsDrawn) {
  Simulate("--size 1600x1200", "standard.png");
  for (const std::string turn : {"0", "10"}) {
    Simulate("--gain 0.8 --size 1600x1200 --turn " + turn);
    const json record = Record("capture photo.png --standard standard.png");
    double error = 0;
    for (int i = 0; i < 24; ++i) {
      cv::Vec3d difference;
      for (int k = 0; k < 3; ++k) {
        const json entry = Measured(record, std::string("camera_capture_lab_") + "lab"[k])[i];
        EXPECT_EQ(i, entry[0]);
        difference[k] = entry[1].get<double>() - Truth()["patches"][i]["lab"][k].get<double>();
      }
      error += cv::norm(difference) / 24;
    }
    EXPECT_LT(error, 0.7) << "patch means are cut to whole levels, half a level on average";
    double largest = 0;
    for (const json& entry : Measured(record, "camera_capture_delta_e_76")) {
      largest = std::max(largest, entry[1].get<double>());
    }
    EXPECT_EQ(largest, Measured(record, "camera_capture_delta_e_76_max"));
  }
  folder_.Write("limits.json", R"({"limits": {"camera_capture_delta_e_2000":
                {"each": {"max": 90}, "patches": {"7": {"max": 0}}}}})");
  const json judged = Record("capture photo.png --standard standard.png --limits limits.json", 1);
  EXPECT_EQ(json::array({7}), judged["phases"][0]["measurements"]["camera_capture_delta_e_2000"]["decision"]["broken"]);
  EXPECT_THAT(err_, HasSubstr("camera_capture_delta_e_2000: outside its limit: patch 7 ("));
  const json alone = Record("capture photo.png --front");
  EXPECT_EQ(20, alone["metadata"]["test_index"]);
  EXPECT_EQ(4u, Measured(alone, "camera_capture_front_lab_l").size());
  EXPECT_EQ(9, Measured(alone, "camera_capture_front_lab_l")[3][0]);
  ExpectComplaint("capture photo.png --standard " + Simulate("--scene dust", "blank.png"), 3,
                  "blank.png: no finder mark was found");
}

TEST_F(CameraProgram, DustIsFoundWhereItLiesUnlessThePhotoIsDark) {
  Simulate("--scene dust --specks 4 --blur 0.7 --noise 0.5");
  const json record = Record("dust photo.png");
  folder_.Write("dust.json", record.dump());
  EXPECT_EQ(4, Measured(record, "lens_dust_blob_count"));
  const json specks = Truth()["specks"];
  for (const json& blob : Measured(record, "lens_dust_blobs")) {
    EXPECT_TRUE(std::any_of(specks.begin(), specks.end(), [&](const json& speck) {
      return cv::norm(cv::Point2d(speck["x"], speck["y"]) - cv::Point2d(blob[0], blob[1])) < 1;
    }));
  }

  const json again = Record("dust photo.png --reference dust.json --front");
  EXPECT_EQ(0, Measured(again, "lens_dust_front_histogram_difference"));
  EXPECT_EQ(256u, again["metadata"]["properties"]["87"].size());
  std::string numbers;
  for (int i = 0; i < 256; ++i) numbers += i == 3 ? "5 " : "0\n";
  folder_.Write("levels.txt", numbers);
  EXPECT_EQ(1200 * 900 + 5,
            Measured(Record("dust photo.png --reference levels.txt"), "lens_dust_histogram_difference"));
  for (const std::string& bad : {std::string("[1, 2]"), std::string("1 2 x"), std::string("{}"), numbers + " 7"}) {
    folder_.Write("levels.txt", bad);
    ExpectComplaint("dust photo.png --reference levels.txt", 2, "neither a dust record nor 256 whole numbers");
  }

  const json dark = Record("dust " + Simulate("--scene dust --gain 0.4"), 3);
  EXPECT_THAT(err_, ::testing::AllOf(HasSubstr("too dark to judge"), HasSubstr("mean grey level is 1")));
  EXPECT_EQ("ERROR", dark["outcome"]);
  EXPECT_FALSE(dark["phases"][0]["measurements"].contains("lens_dust_blob_count"));
}

TEST_F(CameraProgram, OnlyPublishReachesTheSharedStore) {
  // The shared store is the user's own: only that nothing is written without --publish can be tested here.
  const std::string store = "/dev/shm/qvtester-" + std::to_string(geteuid()) + "/properties/t82.vi9898_mung_loc";
  ASSERT_FALSE(std::filesystem::exists(store));
  EXPECT_EQ(0, Run("dust --step 9898 " + Simulate("--scene dust")).status);
  EXPECT_FALSE(std::filesystem::exists(store));
}

}  // namespace
