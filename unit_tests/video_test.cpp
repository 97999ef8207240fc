// Tests 22 to 26 on films that were encoded by ffmpeg.

#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <limits>
#include <opencv2/videoio.hpp>

#include "unit_tests/film_file.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::AnyOf;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsNan;
using ::testing::Pointwise;

const cv::Size kSize(160, 120);

std::vector<cv::Mat> Blank(int count) { return std::vector<cv::Mat>(count, cv::Mat(kSize, CV_8UC3, cv::Scalar(90))); }

// Frames of even grey, as bright as said.
std::vector<cv::Mat> Levels(const std::vector<int>& levels) {
  std::vector<cv::Mat> frames;
  for (const int level : levels) frames.emplace_back(kSize, CV_8UC3, cv::Scalar::all(level));
  return frames;
}

cv::Mat Chart(double blur_px, double turn_deg = 0, int marks = 3) {
  return DrawChart({marks, turn_deg, 0.06, {560, 540}, blur_px});
}

template <typename T>
std::vector<T> Values(const T* array, int count) {
  return {array, array + count};
}

MATCHER_P(SameWithin, tolerance, "") { return std::fabs(std::get<0>(arg) - std::get<1>(arg)) <= tolerance; }

class Video : public ModuleTest {
 protected:
  static int LoadFilm(int slot, std::string path) {
    return SetResource(static_cast<QV_RESOURCE_INDEX>(slot), path.data());
  }
  int Run(QV_TEST_INDEX test, const std::vector<cv::Mat>& frames, const std::string& options = kLossless,
          const std::string& file = "film.mkv") {
    const int slot = test == QV_TEST_VIDEO_RECORD ? 35 : 34;
    EXPECT_EQ(1, LoadFilm(slot, WriteFilm(folder_.Path(file), frames, options)));
    return RunTest(test, false);
  }
};

struct Course {
  const char* name;
  std::string file, options;
  int frames;
  std::vector<int> dropped;  // of those that were filmed
  double jitter;             // of each stamp, in intervals: jitter * sin(1.7 n)
};

TEST_F(Video, LostFramesAreCountedAndNoOthers) {
  const std::vector<Course> courses = {
      {"whole", "a.mp4", kH264 + " -bf 0", 40, {}, 0},
      {"lost", "a.mp4", kH264 + " -bf 0", 60, {7, 20, 21, 40, 41, 42}, 0},
      {"lost, stored out of order", "a.mp4", kH264, 60, {7, 20, 21}, 0},
      {"60 a second", "b.mkv", kH264 + " -bf 0 -r 60", 60, {1, 50}, 0},
      {"variable", "c.mp4", kH264 + " -bf 0", 80, {}, 0.12},
      {"variable, lost", "c.mp4", kH264 + " -bf 0", 80, {11, 33, 34, 70}, 0.12},
      {"other codec", "d.mkv", "-c:v ffv1", 40, {12}, 0},
  };
  for (const Course& c : courses) {
    const double rate = c.options.find("-r 60") != std::string::npos ? 60 : 30;
    std::string keep = "1";
    std::vector<double> truth;
    for (int n = 0; n < c.frames; ++n) {
      if (std::find(c.dropped.begin(), c.dropped.end(), n) == c.dropped.end()) {
        truth.push_back((n + c.jitter * std::sin(1.7 * n)) * 1000 / rate);
      } else {
        keep += "*not(eq(n\\," + std::to_string(n) + "))";
      }
    }
    const std::string filter = " -fps_mode passthrough -enc_time_base 1:90000 -vf settb=1/90000,setpts='(N+" +
                               std::to_string(c.jitter) + "*sin(1.7*N))/" + std::to_string(rate) + "/TB',select='" +
                               keep + "'";
    std::string options = c.options;
    if (rate == 60) options.erase(options.find(" -r 60"));
    const LogLines log;
    ASSERT_EQ(-91, Run(QV_TEST_VIDEO_RECORD, Blank(c.frames), options + filter, c.file)) << "no chart";
    const QVVideoChartResult& result = Results().video_record_;
    EXPECT_EQ(static_cast<int>(c.dropped.size()), result.frames_lost_) << c.name;
    ASSERT_EQ(static_cast<int>(truth.size()), result.frame_count_) << c.name;
    EXPECT_EQ(0, result.frames_bad_) << c.name;
    // A millisecond, since Matroska's stamps are whole ones; the last four may be extended ones.
    std::vector<double> times = Values(result.time_, result.frame_count_);
    for (std::size_t i = times.size() - 4; i < times.size(); ++i) {
      EXPECT_NEAR(truth[i], times[i], 1.01 + 3000 * c.jitter / rate) << c.name << ' ' << i;
      times[i] = truth[i];
    }
    EXPECT_THAT(times, Pointwise(SameWithin(1.01), truth)) << c.name;
    EXPECT_NEAR(1000 * (static_cast<double>(truth.size()) - 1) / truth.back(), result.mean_rate_, 0.1) << c.name;
    EXPECT_EQ(c.options.find("ffv1") == std::string::npos,
              ::testing::Value(LogLines::Texts(), Contains(HasSubstr("time stamps go back or repeat"))))
        << c.name << ": what is decoded with a delay has no stamps at its end";
    EXPECT_THAT(Values(result.angle_, result.frame_count_), Each(-1.0f));
  }
}

