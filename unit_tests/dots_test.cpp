#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "qvtester/tester.h"
#include "unit_tests/agreement_test.h"

namespace {

using plain::ErrorArea;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

// Channel 0 of a capture; the other channels must not matter.
struct HdrPicture {
  int height, width;
  std::vector<float> data;

  HdrPicture(int height, int width, float level) : height(height), width(width), data(3 * height * width, NAN) {
    for (int i = 0; i < height * width; ++i) data[3 * i] = level;
  }
  float& at(int row, int column) { return data[3 * (row * width + column)]; }
  std::vector<cv::Point> Flagged(float threshold, int radius) {
    QVTester tester;
    std::vector<unsigned char> mask(height * width, 0);
    tester.DetectDot(data.data(), height, width, threshold, radius, mask.data());
    std::vector<cv::Point> flagged;
    for (int i = 0; i < height * width; ++i) {
      EXPECT_LE(mask[i], 1);
      if (mask[i] == 1) flagged.emplace_back(i % width, i / width);
    }
    return flagged;
  }
};

TEST(Dots, APixelIsHeldAgainstItsLocalMean) {
  const LogLines log;
  HdrPicture capture(20, 30, 4);
  EXPECT_THAT(capture.Flagged(1e-6f, 2), IsEmpty()) << "small whole numbers sum exactly";
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[OKAPI] OpenMP #1 Start", "[OKAPI] OpenMP #1 End"));
  capture.at(7, 11) = 8;  // mean 4.16: the dot is 92 % off, its neighbours 3.8 %
  EXPECT_THAT(capture.Flagged(0.5f, 2), ElementsAre(cv::Point(11, 7)));
  EXPECT_THAT(capture.Flagged(0.93f, 2), IsEmpty());
  EXPECT_THAT(capture.Flagged(0.03f, 2), SizeIs(25)) << "all whose window holds the dot";
}

TEST(Dots, SmallPicturesAreLoggedAndLeftAlone) {
  const LogLines log;
  EXPECT_THAT(HdrPicture(4, 30, 4).Flagged(0, 2), IsEmpty());
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[DetectDot] a picture of 30 x 4 is smaller than the window of radius 2"));
  EXPECT_THAT(HdrPicture(30, 4, 4).Flagged(0, 2), IsEmpty());
  EXPECT_THAT(HdrPicture(5, 5, 4).Flagged(0, INT_MAX), IsEmpty());
  EXPECT_THAT(HdrPicture(5, 5, 4).Flagged(0, -1), IsEmpty());
}

TEST(Dots, AreThoseOfTheWholeTable) { ExpectAgreement(plain::Dots, 4000, 0.05, 0.5); }

// At the dot's departure to the last bit, where the undivided test alone would be a few roundings off.
TEST(Dots, AreExactAtTheThreshold) {
  const LogLines log;
  cv::RNG random(5);
  const float levels[] = {1, 40000, 1e-38f, 1e-41f};
  const float factors[] = {1 + 3e-5f, 1.2f, 0.3f, 5, -1, 9};
  for (int round = 0; round < 300; ++round) {
    const int radius = 1 + round % 3;
    const int side = 2 * radius + 1;
    HdrPicture capture(9, 60, levels[round % 4] * random.uniform(0.5f, 1.0f));
    capture.at(4, 20) *= factors[round % 6] * random.uniform(0.5f, 1.0f);
    const cv::Mat_<float> sums = plain::SumChannel0(capture.data.data(), 9, 60);
    const cv::Point dot(20, 4);
    const cv::Point from = dot - cv::Point(radius, radius);
    const cv::Point to = from + cv::Point(side, side);
    const float sum = sums(to) + sums(from) - sums(from.y, to.x) - sums(to.y, from.x);
    const float mean = sum / static_cast<float>(side * side);
    const float departure = std::fabs((mean - capture.at(4, 20)) / mean);
    EXPECT_THAT(capture.Flagged(std::nextafter(departure, 0.0f), radius), Contains(dot)) << round;
    EXPECT_THAT(capture.Flagged(departure, radius), Not(Contains(dot))) << round;
  }
}

TEST(Dots, HdrPicturesAreStretchedForTheEye) {
  QVTester tester;
  cv::Mat hdr = (cv::Mat_<cv::Vec3f>(1, 3) << cv::Vec3f(-2, 0, 1), cv::Vec3f(8, 0, 1), cv::Vec3f(3, 0, 1));
  const cv::Mat before = hdr.clone();
  const cv::Mat_<uchar> expected = (cv::Mat_<uchar>(1, 3) << 0, 255, 128);  // 127.5, to the even one
  EXPECT_EQ(0, cv::norm(expected, tester.HDR2UCHAR(hdr), cv::NORM_INF));
  EXPECT_EQ(0, cv::norm(before, hdr, cv::NORM_INF));
  cv::Mat constant(2, 2, CV_32FC3, cv::Scalar::all(7));
  EXPECT_EQ(0, cv::countNonZero(tester.HDR2UCHAR(constant)));
  cv::Mat none;
  EXPECT_THROW(tester.HDR2UCHAR(none), cv::Exception);
}

TEST(Areas, TheFirstCloseOneTakesAll) {
  const std::vector<ErrorArea> areas = {
      {{0, 0}, {3, 3}, 1, 0},
      {{20, 0}, {23, 3}, 10, 0},
      {{10, 0}, {13, 3}, 100, 0},  // close to both; joins the first, which then reaches the second
      {{90, 70}, {93, 73}, 1000, 0}};
  const ErrorArea all = {{0, 0}, {23, 3}, 111, 0};
  const ErrorArea far = {{90, 70}, {93, 73}, 1000, 1};  // its index in the pass before the last
  EXPECT_THAT(plain::ClusterByTester(16, 100, 80, areas), ElementsAre(all, far));
}

TEST(Areas, GrowthEndsAtTheImage) {
  const std::vector<ErrorArea> areas = {{{0, 10}, {0, 10}, 1, 0}, {{0, 11}, {0, 11}, 1, 1}};
  EXPECT_EQ(areas, plain::ClusterByTester(20, 1, 80, areas)) << "one shared column is not enough";
}

TEST(Areas, CountsAreOptionalAndOneAreaIsLeftAsItIs) {
  const std::vector<ErrorArea> one = {{{10, 10}, {10, 10}, 2, 0}};
  EXPECT_EQ(one, plain::ClusterByTester(8, 100, 80, one));
  std::vector<int> areas(2);
  auto* first = static_cast<cv::Point*>(std::calloc(2, sizeof(cv::Point)));
  auto* last = static_cast<cv::Point*>(std::calloc(2, sizeof(cv::Point)));
  EXPECT_EQ(1, QVTester().ErrorAreaClustering(4, 10, 10, &areas, nullptr, &first, &last));
  std::free(first);
  std::free(last);
  areas.clear();
  EXPECT_EQ(0, QVTester().ErrorAreaClustering(8, 10, 10, &areas, nullptr, nullptr, nullptr));
}

TEST(Areas, ChangedAreasAreAllThatNeedsASecondLook) { ExpectAgreement(plain::Areas, 400, 0.1); }

}  // namespace
