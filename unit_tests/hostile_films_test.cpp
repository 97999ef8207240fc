// Films that are cut, promise what they don't hold, or change while they are read: a code and a sentence each.

#include <gmock/gmock.h>

#include <algorithm>
#include <filesystem>
#include <random>

#include "unit_tests/film_file.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::AnyOf;
using ::testing::Contains;
using ::testing::HasSubstr;

const std::pair<QV_TEST_INDEX, const char*> kFilmTests[] = {{QV_TEST_VIDEO_AUTOFOCUS, "[TestVideoAutofocus]"},
                                                            {QV_TEST_VIDEO_FLASH, "[TestVideoFlash]"},
                                                            {QV_TEST_VIDEO_RECORD, "[TestVideoRecord]"},
                                                            {QV_TEST_VIDEO_PLAY, "[TestVideoPlay]"}};

std::vector<cv::Mat> Frames(cv::Size size, int count = 12) {
  std::vector<cv::Mat> frames;
  for (int i = 0; i < count; ++i) frames.emplace_back(size, CV_8UC3, cv::Scalar::all(20 * (i % 12)));
  return frames;
}

// Bytes at so many behind a name in the file, if it is there.
std::string Patched(std::string bytes, const std::string& name, std::size_t behind, const std::string& with) {
  const std::size_t at = bytes.find(name);
  EXPECT_NE(std::string::npos, at) << name;
  return bytes.replace(at + behind, with.size(), with);
}

class HostileFilms : public ModuleTest {
 protected:
  static int LoadFilm(int slot, std::string path) {
    return SetResource(static_cast<QV_RESOURCE_INDEX>(slot), path.data());
  }

  // Runs all tests on a film: `frames` are read; 0: it is opened, and none can be; below 0: it is refused.
  void ExpectFrames(const std::string& path, int frames) {
    for (const auto& [test, name] : kFilmTests) {
      const int slot = test == QV_TEST_VIDEO_RECORD ? 35 : 34;
      const LogLines log;
      const int code = LoadFilm(slot, path);
      EXPECT_EQ(frames < 0 ? -97 : 1, code) << path;
      if (code != 1) {
        EXPECT_THAT(LogLines::Texts(), Contains(HasSubstr(path)));
        continue;
      }
      const bool marks = test != QV_TEST_VIDEO_FLASH;  // not to be found here
      EXPECT_EQ(frames == 0 ? -95 : marks ? -91 : 1, RunTest(test, false)) << path << ' ' << name;
      if (frames == 0 || test == QV_TEST_VIDEO_AUTOFOCUS) {
        EXPECT_THAT(LogLines::Texts(), Contains(HasSubstr(name))) << path;
      }
      const int read = test == QV_TEST_VIDEO_FLASH    ? Results().video_flash_frame_count_
                       : test == QV_TEST_VIDEO_RECORD ? Results().video_record_.frame_count_
                                                      : Results().video_play_.frame_count_;
      EXPECT_TRUE(frames == 0 || test == QV_TEST_VIDEO_AUTOFOCUS || frames == read)
          << path << ' ' << name << ' ' << read;
    }
  }

  std::string Written(const std::string& name, const std::string& bytes) { return folder_.Write(name, bytes); }
};

TEST_F(HostileFilms, AnySizeAndAnyLengthIsRead) {
  for (const cv::Size size : {cv::Size(641, 479), {1, 1}, {2, 2}, {16, 4000}, {4000, 16}}) {
    ExpectFrames(WriteFilm(folder_.Path("a.mkv"), Frames(size, 3)), 3);
  }
  ExpectFrames(WriteFilm(folder_.Path("odd.mp4"), Frames({641, 479}, 5), "-c:v libx264 -pix_fmt yuv444p"), 5);
  ExpectFrames(WriteFilm(folder_.Path("one.mp4"), Frames({64, 48}, 1), kH264), 1);
  const QVVideoChartResult& one = Results().video_play_;
  EXPECT_EQ(0, one.time_[0]);
  EXPECT_EQ(0, one.mean_rate_ + one.longest_gap_ + one.frames_lost_ + one.frames_bad_);
}

