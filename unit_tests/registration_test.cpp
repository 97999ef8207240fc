#include <gmock/gmock.h>

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "unit_tests/drawing.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

// What a camera sees that is shifted by (dx, dy).
cv::Mat View(const cv::Mat& scene, cv::Point shift) {
  return scene(cv::Rect(20 + shift.x, 20 + shift.y, 640, 480)).clone();
}

// Mean distance over a grid between where the registration puts a point and where a shift does.
double GridError(const cv::Mat& matrix, cv::Point shift) {
  std::vector<cv::Point2d> grid;
  for (int i = 0; i < 81; ++i) grid.emplace_back(i % 9 * 80, i / 9 * 60);
  std::vector<cv::Point2d> placed;
  cv::transform(grid, placed, matrix);
  double sum = 0;
  for (int i = 0; i < 81; ++i) sum += cv::norm(placed[i] - grid[i] + cv::Point2d(shift));
  return sum / 81;
}

TEST(Unwarp, ShiftedPicturesAreBroughtBack) {
  QVTester tester;
  std::vector<double> errors;
  for (unsigned seed = 1; seed <= 6; ++seed) {
    const cv::Mat scene = DrawScene(seed);
    const cv::Point shift(static_cast<int>(seed * 7 % 31) - 15, static_cast<int>(seed * 5 % 23) - 11);
    cv::Mat colour;
    cv::cvtColor(View(scene, shift), colour, cv::COLOR_GRAY2BGR);
    cv::Mat unwarped;
    cv::theRNG().state = seed;
    ASSERT_EQ(1, tester.GetUnwarpedImage(View(scene, {0, 0}), colour, unwarped));
    EXPECT_EQ(seed, cv::theRNG().state) << "the caller's random numbers are left alone";
    EXPECT_TRUE(unwarped.size() == cv::Size(640, 480) && unwarped.type() == CV_8UC3);
    errors.push_back(GridError(tester.kept_->unwarp.matrix, shift));
    if (seed > 1) continue;
    cv::Mat again;
    cv::theRNG().state = 99;
    ASSERT_EQ(1, tester.GetUnwarpedImage(View(scene, {0, 0}), colour, again));
    EXPECT_EQ(0, cv::norm(unwarped, again, cv::NORM_INF)) << "a search is repeatable";
  }
  // The method fixes the map by three matches: some pairs go wrong, most do not.
  std::sort(errors.begin(), errors.end());
  EXPECT_LT(errors[3], 3) << ::testing::PrintToString(errors);
}

TEST(Unwarp, TooLittleToSeeIsNoRegistration) {
  QVTester tester;
  const cv::Mat scene = View(DrawScene(1), {0, 0});
  const cv::Mat blank(480, 640, CV_8UC1, cv::Scalar(90));
  cv::Mat unwarped(3, 3, CV_8UC1, cv::Scalar(7));
  for (const cv::Mat& other : {blank, blank(cv::Rect(0, 0, 1, 1)).clone()}) {
    EXPECT_EQ(-90, tester.GetUnwarpedImage(scene, other, unwarped));
    EXPECT_EQ(-90, tester.GetUnwarpedImage(other, scene, unwarped));
  }
  EXPECT_EQ(cv::Size(3, 3), unwarped.size());
  EXPECT_TRUE(tester.DrawUnwarpMatches().empty());
  EXPECT_THROW(tester.GetUnwarpedImage(scene, cv::Mat(9, 9, CV_16UC1, cv::Scalar(0)), unwarped), cv::Exception);
  EXPECT_THROW(tester.GetUnwarpedImage(cv::Mat(), scene, unwarped), cv::Exception);
  ASSERT_EQ(1, tester.GetUnwarpedImage(scene, scene, unwarped));
  EXPECT_EQ(0, cv::norm(scene, unwarped, cv::NORM_INF)) << "an identical picture comes back itself";
  cv::theRNG().state = 1;  // of the lines' colours
  const cv::Mat drawing = tester.DrawUnwarpMatches().clone();
  ASSERT_EQ(cv::Size(1280, 480), drawing.size());
  cv::Mat reused = scene.clone();
  ASSERT_EQ(1, tester.GetUnwarpedImage(reused, reused, unwarped));
  reused.setTo(0);
  cv::theRNG().state = 1;
  EXPECT_EQ(0, cv::norm(drawing, tester.DrawUnwarpMatches(), cv::NORM_INF)) << "what was registered is drawn";
}

