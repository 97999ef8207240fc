#include <gmock/gmock.h>

#include <cmath>
#include <cstdlib>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <regex>

#include "chart/chart_layout.h"
#include "unit_tests/program.h"

// The sheets as other programs render them, at 10 pixels a millimetre, held against the chart's geometry.

namespace {

using nlohmann::json;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

struct Sheet {
  cv::Mat picture;  // CV_8UC3
  std::string facts;
  double px_per_unit = 0;
};

// Where a line of pixels changes from its first level to its last.
double Crossing(const cv::Mat& line) {
  const double first = *line.ptr();
  const double last = *line.ptr(line.rows - 1, line.cols - 1);
  return static_cast<double>(line.total()) * (cv::mean(line)[0] - last) / (first - last) - 0.5;
}

class ChartSheets : public SimulatedPhotos {
 protected:
  void Shell(const std::string& command) const {
    const std::string there = "cd '" + folder_.Path("") + "' && " + command;
    ASSERT_EQ(0, std::system(there.c_str())) << command;  // NOLINT(cert-env33-c): names of a test's own folder
  }

  // The sheet as shown, in sheet.png.
  Sheet Draw(const std::string& extension, const std::string& options = "") const {
    const std::string file = "sheet" + extension;
    const ProgramRun run = Run("chart --dpi 254 -o " + file + " " + options);
    EXPECT_EQ(0, run.status) << run.err;
    if (extension == ".svg") Shell("rsvg-convert -b white -d 254 -p 254 -o sheet.png sheet.svg");
    if (extension == ".pdf") Shell("pdftoppm -png -singlefile -r 254 sheet.pdf sheet");
    EXPECT_THAT(run.out, StartsWith(file + "\n  "));
    Sheet sheet = {cv::imread(folder_.Path("sheet.png")), "", 0};
    sheet.facts = std::regex_replace(run.out.substr(file.size() + 3), std::regex("\n  "), "\n");
    std::smatch scale;
    if (std::regex_search(sheet.facts, scale, std::regex("(.*) mm per chart unit"))) {
      sheet.px_per_unit = 10 * std::stod(scale[1]);
    }
    return sheet;
  }

  // What a phone's code reader sees; it adds a line end.
  std::string ReadCode(const cv::Mat& picture) const {
    folder_.Write("code.png", picture);
    Shell("zbarimg -q --nodbus --raw code.png >read.txt");
    return ReadFile(folder_.Path("read.txt"));
  }

