#include <gmock/gmock.h>

#include <filesystem>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "unit_tests/golden.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;

class Preview : public ModuleTest {
 protected:
  Preview() { SetHostPreviewFolder(folder_.Path("").c_str()); }
  ~Preview() override { SetHostPreviewFolder(nullptr); }
  static std::vector<float> Map(const QVPreviewResult& result) {
    return {result.preview_diff_map_, result.preview_diff_map_ + result.preview_diff_cols_ * result.preview_diff_rows_};
  }
};

TEST_F(Preview, TheDifferenceIsMeasuredAndScaled) {
  cv::Mat first(2, 3, CV_8UC3, cv::Scalar::all(100));
  cv::Mat second = first.clone();
  second.at<cv::Vec3b>(0, 1) = {49, 49, 49};
  second.at<cv::Vec3b>(1, 2) = {202, 202, 202};
  Load(14, first);
  Load(15, second);
  ASSERT_EQ(1, RunTest(QV_TEST_CAMERA_PREVIEW, false));
  const QVPreviewResult& result = Results().preview_main_;
  EXPECT_FLOAT_EQ((51 + 102) / 255.0f / 6, result.preview_diff_mean_);
  EXPECT_THAT(Map(result), ElementsAre(0, 0.5f, 0, 0, 0, 1));
  EXPECT_EQ(nullptr, Results().preview_front_.preview_diff_map_);

  Load(15, cv::Mat(2, 4, CV_8UC3, cv::Scalar(1)));
  const LogLines log;
  EXPECT_EQ(1, RunTest(QV_TEST_CAMERA_PREVIEW, false));
  EXPECT_EQ("[OKAPI] image size does not match", LogLines::Texts().back());
  Load(15, cv::Mat(2, 3, CV_16UC3, cv::Scalar(1)));
  EXPECT_EQ(-95, RunTest(QV_TEST_CAMERA_PREVIEW, false)) << "frames of different depths";
  EXPECT_THAT(Map(result), ElementsAre(0, 0.5f, 0, 0, 0, 1));
}

TEST_F(Preview, IdenticalFramesGiveNoNumbers) {
  for (const int slot : {21, 22}) Load(slot, cv::Mat(4, 4, CV_8UC4, cv::Scalar::all(77)));
  for (int run = 0; run < 2; ++run) {
    ASSERT_EQ(1, RunTest(QV_TEST_CAMERA_PREVIEW_2, false));
    EXPECT_EQ(0.0f, Results().preview_front_.preview_diff_mean_);
    EXPECT_THAT(Map(Results().preview_front_), Each(::testing::IsNan()));
  }
}

TEST_F(Preview, ASecondMapTakesThePlaceOfTheFirst) {  // in its memory where it fits
  for (const auto& [size, level] : {std::pair{cv::Size(40, 30), 51}, {{40, 30}, 102}, {{30, 40}, 204}, {{9, 2}, 51}}) {
    Load(14, cv::Mat(size, CV_8UC3, cv::Scalar::all(level)));
    Load(15, cv::Mat(size, CV_8UC4, cv::Scalar::all(0)));
    ASSERT_EQ(1, RunTest(QV_TEST_CAMERA_PREVIEW, false));
    const QVPreviewResult& result = Results().preview_main_;
    ASSERT_EQ(size, cv::Size(result.preview_diff_cols_, result.preview_diff_rows_));
    EXPECT_FLOAT_EQ(static_cast<float>(level) / 255, result.preview_diff_mean_);
    EXPECT_THAT(Map(result), Each(1));
    EXPECT_EQ(level, cv::norm(Loaded(14), cv::NORM_INF)) << "the photo stays as it is";
  }
}

TEST_F(Preview, ThreeMarksArePublished) {
  EXPECT_EQ(-98, CheckPatternCircles(0));
  Load(17, DrawChart());
  EXPECT_EQ(1, CheckPatternCircles(1));
  EXPECT_FALSE(std::filesystem::exists(store_)) << "another camera publishes nothing";
  EXPECT_EQ(1, CheckPatternCircles(0));
  EXPECT_EQ("3", Property("t82.vi_c_num_main"));
  EXPECT_THAT((std::array{Property("t82.vi_circle_loc_0_0"), Property("t82.vi_circle_loc_0_1"),
                          Property("t82.vi_circle_loc_0_2"), Property("t82.vi_center_loc_0")}),
              ElementsAre("151,151", "151,848", "848,151", "499,499"));
  EXPECT_EQ(1, CheckPatternCircles(2));
  EXPECT_EQ("3", Property("t82.vi_c_num_mw"));
  EXPECT_EQ("499,499", Property("t82.vi_center_loc_2"));

  Load(17, DrawChart({2}));
  EXPECT_EQ(0, CheckPatternCircles(0));
  EXPECT_EQ("2", Property("t82.vi_c_num_main"));
  EXPECT_EQ("0,0", Property("t82.vi_center_loc_0"));
  EXPECT_EQ("848,151", Property("t82.vi_circle_loc_0_2")) << "points of an earlier run are not cleared";
  ExpectGolden("log_circles", LogLines::Text());
  Load(17, cv::Mat(20, 20, CV_16UC3, cv::Scalar::all(9)));
  EXPECT_EQ(-95, CheckPatternCircles(0));
}

