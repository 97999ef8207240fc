#include "qvtester/lcd.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <map>
#include <opencv2/imgproc.hpp>

#include "desk/simulation/simulation.h"
#include "unit_tests/log_lines.h"

namespace {

using ::testing::Each;
using ::testing::HasSubstr;
using ::testing::Lt;
using ::testing::StartsWith;

qv::SimulationOptions View(const std::string& pattern, double turn = 3, double pan = 0, double tilt = 0) {
  qv::SimulationOptions view;
  view.scene = "display";
  view.display.pattern = pattern;
  view.camera.size = {600, 450};
  view.camera.fill = 0.75;
  view.camera.turn_deg = turn;
  view.camera.pan_deg = pan;
  view.camera.tilt_deg = tilt;
  view.camera.blur_px = 0.8;
  view.camera.noise_percent = 1;
  return view;
}

struct Display {
  cv::Mat photo;
  std::vector<cv::Point2f> corners;  // clockwise from the upper left as seen

  explicit Display(const qv::SimulationOptions& view) {
    const qv::Simulation simulation = qv::Simulate(view);
    photo = qv::Sense(view.camera, simulation.levels[0], 8);
    for (const auto& corner : simulation.truth["corners"]) corners.emplace_back(corner["x"], corner["y"]);
    std::rotate(corners.begin(),
                std::min_element(corners.begin(), corners.end(), [](auto a, auto b) { return a.x + a.y < b.x + b.y; }),
                corners.end());
  }
};

std::vector<double> Off(const std::vector<cv::Point2f>& found, const std::vector<cv::Point2f>& truth) {
  std::vector<double> off;
  for (std::size_t i = 0; i < found.size(); ++i) off.push_back(cv::norm(found[i] - truth[i]));
  return off;
}

void Box(cv::Mat& photo, cv::Rect box, int level) { cv::rectangle(photo, box, cv::Scalar::all(level), cv::FILLED); }

TEST(Lcd, CornersAreFoundToSubpixels) {
  const LogLines log;
  const double turns[][3] = {{0, 0, 0}, {3, 0, 0}, {47, 10, 20}, {90, 30, 0}, {-160, -30, 30}, {181, 20, -30}};
  for (const std::string& pattern : qv::kDisplayPatterns) {
    for (const auto& [turn, pan, tilt] : turns) {
      qv::SimulationOptions view = View(pattern, turn, pan, tilt);
      view.display.bezel = pattern == "black" ? 0 : 50;
      const Display display(view);
      QVTester_LCD lcd;
      ASSERT_EQ(1, lcd.FindScreen(display.photo)) << pattern << " turned by " << turn;
      EXPECT_THAT(Off(lcd.corners_, display.corners), Each(Lt(0.2))) << pattern << " turned by " << turn;
    }
  }
}

TEST(Lcd, TheScreenIsToldFromWhatElseIsBrightOrDark) {
  const LogLines log;
  struct Case {
    const char* name;
    const char* pattern;
    double surround, bezel, fill;
    std::function<void(cv::Mat&, const Display&)> disturb;
  };
  const auto nothing = [](cv::Mat&, const Display&) {};
  const Case cases[] = {
      {"bright table about a dark bezel", "green", 200, 60, 0.75, nothing},
      {"black on a bright table", "black", 180, 0, 0.75, nothing},
      {"black beside a lit sheet", "black", 120, 0, 0.6,
       [](cv::Mat& p, const Display&) {
         Box(p, {0, 0, 90, 60}, 250);
       }},
      {"lamp and sheet beside it", "white", 40, 0, 0.5,
       [](cv::Mat& p, const Display&) {
         Box(p, {10, 10, 150, 60}, 255);
         Box(p, {400, 400, 190, 40}, 255);
       }},
      {"glare across a side", "green", 40, 40, 0.75,
       [](cv::Mat& p, const Display& d) {
         cv::circle(p, (d.corners[0] + d.corners[1]) / 2, 25, cv::Scalar::all(250), -1);
       }},
      {"window mirrored in black glass", "black", 150, 0, 0.75,
       [](cv::Mat& p, const Display&) {
         Box(p, {250, 180, 70, 60}, 140);
       }},
      {"bridge from screen to table", "white", 190, 60, 0.75,
       [](cv::Mat& p, const Display& d) {
         cv::line(p, d.corners[2], {599, 449}, cv::Scalar::all(230), 9);
       }},
      {"dead line across", "white", 40, 0, 0.75,
       [](cv::Mat& p, const Display& d) {
         cv::line(p, (d.corners[0] + d.corners[1]) / 2, (d.corners[2] + d.corners[3]) / 2, cv::Scalar::all(8), 3);
       }},
      {"two pixels from the photo's rim", "white", 40, 0, 0.99, nothing},
      {"edge of a bright table behind", "white", 25, 30, 0.6,
       [](cv::Mat& p, const Display&) {
         Box(p, {0, 0, 600, 50}, 160);
       }},
  };
  for (const Case& c : cases) {
    qv::SimulationOptions view = View(c.pattern);
    view.display.surround = c.surround;
    view.display.bezel = c.bezel;
    view.camera.fill = c.fill;
    Display display(view);
    c.disturb(display.photo, display);
    QVTester_LCD lcd;
    ASSERT_EQ(1, lcd.FindScreen(display.photo)) << c.name;
    EXPECT_THAT(Off(lcd.corners_, display.corners), Each(Lt(0.5))) << c.name;
  }
}

// A white screen of 400 x 300 that fills the photo but for its rim, with the corners given.
struct Shown {
  cv::Mat photo = cv::Mat(320, 420, CV_8UC3, cv::Scalar::all(20));
  cv::Mat screen = photo(cv::Rect(10, 10, 400, 300));
  QVTester_LCD lcd;
  QVLcdResult result;

