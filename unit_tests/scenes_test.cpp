// What stands before the camera, by its measures.

#include <gtest/gtest.h>

#include <cmath>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "desk/scenes/display.h"
#include "desk/scenes/lights.h"
#include "desk/scenes/print.h"
#include "desk/scenes/targets.h"
#include "desk/simulation/camera.h"
#include "desk/simulation/photo_file.h"
#include "desk/simulation/simulation.h"

namespace qv {
namespace {

// Width and height of a shape.
cv::Size2d Extent(const FilledShape& shape) {
  std::vector<cv::Point2f> outline(shape.outline.begin(), shape.outline.end());
  const cv::RotatedRect box = cv::minAreaRect(outline);
  return {std::max(box.size.width, box.size.height), std::min(box.size.width, box.size.height)};
}

TEST(PhotoFiles, KeepEveryLevel) {
  cv::Mat photo(31, 47, CV_16UC3);
  cv::randu(photo, 0, 65536);
  cv::Mat eight;
  photo.convertTo(eight, CV_8U, 1 / 257.0);
  for (const auto& [name, levels] :
       {std::pair{"a.png", eight}, {"a.tif", eight}, {"a.bmp", eight}, {"a.png", photo}, {"a.tif", photo}}) {
    const std::string file = EncodePhoto(levels, {name});
    const cv::Mat back = cv::imdecode(std::vector<char>(file.begin(), file.end()), cv::IMREAD_UNCHANGED);
    ASSERT_EQ(levels.type(), back.type()) << name;
    EXPECT_EQ(0, cv::norm(levels, back, cv::NORM_INF)) << name;
  }
}

// Of a well of one electron, a level is as many electrons as it is shares of 255.
TEST(Camera, ShotNoiseIsThatOfTheSmallestWellToo) {
  CameraModel camera;
  camera.full_well = 1;
  cv::Mat levels(100, 100, CV_32FC3, cv::Scalar::all(100));
  cv::RNG random(1);
  AddNoise(camera, levels, random);
  EXPECT_NEAR(std::sqrt(100 * 255.0),
              cv::norm(levels, cv::Mat(levels.size(), levels.type(), cv::Scalar::all(100))) / std::sqrt(3e4), 3);
}

TEST(Scenes, LightsStandInRowsAndColumns) {
  LightsStyle style;
  style.columns = 3;
  style.rows = 2;
  EXPECT_EQ(cv::Point2d(600, 200), LightMiddle(style, 1));
  EXPECT_EQ(cv::Point2d(200, 600), LightMiddle(style, 3));
  EXPECT_EQ(cv::Rect2d(0, 0, 1200, 800), LightsBounds(style));
}

TEST(Scenes, DefectsAndSpecksHaveTheSizeThatIsAskedFor) {
  PrintStyle print;
  print.defects = {{{400, 300}, 25, false}};
  EXPECT_NEAR(25, Extent(Print(print).shapes.back()).height, 1e-3);
  const Scene dust = DustyTarget({{{50, 60}, 12}}, 0.5);
  EXPECT_NEAR(12, Extent(dust.shapes.at(0)).width, 0.02) << "a disc";
  EXPECT_NEAR(127.5, dust.shapes.at(0).colour[0], 0.1);
  LightsStyle lights;
  lights.spots = {{{200, 200}, 40}};
  EXPECT_NEAR(40, Extent(Lights(lights).shapes.back()).width, 1e-3);
}

TEST(Scenes, SignsHaveTwoStrokes) {
  for (const char* pattern : {"tick", "cross"}) {
    DisplayStyle plain;
    plain.pattern = pattern;
    EXPECT_EQ(3U, Display(plain).shapes.size()) << "the field and two";
  }
}

TEST(Scenes, TheTruthOfADustPhotoIsItsOwn) {
  SimulationOptions options;
  options.scene = "dust";
  options.camera.size = {1000, 800};
  options.specks = 30;
  options.speck_px = 10;
  options.camera.gain = 0.5;
  options.camera.cast = {1, 0.8, 0.6};
  options.camera.blur_px = 3;
  options.speck_blur_px = 4;
  const Json truth = Simulate(options).truth;
  const Json& specks = truth["specks"];
  EXPECT_NEAR(5, specks[0]["blur_px"], 1e-9) << "blurs add by their squares";
  for (std::size_t i = 0; i < specks.size(); ++i) {
    for (std::size_t k = 0; k < i; ++k) {
      const cv::Point2d off(specks[i]["x"].get<double>() - specks[k]["x"].get<double>(),
                            specks[i]["y"].get<double>() - specks[k]["y"].get<double>());
      EXPECT_GE(cv::norm(off), 80) << "four diameters, and 40 px";
    }
  }
  // Photos hold blue first, which the tests take for red; the specks darken a two-hundredth of the photo.
  EXPECT_NEAR(127.5 * (0.299 * 0.6 + 0.587 * 0.8 + 0.114), truth["mean_level"], 0.6);
}

TEST(Scenes, TheChartLiesInThePhotosMiddle) {
  SimulationOptions options;
  options.camera.size = {640, 480};
  const Json marks = Simulate(options).truth["marks"];
  EXPECT_NEAR((640 - 1) / 2.0, (marks[0]["x"].get<double>() + marks[1]["x"].get<double>()) / 2, 1e-6);
  EXPECT_NEAR((480 - 1) / 2.0, (marks[0]["y"].get<double>() + marks[2]["y"].get<double>()) / 2, 1e-6);
}

}  // namespace
}  // namespace qv
