#include <gmock/gmock.h>

#include <climits>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "unit_tests/module_test.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

QV_RESOURCE_INDEX Slot(int slot) { return static_cast<QV_RESOURCE_INDEX>(slot); }

class Resources : public ModuleTest {
 protected:
  static int LoadFile(int slot, std::string path) { return SetResource(Slot(slot), path.data()); }
  static bool Filled(int slot) { return theTester->resources_[slot] != nullptr; }

  std::string photo_ = folder_.Write("photo.png", cv::Mat(4, 6, CV_8UC3, cv::Scalar(1, 2, 3)));
};

TEST_F(Resources, SlotsAreSetAndReleasedByTheirOwnFunctions) {
  float hdr[3] = {};
  unsigned short ldr[3] = {};
  for (int slot = -1; slot <= 37; ++slot) {
    const bool of_hdr = slot >= 0 && slot <= 13;
    const bool of_ldr = slot >= 14 && slot <= 35;
    EXPECT_EQ(of_hdr ? 1 : -97, SetHDRResource(Slot(slot), 1, 1, true, hdr)) << slot;
    EXPECT_EQ(of_ldr ? 1 : -97, SetLDRResource(Slot(slot), 1, 1, ldr)) << slot;
    for (int time = 0; time < 2; ++time) EXPECT_EQ(of_hdr ? 1 : -97, ReleaseImage(Slot(slot))) << slot;
    EXPECT_EQ(of_ldr, of_ldr && Filled(slot)) << slot;
    EXPECT_FALSE(of_hdr && Filled(slot)) << slot;
    if (slot == 34 || slot == 35) continue;  // a film's
    EXPECT_EQ(of_ldr ? 1 : -97, LoadFile(slot, photo_)) << slot;
  }
}

TEST_F(Resources, ImageFilesBecomeEightBitColour) {
  for (const auto& [type, level] : {std::pair{CV_8UC1, 7}, {CV_16UC3, 0x1234}, {CV_8UC4, 9}}) {
    ASSERT_EQ(1, LoadFile(20, folder_.Write("image.png", cv::Mat(4, 6, type, cv::Scalar::all(level)))));
    ASSERT_EQ(CV_8UC3, Loaded(20).type());
    EXPECT_EQ(level < 256 ? level : level >> 8, Loaded(20).at<cv::Vec3b>(0, 0)[1]);
  }
}

TEST_F(Resources, OrientationTagsDoNotTurnThePhotoAndACutOneCounts) {
  cv::Mat noise(80, 160, CV_8UC3);
  cv::randu(noise, 0, 255);
  std::vector<uchar> jpeg;
  cv::imencode(".jpg", noise, jpeg);
  const unsigned char exif[] = {
      0xFF, 0xE1, 0,    34,   'E', 'x', 'i', 'f', 0, 0, 'M', 'M', 0, 42, 0, 0, 0, 8,
      0,    1,    0x01, 0x12, 0,   3,   0,   0,   0, 1, 0,   6,   0, 0,  0, 0, 0, 0};  // turn by 90 degrees
  jpeg.insert(jpeg.begin() + 2, std::begin(exif), std::end(exif));
  ASSERT_EQ(cv::Size(80, 160), cv::imdecode(jpeg, cv::IMREAD_COLOR).size()) << "the tag is not understood";
  for (const std::size_t length : {jpeg.size(), jpeg.size() / 2}) {
    ASSERT_EQ(1, LoadFile(17, folder_.Write("photo.jpg", std::string(jpeg.begin(), jpeg.begin() + length))));
    EXPECT_EQ(cv::Size(160, 80), Loaded(17).size());
  }
}

TEST_F(Resources, RefusedFilesLeaveTheSlotAndOneLine) {
  const std::string bad[] = {folder_.Write("empty.png", std::string()),
                             folder_.Write("cut.png", ReadFile(photo_).substr(0, 20)),
                             folder_.Write("words.jpg", std::string("this is no image")), folder_.Path("")};
  for (const bool filled : {false, true}) {
    if (filled) LoadFile(20, photo_);
    for (const std::string& path : bad) {
      const LogLines log;
      EXPECT_EQ(-97, LoadFile(20, path)) << path;
      EXPECT_THAT(LogLines::Texts(), ElementsAre(HasSubstr(path)));
    }
    EXPECT_EQ(-97, LoadFile(20, folder_.Path("missing.png")));
    EXPECT_EQ(filled, Filled(20));
  }
  EXPECT_EQ(cv::Vec3b(1, 2, 3), Loaded(20).at<cv::Vec3b>(3, 5));
}