  Shown() {
    screen.setTo(cv::Scalar::all(200));
    lcd.keep_corners_ = true;
    lcd.corners_ = {{9.5f, 9.5f}, {409.5f, 9.5f}, {409.5f, 309.5f}, {9.5f, 309.5f}};
    lcd.expected_ratio_ = 4 / 3.0f;
  }
  const QVLcdResult& Judge(QV_LCD_PATTERN pattern) {
    EXPECT_EQ(1, lcd.JudgePattern(photo, pattern, &result));
    return result;
  }
};

TEST(Lcd, WhiteIsOfEqualSharesAndGreenIsEven) {
  for (const auto& [red, verdict] : {std::pair(224, 1), {240, 0}}) {  // shares off by 0.04 and 0.07
    Shown shown;
    shown.screen.setTo(cv::Scalar(300 - red / 2.0, 300 - red / 2.0, red));
    EXPECT_EQ(verdict, shown.Judge(QV_LCD_WHITE).verdict_) << red;
  }
  Shown shown;
  shown.screen.setTo(cv::Scalar(0, 200, 0));
  shown.screen.colRange(0, 133).setTo(cv::Scalar(0, 150, 0));
  for (const float least : {0.7f, 0.8f}) {
    shown.lcd.min_uniformity_ = least;
    EXPECT_EQ(least < 0.75f ? 1 : 0, shown.Judge(QV_LCD_GREEN).verdict_) << shown.result.reason_;
  }
}

TEST(Lcd, DotsCountFromTheLeastOfPixelsAndAboveTheNoise) {
  const LogLines log;
  Shown s;
  s.screen(cv::Rect(100, 100, 3, 1)).setTo(0);
  for (const int least : {3, 4}) {
    s.lcd.min_dot_pixels_ = least;
    EXPECT_EQ(least == 3 ? 1 : 0, s.Judge(QV_LCD_WHITE).error_count_);
  }
  Shown noisy;
  cv::Mat grain(noisy.screen.size(), CV_16SC3);
  cv::RNG(1).fill(grain, cv::RNG::NORMAL, 0, 15);
  noisy.lcd.dot_threshold_ = 0.05f;
  cv::Mat levels;
  cv::add(noisy.screen - cv::Scalar::all(80), grain, levels, cv::noArray(), CV_8U);
  levels.copyTo(noisy.screen);
  EXPECT_EQ(0, noisy.Judge(QV_LCD_WHITE).error_count_) << "of 360,000 samples one in 300,000 lies 4.5 sigma off";
}

TEST(Lcd, PatchesOfLevelsAreATwelfthOfTheShorterSide) {
  const LogLines log;
  Shown s;
  s.screen.setTo(cv::Scalar::all(100));
  for (int i = 0; i < 9; ++i) {  // 25 pixels about the middles of the ninths
    s.screen(cv::Rect((2 * (i % 3) + 1) * 400 / 6 - 12, (2 * (i / 3) + 1) * 50 - 12, 25, 25)).setTo(220);
  }
  EXPECT_THAT(s.Judge(QV_LCD_WHITE).levels_, Each(220));
}

TEST(Lcd, BarsAreReadWithoutTheirRims) {
  const LogLines log;
  Shown s;
  const cv::Scalar bars[] = {{20, 20, 200}, {20, 200, 20}, {200, 20, 20}, {104, 104, 104}};  // white: hardly enough
  for (int i = 0; i < 4; ++i) s.screen.colRange(100 * i, 100 * i + 100).setTo(bars[i]);
  EXPECT_EQ(1, s.Judge(QV_LCD_CONTROL).verdict_);
  cv::rectangle(s.screen, cv::Rect(0, 0, 400, 300), cv::Scalar::all(0), 5);
  EXPECT_EQ(1, s.Judge(QV_LCD_CONTROL).verdict_) << s.result.reason_;
  s.lcd.margin_ = INFINITY;  // the middles are left
  EXPECT_EQ(1, s.Judge(QV_LCD_CONTROL).verdict_) << s.result.reason_;
  for (const float none : {0.0f, -1.0f, NAN}) {  // the black rim darkens the white bar
    s.lcd.margin_ = none;
    EXPECT_THAT(s.Judge(QV_LCD_CONTROL).reason_, HasSubstr("RGB?")) << none;
  }
}

// Edges are two pixels wide on the field of 388 x 288, seen at 160 x 119: of a square of 58 pixels they take 1 %.
TEST(Lcd, ASignTakesAHundredthOfTheFieldAndStandsOutByAnEighth) {
  const LogLines log;
  for (const auto& [side, step, seen] : {std::tuple(66, 100, 1), {50, 100, 0}, {150, 36, 1}, {150, 26, 0}}) {
    Shown s;
    s.screen.setTo(cv::Scalar(20, 200, 20));
    s.screen(cv::Rect(130, 80, side, side)).setTo(cv::Scalar(20, 200 - step, 20));
    EXPECT_EQ(seen, s.Judge(QV_LCD_RESULT).verdict_) << side << ", " << step << ": " << s.result.reason_;
  }
}

TEST(Lcd, KeptCornersAreFoundAnewWhenAskedFor) {
  const LogLines log;
  Shown s;
  s.lcd.corners_ = {{50, 50}, {100, 50}, {100, 90}, {50, 90}};
  ASSERT_EQ(1, s.lcd.FindScreen(s.photo));
  EXPECT_NEAR(9.5, s.lcd.corners_[0].x, 0.3);
}

TEST(Lcd, AScreenCutSmallerKeepsItsMeans) {
  const LogLines log;
  Shown s;
  for (int i = 0; i < 400 * 300; ++i)
    s.screen.at<cv::Vec3b>(i / 400, i % 400) = cv::Vec3b::all((i + i / 400) % 2 * 200);
  cv::Mat small;
  ASSERT_EQ(1, s.lcd.Straighten(s.photo, {160, 120}, small));
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(small, mean, deviation);
  EXPECT_NEAR(100, mean[0], 1);
  EXPECT_LT(deviation[0], 15) << "single pixels of a chequered screen would scatter by 60";
}

// By pattern asked for, and what is shown: "t" where green is shown with a tick on it, which either answer suits.
TEST(Lcd, APatternIsToldFromTheOthersHoweverThePhotoIsTurned) {
  const LogLines log;
  const std::map<std::string, std::string> verdicts = {{"control", "10000"}, {"green", "01000"}, {"black", "00100"},
                                                       {"white", "00010"},   {"tick", "0t001"},  {"cross", "00000"}};
  for (const auto& [shown, expected] : verdicts) {
    qv::SimulationOptions view = View(shown, 5, 15, 20);
    view.camera.size = {320, 240};
    const Display display(view);
    for (int turn = -1; turn < 3; ++turn) {
      cv::Mat photo = display.photo;
      if (turn >= 0) cv::rotate(display.photo, photo, turn);
      for (int asked = QV_LCD_CONTROL; asked <= QV_LCD_RESULT; ++asked) {
        QVTester_LCD lcd;
        QVLcdResult result;
        ASSERT_EQ(1, lcd.JudgePattern(photo, static_cast<QV_LCD_PATTERN>(asked), &result)) << shown;
        if (expected[asked] == 't' || (shown == "control" && asked == QV_LCD_CONTROL && turn > 0)) continue;
        EXPECT_EQ(expected[asked] - '0', result.verdict_) << shown << " for " << asked << ": " << result.reason_;
        if (result.verdict_ == 1) {
          EXPECT_EQ(0, result.error_count_) << shown;
        }
        const char* const field = shown == "tick" ? "green tick field" : shown == "cross" ? "red cross field" : "";
        if (asked == QV_LCD_RESULT) {
          EXPECT_THAT(result.reason_, StartsWith(field));
        }
      }
    }
  }
}

struct Judged {
  QVLcdResult result;
  cv::Size size;
};

Judged Judge(const cv::Mat& photo, QV_LCD_PATTERN pattern) {
  QVTester_LCD lcd;
  Judged judged;
  EXPECT_EQ(1, lcd.JudgePattern(photo, pattern, &judged.result));
  judged.size = lcd.screen_size_;
  return judged;
}

TEST(Lcd, AVerdictOfZeroSaysWhy) {
  const LogLines log;
  qv::SimulationOptions turned = View("control", 180);
  EXPECT_THAT(Judge(Display(turned).photo, QV_LCD_CONTROL).result.reason_, HasSubstr("WBGR from the left"));
  qv::SimulationOptions yellow = View("white");
  yellow.display.tint = {1, 1, 0.6};
  EXPECT_THAT(Judge(Display(yellow).photo, QV_LCD_WHITE).result.reason_, StartsWith("not white all over: 0 of 9"));
  qv::SimulationOptions dark = View("white");
  dark.display.tint = cv::Vec3d::all(0.35);
  EXPECT_THAT(Judge(Display(dark).photo, QV_LCD_WHITE).result.reason_, StartsWith("too dark for white"));
  qv::SimulationOptions square = View("green");
  square.display.ratio = 1.2;
  EXPECT_THAT(Judge(Display(square).photo, QV_LCD_GREEN).result.reason_, StartsWith("sides are 1.20 to 1, not 1.78"));
  qv::SimulationOptions plain = View("green");
  EXPECT_THAT(Judge(Display(plain).photo, QV_LCD_RESULT).result.reason_, StartsWith("no sign on the field"));
}

TEST(Lcd, DotsAndLevelsAreThoseOfTheScreen) {
  const LogLines log;
  const std::pair<const char*, QV_LCD_PATTERN> patterns[] = {
      {"white", QV_LCD_WHITE}, {"green", QV_LCD_GREEN}, {"black", QV_LCD_BLACK}, {"control", QV_LCD_CONTROL}};
  for (const auto& [shown, pattern] : patterns) {
    qv::SimulationOptions view = View(shown, 5, 20, -15);
    view.camera.size = {1000, 750};
    view.defects = 12;
    view.display.defect_side = 8;  // about four pixels
    const qv::Simulation simulation = qv::Simulate(view);
    const Judged judged = Judge(qv::Sense(view.camera, simulation.levels[0], 8), pattern);
    EXPECT_EQ(12, judged.result.error_count_) << shown;
    for (const auto& defect : simulation.truth["defects"]) {
      const cv::Point2d at(defect["across"].get<double>() * judged.size.width - 0.5,
                           defect["down"].get<double>() * judged.size.height - 0.5);
      EXPECT_TRUE(std::any_of(judged.result.error_areas_.begin(), judged.result.error_areas_.end(),
                              [&](const QVRECT& r) {
                                return at.x > r.left - 1 && at.x < r.right + 1 && at.y > r.top - 1 &&
                                       at.y < r.bottom + 1;
                              }))
          << shown << " " << defect;
    }
  }
  qv::SimulationOptions dim = View("white", 0);
  dim.dim_corner = 0.6;
  const QVLcdResult result = Judge(Display(dim).photo, QV_LCD_WHITE).result;
  const double white = 250 * 0.92;
  // The first point lies at a sixth of either side: exp(-((1/6)^2 + (9/16/6)^2) / 0.35^2) = 0.742 of 0.6 is missing.
  EXPECT_NEAR(white * (1 - 0.6 * 0.742), result.levels_[0], 2);
  EXPECT_NEAR(white, result.levels_[8], 1);
  EXPECT_NEAR(result.levels_[0] / white, result.uniformity_, 0.01);
}

TEST(Lcd, PhotosOfAnyTypeShowTheSameScreen) {
  const LogLines log;
  const Display display(View("white", 10, 10, 10));
  cv::Mat deep;
  cv::Mat grey;
  cv::Mat opaque;
  display.photo.convertTo(deep, CV_16U, 257);
  cv::cvtColor(display.photo, grey, cv::COLOR_BGR2GRAY);
  cv::cvtColor(display.photo, opaque, cv::COLOR_BGR2BGRA);
  for (const cv::Mat& photo : {deep, grey, opaque}) {
    QVTester_LCD lcd;
    QVLcdResult result;
    ASSERT_EQ(1, lcd.JudgePattern(photo, QV_LCD_WHITE, &result));
    EXPECT_THAT(Off(lcd.corners_, display.corners), Each(Lt(0.2)));
    EXPECT_EQ(1, result.verdict_);
    EXPECT_NEAR(250 * 0.92, result.sums_[0], 0.5);
    cv::Mat screen;
    ASSERT_EQ(1, lcd.Straighten(photo, {32, 18}, screen));
    EXPECT_EQ(cv::Size(32, 18), screen.size());
    EXPECT_EQ(photo.type(), screen.type());
  }
}

TEST(Lcd, WhatCanNotBeJudgedChangesNothing) {
  const LogLines log;
  const Display display(View("white"));
  QVTester_LCD lcd;
  ASSERT_EQ(1, lcd.FindScreen(display.photo));
  const std::vector<cv::Point2f> corners = lcd.corners_;
  cv::Mat screen;
  QVLcdResult result;
  result.reason_ = "as before";
  const cv::Mat plain(100, 100, CV_8UC3, cv::Scalar::all(90));
  for (const cv::Mat& none : {plain, cv::Mat(1, 1, CV_8U, cv::Scalar(3)), cv::Mat(1, 4000, CV_8UC3)}) {
    EXPECT_EQ(-91, lcd.FindScreen(none));
    EXPECT_EQ(-91, lcd.Straighten(none, {10, 10}, screen));
    EXPECT_EQ(-91, lcd.JudgePattern(none, QV_LCD_WHITE, &result));
  }
  lcd.keep_corners_ = true;
  for (const cv::Mat& unusable : {cv::Mat(), cv::Mat(9, 9, CV_32FC3), cv::Mat(9, 9, CV_8UC2)}) {
    EXPECT_EQ(-95, lcd.FindScreen(unusable));
    EXPECT_EQ(-95, lcd.Straighten(unusable, {10, 10}, screen));
    EXPECT_EQ(-95, lcd.JudgePattern(unusable, QV_LCD_WHITE, &result));
  }
  EXPECT_EQ(-97, lcd.JudgePattern(display.photo, QV_LCD_WHITE, nullptr));
  EXPECT_EQ(-97, lcd.JudgePattern(display.photo, static_cast<QV_LCD_PATTERN>(5), &result));
  EXPECT_EQ(-97, lcd.Straighten(display.photo, {0, 10}, screen));
  EXPECT_EQ(corners, lcd.corners_);
  EXPECT_EQ("as before", result.reason_);
  EXPECT_TRUE(screen.empty());
  EXPECT_EQ(1, lcd.JudgePattern(cv::Mat(450, 600, CV_8UC3, cv::Scalar::all(9)), QV_LCD_BLACK, &result));
  EXPECT_EQ(1, result.verdict_) << "in the dark, by corners that were found before";
}

}  // namespace
