// Files that lead a decoder elsewhere, keep it waiting or ask for the whole memory; and all that must still be read.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <turbojpeg.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "unit_tests/film_file.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

class Files : public ModuleTest {
 protected:
  ~Files() override { QVResource::most_pixels_ = 200'000'000; }

  static int LoadInto(int slot, std::string path) {
    return SetResource(static_cast<QV_RESOURCE_INDEX>(slot), path.data());
  }

  // Refused as a photo, as a film and in a list of photos, each with one line that names it.
  static void ExpectRefused(const std::string& path) {
    for (const int slot : {17, 34, 36}) {
      const LogLines log;
      EXPECT_EQ(-97, slot == 36 ? SetResourceWithList(QV_RESOURCE_IMAGE_LIST, {path}) : LoadInto(slot, path)) << path;
      EXPECT_THAT(LogLines::Texts(), ElementsAre(HasSubstr(path))) << slot;
      EXPECT_EQ(nullptr, theTester->resources_[slot]) << path;
    }
  }
};

TEST_F(Files, EveryFormatIsReadUpToTheLimitOfPixels) {
  cv::Mat levels(37, 90, CV_32FC3);
  cv::randu(levels, 0, 1);
  cv::Mat picture;
  levels.convertTo(picture, CV_8U, 255);
  const cv::Mat gray(levels.size(), CV_8UC1, cv::Scalar(80));
  const std::pair<const char*, const cv::Mat&> files[] = {
      {"a.jpg", picture},  {"a.jp2", picture}, {"a.png", picture}, {"a.bmp", picture}, {"a.tif", levels},
      {"a.webp", picture}, {"a.ppm", picture}, {"a.pgm", gray},    {"a.pbm", gray},    {"a.pam", picture},
      {"a.ras", picture},  {"a.hdr", levels},  {"a.exr", levels},  {"a.pfm", levels}};
  for (const auto& [name, content] : files) {
    const std::string path = folder_.Write(name, content);
    QVResource::most_pixels_ = 37 * 90;
    ASSERT_EQ(1, LoadInto(17, path)) << name;
    const cv::Mat read = cv::imread(path, cv::IMREAD_COLOR | cv::IMREAD_IGNORE_ORIENTATION);
    EXPECT_EQ(0, cv::norm(Loaded(17), read, cv::NORM_INF)) << name;
    theTester->resources_[17].reset();
    QVResource::most_pixels_ = 37 * 90 - 1;
    ExpectRefused(path);
    QVResource::most_pixels_ = 0;  // headers alone are read: the sanitizers look on
    const std::string whole = ReadFile(path);
    for (std::size_t length = 0; length < std::min<std::size_t>(whole.size(), 600); ++length) {
      std::string reason;
      EXPECT_TRUE(QVResource::DecodePicture({whole.data(), whole.data() + length}, reason).empty());
    }
  }
}

TEST_F(Files, EveryFilmIsOpened) {
  const std::vector<cv::Mat> frames(12, cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(90)));
  const std::string h265 = "-c:v libx265 -x265-params log-level=none";
  for (const auto& [name, options] :
       std::vector<std::pair<std::string, std::string>>{{"a.mp4", kH264},
                                                        {"a.mov", kH264},
                                                        {"a.3gp", kH264},
                                                        {"a.mkv", kH264},
                                                        {"a.avi", kLossless},
                                                        {"a.ts", kH264},
                                                        {"a.m2ts", kH264},
                                                        {"a.mpg", "-c:v mpeg2video"},
                                                        {"a.webm", "-c:v libvpx"},
                                                        {"a.h264", kH264},
                                                        {"a.h265", h265},
                                                        {"a%03d.jpg", kH264 + " -f mp4 -update 1"}}) {
    ASSERT_EQ(1, LoadInto(34, WriteFilm(folder_.Path(name), frames, options))) << name;
    cv::VideoCapture film;
    cv::Mat frame;
    theTester->resources_[34]->GetVideo(&film);
    EXPECT_TRUE(film.read(frame) && frame.size() == cv::Size(64, 48)) << name;
  }
}

// As phones note how they were held: in the track's matrix, the second of the file.
TEST_F(Files, FilmsAreNotTurnedByTheirTags) {
  const std::vector<cv::Mat> frames(3, cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(90)));
  std::string film = ReadFile(WriteFilm(folder_.Path("a.mov"), frames, kH264));
  const std::string upright("\0\1\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\1\0\0", 20);
  const std::string turned("\0\0\0\0\0\1\0\0\0\0\0\0\xFF\xFF\0\0\0\0\0\0", 20);
  film.replace(film.find(upright, film.find("tkhd")), turned.size(), turned);
  ASSERT_EQ(1, LoadInto(34, folder_.Write("turned.mov", film)));
  cv::VideoCapture capture;
  theTester->resources_[34]->GetVideo(&capture);
  cv::Mat frame;
  EXPECT_TRUE(capture.read(frame) && frame.size() == cv::Size(64, 48));
}