TEST_F(Video, EachFrameGetsItsMarks) {
  std::vector<cv::Mat> frames;
  for (const double turn : {0.0, 3.0, 90.0, 0.0, 273.0}) frames.push_back(Chart(0.8, turn, frames.size() == 3 ? 2 : 3));
  ASSERT_EQ(1, Run(QV_TEST_VIDEO_PLAY, frames));
  const QVVideoChartResult& result = Results().video_play_;
  for (int run = 0; run < 2; ++run) {
    ASSERT_EQ(1, RunTest(QV_TEST_VIDEO_PLAY, run == 1)) << "the film starts anew";
    EXPECT_THAT(Values(result.mark_count_, 5), ElementsAre(3, 3, 3, 2, 3));
    EXPECT_THAT(Values(result.angle_, 5), Pointwise(SameWithin(1.5), std::vector<float>{315, 318, 45, -1, 228}));
    for (int i = 0; i < 5; ++i) {
      const auto centre = MarkCentres({3, std::array{0.0, 3.0, 90.0, 0.0, 273.0}[i], 0.06, {560, 540}, 0.8})[0];
      EXPECT_NEAR(i == 3 ? -1 : centre.y, result.corner_row_[i], 2) << i;
      EXPECT_NEAR(i == 3 ? -1 : centre.x, result.corner_column_[i], 2) << i;
    }
    EXPECT_EQ(4, result.found_count_);
    EXPECT_EQ(5, result.frames_promised_);
  }
  EXPECT_EQ(1, ReleaseTestResult(QV_TEST_VIDEO_PLAY));
  EXPECT_EQ(nullptr, result.time_);
  EXPECT_EQ(0, result.frame_count_);
}

TEST_F(Video, PulsesAreMeasuredAtHalfHeight) {
  struct Pulse {
    const char* name;
    std::vector<int> levels;
    int limit, peak;
    double base, width;  // intervals; negative: none
  };
  const std::vector<Pulse> pulses = {
      {"triangle", {50, 50, 50, 100, 150, 100, 50, 50, 50}, 0, 4, 50, 2},
      {"interpolated", {40, 40, 40, 60, 140, 140, 50, 40, 40}, 0, 4, 40, 1 + 50 / 80.0 + 50 / 90.0},
      {"cut at the start", {200, 200, 50, 50, 50, 50}, 0, 0, 50, 1.5},
      {"cut at the end", {50, 50, 50, 50, 200}, 0, 4, 50, 0.5},
      {"two, the higher counts", {20, 90, 20, 20, 120, 120, 20, 20}, 0, 4, 20, 2},
      {"the higher is not read", {20, 90, 20, 20, 120, 120, 20, 20}, 4, 1, 20, 1},
      {"an even count of frames", {10, 20, 100, 10, 20, 10}, -3, 2, 15, 42.5 / 80 + 42.5 / 90},
      {"none", {50, 50, 54, 50, 50}, 0, 2, 50, -1},
      {"just one", {50, 50, 55, 50, 50}, 0, 2, 50, 1},
  };
  for (Pulse c : pulses) {
    SetProperty(QV_PROPERTY_VIDEO_FLASH_FRAME_COUNT, &c.limit);
    ASSERT_EQ(1, Run(QV_TEST_VIDEO_FLASH, Levels(c.levels), kLossless, "film.avi")) << c.name;
    const QVResultData& r = Results();
    const int count = c.limit > 0 ? c.limit : static_cast<int>(c.levels.size());
    ASSERT_EQ(count, r.video_flash_frame_count_) << c.name;
    c.levels.resize(count);
    EXPECT_THAT(Values(r.video_flash_mean_, count), Pointwise(::testing::Eq(), c.levels)) << c.name;
    EXPECT_EQ(c.peak, r.video_flash_peak_frame_) << c.name;
    EXPECT_EQ(c.levels[c.peak], r.video_flash_peak_) << c.name;
    EXPECT_EQ(c.base, r.video_flash_base_) << c.name;
    if (c.width < 0) {
      EXPECT_THAT(r.video_flash_width_, IsNan()) << c.name;
    } else {
      EXPECT_NEAR(c.width * 1000 / 30, r.video_flash_width_, 1e-6) << c.name;
    }
  }
}

