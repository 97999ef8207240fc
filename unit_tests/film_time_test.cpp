// Time stamps of a film, and the search that makes only the rows that it reads.

#include <gmock/gmock.h>

#include <opencv2/imgproc.hpp>

#include "tests/video/film.h"
#include "unit_tests/agreement_test.h"

namespace {

using ::testing::DoubleNear;
using ::testing::Pointwise;

struct Stamps {
  const char* name;
  std::vector<double> stamps, times;
  int extended, lost;
  double rate, gap;
};

TEST(FilmTime, StampsBecomeTimes) {
  const double third = 1000 / 30.0;  // the nominal interval here
  const double nan = std::nan("");
  const std::vector<Stamps> cases = {
      {"one frame", {70}, {0}, 0, 0, 0, 0},
      {"even", {40, 80, 120, 160}, {0, 40, 80, 120}, 0, 0, 25, 40},
      {"gaps of one and of two", {0, 10, 20, 40, 50, 80}, {0, 10, 20, 40, 50, 80}, 0, 3, 62.5, 30},
      {"a gap of just 1.5", {0, 10, 20, 35}, {0, 10, 20, 35}, 0, 0, 3000 / 35.0, 15},
      {"more than 1.5", {0, 10, 20, 35.1}, {0, 10, 20, 35.1}, 0, 1, 3000 / 35.1, 15.1},
      {"zeros at the end", {5, 15, 25, 0, 0}, {0, 10, 20, 30, 40}, 2, 0, 100, 10},
      {"back and on", {0, 10, 20, 5, 40}, {0, 10, 20, 30, 40}, 1, 0, 100, 10},
      {"a repeat", {0, 10, 10, 30}, {0, 10, 20, 30}, 1, 0, 100, 10},
      {"none usable", {0, 0, 0}, {0, third, 2 * third}, 2, 0, 30, third},
      {"the ticks of a bare stream", {0, 1 / 1200.0, 2 / 1200.0, 0}, {0, third, 2 * third, 3 * third}, 3, 0, 30, third},
      {"9,500 a second", {0, 0.105, 0.21}, {0, 0.105, 0.21}, 0, 0, 2000 / 0.21, 0.105},
      {"no numbers", {nan, 10, nan, 30}, {0, 10, 20, 30}, 1, 0, 100, 10},
      {"even count of intervals", {0, 10, 22, 34, 44}, {0, 10, 22, 34, 44}, 0, 0, 4000 / 44.0, 12},
      {"from 30 to 15", {0, 1, 2, 3, 4, 6, 8}, {0, 1, 2, 3, 4, 6, 8}, 0, 2, 750, 2},
      {"endless", {0, 1, 1e300}, {0, 1, 1e300}, 0, 1, 0, 1e300},
  };
  for (const Stamps& c : cases) {
    Film film;
    EXPECT_EQ(c.extended, KeepTime(c.stamps, third, film)) << c.name;
    EXPECT_THAT(film.time, Pointwise(DoubleNear(1e-9), c.times)) << c.name;
    EXPECT_EQ(c.lost, film.lost) << c.name;
    EXPECT_NEAR(c.rate, film.mean_rate, 1e-9) << c.name;
    EXPECT_DOUBLE_EQ(c.gap, film.longest_gap) << c.name;
  }
}

TEST(CutPhoto, ShowsTheSearchWhatTheBinaryPictureDoes) {
  ExpectAgreement(plain::ScanOfThePhotoAndOfItsCut, 6000, 0.05);
  ExpectAgreement(plain::DarkPixels, 20000, 0.2);
  QVTester tester;
  EXPECT_THROW(FindMarks(tester, cv::Mat(40, 40, CV_16UC3), 125), cv::Exception);
  EXPECT_EQ(nullptr, tester.kept_->cut_photo);
}

}  // namespace
