// Films of the simulator, measured by the program.

#include <gmock/gmock.h>

#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/film_file.h"
#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::HasSubstr;

class VideoProgram : public SimulatedPhotos {
 protected:
  void Film(const std::string& scene, const std::string& options) const {
    const ProgramRun run = Run("simulate --quiet --scene film-" + scene + " -o film.mp4 " + options);
    ASSERT_EQ(0, run.status) << run.err;
  }
};

TEST_F(VideoProgram, FocusSettlesWhenItDid) {
  Film("focus", "--size 560x480 --blur 0.8 --frames 45 --focus-time 500 --return-time 300 --noise 0.5");
  const json record = Record("video autofocus film.mp4 --annotate seen.png");
  EXPECT_NEAR(Truth("film")["settle_time_ms"], Measured(record, "video_autofocus_settle_time"), 1000 / 30.0);
  EXPECT_NEAR(Truth("film")["final_mtf50_nyquist"], Measured(record, "video_autofocus_final_mtf50"), 0.03);
  EXPECT_EQ(45, Measured(record, "video_autofocus_mtf50_vertical").size());
  EXPECT_FALSE(cv::imread(folder_.Path("seen.png")).empty());
  folder_.Write("limits.json", std::string(R"({"name": "l", "revision": "1", "limits": {
      "video_autofocus_settle_time": {"max": 100, "unit": "ms"}}})"));
  Record("video autofocus film.mp4 --limits limits.json", 1);
}

TEST_F(VideoProgram, ThePulseIsAsLongAsItWas) {
  Film("flash", "--size 160x120 --frames 60 --pulse 250 --pulse-at 900");
  const json record = Record("video flash film.mp4 --annotate seen.png");
  EXPECT_NEAR(250, Measured(record, "video_flash_width"), 250 * 0.03);
  EXPECT_NEAR(Truth("film")["base"], Measured(record, "video_flash_base"), 1);
  EXPECT_EQ(20, Measured(Record("video flash film.mp4 --frames 20"), "video_flash_frame_count"));
}

TEST_F(VideoProgram, LostFramesAndTheTurnAreSeen) {
  Film("chart", "--size 480x400 --blur 0.7 --frames 40 --lost 7,20,21 --jitter 0.1 --turn-rate 15");
  const json record = Record("video record film.mp4 --annotate seen.png");
  EXPECT_EQ(3, Measured(record, "video_record_frames_lost"));
  EXPECT_EQ(37, Measured(record, "video_record_frame_count"));
  const json angles = Measured(record, "video_record_angle");
  ASSERT_EQ(37, angles.size());
  for (int i = 0; i < 37; ++i) {
    EXPECT_NEAR(Truth("film")["turn_deg"][i].get<double>() + 315, angles[i][1].get<double>(), 1.5);
    if (i < 33) {  // the last four have no stamps
      EXPECT_NEAR(Truth("film")["time_ms"][i], angles[i][0], 0.02);
    }
  }
  EXPECT_THAT(err_, HasSubstr("3: 1 after frame 6, 2 after frame 18"));

  Film("flash", "--size 160x120 --frames 20 --lost 5");
  const json blank = Record("video play film.mp4", 3);
  EXPECT_EQ(1, Measured(blank, "video_play_frames_lost")) << "what was lost is known without a chart";
}

TEST_F(VideoProgram, AFilmThatEndsBeforeItsPromiseIsDoubted) {
  const std::vector<cv::Mat> frames(40, cv::Mat(120, 160, CV_8UC3, cv::Scalar::all(90)));
  const std::string file = WriteFilm(folder_.Path("film.avi"), frames, "-c:v mjpeg");
  for (const auto& [size, status] : {std::pair(1.0, 0), {0.6, 3}}) {
    std::filesystem::resize_file(file, static_cast<std::uintmax_t>(size * std::filesystem::file_size(file)));
    Record("video flash film.avi", status);
    EXPECT_EQ(status == 3, err_.find("promises; it was cut") != std::string::npos) << size;
    Record("video flash film.avi --set 89=10");  // whose end was not asked for
  }
}

TEST_F(VideoProgram, TheEnvironmentLetsNoFilmElsewhere) {
  Simulate("--scene film-flash --size 64x64 --frames 5", "film.mp4");
  EXPECT_EQ(0, Run("video flash film.mp4", "OPENCV_FFMPEG_CAPTURE_OPTIONS='protocol_whitelist;http' ").status)
      << "its options would have shut the file out";
}

TEST_F(VideoProgram, WhatIsNoFilmIsToldInASentence) {
  Simulate("--size 64x64");
  ExpectComplaint("video flash photo.png", 3, "photo.png: not a film that can be decoded");
  ExpectComplaint("video flash none.mp4", 3, "none.mp4: no such file");
  ExpectComplaint("video", 2, "a command is needed");
  ExpectComplaint("simulate --scene film-flash -o film.avi", 2, "a film is written as .mp4, .mkv or .mov");
  ExpectComplaint("simulate --scene film-flash -o film.mp4 --lost 0", 2, "only frames between the first and the last");
  const std::filesystem::path broken = folder_.Write("ffmpeg", std::string("#!/bin/sh\nexit 1\n"));
  std::filesystem::permissions(broken, std::filesystem::perms::owner_all);
  const ProgramRun run = Run("simulate --scene film-flash --size 160x120 -o film.mp4", "PATH=\"$PWD:$PATH\" ");
  EXPECT_EQ(4, run.status);
  EXPECT_THAT(run.err, HasSubstr("film.mp4: ffmpeg could not encode the film"));
  EXPECT_EQ(0, Measured(Record("video preview photo.png photo.png"), "video_preview_difference_mean"));
}

}  // namespace
