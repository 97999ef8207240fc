#include "desk/drawing/picture.h"

#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/drawing/labels.h"
#include "desk/drawing/plot.h"

namespace qv {
namespace {

using ::testing::HasSubstr;

cv::Mat Decode(const Picture& picture) {
  const std::string file = picture.Png();
  return cv::imdecode(std::vector<uchar>(file.begin(), file.end()), cv::IMREAD_COLOR);
}

cv::Mat MaskOf(const cv::Mat& picture, Colour colour, double slack = 1) {
  cv::Mat found;
  const cv::Vec3d bgr = 255 * cv::Vec3d(colour.blue, colour.green, colour.red);
  cv::inRange(picture, bgr - cv::Vec3d::all(slack), bgr + cv::Vec3d::all(slack), found);
  return found;
}

int Count(const cv::Mat& picture, Colour colour) { return cv::countNonZero(MaskOf(picture, colour)); }

// Relative luminance and contrast as WCAG 2.1 defines them.
double Luminance(Colour c) {
  const auto linear = [](double v) { return v <= 0.03928 ? v / 12.92 : std::pow((v + 0.055) / 1.055, 2.4); };
  return 0.2126 * linear(c.red) + 0.7152 * linear(c.green) + 0.0722 * linear(c.blue);
}

double Contrast(Colour a, Colour b) {
  const double ratio = (Luminance(a) + 0.05) / (Luminance(b) + 0.05);
  return std::max(ratio, 1 / ratio);
}

// As seen without red cones, and without green ones (Vienot, Brettel and Mollon, 1999).
Colour SeenBy(bool no_red, Colour c) {
  const auto mix = [&](double r, double g, double b) { return r * c.red + g * c.green + b * c.blue; };
  return no_red ? Colour{mix(0.11238, 0.88762, 0), mix(0.11238, 0.88762, 0), mix(0.00401, -0.00401, 1)}
                : Colour{mix(0.29275, 0.70725, 0), mix(0.29275, 0.70725, 0), mix(-0.02234, 0.02234, 1)};
}

double Distance(Colour a, Colour b) {
  return cv::norm(cv::Vec3d(a.red, a.green, a.blue) - cv::Vec3d(b.red, b.green, b.blue));
}

TEST(Palette, EveryWordIsReadableOnItsGroundAndEveryToneToldApart) {
  constexpr double kReadable = 4.5;  // WCAG 2.1, level AA
  constexpr double kApart = 0.25;
  for (const PaletteRow& row : kPalette) {
    EXPECT_GE(Contrast(row.on_label, kLabel), kReadable) << row.name;
    EXPECT_GE(Contrast(row.on_paper, kPaper), kReadable) << row.name;
    for (const PaletteRow& other : kPalette) {
      for (const bool no_red : {true, false}) {
        if (row.tone == other.tone) continue;
        EXPECT_GE(Distance(SeenBy(no_red, row.on_label), SeenBy(no_red, other.on_label)), kApart)
            << row.name << ", " << other.name;
      }
    }
  }
  for (std::size_t i = 0; i < kSeries.size(); ++i) {
    EXPECT_GE(Contrast(kSeries[i].colour, kPaper), 3) << "WCAG 2.1 for what is no text";
    for (std::size_t j = 0; j < i; ++j) {
      EXPECT_NE(kSeries[i].dash, kSeries[j].dash);
      EXPECT_NE(kSeries[i].shape, kSeries[j].shape);
    }
  }
}

TEST(Picture, WordsStandInTheColourOfTheirToneOnTheirGround) {
  for (const PaletteRow& row : kPalette) {
    Picture picture(200, 60);
    picture.Text("MMMM", {10, 40}, 30, row.tone, Align::kLeft, true);
    EXPECT_GT(Count(Decode(picture), row.on_label), 100) << row.name;
    EXPECT_GT(Count(Decode(picture), kLabel), 1000) << row.name;
    Picture badge(200, 60);
    EXPECT_NEAR(10 + WidthOf("MMMM", 30) + 12, badge.Badge("MMMM", {10, 40}, 30, row.tone), 1e-6);
    EXPECT_GT(Count(Decode(badge), row.on_paper), 1000) << row.name;
  }
  const std::vector<std::string> lines = Wrapped("the words of a long sentence, in lines", 14.0, 100.0);
  EXPECT_GE(lines.size(), 3U);
  for (const std::string& line : lines) EXPECT_LE(WidthOf(line, 14), 100) << line;
}

TEST(Labels, LieInsideAndOverNothingThatIsToBeSeen) {
  const cv::Rect2d inside(0, 0, 300, 200);
  Labels labels(inside);
  Picture picture(300, 200);
  std::vector<cv::Rect2d> seen = {{0, 0, 120, 80}, {130, 0, 40, 200}, {0, 90, 60, 60}, {280, 180, 20, 20}};
  for (const cv::Rect2d& thing : seen) labels.Keep(thing);
  for (const std::size_t thing : {0, 1, 2, 3}) {
    const cv::Rect2d label = labels.Add(picture, {"a name", "and more"}, seen[thing], kGood);
    EXPECT_EQ(label, label & inside);
    for (const cv::Rect2d& other : seen) EXPECT_EQ(0, (label & other).area()) << thing;
    EXPECT_GT(cv::countNonZero(MaskOf(Decode(picture)(label), OnLabel(kGood), 60)), 30) << "its words";
    seen.push_back(label);
  }
}

TEST(Labels, FarOnesAreTiedToTheirThing) {
  Labels labels({0, 0, 300, 200});
  Picture picture(300, 200);
  const cv::Rect2d crowd(80, 40, 140, 120);
  labels.Keep(crowd);
  labels.Add(picture, {"a"}, {150, 100, 1, 1}, kGood);
  EXPECT_GT(cv::countNonZero(MaskOf(Decode(picture)(crowd), OnLabel(kGood), 60)), 30) << "a stroke over the crowd";
  const cv::Rect2d all_but_below(0, 0, 300, 170);
  labels.Keep(all_but_below);
  EXPECT_EQ(0, (labels.Add(picture, {"b"}, {60, 40, 1, 1}, kGood) & all_but_below).area()) << "nowhere near is room";
}

// After an error cairo draws nothing more and says nothing: the picture would look finished.
TEST(Picture, APictureThatLostAStrokeIsNotHandedOut) {
  Picture picture(40, 20);
  picture.FillRectangle({0, 0, 10, 10}, OnPaper(kPoor));
  EXPECT_EQ(100, Count(Decode(picture), OnPaper(kPoor)));
  picture.Text("\xFF is not UTF-8", {2, 12}, 10, kInk);
  picture.FillRectangle({10, 0, 10, 10}, OnPaper(kPoor));
  try {
    picture.Png();
    FAIL() << "a picture without its text";
  } catch (const Failure& e) {
    EXPECT_EQ(kInternalFault, e.kind);
    EXPECT_THAT(e.what(), HasSubstr("UTF-8"));
  }
}

TEST(Picture, TextAndOutlinesEndWhereTheyAreToldTo) {
  Picture picture(300, 100);
  picture.Text("mm", {200, 50}, 20, kPoor, Align::kRight);
  picture.Line({{10, 10}, {60, 10}, {60, 60}}, kGood, 3, true);
  const cv::Mat drawn = Decode(picture);
  EXPECT_EQ(0, cv::countNonZero(drawn.colRange(201, 300).clone().reshape(1) != 255));
  EXPECT_GT(cv::countNonZero(drawn.colRange(190, 200).clone().reshape(1) != 255), 20);
  EXPECT_NE(cv::Vec3b(255, 255, 255), drawn.at<cv::Vec3b>(35, 35)) << "the third side";
  const PhotoPlace place = picture.PlacePhoto(cv::Mat(4, 6, CV_8UC3, cv::Scalar(9, 9, 250)), {100, 20}, 10);
  EXPECT_EQ(cv::Point2d(115, 35), place({1, 1})) << "pixel centres at whole numbers";
  const cv::Mat photo = Decode(picture);
  EXPECT_EQ(cv::Vec3b(9, 9, 250), photo.at<cv::Vec3b>(20, 100));
  EXPECT_EQ(cv::Vec3b(9, 9, 250), photo.at<cv::Vec3b>(59, 159));
}

const cv::Rect kFrame(52, 28, 400 - 68, 300 - 28 - 44);  // of a plot of 400 x 300 without a legend

// What is beyond the frame is cut, on all sides.
TEST(Plot, CurvesAndMarkersLieWhereTheAxesSay) {
  Picture picture(400, 300);
  Plot plot;
  plot.y_max = 2;
  plot.curves = {{"", {{0.5, 0}, {0.5, 9}, {3, 1}}, {OnLabel(kGood), Dash::kSolid, PointShape::kNone}}};
  plot.markers = {{{0.25, 1}, "", kPoor}, {{0.5, NAN}, "", kDoubtful}, {{1.03, 1}, "", kDoubtful}};
  DrawPlot(picture, plot, {0, 0, 400, 300});
  const cv::Mat drawn = Decode(picture);
  const cv::Rect curve = cv::boundingRect(MaskOf(drawn, OnLabel(kGood), 40));
  EXPECT_NEAR(kFrame.x + 0.5 * kFrame.width, curve.x + curve.width / 2.0, 1);
  EXPECT_NEAR(kFrame.y, curve.y, 2);
  EXPECT_NEAR(kFrame.height, curve.height, 3);
  EXPECT_EQ(0, Count(drawn, OnPaper(kDoubtful)));
  EXPECT_GT(Count(drawn(cv::Rect(kFrame.x - 20, kFrame.y - 8, 18, 14)), OnPaper(kInk)), 1) << "the topmost tick";
  const cv::Rect marker = cv::boundingRect(MaskOf(drawn, OnPaper(kPoor), 20));
  EXPECT_NEAR(kFrame.x + 0.25 * kFrame.width, marker.x + marker.width / 2.0, 1);
  EXPECT_NEAR(kFrame.y + 0.5 * kFrame.height - 6, marker.y, 2);
}

TEST(Plot, AxesNeedNotBeginAtZeroAndASecondHasItsOwnNumbers) {
  Plot plot;
  plot.y_min = 10;
  plot.y_max = 12;
  plot.markers = {{{0.5, 11}, "", kPoor}};
  Picture picture(400, 300);
  DrawPlot(picture, plot, {0, 0, 400, 300});
  EXPECT_NEAR(kFrame.y + 0.5 * kFrame.height - 6, cv::boundingRect(MaskOf(Decode(picture), OnPaper(kPoor), 20)).y, 2);
  plot.second_x_label = "c/p";
  std::vector<std::string> drawn;
  for (const double factor : {1.0, 0.5}) {
    plot.second_x_factor = factor;
    Picture both(400, 300);
    DrawPlot(both, plot, {0, 0, 400, 300});
    drawn.push_back(both.Png());
  }
  EXPECT_NE(drawn[0], drawn[1]);
}

// Each part is drawn, in its colour, where it should be: without it that place is empty.
TEST(Plot, ShowsIntervalsLevelsAndALegend) {
  const Series& series = kSeries[1];
  Plot bare;
  bare.curves = {{"", {{0.2, 0.5}, {0.8, 0.5}}, series}};
  struct Part {
    const char* name;
    void (*add)(Plot& plot);
    cv::Rect where;
    Colour colour;
  };
  const int middle = kFrame.y + kFrame.height / 2;
  const Part parts[] = {
      {"interval",
       [](Plot& plot) {
         plot.curves[0].spans = {{0.1, 0.9}, {0.1, 0.9}};
       },
       cv::Rect(kFrame.x + kFrame.width / 5 - 4, kFrame.y + kFrame.height / 9, 8, kFrame.height / 4), series.colour},
      {"limit",
       [](Plot& plot) {
         plot.levels = {{0.6, "at least 0.6", true, kPoor}};
       },
       cv::Rect(kFrame.x + kFrame.width * 6 / 10 - 3, kFrame.y + 10, 6, 60), OnPaper(kPoor)},
      {"legend", [](Plot& plot) { plot.curves[0].name = "own"; }, cv::Rect(8, 284, 40, 16), series.colour},
      {"bars", [](Plot& plot) { plot.curves[0].bars = true; },
       cv::Rect(kFrame.x + kFrame.width / 5 - 3, middle + 20, 6, 40), series.colour}};
  const auto coloured = [](const Plot& plot, const Part& part) {
    Picture picture(400, 300);
    DrawPlot(picture, plot, {0, 0, 400, 300});
    return cv::countNonZero(MaskOf(Decode(picture)(part.where), part.colour, 120));
  };
  for (const Part& part : parts) {
    Plot plot = bare;
    part.add(plot);
    EXPECT_EQ(0, coloured(bare, part)) << part.name;
    EXPECT_GT(coloured(plot, part), 10) << part.name;
  }
}

}  // namespace
}  // namespace qv
