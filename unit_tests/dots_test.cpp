#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <random>

#include "qvtester/tester.h"
#include "unit_tests/log_lines.h"
#include "unit_tests/plain/error_areas.h"
#include "unit_tests/plain/hdr_dots.h"

namespace {

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

class Dots : public ::testing::Test {
 protected:
  LogLines log_;
};

TEST_F(Dots, APixelIsHeldAgainstItsLocalMean) {
  Capture capture(20, 30, 4);
  EXPECT_THAT(capture.Flagged(1e-6f, 2), IsEmpty()) << "small whole numbers sum exactly";
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[OKAPI] OpenMP #1 Start", "[OKAPI] OpenMP #1 End"));
  capture.at(7, 11) = 8;  // mean 4.16: the dot is 92 % off, its neighbours 3.8 %
  EXPECT_THAT(capture.Flagged(0.5f, 2), ElementsAre(cv::Point(11, 7)));
  EXPECT_THAT(capture.Flagged(0.93f, 2), IsEmpty());
  EXPECT_THAT(capture.Flagged(0.03f, 2), SizeIs(25)) << "all whose window holds the dot";
}

TEST_F(Dots, SmallPicturesAreLoggedAndLeftAlone) {
  EXPECT_THAT(Capture(4, 30, 4).Flagged(0, 2), IsEmpty());
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[DetectDot] a picture of 30 x 4 is smaller than the window of radius 2"));
  EXPECT_THAT(Capture(30, 4, 4).Flagged(0, 2), IsEmpty());
  EXPECT_THAT(Capture(5, 5, 4).Flagged(0, INT_MAX), IsEmpty());
  EXPECT_THAT(Capture(5, 5, 4).Flagged(0, -1), IsEmpty());
}

// Levels from the smallest to the largest, so that every guard of the undivided test is met.
float RandomLevel(std::mt19937& random) {
  constexpr float kLevels[] = {0, 1e-45f, 1e-38f, 3e-37f, 1e-6f, 1, 100, 1e6f, 1e30f, 3e38f};
  return kLevels[random() % std::size(kLevels)];
}

TEST_F(Dots, AreThoseOfTheWholeTable) {
  constexpr float kOdd[] = {0, -0.0f, NAN, INFINITY, -INFINITY, 3e38f, -3e38f, 1e-45f, -1};
  constexpr float kThresholds[] = {0, -1, 1e-7f, 1.1e-6f, 0.01f, 0.1f, 0.5f, 1, 3, 10, 1e38f, NAN, INFINITY};
  std::size_t flagged = 0;
  std::size_t pixels = 0;
  for (unsigned seed = 0; seed < 4000; ++seed) {
    std::mt19937 random(seed);
    const int radius = static_cast<int>(random() % 7);
    const int height = 2 * radius + 1 + static_cast<int>(random() % 24);
    const int width = 2 * radius + 1 + static_cast<int>(random() % 150);
    Capture capture(height, width, RandomLevel(random));
    const float spread = std::ldexp(1.0f, -static_cast<int>(random() % 24));
    for (int i = 0; i < height * width; ++i) {
      capture.data[3 * i] *= 1 + spread * static_cast<float>(random() % 1000) / 1000;
    }
    const float other = random() % 2 == 0 ? RandomLevel(random) : kOdd[random() % std::size(kOdd)];
    for (unsigned n = random() % 4; n > 0; --n) {
      capture.at(static_cast<int>(random() % height), static_cast<int>(random() % width)) = other;
    }
    const float threshold = random() % 2 == 0 ? spread : kThresholds[random() % std::size(kThresholds)];
    const std::size_t size = static_cast<std::size_t>(height) * width;
    std::vector<unsigned char> expected(size, 7);  // what is not flagged is not written
    std::vector<unsigned char> mask(size, 7);
    plain::DetectDot(capture.data.data(), height, width, threshold, radius, expected.data());
    QVTester().DetectDot(capture.data.data(), height, width, threshold, radius, mask.data());
    ASSERT_EQ(expected, mask) << "seed " << seed;
    flagged += std::count(mask.begin(), mask.end(), 1);
    pixels += size;
  }
  EXPECT_GT(flagged, pixels / 20) << "or the two would agree on nothing";
  EXPECT_LT(flagged, pixels / 2);
}

// At the dot's departure to the last bit, where the undivided test alone would be a few roundings off.
TEST_F(Dots, AreExactAtTheThreshold) {
  std::mt19937 random(5);
  std::uniform_real_distribution<float> any(0.5f, 1);
  const float levels[] = {1, 40000, 1e-38f, 1e-41f};
  const float factors[] = {1 + 3e-5f, 1.2f, 0.3f, 5, -1, 9};
  for (int round = 0; round < 300; ++round) {
    const int radius = 1 + round % 3;
    const int side = 2 * radius + 1;
    Capture capture(9, 60, levels[round % 4] * any(random));
    capture.at(4, 20) *= factors[round % 6] * any(random);
    const cv::Mat_<float> sums = plain::SumChannel0(capture.data.data(), 9, 60);
    const cv::Point from(20 - radius, 4 - radius);
    const cv::Point to = from + cv::Point(side, side);
    const float mean =
        (sums(to) + sums(from) - sums(from.y, to.x) - sums(to.y, from.x)) / static_cast<float>(side * side);
    const float departure = std::fabs((mean - capture.at(4, 20)) / mean);
    const cv::Point dot(20, 4);
    EXPECT_THAT(capture.Flagged(std::nextafter(departure, 0.0f), radius), Contains(dot)) << round;
    EXPECT_THAT(capture.Flagged(departure, radius), Not(Contains(dot))) << round;
  }
}

TEST_F(Dots, HdrPicturesAreStretchedForTheEye) {
  QVTester tester;
  const cv::Mat channels[] = {(cv::Mat_<float>(1, 3) << -2, 8, 3), cv::Mat::zeros(1, 3, CV_32F),
                              cv::Mat::ones(1, 3, CV_32F)};
  cv::Mat hdr;
  cv::merge(channels, 3, hdr);
  const cv::Mat before = hdr.clone();
  const cv::Mat seen = tester.HDR2UCHAR(hdr);
  EXPECT_EQ(CV_8UC1, seen.type());
  EXPECT_EQ(0, seen.at<uchar>(0));
  EXPECT_EQ(255, seen.at<uchar>(1));
  EXPECT_EQ(128, seen.at<uchar>(2));  // 127.5, to the even one
  EXPECT_EQ(0, cv::norm(before, hdr, cv::NORM_INF));
  cv::Mat constant(2, 2, CV_32FC3, cv::Scalar::all(7));
  EXPECT_EQ(0, cv::countNonZero(tester.HDR2UCHAR(constant)));
  cv::Mat none;
  EXPECT_THROW(tester.HDR2UCHAR(none), cv::Exception);
}

template <typename T>
void Allocate(T*& array, std::size_t n) {
  std::free(array);
  array = static_cast<T*>(std::calloc(n, sizeof(T)));
}

// The caller's arrays, from malloc, and what comes back; the address sanitizer watches who frees them.
class Areas : public ::testing::Test {
 protected:
  ~Areas() override {
    for (void* array : {static_cast<void*>(counts_), static_cast<void*>(first_), static_cast<void*>(last_)}) {
      std::free(array);
    }
  }
  void Add(cv::Rect area, int count = 1) { given_.emplace_back(area, count); }
  int Cluster(int distance, bool with_counts = true) {
    areas_.clear();
    Allocate(counts_, given_.size());
    Allocate(first_, given_.size());
    Allocate(last_, given_.size());
    for (const auto& [area, count] : given_) {
      const int i = static_cast<int>(areas_.size());
      areas_.push_back(i);
      counts_[i] = count;
      first_[i] = area.tl();
      last_[i] = area.br() - cv::Point(1, 1);
    }
    return QVTester().ErrorAreaClustering(distance, size_.width, size_.height, &areas_,
                                          with_counts ? &counts_ : nullptr, &first_, &last_);
  }
  cv::Rect Result(int i) const { return {first_[i], last_[i] + cv::Point(1, 1)}; }