TEST_F(Preview, TheCentreIsTheMiddleOfTheLongestSide) {
  const LogLines log;
  const auto centre = [&](std::vector<cv::Point> points) {
    EXPECT_EQ(0, theTester->GetImageCenter(points, 0));
    return Property("t82.vi_center_loc_0");
  };
  EXPECT_EQ("-5,5", centre({{0, 0}, {0, 10}, {-11, 10}})) << "cut toward zero";
  ExpectGolden("log_centre", LogLines::Text());
  EXPECT_EQ("0,10", centre({{0, 0}, {0, 10}, {0, 20}}));
  EXPECT_EQ("0,8", centre({{0, 0}, {6, 8}, {0, 16}})) << "of a middle one";
  EXPECT_EQ("20,5", centre({{0, 0}, {40, 10}, {0, 20}})) << "of two alike the first";
  EXPECT_EQ("4,4", centre({{4, 4}, {4, 5}, {4, 4}})) << "of a side of one pixel";
  EXPECT_EQ("0,0", centre({{4, 4}, {4, 4}, {4, 4}})) << "no side is longer than none";
  EXPECT_EQ("0,0", centre({{0, 0}, {0, 10}, {8, 5}, {4, 2}})) << "four points have no centre";
  EXPECT_EQ("4,2", Property("t82.vi_circle_loc_0_3"));
  EXPECT_EQ("0,0", centre({}));
  SetHostPropertyStore(folder_.Path("no/store").c_str());
  EXPECT_EQ("0,0", centre({{0, 0}, {0, 10}, {0, 20}})) << "publishing is nobody's failure";
}

TEST_F(Preview, LongKeysAreCutNotOverrun) {
  std::vector<cv::Point> points(11, {INT_MIN, INT_MIN});
  points[10] = {6, 7};
  theTester->GetImageCenter(points, INT_MIN);
  EXPECT_EQ("-2147483648,-2147483648", Property("t82.vi_circle_loc_-2147483648_0"));
  EXPECT_EQ("6,7", Property("t82.vi_circle_loc_-2147483648_1")) << "the last digit of 10 has no room";
  EXPECT_EQ("0,0", Property("t82.vi_center_loc_-2147483648"));
}

TEST_F(Preview, SavedFramesShareAFileByThrees) {
  std::vector<unsigned char> frame(64 * 72, 128);
  for (const int number : {0, 2, 3, 5}) EXPECT_EQ(1, SavePreview(frame.data(), number, 64, 48));
  for (const char* file : {"vi_pview_0.jpg", "vi_pview_1.jpg"}) {
    EXPECT_EQ(cv::Size(64, 48), cv::imread(folder_.Path(file)).size());
  }
  EXPECT_FALSE(std::filesystem::exists(folder_.Path("vi_pview_2.jpg")));
  EXPECT_NE(std::filesystem::perms::none,
            std::filesystem::status(folder_.Path("vi_pview_0.jpg")).permissions() & std::filesystem::perms::others_read)
      << "others look at them";
  EXPECT_EQ(-95, SavePreview(frame.data(), 0, 63, 48));
  EXPECT_EQ(-97, SavePreview(nullptr, 0, 64, 48));
  EXPECT_EQ(-97, SavePreview(frame.data(), 0, 0, 48));
  const std::string victim = folder_.Write("victim", std::string("words"));
  std::filesystem::create_symlink(victim, folder_.Path("vi_pview_7.jpg"));
  std::filesystem::create_directory(folder_.Path("vi_pview_8.jpg"));
  for (const int number : {21, 24}) EXPECT_EQ(1, SavePreview(frame.data(), number, 64, 48));
  EXPECT_EQ("words", ReadFile(victim)) << "a link is replaced, not followed";
  EXPECT_EQ(cv::Size(64, 48), cv::imread(folder_.Path("vi_pview_7.jpg")).size());
  for (const auto& entry : std::filesystem::directory_iterator(folder_.Path(""))) {
    EXPECT_NE('.', entry.path().filename().string()[0]) << "what was written aside is gone";
  }
  std::filesystem::create_directory_symlink(folder_.Path(""), folder_.Path("linked"));
  for (const std::string& folder : {folder_.Path("missing"), folder_.Path("linked"), std::string(200, 'x')}) {
    SetHostPreviewFolder(folder.c_str());
    EXPECT_EQ(1, SavePreview(frame.data(), 30, 64, 48)) << "a failed write is silent";
  }
  EXPECT_FALSE(std::filesystem::exists(folder_.Path("vi_pview_10.jpg"))) << "nor is a linked folder followed";
}

}  // namespace