  // Photographs the sheet on a dark table: turned, a little blurred, dim and noisy.
  cv::Mat Photograph(const cv::Mat& sheet, double turn_deg) const {
    cv::Mat photo;
    cv::copyMakeBorder(sheet, photo, 300, 300, 500, 500, cv::BORDER_CONSTANT, cv::Scalar::all(60));
    const cv::Point2f middle(photo.cols / 2.0F, photo.rows / 2.0F);
    cv::warpAffine(photo, photo, cv::getRotationMatrix2D(middle, turn_deg, 1), photo.size(), cv::INTER_LINEAR,
                   cv::BORDER_CONSTANT, cv::Scalar::all(60));
    cv::GaussianBlur(photo, photo, cv::Size(), 1);
    cv::Mat grain(photo.size(), CV_16SC3);
    cv::RNG(7).fill(grain, cv::RNG::NORMAL, 0, 4);
    cv::add(photo * 0.9, grain, photo, cv::noArray(), CV_8U);
    folder_.Write("photo.png", photo);
    return photo;
  }
};

class SheetFiles : public ChartSheets, public ::testing::WithParamInterface<const char*> {};

// Darkness along a line of pixels, in pixels of full black; what lies past the ends is white.
double Darkness(const cv::Mat& line) { return static_cast<double>(line.total()) * (1 - cv::mean(line)[0] / 255); }

// In chart units: the marks' square has 6970 of them a side, the paper's width between its margins of 10 mm 7910.
TEST_P(SheetFiles, HaveTheChartsMeasures) {
  const Sheet sheet = Draw(GetParam());
  ASSERT_NEAR(2100, sheet.picture.cols, 1);
  ASSERT_NEAR(2970, sheet.picture.rows, 1);
  EXPECT_NEAR(1900 / 7910.0, sheet.px_per_unit, 1e-4);
  cv::Mat grey;
  cv::cvtColor(sheet.picture, grey, cv::COLOR_BGR2GRAY);

  // Marks: the search gives whole pixels, their darkness the rest.
  std::vector<cv::Point2d> marks;
  // Drawn, not photographed: its white paper ends at level 255, which is a doubt.
  for (const json& mark : Measured(Record("autofocus sheet.png", 3), "camera_autofocus_marks")) {
    const int half = static_cast<int>(4.5 * 25 * sheet.px_per_unit);
    const cv::Rect window(mark[0].get<int>() - half, mark[1].get<int>() - half, 2 * half, 2 * half);
    const cv::Moments dark = cv::moments(255 - grey(window));
    marks.emplace_back(window.x + dark.m10 / dark.m00, window.y + dark.m01 / dark.m00);
    EXPECT_NEAR((1 + 3 + 1) * 25 * sheet.px_per_unit, Darkness(grey(window).row(half)), 0.4) << "fine marks";
  }
  // The scale is printed with four digits; the SVG's coordinates go in steps of 1/256 mm.
  EXPECT_NEAR(1674.2, marks[1].x - marks[0].x, 0.5);
  EXPECT_NEAR(1674.2, marks[2].y - marks[0].y, 0.5);
  EXPECT_NEAR(marks[0].y, marks[1].y, 0.1);
  EXPECT_NEAR(marks[0].x, marks[2].x, 0.1);
  EXPECT_NEAR(sheet.picture.cols, marks[0].x + marks[1].x + 1, 1) << "the chart is not in the middle";
  const auto place = [&](double x, double y) { return marks[0] + cv::Point2d(x, y) * sheet.px_per_unit; };

  // Edges of 5 degrees through the whole of two regions of 2160 x 750, crossing their middles.
  const double slope = std::tan(5 * CV_PI / 180);
  for (const double along : {-1080.0, -500.0, 0.0, 500.0, 1080.0}) {
    const cv::Point2d upright = place(3605 + slope * along, 2020 + along);
    const cv::Rect across(cvRound(place(3230, 0).x), cvRound(upright.y), cvRound(750 * sheet.px_per_unit), 1);
    EXPECT_NEAR(upright.x, across.x + Crossing(grey(across)), 0.5) << along;
    const cv::Point2d lying = place(4960 + along, 3635 - slope * along);
    const cv::Rect down(cvRound(lying.x), cvRound(place(0, 3260).y), 1, cvRound(750 * sheet.px_per_unit));
    EXPECT_NEAR(lying.y, down.y + Crossing(grey(down)), 0.5) << along;
  }

  // Patches of 940 at the sevenths of the square's sides: six along the top, the bottom, the left, the right.
  for (int i = 0; i < 24; ++i) {
    const double along = (i % 6 + 1) * 6970 / 7.0;
    const double across = i / 6 % 2 * 6970;
    const cv::Point middle = i < 12 ? place(along, across) : place(across, along);
    const int half = static_cast<int>(0.9 * 470 * sheet.px_per_unit);
    const cv::Scalar seen = cv::mean(sheet.picture({middle.x - half, middle.y - half, 2 * half, 2 * half}));
    const cv::Scalar drawn(kPatches[i].blue, kPatches[i].green, kPatches[i].red);
    EXPECT_LE(cv::norm(seen, drawn, cv::NORM_INF), 1) << kPatches[i].name;  // renderers round colours their own way
    const cv::Point frame(cvRound(middle.x + 465 * sheet.px_per_unit), middle.y);
    EXPECT_NEAR(185, grey.at<uchar>(frame), 8) << "shows where the white one is";
    if (drawn == cv::Scalar(255, 255, 255)) continue;  // as the paper
    const int reach = cvRound(498 * sheet.px_per_unit);
    const cv::Rect line(middle.x - (i < 12 ? reach : 0), middle.y - (i < 12 ? 0 : reach), i < 12 ? 2 * reach : 1,
                        i < 12 ? 1 : 2 * reach);
    EXPECT_NEAR(940 * sheet.px_per_unit, cv::countNonZero(grey(line) < 250), 2.5) << kPatches[i].name;
  }
}

TEST_P(SheetFiles, CarryRulerAndCode) {
  for (const std::string kind : {"sfr", "target", "dust"}) {
    const Sheet sheet = Draw(GetParam(), "--kind " + kind);
    cv::Mat grey;
    cv::cvtColor(sheet.picture, grey, cv::COLOR_BGR2GRAY);
    const cv::Mat label = grey.rowRange(grey.rows - 380, grey.rows);

    // 4 mm below the top line of the ruler only the ticks of whole centimetres are left.
    int top = 0;
    while (top < 100 && cv::countNonZero(label.row(top) < 240) < 500) ++top;
    cv::Mat ignored;
    cv::Mat_<double> ticks;  // below the background
    const cv::Mat dark = label(cv::Rect(0, top + 40, 1300, 1)) <= 240;
    ASSERT_EQ(12, cv::connectedComponentsWithStats(dark, ignored, ignored, ticks)) << kind;
    for (int i = 0; i < 11; ++i) EXPECT_NEAR(100 * i, ticks(i + 1, 0) - ticks(1, 0), 0.5) << kind;

    EXPECT_EQ(sheet.facts, ReadCode(label)) << kind;
    EXPECT_THAT(sheet.facts, HasSubstr("qvtester " + kind + " chart, revision "));
    EXPECT_THAT(sheet.facts, HasSubstr("print at 100 %"));
  }
}

INSTANTIATE_TEST_SUITE_P(Formats, SheetFiles, ::testing::Values(".svg", ".pdf", ".png"),
                         [](const auto& format) { return std::string(format.param + 1); });

TEST_F(ChartSheets, APhotoOfTheWholeSheetShowsThreeMarks) {
  const Sheet sheet = Draw(".png");
  for (const double turn : {3.0, 180.0}) {
    const cv::Mat photo = Photograph(sheet.picture, turn);
    const json record = Record("autofocus photo.png --quiet");
    EXPECT_THAT(err_, IsEmpty()) << "turned by " << turn;
    EXPECT_EQ(3, Measured(record, "camera_autofocus_mark_candidates"));
    const double turn_deg = Measured(record, "camera_autofocus_chart_turn");
    EXPECT_NEAR(0, std::remainder(turn - turn_deg, 360), 0.2);  // marks come in whole pixels
    EXPECT_EQ(sheet.facts, ReadCode(photo)) << "light as the code is, readers see it";
  }
}

TEST_F(ChartSheets, ThePaperIsTurnedForTheLargestChart) {
  EXPECT_THAT(Draw(".svg", "--paper 300x200").facts, HasSubstr("paper 200 x 300 mm"));
  EXPECT_THAT(Draw(".svg", "--kind dust").facts, HasSubstr("paper A4, 297 x 210 mm"));
  const Sheet wide = Draw(".png", "--paper A3 --margin 0");
  EXPECT_EQ(cv::Size(2970, 4200), wide.picture.size());
  EXPECT_NEAR(2970 / 7910.0, wide.px_per_unit, 1e-4) << "a chart less wide than the paper";
  const std::string per_metre = {0, 0, '\x27', '\x10'};  // 10 000: the picture knows its printed size
  EXPECT_EQ("pHYs" + per_metre + per_metre + '\1', ReadFile(folder_.Path("sheet.png")).substr(37, 13));
}

TEST_F(ChartSheets, WhatHasNoRoomIsRefused) {
  for (const auto& [options, complaint] : {std::pair("--paper 100x100", "need 138 x 121 mm inside the margins"),
                                           {"--margin 60", "take larger paper or a smaller margin"},
                                           {"--paper B7", "name A5 to A0 or Letter"},
                                           {"--paper 210x-297", "WIDTHxHEIGHT in mm"},
                                           {"--margin -1", "--margin"},
                                           {"--paper A0 --dpi 1200", "more than a picture can have"},
                                           {"-o sheet.jpg", "name a .svg, .pdf or .png file"}}) {
    ExpectComplaint(std::string("chart -o sheet.png ") + options, 2, complaint);
  }
}

}  // namespace