  cv::Size size_ = {100, 80};
  std::vector<std::pair<cv::Rect, int>> given_;
  std::vector<int> areas_;
  int* counts_ = nullptr;
  cv::Point* first_ = nullptr;
  cv::Point* last_ = nullptr;
};

TEST_F(Areas, ChainsCollapseOverSeveralPasses) {
  // In this order no area is close to the one before it; the last joins two that are kept apart until then.
  for (const int x : {0, 20, 40, 60, 30, 10, 50}) Add({x, 40, 8, 8}, 1);
  EXPECT_EQ(1, Cluster(12));
  EXPECT_EQ(cv::Rect(0, 40, 68, 8), Result(0));
  EXPECT_EQ(7, counts_[0]);
}

TEST_F(Areas, TheFirstCloseOneTakesAll) {
  Add({0, 0, 4, 4}, 1);
  Add({20, 0, 4, 4}, 10);
  Add({10, 0, 4, 4}, 100);  // close to both; joins the first, which then reaches the second
  Add({90, 70, 4, 4}, 1000);
  EXPECT_EQ(2, Cluster(16));
  EXPECT_EQ(111, counts_[0]);
  EXPECT_EQ(1000, counts_[1]);
  EXPECT_THAT(areas_, ElementsAre(0, 1)) << "indices in the pass before the last";
}

TEST_F(Areas, GrowthEndsAtTheImage) {
  size_ = {1, 80};  // grown rectangles share no more than the one column, and that is not enough
  Add({0, 10, 1, 1});
  Add({0, 11, 1, 1});
  EXPECT_EQ(2, Cluster(20));
}

TEST_F(Areas, CountsAreOptionalAndOneAreaIsLeftAsItIs) {
  Add({10, 10, 1, 1}, 2);
  EXPECT_EQ(1, Cluster(8));
  EXPECT_EQ(2, counts_[0]);
  Add({11, 10, 1, 1}, 5);
  EXPECT_EQ(1, Cluster(4, false));
  EXPECT_EQ(2, counts_[0]) << "the caller's array is left alone";
  areas_.clear();
  EXPECT_EQ(0, QVTester().ErrorAreaClustering(8, 10, 10, &areas_, nullptr, nullptr, nullptr));
}

TEST_F(Areas, ChangedAreasAreAllThatNeedsASecondLook) {
  std::mt19937 random(4);
  const auto any = [&](int from, int to) { return std::uniform_int_distribution<int>(from, to)(random); };
  int lists_merged = 0;
  for (int list = 0; list < 400; ++list) {
    given_.clear();
    std::vector<plain::ErrorArea> plain;
    const int distance = any(0, 12);
    size_ = {any(2, 300), any(2, 200)};
    for (int n = any(2, 150); n > 0; --n) {
      const cv::Rect area(any(0, size_.width - 1), any(0, size_.height - 1), any(1, 9),
                          any(1, 40) == 1 ? 60 : any(1, 9));
      Add(area, any(0, 9));
      plain.push_back({area.tl(), area.br() - cv::Point(1, 1), given_.back().second, 0});
    }
    const auto expected = plain::ErrorAreaClustering(distance, size_.width, size_.height, plain);
    const int n = Cluster(distance);
    std::vector<plain::ErrorArea> merged;
    for (int i = 0; i < n; ++i) merged.push_back({first_[i], last_[i], counts_[i], areas_[i]});
    ASSERT_TRUE(expected == merged) << "list " << list;
    lists_merged += n < static_cast<int>(given_.size()) ? 1 : 0;
  }
  EXPECT_GT(lists_merged, 200) << "most lists have something to merge";
}

}  // namespace