TEST_F(HostileFilms, HeadersThatLieAreNotBelieved) {
  const std::string mp4 = ReadFile(WriteFilm(folder_.Path("a.mp4"), Frames({64, 48}), kH264 + " -bf 0"));
  const std::string avi = ReadFile(WriteFilm(folder_.Path("a.avi"), Frames({64, 48}), "-c:v mjpeg"));
  const std::string mkv = ReadFile(WriteFilm(folder_.Path("a.mkv"), Frames({64, 48}), "-c:v mjpeg"));
  const std::string none(4, '\0');
  const std::string most = "\x7F\xFF\xFF\xFF";
  const std::string little(most.rbegin(), most.rend());
  struct Film {
    const char* name;
    std::string bytes;
    int frames = 12;  // that FFmpeg gives
  };
  const Film films[] = {
      {"no_time_scale.mp4", Patched(mp4, "mdhd", 16, none), 0},  // all before the start by its edit list
      {"absurd_time_scale.mp4", Patched(mp4, "mdhd", 16, most)},
      {"no_interval.mp4", Patched(mp4, "stts", 16, none)},
      {"absurd_interval.mp4", Patched(mp4, "stts", 16, most), 1},
      {"long.mp4", Patched(Patched(mp4, "mdhd", 20, most), "mvhd", 20, most)},
      {"many.mp4", Patched(mp4, "stts", 12, most)},
      {"no_rate.avi", Patched(Patched(avi, "avih", 8, none), "strh", 28, none + none)},
      {"absurd_rate.avi", Patched(avi, "strh", 28, std::string("\1\0\0\0", 4) + little)},
      {"slow.avi", Patched(avi, "strh", 28, little + std::string("\1\0\0\0", 4))},
      {"many.avi", Patched(Patched(avi, "avih", 24, little), "strh", 40, little)},
      {"negative.avi", Patched(Patched(avi, "avih", 24, "\xFF\xFF\xFF\xFF"), "strh", 40, "\xFF\xFF\xFF\xFF")},
      {"no_rate.mkv", Patched(mkv, "\x23\xE3\x83\x84", 4, none)},
  };
  for (const auto& [name, bytes, frames] : films) {
    ExpectFrames(Written(name, bytes), frames);
    const QVVideoChartResult& film = Results().video_play_;
    EXPECT_GE(film.frames_promised_, 0) << name;
    for (int i = 1; i < film.frame_count_; ++i) EXPECT_GT(film.time_[i], film.time_[i - 1]) << name;
  }
}

TEST_F(HostileFilms, WhatIsNoFilmIsRefused) {
  const std::string picture = ReadFile(folder_.Write("a.png", cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(9))));
  const std::string photo = ReadFile(folder_.Write("a.jpg", cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(9))));
  ExpectFrames(Written("picture.mp4", picture), -1);
  ExpectFrames(Written("photo.mp4", photo), -1);
  ExpectFrames(Written("empty.mp4", std::string()), -1);
  QVResource::most_pixels_ = 64 * 48 - 1;
  ExpectFrames(WriteFilm(folder_.Path("large.mkv"), Frames({64, 48}, 2)), -1);
  QVResource::most_pixels_ = 200'000'000;
  for (const char* const name : {"sound.mp4", "sound.mkv", "sound.avi"}) {
    const std::string path = folder_.Path(name);
    // NOLINTNEXTLINE(cert-env33-c): the test's own words
    ASSERT_EQ(0, std::system(("ffmpeg -v error -f lavfi -i sine -t 0.2 -c:a ac3 " + path).c_str()));
    ExpectFrames(path, -1);
  }
}