TEST_F(Video, FocusSettlesWhenItStaysNearItsEnd) {
  std::vector<cv::Mat> frames(3, cv::Mat(540, 560, CV_8UC3, cv::Scalar::all(200)));
  for (const double blur : {3.0, 2.5, 2.0, 0.7, 2.0, 3.0, 1.6, 1.3, 1.05, 1.0, 1.0, 2.5, 1.0, 1.0, 1.0, 1.0, 1.0}) {
    frames.push_back(Chart(blur));
  }
  const int count = static_cast<int>(frames.size());
  ASSERT_EQ(1, Run(QV_TEST_VIDEO_AUTOFOCUS, frames));
  const QVResultData& r = Results();
  EXPECT_EQ(count, r.video_af_frame_count_);
  EXPECT_EQ(count - 3, r.video_af_found_count_);
  EXPECT_EQ(6, r.video_af_best_frame_);
  std::vector<float> level;
  for (int i = 0; i < count; ++i) {
    float v = std::numeric_limits<float>::quiet_NaN();
    float h = v;
    EXPECT_EQ(i < 3 ? -91 : 1, theTester->GetMTFFromImage(frames[i], v, h));
    EXPECT_THAT(r.video_af_mtf50_vertical_[i], ::testing::NanSensitiveFloatEq(v)) << i;
    EXPECT_THAT(r.video_af_mtf50_horizontal_[i], ::testing::NanSensitiveFloatEq(h)) << i;
    level.push_back((v + h) / 2);
  }
  EXPECT_FLOAT_EQ(level[6], r.video_af_best_mtf50_);
  EXPECT_FLOAT_EQ(level[19], r.video_af_final_mtf50_);
  // Frames 9, 10 and 11 have a blur of 1.6, 1.3 and 1.05; a median of five sees neither the peak nor the slip.
  EXPECT_NEAR(11 * 1000 / 30.0, r.video_af_settle_time_, 1000 / 30.0);

  for (cv::Mat& frame : frames) frame = Chart(1, 0, 2);
  const std::vector<double> before = Values(r.video_af_time_, count);
  EXPECT_EQ(-91, Run(QV_TEST_VIDEO_AUTOFOCUS, {frames.begin(), frames.begin() + 2}, kLossless, "two.mkv"));
  EXPECT_EQ(before, Values(r.video_af_time_, r.video_af_frame_count_));
}

TEST_F(Video, TheEndIsTheLastFifthRoundedUpAndATenthOfItTheLimit) {
  const auto level = [&](double blur) {
    float v = 0;
    float h = 0;
    EXPECT_EQ(1, theTester->GetMTFFromImage(Chart(blur), v, h));
    return (v + h) / 2;
  };
  ASSERT_EQ(1, Run(QV_TEST_VIDEO_AUTOFOCUS, {Chart(1), Chart(1), Chart(1), Chart(1), Chart(1), Chart(1.3)}));
  EXPECT_FLOAT_EQ((level(1) + level(1.3)) / 2, Results().video_af_final_mtf50_) << "two of six";
  double blur = 1;
  while (level(blur) < 1.105 * level(1)) blur -= 0.004;
  ASSERT_LT(level(blur), 1.118 * level(1));
  std::vector<cv::Mat> frames(6, Chart(blur));
  frames.insert(frames.end(), 6, Chart(1));
  ASSERT_EQ(1, Run(QV_TEST_VIDEO_AUTOFOCUS, frames, kLossless, "settling.mkv"));
  EXPECT_NEAR(200, Results().video_af_settle_time_, 1) << "the first of which the median of five is low";
}

