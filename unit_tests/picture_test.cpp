#include "desk/drawing/picture.h"

#include <gmock/gmock.h>

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/drawing/plot.h"

namespace qv {
namespace {

using ::testing::HasSubstr;

cv::Mat Decode(const Picture& picture) {
  const std::string file = picture.Png();
  return cv::imdecode(std::vector<uchar>(file.begin(), file.end()), cv::IMREAD_COLOR);
}

cv::Mat Gray(const cv::Mat& picture) {
  cv::Mat gray;
  cv::cvtColor(picture, gray, cv::COLOR_BGR2GRAY);
  return gray;
}

int Count(const cv::Mat& picture, Colour colour) {
  cv::Mat found;
  const cv::Vec3d bgr = 255 * cv::Vec3d(colour.blue, colour.green, colour.red);
  cv::inRange(picture, bgr - cv::Vec3d::all(1), bgr + cv::Vec3d::all(1), found);
  return cv::countNonZero(found);
}

// After an error cairo draws nothing more and says nothing: the picture would look finished.
TEST(Picture, APictureThatLostAStrokeIsNotHandedOut) {
  Picture picture(40, 20);
  picture.FillRectangle({0, 0, 10, 10}, kPoor);
  EXPECT_EQ(100, Count(Decode(picture), kPoor));
  picture.Text("\xFF is not UTF-8", {2, 12}, 10, kInk);
  picture.FillRectangle({10, 0, 10, 10}, kPoor);
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

// A line at half of the height, and a marker where the curve meets it; what is beyond the frame is cut.
TEST(Plot, CurvesLinesAndMarkersLieWhereTheAxesSay) {
  Picture picture(400, 300);
  Plot plot;
  plot.y_max = 2;
  plot.more_curves = {{{{0.5, 0}, {0.5, 9}}, kGood}};
  plot.markers = {{{0.25, 1}, "", kPoor}, {{0.5, NAN}, "", kDoubtful}, {{1.03, 1}, "", kDoubtful}};
  plot.horizontal_lines = {0.5};
  plot.second_curve = {{0, 1.5}, {1, 1.5}};
  DrawPlot(picture, plot, {0, 0, 400, 300});
  const cv::Mat drawn = Decode(picture);
  const cv::Rect frame(52, 28, 400 - 68, 300 - 72);
  cv::Mat good;
  cv::inRange(drawn, cv::Scalar(150, 120, 0), cv::Scalar(230, 220, 130), good);
  const cv::Rect curve = cv::boundingRect(good);
  EXPECT_NEAR(frame.x + 0.5 * frame.width, curve.x + curve.width / 2.0, 1);
  EXPECT_NEAR(frame.y, curve.y, 5);  // a dot's radius and half a stroke
  EXPECT_NEAR(frame.height, curve.height, 10);
  EXPECT_EQ(0, Count(drawn, kDoubtful));
  const auto dark = [&](const cv::Rect& part) { return cv::countNonZero(Gray(drawn(part)) < 150); };
  for (const double y : {0.5, 1.5}) {  // a limit, and a second curve
    EXPECT_GT(dark({frame.x + 5, cvRound(frame.y + frame.height * (1 - y / 2)) - 1, frame.width - 10, 2}), 300) << y;
  }
  EXPECT_GT(dark({frame.x - 20, frame.y - 8, 18, 14}), 5) << "the topmost tick";
  cv::Mat poor;
  cv::inRange(drawn, cv::Scalar(0, 0, 200), cv::Scalar(90, 90, 255), poor);
  const cv::Rect marker = cv::boundingRect(poor);
  EXPECT_NEAR(frame.x + 0.25 * frame.width, marker.x + marker.width / 2.0, 1);
  EXPECT_NEAR(frame.y + 0.5 * frame.height - 6, marker.y, 2);
}

}  // namespace
}  // namespace qv