TEST_F(Resources, VideosOpenInTheirOwnSlots) {
  const std::string path = folder_.Path("film.avi");
  {
    cv::VideoWriter writer(path, cv::CAP_OPENCV_MJPEG, cv::VideoWriter::fourcc('M', 'J', 'P', 'G'), 10, {64, 48});
    for (int i = 0; i < 3; ++i) writer.write(cv::Mat(48, 64, CV_8UC3, cv::Scalar::all(80 * i)));
  }
  ASSERT_EQ(1, LoadFile(34, path));
  cv::VideoCapture video;
  theTester->resources_[34]->GetVideo(&video);
  cv::Mat frame;
  ASSERT_TRUE(video.read(frame));
  EXPECT_EQ(cv::Size(64, 48), frame.size());

  EXPECT_EQ(-97, LoadFile(34, folder_.Write("words.avi", std::string("no film"))));
  EXPECT_TRUE(video.read(frame)) << "the open film must go on";
  EXPECT_FALSE(Filled(35));
}

TEST_F(Resources, PreviewFramesAreConvertedOrRefused) {
  std::vector<unsigned char> frame(640 * 720, 128);  // neutral chroma, grey luma
  std::fill_n(frame.begin(), 640 * 480, static_cast<unsigned char>(126));
  void* const data = frame.data();
  ASSERT_EQ(1, SetResource(Slot(14), 640, 480, data));
  for (const int slot : {14, 15}) {
    for (const cv::Size size : {cv::Size(639, 480), cv::Size(640, 3), cv::Size(2, INT_MAX)}) {
      EXPECT_EQ(-95, SetResource(Slot(slot), size.width, size.height, data)) << size;
    }
  }
  EXPECT_FALSE(Filled(15));
  ASSERT_EQ(cv::Size(640, 480), Loaded(14).size());
  ASSERT_EQ(CV_8UC4, Loaded(14).type());
  EXPECT_EQ(cv::Vec4b(128, 128, 128, 255), Loaded(14).at<cv::Vec4b>(479, 639));  // 1.164 (126 - 16)
  EXPECT_EQ(1, SetResource(Slot(0), 2, 4, data)) << "any slot takes a preview frame";
  EXPECT_EQ(-97, SetResource(Slot(37), 2, 4, data));
}

TEST_F(Resources, BuffersAreCopied) {
  unsigned short levels[] = {1, 2, 3, 65535, 5, 6};
  ASSERT_EQ(1, SetLDRResource(Slot(17), 2, 1, levels));
  levels[0] = 0;
  EXPECT_EQ(0, cv::norm(Loaded(17), cv::Mat_<cv::Vec3w>({1, 2}, {{1, 2, 3}, {65535, 5, 6}}), cv::NORM_INF));

  float pixels[] = {1, 2, 3, 4, 5, 6};
  ASSERT_EQ(1, SetHDRResource(Slot(5), 1, 2, true, pixels));
  pixels[5] = 0;
  EXPECT_EQ(-99, SetHDRResource(Slot(5), INT_MAX, INT_MAX, false, pixels)) << "no product of sizes wraps";
  float* held = nullptr;
  int width = 0;
  theTester->resources_[5]->GetHDRImage(&held);
  theTester->resources_[5]->GetHDRWidth(&width);
  EXPECT_EQ(6.0f, held[5]);
  EXPECT_TRUE(width == 1 && theTester->hdr_height_ == 2 && theTester->hdr_flag_);
}

TEST_F(Resources, BadArgumentsAreRefused) {
  unsigned short ldr[3] = {};
  EXPECT_EQ(-97, SetLDRResource(Slot(20), 0, 1, ldr));
  EXPECT_EQ(-97, SetLDRResource(Slot(20), 1, -1, ldr));
  EXPECT_EQ(-97, SetLDRResource(Slot(20), 1, 1, nullptr));
  EXPECT_EQ(-97, SetResource(Slot(20), nullptr));
  EXPECT_EQ(-97, SetResource(Slot(20), 2, 2, static_cast<void*>(nullptr)));
  EXPECT_EQ(-99, SetLDRResource(Slot(20), INT_MAX, INT_MAX, ldr));
  EXPECT_EQ(-99, SetLDRResource(Slot(20), 1 << 20, 1 << 20, ldr)) << "OpenCV's own out of memory";
  EXPECT_FALSE(Filled(20));
}

TEST_F(Resources, AStandardImageOverridesItsReferenceValues) {
  for (const auto& [slot, property] : {std::pair{18, 91}, {25, 92}}) {
    std::array<float, 72> values;
    for (const int index : {91, 92}) {
      values.fill(static_cast<float>(index));
      ASSERT_EQ(1, SetProperty(static_cast<QV_PROPERTY_INDEX>(index), values.data()));
    }
    GetProperty(static_cast<QV_PROPERTY_INDEX>(property), values.data());
    EXPECT_THAT(values, Each(static_cast<float>(property)));
    EXPECT_EQ(-97, LoadFile(slot, folder_.Write("words.png", std::string("words"))));
    EXPECT_TRUE(theTester->ref_patch_values_0_set_ && theTester->ref_patch_values_1_set_);
    ASSERT_EQ(1, LoadFile(slot, photo_));
    EXPECT_EQ(property == 91, theTester->ref_patch_values_0_set_);
    EXPECT_EQ(property == 92, theTester->ref_patch_values_1_set_);
  }
}

}  // namespace