class ImageList : public ModuleTest {
 protected:
  std::string Write(int i) const { return folder_.Write(std::to_string(i) + ".png", View(scene_, {3 * i, -2 * i})); }
  static const QVTester::ImageList& Held() { return theTester->kept_->image_list; }

  cv::Mat scene_ = DrawScene(5);
  std::vector<std::string> files_ = {Write(0), Write(1), Write(2), Write(3)};
};

TEST_F(ImageList, PicturesAreRegisteredBinarisedAndTakenApart) {
  int components = 9;
  SetProperty(QV_PROPERTY_LIST_COMPONENTS, &components);
  ASSERT_EQ(1, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, files_));
  EXPECT_EQ(4, Held().components) << "no more components than images";
  ASSERT_EQ(cv::Size(640 * 480, 4), Held().matrix.size());
  cv::Mat levels;
  Held().matrix.convertTo(levels, CV_8U);
  EXPECT_EQ(0, cv::countNonZero((levels != 0) & (levels != 255)));

  cv::Mat smoothed;
  cv::medianBlur(View(scene_, {0, 0}), smoothed, 5);
  EXPECT_EQ(0, cv::norm(smoothed, Held().gray[0], cv::NORM_INF));
  const cv::Mat light = smoothed > cv::mean(smoothed)[0];
  EXPECT_EQ(0, cv::norm(light.reshape(1, 1), levels.row(0), cv::NORM_INF));
  // Registered pictures agree with the first but near edges, where the grey levels cross the mean.
  for (int i = 1; i < 4; ++i) EXPECT_LT(cv::countNonZero(levels.row(i) != levels.row(0)), 0.08 * 640 * 480) << i;

  // Each image is its mean and its components: rebuilt from all of them it is itself, within single precision.
  for (int i = 0; i < 4; ++i) {
    EXPECT_LT(cv::norm(theTester->RebuildListImage(i), Held().matrix.row(i).reshape(1, 480), cv::NORM_INF), 0.1) << i;
  }
  EXPECT_THROW(theTester->RebuildListImage(4), cv::Exception);
  EXPECT_NE(nullptr, theTester->resources_[36]);
  cv::Mat sum = cv::Mat::zeros(480, 640, CV_64F);
  for (const cv::Mat& image : Held().registered) cv::accumulate(image, sum);
  cv::Mat mean;
  sum.convertTo(mean, CV_8U, 0.25);
  EXPECT_EQ(0, cv::norm(mean, Held().combined, cv::NORM_INF));
  theTester->Initialize();
  EXPECT_TRUE(Held().gray.empty() && Held().matrix.empty()) << "the list goes with its slot";
}

TEST_F(ImageList, AFailureChangesNothing) {
  EXPECT_EQ(-97, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, {}));
  EXPECT_EQ(-97, SetResourceWithList(QV_RESOURCE_CHART_PHOTO, files_));
  EXPECT_EQ(nullptr, theTester->resources_[36]);
  ASSERT_EQ(1, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, {files_[0], files_[1]}));
  const cv::Mat held = Held().matrix.clone();

  folder_.Write("words.png", std::string("words"));
  folder_.Write("blank.png", cv::Mat(480, 640, CV_8UC1, cv::Scalar(9)));
  for (const auto& [bad, code] : {std::pair{"missing.png", -97}, {"words.png", -97}, {"blank.png", -90}}) {
    const LogLines log;
    EXPECT_EQ(code, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, {files_[2], folder_.Path(bad)}));
    EXPECT_THAT(LogLines::Texts(), ElementsAre(HasSubstr(folder_.Path(bad))));
  }
  EXPECT_EQ(0, cv::norm(held, Held().matrix, cv::NORM_INF));
}

TEST_F(ImageList, OtherSizesComeIntoTheFirstOnesFrame) {
  const std::string wide = folder_.Write("wide.png", scene_);
  ASSERT_EQ(1, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, {files_[0], wide}));
  EXPECT_EQ(cv::Size(640, 480), Held().registered[1].size());
  int none = 0;
  SetProperty(QV_PROPERTY_LIST_COMPONENTS, &none);
  ASSERT_EQ(1, SetResourceWithList(QV_RESOURCE_IMAGE_LIST, {wide})) << "a list of one";
  EXPECT_EQ(1, Held().components);
  EXPECT_EQ(0, cv::norm(Held().matrix.reshape(1, 520), theTester->RebuildListImage(0), cv::NORM_INF));
}

}  // namespace