TEST_F(HostileFilms, AFilmIsReadAsItIsWhenTheTestRuns) {
  const std::string first = ReadFile(WriteFilm(folder_.Path("a.mkv"), Frames({64, 48}, 12)));
  const std::string second = ReadFile(WriteFilm(folder_.Path("b.mkv"), Frames({80, 30}, 5)));
  const std::string photo = ReadFile(folder_.Write("a.png", cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(9))));
  const std::string path = Written("film.mkv", first);
  ASSERT_EQ(1, LoadFilm(34, path));
  ASSERT_EQ(1, RunTest(QV_TEST_VIDEO_FLASH, false));
  for (const std::string& other : {photo, std::string(), first.substr(0, 300)}) {
    const LogLines log;
    Written("film.mkv", other);
    EXPECT_EQ(-95, RunTest(QV_TEST_VIDEO_FLASH, false));
    EXPECT_THAT(LogLines::Texts(), Contains(HasSubstr("[TestVideoFlash]")));
    EXPECT_EQ(12, Results().video_flash_frame_count_) << "what failed changes nothing";
  }
  std::filesystem::remove(path);
  EXPECT_EQ(-95, RunTest(QV_TEST_VIDEO_FLASH, false));
  std::filesystem::create_directory(path);
  EXPECT_EQ(-95, RunTest(QV_TEST_VIDEO_FLASH, false));
  std::filesystem::remove(path);
  Written("film.mkv", second);
  EXPECT_EQ(1, RunTest(QV_TEST_VIDEO_FLASH, false));
  EXPECT_EQ(5, Results().video_flash_frame_count_);
}

// OpenCV goes on in the size that it took from the head, and can't give a larger picture than that.
TEST_F(HostileFilms, TheSizeMayChangeMidway) {
  for (const char* const name : {"part.ts", "part.h264"}) {
    std::vector<std::string> parts;
    for (const cv::Size size : {cv::Size(64, 48), {96, 128}, {1280, 16}, {16, 16}}) {
      parts.push_back(ReadFile(WriteFilm(folder_.Path(name), Frames(size, 40), kH264 + " -bf 0")));
    }
    for (std::size_t first = 0; first < parts.size(); ++first) {
      for (std::size_t then = 0; then < parts.size(); ++then) {
        const LogLines log;
        ASSERT_EQ(1, LoadFilm(34, Written("film", parts[first] + parts[then])));
        const int code = RunTest(QV_TEST_VIDEO_FLASH, false);
        EXPECT_THAT(code, AnyOf(1, -95));
        if (code != 1) {
          EXPECT_THAT(LogLines::Texts(),
                      Contains("[TestVideoFlash] the film in slot 34 has no frame that can be decoded"));
        }
        EXPECT_EQ(code == 1 ? -91 : -95, RunTest(QV_TEST_VIDEO_AUTOFOCUS, false));
      }
    }
  }
}

TEST_F(HostileFilms, CutOrSpoiltAnywhereTheyGiveWhatTheyHold) {
  std::mt19937 random(1);
  for (const auto& [name, options] : {std::pair{"a.mp4", kH264 + " -movflags +faststart"},
                                      {"b.mp4", kH264},
                                      {"a.mkv", kH264},
                                      {"a.ts", kH264},
                                      {"a.avi", std::string("-c:v mjpeg")},
                                      {"c.mp4", kH264 + " -movflags frag_keyframe+empty_moov -g 4"}}) {
    const std::string whole = ReadFile(WriteFilm(folder_.Path(name), Frames({64, 48}), options));
    int most = 0;
    for (int i = 0; i <= 96; ++i) {
      const std::size_t length = i <= 64 ? whole.size() * i / 64 : random() % whole.size();
      std::string bytes = whole.substr(0, length);
      if (i > 80) {
        bytes = whole;
        for (int k = 0; k < 8; ++k) bytes[random() % bytes.size()] = static_cast<char>(random());
      }
      const std::string path = Written(std::string("spoilt_") + name, bytes);
      const LogLines log;
      int code = LoadFilm(34, path);
      if (code == 1) {
        code = RunTest(QV_TEST_VIDEO_FLASH, false);
        EXPECT_THAT(RunTest(QV_TEST_VIDEO_PLAY, false), code == 1 ? -91 : code) << path << ' ' << i;
      }
      EXPECT_THAT(code, AnyOf(1, -95, -97)) << path << ' ' << i;
      EXPECT_TRUE(code == 1 || !LogLines::All().empty()) << path << ' ' << i;
      if (code == 1) most = std::max(most, Results().video_flash_frame_count_);
    }
    EXPECT_EQ(12, most) << name;
  }
}

}  // namespace
