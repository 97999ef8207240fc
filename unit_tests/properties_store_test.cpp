#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "platform/jpeg.h"
#include "platform/properties.h"
#include "qvtester/host_properties.h"
#include "unit_tests/drawing.h"

namespace {

class Store : public ::testing::Test {
 protected:
  Store() { SetHostPropertyStore(path_.c_str()); }
  ~Store() override { SetHostPropertyStore(nullptr); }
  static std::string Get(const char* key, const char* fallback = "") {
    char value[platform::kPropertyValueMax];
    const int length = platform::property_get(key, value, fallback);
    EXPECT_EQ(static_cast<std::size_t>(length), std::string(value).size());
    return value;
  }
  TemporaryFolder folder_;
  std::string path_ = folder_.Path("p");
};

TEST_F(Store, ValuesUpToNinetyOneBytesAreKept) {
  EXPECT_EQ("none", Get("a.key", "none"));
  const std::string longest(91, 'v');
  EXPECT_EQ(0, platform::property_set("a.key", longest.c_str()));
  EXPECT_EQ(longest, ReadFile(path_ + "/a.key")) << "the bare value, for `cat`";
  EXPECT_GT(0, platform::property_set("a.key", std::string(92, 'w').c_str()));
  EXPECT_EQ(longest, Get("a.key"));
  EXPECT_EQ(0, platform::property_set("a.key", ""));
  EXPECT_EQ("default", Get("a.key", "default")) << "an empty value gives the default";
  EXPECT_EQ(std::string(91, 'd'), Get("b.key", std::string(200, 'd').c_str()));
  const std::filesystem::directory_iterator files(path_);
  EXPECT_EQ(1, std::distance(begin(files), end(files))) << "nothing is left beside the key";
}

TEST_F(Store, KeysStayInTheirDirectory) {
  folder_.Write("outside", std::string("secret"));
  for (const char* key : {"../outside", "a/b", "..", ".", "", "/etc/passwd", ".fresh-1"}) {
    EXPECT_GT(0, platform::property_set(key, "x")) << key;
    EXPECT_EQ("", Get(key)) << key;
  }
  EXPECT_EQ("secret", ReadFile(folder_.Path("outside")));
  EXPECT_EQ(0, platform::property_set("a..b c%d", "odd but harmless"));
  EXPECT_EQ("odd but harmless", Get("a..b c%d"));
  for (const std::size_t length : {256, 5000})
    EXPECT_GT(0, platform::property_set(std::string(length, 'k').c_str(), "x"));
  const std::filesystem::directory_iterator files(path_);
  EXPECT_EQ(1, std::distance(begin(files), end(files))) << "nothing is left of a name that is too long";
}

TEST_F(Store, WhatIsNoValueIsNeitherReadNorFollowed) {
  ASSERT_EQ(0, platform::property_set("k", "own"));
  ASSERT_EQ(0, mkfifo((path_ + "/pipe").c_str(), 0600));
  std::filesystem::create_directory(path_ + "/folder");
  for (const char* key : {"pipe", "folder"}) {  // and nobody waits for the pipe's other end
    EXPECT_GT(0, platform::property_set(key, "x")) << key;
    EXPECT_EQ("none", Get(key, "none")) << key;
  }
  std::filesystem::create_symlink(folder_.Write("outside", std::string("secret")), path_ + "/link");
  EXPECT_EQ("none", Get("link", "none"));
  EXPECT_EQ(0, platform::property_set("link", "x"));
  EXPECT_EQ("x", Get("link"));
  EXPECT_EQ("secret", ReadFile(folder_.Path("outside")));
  const std::filesystem::directory_iterator files(path_);
  EXPECT_EQ(4, std::distance(begin(files), end(files))) << "what was written aside is gone";
  for (const mode_t others : {0720, 0702}) {
    ASSERT_EQ(0, chmod(path_.c_str(), others));
    EXPECT_GT(0, platform::property_set("k", "x")) << std::oct << others;
    EXPECT_EQ("none", Get("k", "none"));
  }
}

TEST_F(Store, WhatIsNotItsOwnIsNoStore) {
  EXPECT_EQ(-97, SetHostPropertyStore(""));
  std::filesystem::create_directory_symlink(path_, folder_.Path("link"));
  for (const char* end : {"", "/", "/.", "//./"}) {  // a link however it is spelled
    SetHostPropertyStore((path_ + end).c_str());
    EXPECT_EQ(0, platform::property_set("k", "own")) << end;
    SetHostPropertyStore((folder_.Path("link") + end).c_str());
    EXPECT_GT(0, platform::property_set("k", "other")) << end;
  }
  SetHostPropertyStore(path_.c_str());
  struct stat status = {};
  ASSERT_EQ(0, stat(path_.c_str(), &status));
  EXPECT_EQ(0700u, status.st_mode & 0777u);
  if (geteuid() == 0) {
    ASSERT_EQ(0, chown(path_.c_str(), 12345, 12345));
    EXPECT_GT(0, platform::property_set("k", "other"));
  }
  EXPECT_EQ("own", ReadFile(path_ + "/k"));
}

// The fast road, which damaged files and those of other colours leave to OpenCV.
TEST(Jpeg, SoundOnesNeedNoOtherDecoder) {
  cv::Mat picture(16, 24, CV_8UC3, cv::Scalar(200, 90, 30));
  std::vector<unsigned char> file;
  cv::imencode(".jpg", picture, file);
  const cv::Mat decoded = platform::DecodeSoundJpeg(file);
  ASSERT_EQ(picture.size(), decoded.size());
  EXPECT_EQ(0, cv::norm(cv::imdecode(file, cv::IMREAD_COLOR), decoded, cv::NORM_INF));
  file.resize(file.size() - 8);
  EXPECT_TRUE(platform::DecodeSoundJpeg(file).empty());
}

}  // namespace
