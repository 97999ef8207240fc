#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <opencv2/imgproc.hpp>

#include "desk/measure/doubts.h"
#include "desk/measure/edge_resampling.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"

namespace qv {

namespace {

const std::array<cv::Point2d, 4> kWhole = {{{0, 0}, {199, 0}, {199, 399}, {0, 399}}};

// An edge between grey 60 and 220, 5 degrees off the columns, blurred by 0.8 px; `fall` is how much of the light goes
// from the left to the right.
cv::Mat Edge(double noise, double fall, std::uint64_t seed) {
  cv::Mat edge(400, 200, CV_32FC1);
  for (int i = 0; i < edge.rows; ++i) {
    for (int j = 0; j < edge.cols; ++j) {
      const double d = (j - 100 + (i - 200) * std::tan(5 * CV_PI / 180)) * std::cos(5 * CV_PI / 180);
      const double light = 60 + 160 * 0.5 * (1 + std::erf(d / 0.8 / std::sqrt(2.0)));
      edge.at<float>(i, j) = static_cast<float>(light * (1 - fall * j / edge.cols));
    }
  }
  cv::Mat grains(edge.size(), CV_32FC1);
  cv::RNG random(seed);
  random.fill(grains, cv::RNG::NORMAL, 0, noise);
  return edge + grains;
}

cv::Mat Levels(const cv::Mat& light) {
  cv::Mat levels;
  light.convertTo(levels, CV_8U);
  return levels;
}

TEST(LevelPiles, CutOffLightIsSeenAndFlatPaperIsNot) {
  struct Case {
    const char* name;
    double noise, top, bottom;
    bool piled;
  };
  const Case kCases[] = {
      {"as it is", 2.5, 255, 0, false},         {"without noise", 0, 255, 0, false},
      {"paper flat at 215", 2.5, 215, 0, true}, {"a tenth cut", 2.5, 223, 0, true},
      {"blacks crushed", 2.5, 255, 62, true},   {"hardly any noise", 0.3, 255, 0, false},
      {"much noise", 12, 255, 0, false},
  };
  for (const Case& row : kCases) {
    const cv::Mat light = cv::min(cv::max(Edge(row.noise, 0, 7), row.bottom), row.top);
    EXPECT_EQ(row.piled, FindLevelPile(Levels(light), kWhole).has_value()) << row.name;
    cv::Mat within;  // a photo whose other pixels are cut off
    cv::copyMakeBorder(Levels(light), within, 31, 7, 53, 9, cv::BORDER_CONSTANT, cv::Scalar(255));
    std::array<cv::Point2d, 4> moved = kWhole;
    for (cv::Point2d& corner : moved) corner += cv::Point2d(53, 31);
    EXPECT_EQ(row.piled, FindLevelPile(within, moved).has_value()) << row.name;
  }
  EXPECT_TRUE(FindLevelPile(Levels(Edge(0, 0, 1) * (255 / 200.0)), kWhole)) << "at 255, also without noise";
  const cv::Mat good = Levels(Edge(2.5, 0, 1));
  const cv::Mat green = Levels(cv::min(Edge(2.5, 0, 2), 218));
  cv::Mat photo;
  cv::merge(std::vector<cv::Mat>{good, green, good}, photo);
  const std::optional<LevelPile> pile = FindLevelPile(photo, kWhole);
  ASSERT_TRUE(pile);
  EXPECT_EQ(1, pile->channel);
  EXPECT_EQ(218, pile->level);
}

// The edge's own spread is symmetric about its middle.
TEST(LightSides, ACurveThatBendsTowardsWhiteBringsTheLightSideNearer) {
  struct Case {
    double noise, knee, slope;
    bool srgb;
    double least, most;
  };
  const Case kCases[] = {{0, 255, 1, false, 0.98, 1.0001},
                         {2.5, 255, 1, false, 0.96, 1.02},
                         {2.5, 255, 1, true, 1.02, 1.5},
                         {0, 190, 0.3, false, 0.7, 0.9},
                         {2.5, 190, 0.3, false, 0.7, 0.9}};
  for (const Case& row : kCases) {
    cv::Mat light = Edge(row.noise, 0, 3);
    light.forEach<float>([&](float& level, const int* /*place*/) {
      if (row.srgb) level = 255 * std::pow(level / 255, 1 / 2.2F);
      if (level > row.knee) level = static_cast<float>(row.knee + row.slope * (level - row.knee));
    });
    for (const int turn : {0, 1, 2, 3}) {  // a side that is the left one, or the lower
      cv::Mat levels = Levels(light);
      if (turn > 0) cv::rotate(levels, levels, turn - 1);
      const double right = levels.cols - 1;
      const double bottom = levels.rows - 1;
      const auto reach = LightSideReach(levels, {{{0, 0}, {right, 0}, {right, bottom}, {0, bottom}}});
      ASSERT_TRUE(reach);
      EXPECT_THAT(*reach, testing::AllOf(testing::Ge(row.least), testing::Le(row.most)))
          << row.knee << " turn " << turn;
    }
  }
}

double Mtf50(const cv::Mat& levels) {
  QVTester tester;
  float mtf50 = 0;
  tester.CalculateMTF(levels, mtf50);
  return mtf50;
}

// The noiseless picture's own reading is the truth.
TEST(NoiselessReadings, NeitherNoiseNorFallingLightMovesThem) {
  const double truth = Mtf50(Levels(Edge(0, 0, 0)));
  const auto is_off = [=](double reading) { return std::fabs(reading - truth) > 0.05 * truth; };
  for (const double noise : {0.0, 1.0, 2.5, 5.0}) {
    for (const double fall : {0.0, 0.2, 0.4}) {
      for (std::uint64_t seed = 1; seed <= 5; ++seed) {
        const NoiselessReading reading = ReadNoiseless(Levels(Edge(noise, fall, seed)), Mtf50);
        EXPECT_NEAR(truth, reading.value, 0.03 * truth) << noise << " " << fall;
        if (noise > 1) continue;  // more hides a slope
        EXPECT_EQ(is_off(Mtf50(Levels(Edge(0, fall, 0)))), is_off(reading.in_its_light)) << noise << " " << fall;
      }
    }
  }
}

TEST(Mirrors, AChartSeenInOneIsTold) {
  for (const bool mirrored : {false, true}) {
    ChartView chart;
    cv::Mat photo = DrawChart(chart);
    if (mirrored) cv::flip(photo, photo, 1);
    QVTester tester;
    EXPECT_EQ(mirrored, LooksMirrored(tester.FindChart(photo, 125)));
  }
}

}  // namespace

}  // namespace qv