TEST_F(Video, PreviewFramesAreThoseOfTheirOwnSlots) {
  Load(28, cv::Mat(2, 3, CV_8UC3, cv::Scalar::all(100)));
  Load(29, cv::Mat(2, 3, CV_8UC3, cv::Scalar::all(151)));
  EXPECT_EQ(1, RunTest(QV_TEST_VIDEO_PREVIEW, false));
  EXPECT_FLOAT_EQ(0.2f, Results().preview_video_.preview_diff_mean_);
  Load(29, cv::Mat(3, 3, CV_8UC3, cv::Scalar::all(151)));
  EXPECT_EQ(1, RunTest(QV_TEST_VIDEO_PREVIEW, false));
  EXPECT_EQ(2, Results().preview_video_.preview_diff_rows_);
  EXPECT_EQ(nullptr, Results().preview_main_.preview_diff_map_);
  QVTester bare;
  EXPECT_THAT((std::array{bare.TestVideoPreview(), bare.TestVideoAutofocus(), bare.TestVideoFlash(),
                          bare.TestVideoRecord(), bare.TestVideoPlay()}),
              Each(-98));
}

TEST_F(Video, AFrameThatCannotBeDecodedIsCountedAndPassed) {
  const std::string path = WriteFilm(folder_.Path("a.avi"), Levels({10, 20, 30, 40, 50, 60, 70, 80, 90}), "-c:v png");
  std::string bytes = ReadFile(path);
  std::size_t at = bytes.find("movi");
  for (int frame = 0; frame < 3; ++frame) at = bytes.find("IHDR", at + 1);
  bytes.replace(at, 4, "XXXX");  // the third picture has no header any more
  ASSERT_EQ(1, LoadFilm(34, folder_.Write("bad.avi", bytes)));
  ASSERT_EQ(1, RunTest(QV_TEST_VIDEO_FLASH, false));
  EXPECT_THAT(Values(Results().video_flash_mean_, Results().video_flash_frame_count_),
              ElementsAre(10, 20, 40, 50, 60, 70, 80, 90));
  EXPECT_EQ(-91, RunTest(QV_TEST_VIDEO_PLAY, false));
  EXPECT_EQ(1, Results().video_play_.frames_bad_);
  EXPECT_EQ(1, Results().video_play_.frames_lost_);
}

TEST_F(Video, WhatIsNoFilmIsSaidToBeNone) {
  const std::string film = WriteFilm(folder_.Path("a.mp4"), Blank(12), kH264);
  ASSERT_EQ(1, LoadFilm(34, film));
  std::filesystem::rename(film, folder_.Path("moved.mp4"));
  {
    const LogLines log;
    EXPECT_EQ(-95, RunTest(QV_TEST_VIDEO_PLAY, false));
    EXPECT_THAT(LogLines::Texts(), Contains("[TestVideoPlay] slot 34 holds no film that can be opened"));
  }
  Load(35, cv::Mat(4, 4, CV_8UC3));
  EXPECT_EQ(-95, RunTest(QV_TEST_VIDEO_RECORD, false));

  const std::string sound = folder_.Path("sound.mp4");
  // NOLINTNEXTLINE(cert-env33-c): the test's own words
  ASSERT_EQ(0, std::system(("ffmpeg -v error -f lavfi -i sine -t 0.2 -c:a aac " + sound).c_str()));
  for (const std::string& path :
       {sound, folder_.Write("empty.mp4", std::string()), folder_.Write("words.mp4", std::string("no film"))}) {
    const LogLines log;
    EXPECT_EQ(-97, LoadFilm(34, path)) << path;
    EXPECT_THAT(LogLines::Texts(), Contains(HasSubstr(path)));
  }
}

TEST_F(Video, CutFilmsGiveWhatTheyHold) {
  for (const auto& [name, options] : {std::pair{"a.mkv", kH264},
                                      {"a.avi", std::string("-c:v mjpeg")},
                                      {"a.mp4", kH264 + " -movflags frag_keyframe+empty_moov -g 4"}}) {
    const std::string bytes = ReadFile(WriteFilm(folder_.Path(name), Blank(12), options));
    int most = 0;
    for (int i = 0; i <= 40; ++i) {
      const std::string path = folder_.Write(std::string("cut_") + name, bytes.substr(0, bytes.size() * i / 40));
      const LogLines log;
      int code = LoadFilm(34, path);
      if (code == 1) code = RunTest(QV_TEST_VIDEO_FLASH, false);
      EXPECT_THAT(code, AnyOf(1, -95, -97)) << path << ' ' << i;
      EXPECT_FALSE(LogLines::All().empty());
      if (code == 1) most = std::max(most, Results().video_flash_frame_count_);
    }
    EXPECT_EQ(12, most) << name;
  }
}

}  // namespace