TEST_F(Files, WhatIsNoPictureOrFilmReachesNoDecoder) {
  const std::string playlist = "#EXTM3U\n#EXTINF:1,\nother.ts\n";
  std::string raster = R"(<VRTDataset rasterXSize="9" rasterYSize="9"><!--)";
  raster.resize(140, ' ');
  raster += "DTED--><VRTRasterBand><SimpleSource><SourceFilename>/etc/passwd</SourceFilename></SimpleSource>";
  const std::vector<cv::Mat> frames(3, cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(90)));
  // What FFmpeg's own probing takes for a manifest before it takes it for a film.
  const std::string manifest =
      R"(profiles="urn:mpeg:dash:profile:isoff-on-demand:2011" type="static"><Period><AdaptationSet mimeType="video/mp4">)"
      R"(<Representation id="1" bandwidth="1"><BaseURL>)" +
      WriteFilm(folder_.Path("other.mp4"), frames, kH264) +
      "</BaseURL></Representation></AdaptationSet></Period></MPD>";
  std::string tagged = ReadFile(folder_.Write("a.bmp", cv::Mat(9, 20, CV_8UC3, cv::Scalar(3))));
  tagged.replace(140, 4, "DTED");
  std::string huge = ReadFile(folder_.Write("a.png", cv::Mat(9, 9, CV_8UC3)));
  huge.replace(16, 8, std::string("\0\0\x40\0\0\0\x40\0", 8));  // 16384 x 16384
  const std::pair<const char*, std::string> files[] = {
      {"vrt.png", raster},
      {"tagged.bmp", tagged},
      {"huge.png", huge},
      {"hls.avi", playlist},
      {"list.mp4", "ffconcat version 1.0\nfile '/etc/passwd'\n"},
      {"session.mp4", "v=0\nm=video 5000 RTP/AVP 96\n"},
      {"manifest.mp4", R"(<?xml version="1.0"?><MPD xmlns="urn:mpeg:dash:schema:mpd:2011"/>)"},
      {"hidden.mp4", "<!--free--><MPD xmlns=\"urn:mpeg:dash:schema:mpd:2011\" " + manifest},
      {"hidden.m2ts", "<!--G" + std::string(191, ' ') + "G" + std::string(191, ' ') +
                          "G--><MPD xmlns=\"urn:mpeg:dash:schema:mpd:2011\" " + manifest},
      {"drawing.png", R"(<svg xmlns="http://www.w3.org/2000/svg"><image href="/etc/passwd"/></svg>)"},
      {"none.tif", std::string("II*\0\x08\0\0\0\0\0", 10)},
      {"loop.jp2", std::string("\0\0\0\x0CjP  \r\n\x87\n\0\0\0\0junk", 20)},
      {"empty", ""},
  };
  for (const auto& [name, content] : files) ExpectRefused(folder_.Write(name, content));
}

TEST_F(Files, WhatIsNoFileEndsAtOnce) {
  const std::string pipe = folder_.Path("pipe.png");
  ASSERT_EQ(0, mkfifo(pipe.c_str(), 0600));
  const std::string link = folder_.Path("link.png");
  std::filesystem::create_symlink(pipe, link);
  for (const std::string& path : {pipe, link, std::string("/dev/zero"), std::string("/dev/tty"), folder_.Path("")}) {
    ExpectRefused(path);
  }
  // Nor is anything closed but what was opened: standard input, for one.
  const bool closed = fcntl(0, F_GETFD) < 0;
  if (closed) {
    ASSERT_EQ(0, open("/dev/null", O_RDONLY | O_CLOEXEC));
  }
  ExpectRefused(folder_.Path(""));
  EXPECT_LE(0, fcntl(0, F_GETFD));
  if (closed) close(0);
}

// An extended WebP file gives width and height less one, three bytes each.
TEST_F(Files, SizesOfExtendedWebPsAreReadInTheirOrder) {
  const std::string start = std::string("RIFF\x16\0\0\0WEBPVP8X\x0A\0\0\0\0\0\0\0", 24);
  const std::string large("\x1F\x4E\0", 3);  // 20000
  const std::string small("\x09\0\0", 3);
  std::string reason;
  for (const auto& [size, expected] : {std::pair{large + small, "not an image"},
                                       {small + large, "not an image"},
                                       {large + large, "too many pixels"}}) {
    const std::string file = start + size;
    EXPECT_TRUE(QVResource::DecodePicture({file.begin(), file.end()}, reason).empty());
    EXPECT_THAT(reason, HasSubstr(expected));
  }
}

