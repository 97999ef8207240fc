#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "qvtester/tester.h"
#include "unit_tests/log_lines.h"
#include "unit_tests/plain/error_areas.h"
#include "unit_tests/plain/hdr_dots.h"

namespace {

using plain::ErrorArea;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

// Channel 0 of a capture; the other channels must not matter.
struct Capture {
  int height, width;
  std::vector<float> data;

  Capture(int height, int width, float level) : height(height), width(width), data(3 * height * width, NAN) {
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
  Capture capture(20, 30, 4);
  EXPECT_THAT(capture.Flagged(1e-6f, 2), IsEmpty()) << "small whole numbers sum exactly";
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[OKAPI] OpenMP #1 Start", "[OKAPI] OpenMP #1 End"));
  capture.at(7, 11) = 8;  // mean 4.16: the dot is 92 % off, its neighbours 3.8 %
  EXPECT_THAT(capture.Flagged(0.5f, 2), ElementsAre(cv::Point(11, 7)));
  EXPECT_THAT(capture.Flagged(0.93f, 2), IsEmpty());
  EXPECT_THAT(capture.Flagged(0.03f, 2), SizeIs(25)) << "all whose window holds the dot";
}

TEST(Dots, SmallPicturesAreLoggedAndLeftAlone) {
  const LogLines log;
  EXPECT_THAT(Capture(4, 30, 4).Flagged(0, 2), IsEmpty());
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[DetectDot] a picture of 30 x 4 is smaller than the window of radius 2"));
  EXPECT_THAT(Capture(30, 4, 4).Flagged(0, 2), IsEmpty());
  EXPECT_THAT(Capture(5, 5, 4).Flagged(0, INT_MAX), IsEmpty());
  EXPECT_THAT(Capture(5, 5, 4).Flagged(0, -1), IsEmpty());
}

TEST(Dots, AreThoseOfTheWholeTable) {
  const LogLines log;
  // From the smallest to the largest, so that every guard of the undivided test is met.
  constexpr float kLevels[] = {0, 1e-45f, 1e-38f, 3e-37f, 1e-6f, 1, 100, 1e6f, 1e30f, 3e38f};
  constexpr float kOdd[] = {0, -0.0f, NAN, INFINITY, -INFINITY, 3e38f, -3e38f, 1e-45f, -1};
  constexpr float kThresholds[] = {0, -1, 1e-7f, 1.1e-6f, 0.01f, 0.1f, 0.5f, 1, 3, 10, 1e38f, NAN, INFINITY};
  cv::RNG random(1);
  std::size_t flagged = 0;
  std::size_t pixels = 0;
  for (int round = 0; round < 4000; ++round) {
    const int radius = random.uniform(0, 7);
    const int height = 2 * radius + random.uniform(1, 25);
    const int width = 2 * radius + random.uniform(1, 151);
    Capture capture(height, width, kLevels[random.uniform(0, 10)]);
    const float spread = std::ldexp(1.0f, -random.uniform(0, 24));
    for (int i = 0; i < height * width; ++i) capture.data[3 * i] *= 1 + spread * random.uniform(0.0f, 1.0f);
    const float other = random.uniform(0, 2) == 0 ? kLevels[random.uniform(0, 10)] : kOdd[random.uniform(0, 9)];
    for (int n = random.uniform(0, 4); n > 0; --n) {
      const int row = random.uniform(0, height);
      capture.at(row, random.uniform(0, width)) = other;
    }
    const float threshold = random.uniform(0, 2) == 0 ? spread : kThresholds[random.uniform(0, 13)];
    std::vector<unsigned char> expected(capture.data.size() / 3, 7);  // what is not flagged is not written
    std::vector<unsigned char> mask = expected;
    plain::DetectDot(capture.data.data(), height, width, threshold, radius, expected.data());
    QVTester().DetectDot(capture.data.data(), height, width, threshold, radius, mask.data());
    ASSERT_EQ(expected, mask) << "round " << round;
    flagged += std::count(mask.begin(), mask.end(), 1);
    pixels += mask.size();
  }
  EXPECT_GT(flagged, pixels / 20) << "or the two would agree on nothing";
  EXPECT_LT(flagged, pixels / 2);
}

// At the dot's departure to the last bit, where the undivided test alone would be a few roundings off.
TEST(Dots, AreExactAtTheThreshold) {
  const LogLines log;
  cv::RNG random(5);
  const float levels[] = {1, 40000, 1e-38f, 1e-41f};
  const float factors[] = {1 + 3e-5f, 1.2f, 0.3f, 5, -1, 9};
  for (int round = 0; round < 300; ++round) {
    const int radius = 1 + round % 3;
    const int side = 2 * radius + 1;
    Capture capture(9, 60, levels[round % 4] * random.uniform(0.5f, 1.0f));
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

TEST(Areas, ChangedAreasAreAllThatNeedsASecondLook) {
  cv::RNG any(4);
  int lists_merged = 0;
  for (int list = 0; list < 400; ++list) {
    std::vector<ErrorArea> areas;
    const int distance = any.uniform(0, 13);
    const int width = any.uniform(2, 301);
    const int height = any.uniform(2, 201);
    for (int n = any.uniform(2, 151); n > 0; --n) {
      const cv::Point at{any.uniform(0, width), any.uniform(0, height)};
      const cv::Point size{any.uniform(0, 9), any.uniform(0, 40) == 0 ? 59 : any.uniform(0, 9)};
      areas.push_back({at, at + size, any.uniform(0, 10), 0});
    }
    const auto merged = plain::ClusterByTester(distance, width, height, areas);
    ASSERT_EQ(plain::ErrorAreaClustering(distance, width, height, areas), merged) << "list " << list;
    lists_merged += merged.size() < areas.size() ? 1 : 0;
  }
  EXPECT_GT(lists_merged, 200) << "most lists have something to merge";
}

}  // namespace
