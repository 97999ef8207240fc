#include "desk/measure/spots.h"

#include <gtest/gtest.h>

#include <cmath>
#include <opencv2/imgproc.hpp>

namespace {

struct Target {
  cv::Size size = {640, 480};
  double noise = 0.01;   // of 255
  double shading = 0.4;  // at the corners
  std::uint64_t seed = 1;
};

struct Speck {
  cv::Point2d at;
  double diameter, contrast;
  bool soft = false;  // a Gaussian of that full width at half its depth
};

cv::Mat Photo(const Target& target, const std::vector<Speck>& specks) {
  cv::Mat photo(target.size, CV_32F);
  const cv::Point2d middle(target.size.width / 2.0, target.size.height / 2.0);
  for (int y = 0; y < photo.rows; ++y) {
    for (int x = 0; x < photo.cols; ++x) {
      const cv::Point2d off = cv::Point2d(x, y) - middle;
      double level = 200 * (1 - target.shading * off.dot(off) / middle.dot(middle));
      for (const Speck& s : specks) {
        const double r = cv::norm(cv::Point2d(x, y) - s.at);
        const double edge = std::clamp(s.diameter / 2 - r + 0.5, 0.0, 1.0);
        level *= 1 - s.contrast * (s.soft ? std::exp2(-4 * r * r / (s.diameter * s.diameter)) : edge);
      }
      photo.at<float>(y, x) = static_cast<float>(level);
    }
  }
  cv::Mat noise(photo.size(), CV_32F);
  cv::RNG random(target.seed);
  random.fill(noise, cv::RNG::NORMAL, 0, 255 * target.noise);
  photo += noise;
  photo.convertTo(photo, CV_8U);
  return photo;
}

TEST(Spots, AreFoundAtAnySizeSharpOrSoftWithTheirAreaAndContrast) {
  for (const double diameter : {6.0, 12.0, 40.0, 100.0}) {
    for (const bool soft : {false, true}) {
      const Speck speck = {{250.3, 200.6}, diameter, 0.1, soft};
      const qv::SpotFinding found = qv::FindSpots(Photo({}, {speck}));
      ASSERT_EQ(1U, found.spots.size()) << diameter << (soft ? " soft" : " sharp");
      EXPECT_LT(cv::norm(found.spots[0].centre - speck.at), 1 + 0.1 * diameter) << diameter;
      EXPECT_NEAR(1, found.spots[0].diameter_px() / diameter, 0.3) << diameter << (soft ? " soft" : " sharp");
      EXPECT_NEAR(1, found.spots[0].contrast / 0.1, 0.35) << diameter << (soft ? " soft" : " sharp");
    }
  }
}

struct Measured {
  double diameter, contrast, area_px, seen_contrast;
};

// Figures that limits may rest on stay as they are when the search is made faster: areas to the pixel, contrasts to
// 1e-4, which is what other orders of sums in single precision have moved them by.
TEST(Spots, KeepTheirFigures) {
  for (const Measured& m :
       std::vector<Measured>{{6, 0.1, 36, 0.0817924}, {20, 0.05, 288, 0.0496250}, {60, 0.2, 2832, 0.2020543}}) {
    const auto spots = qv::FindSpots(Photo({}, {{{250.3, 200.6}, m.diameter, m.contrast, false}})).spots;
    ASSERT_EQ(1U, spots.size()) << m.diameter;
    EXPECT_EQ(m.area_px, spots[0].area_px) << m.diameter;
    EXPECT_NEAR(m.seen_contrast, spots[0].contrast, 1e-4) << m.diameter;
  }
}

TEST(Spots, AreSeenWhereTheyStandNineTimesOutOfTheNoise) {
  int seen = 0;
  int false_ones = 0;
  int count = 0;
  for (const double diameter : {6.0, 16.0, 50.0}) {
    for (std::uint64_t seed = 0; seed < 10; ++seed, ++count) {
      const double contrast = 9 * 0.01 * (255.0 / 200) / (diameter / 2 * std::sqrt(CV_PI));
      const Speck speck = {{310, 230}, diameter, contrast, false};
      const auto spots = qv::FindSpots(Photo({{640, 480}, 0.01, 0.3, seed}, {speck})).spots;
      for (const qv::Spot& spot : spots) (cv::norm(spot.centre - speck.at) < diameter ? seen : false_ones) += 1;
    }
  }
  EXPECT_GE(seen, 0.9 * count);
  EXPECT_LE(false_ones, 0.1 * count);
}

// Between neighbours it shows in a step or two of the levels, and in some tiles in one where others show two.
TEST(Spots, NoiseOfAboutALevelMakesNone) {
  std::size_t found = 0;
  for (const double levels : {0.7, 0.8, 0.9, 1.0, 1.1, 1.3}) {
    found += qv::FindSpots(Photo({{900, 600}, levels / 255, 0, 7}, {})).spots.size();
  }
  EXPECT_LE(found, 1U);
}

// Of the stored levels: what the photo's noise and rounding add up to.
TEST(Spots, NoiseIsWithinItsUncertaintyNearStepsOfTheLevelsToo) {
  int within = 0;
  int count = 0;
  for (const double levels : {0.0, 0.15, 0.7, 0.9, 1.3, 2.5}) {
    for (std::uint64_t seed = 0; seed < 5; ++seed, ++count) {
      const qv::SpotFinding found = qv::FindSpots(Photo({{320, 240}, levels / 255, 0, seed}, {}));
      // A light of 200 is a whole level: noise of 0.15 never rounds away from it.
      const double noise = levels < 0.2 ? 0 : std::sqrt(levels * levels + 1.0 / 12) / 200;
      within += std::fabs(found.noise - noise) <= found.of_noise.expanded ? 1 : 0;
      if (levels >= 0.7) {
        EXPECT_LT(found.of_noise.expanded, 0.05 * noise) << levels;
      }
    }
  }
  EXPECT_GE(within, count - 5);  // 28 are meant
}

TEST(Spots, EmptyTargetsHaveNone) {
  for (const double noise : {0.0, 0.005, 0.03}) {
    for (const double shading : {0.0, 0.6}) {
      EXPECT_EQ(0U, qv::FindSpots(Photo({{640, 480}, noise, shading}, {})).spots.size()) << noise << " " << shading;
    }
  }
  for (const cv::Size size : {cv::Size(1, 1), cv::Size(5, 3), cv::Size(700, 2)}) {
    EXPECT_EQ(0U, qv::FindSpots(cv::Mat(size, CV_16UC3, cv::Scalar::all(30000))).spots.size());
  }
  EXPECT_THROW(qv::FindSpots(cv::Mat()), cv::Exception);
}

}  // namespace