// Rows stored from the top are a height below 0; of the oldest BMPs numbers have two bytes, of a big TIFF eight; a
// JPEG 2000's size is less its origin.
TEST_F(Files, SizesAreReadWhereTheirFormatsKeepThem) {
  std::string bmp = ReadFile(folder_.Write("a.bmp", cv::Mat(9, 20, CV_8UC3, cv::Scalar(3))));
  EXPECT_EQ(1, LoadInto(17, folder_.Write("top.bmp", bmp.replace(22, 4, "\xF7\xFF\xFF\xFF"))));
  const auto number = [](std::uint64_t value, int bytes, bool big) {
    std::string text;
    for (int i = 0; i < bytes; ++i) text += static_cast<char>(value >> 8 * (big ? bytes - 1 - i : i) & 255);
    return text;
  };
  const auto entry = [&](int tag) { return number(tag, 2, false) + number(4, 2, false) + number(1, 8, false); };
  const std::string tiff = "II+" + std::string("\0\x08\0\0\0", 5) + number(16, 8, false) + number(2, 8, false) +
                           entry(256) + number(20000, 8, false) + entry(257) + number(20000, 8, false);
  const auto jpeg_2000 = [&](int origin) {
    return "\xFF\x4F\xFF\x51" + number(41, 4, true) + number(40000, 4, true) + number(40000, 4, true) +
           number(origin, 4, true) + number(origin, 4, true);
  };
  const std::string old_bmp =
      "BM" + std::string(12, '\0') + number(12, 4, false) + number(20000, 2, false) + number(20000, 2, false);
  std::string reason;
  for (const auto& [file, expected] : {std::pair{tiff, "too many pixels"},
                                       {old_bmp, "too many pixels"},
                                       {std::string("P5\t20000\t20000\t255\n"), "too many pixels"},
                                       {jpeg_2000(9), "too many pixels"},
                                       {jpeg_2000(39990), "not an image that can be decoded"}}) {
    EXPECT_TRUE(QVResource::DecodePicture({file.begin(), file.end()}, reason).empty());
    EXPECT_THAT(reason, HasSubstr(expected));
  }
}

std::string JpegOf(const cv::Mat& picture, int sampling, int flags) {
  unsigned char* bytes = nullptr;
  unsigned long size = 0;
  void* const encoder = tjInitCompress();
  tjCompress2(encoder, picture.data, picture.cols, 0, picture.rows, TJPF_BGR, &bytes, &size, sampling, 90, flags);
  std::string file(reinterpret_cast<char*>(bytes), size);
  tjFree(bytes);
  tjDestroy(encoder);
  return file;
}

// Sound files and damaged ones take different roads, and end at the same pixels. A cut one is ended.
TEST_F(Files, JpegsOfEveryKindAreThoseOfImdecode) {
  const std::string kEnd = "\xFF\xD9";
  cv::Mat picture(61, 83, CV_8UC3);
  cv::randu(picture, 0, 256);
  cv::GaussianBlur(picture, picture, {}, 2);
  cv::RNG random(1);
  cv::Mat whole;
  int damaged = 0;
  for (int kind = 0; kind < 2 * TJ_NUMSAMP; ++kind) {
    const std::string sound = JpegOf(picture, kind / 2, kind % 2 == 0 ? 0 : TJFLAG_PROGRESSIVE);
    const std::size_t scan = sound.find("\xFF\xDA") + 14;
    for (int round = 0; round < 40; ++round) {
      std::string file = sound;
      const int at = random.uniform(static_cast<int>(scan), static_cast<int>(file.size()));
      if (round % 4 == 1) file.resize(static_cast<std::size_t>(at));
      if (round % 4 > 1) file[static_cast<std::size_t>(at)] = static_cast<char>(random.uniform(0, 256));
      std::string reason;
      const cv::Mat decoded = QVResource::DecodePicture({file.begin(), file.end()}, reason);
      if (file.compare(file.size() - 2, 2, kEnd) != 0) file += kEnd;
      const cv::Mat expected = cv::imdecode(std::vector<char>(file.begin(), file.end()), cv::IMREAD_COLOR);
      ASSERT_EQ(expected.size(), decoded.size()) << kind << ", " << round;
      if (expected.empty()) continue;
      ASSERT_EQ(0, cv::norm(expected, decoded, cv::NORM_INF)) << kind << ", " << round;
      if (round == 0) expected.copyTo(whole);
      damaged += cv::norm(expected, whole, cv::NORM_INF) > 0 ? 1 : 0;
    }
  }
  EXPECT_GT(damaged, 50);
}

// A header of the other byte order, as cameras write it: tag, type 3 or 4, count 1, value.
TEST_F(Files, SizesOfTiffsAreReadInBothByteOrders) {
  const std::string start = "MM" + std::string("\0*\0\0\0\x08\0\x02", 8);
  const auto entry = [](char tag, int value) {
    return std::string("\x01", 1) + tag + std::string("\0\x03\0\0\0\x01", 6) + static_cast<char>(value >> 8) +
           static_cast<char>(value & 255) + std::string(2, '\0');
  };
  std::string reason;
  for (const auto& [height, expected] :
       {std::pair{20000, "too many pixels"}, {9, "not an image that can be decoded"}}) {
    const std::string file = start + entry('\0', 20000) + entry('\1', height) + std::string(4, '\0');
    EXPECT_TRUE(QVResource::DecodePicture({file.begin(), file.end()}, reason).empty());
    EXPECT_THAT(reason, HasSubstr(expected));
  }
}

}  // namespace
