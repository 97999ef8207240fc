#include "desk/scenes/display.h"

#include <algorithm>

namespace qv {

namespace {

FilledShape Box(const cv::Rect2d& r, cv::Vec3d colour) {
  return {{r.tl(), {r.br().x, r.y}, r.br(), {r.x, r.br().y}}, colour};
}

// A stroke of a sign, from a to b.
FilledShape Stroke(cv::Point2d a, cv::Point2d b, double width, cv::Vec3d colour) {
  const cv::Point2d along = (b - a) * (width / 2 / cv::norm(b - a));
  const cv::Point2d across(-along.y, along.x);
  return {{a - along + across, b + along + across, b + along - across, a - along - across}, colour};
}

// What a camera records of the primaries: none is pure to it.
const cv::Vec3d kRed(235, 45, 35);
const cv::Vec3d kGreen(60, 225, 55);
const cv::Vec3d kBlue(35, 70, 240);
const cv::Vec3d kWhite(250, 250, 250);

}  // namespace

cv::Rect2d ScreenBounds(const DisplayStyle& style) { return {0, 0, kScreenWidth, kScreenWidth / style.ratio}; }

Scene Display(const DisplayStyle& style) {
  const cv::Rect2d screen = ScreenBounds(style);
  Scene scene;
  scene.paper = cv::Vec3d::all(style.surround);
  if (style.bezel > 0) {
    const cv::Point2d rim(style.bezel, style.bezel);
    scene.shapes.push_back(Box({screen.tl() - rim, screen.br() + rim}, cv::Vec3d::all(style.bezel_level)));
  }
  const auto show = [&](cv::Vec3d colour) { return colour.mul(style.tint); };
  const cv::Vec3d black = cv::Vec3d::all(style.black);
  const cv::Vec3d field = style.pattern == "white"   ? show(kWhite)
                          : style.pattern == "black" ? black
                          : style.pattern == "cross" ? show(kRed)
                                                     : show(kGreen);
  scene.shapes.push_back(Box(screen, field));
  if (style.pattern == "control") {
    const cv::Vec3d bars[] = {kRed, kGreen, kBlue, kWhite};
    for (int i = 0; i < 4; ++i) {
      scene.shapes.push_back(Box({i * screen.width / 4, 0, screen.width / 4, screen.height}, show(bars[i])));
    }
  }
  const cv::Point2d middle = (screen.tl() + screen.br()) / 2;
  const double unit = std::min(screen.width, screen.height) / 2;
  const auto sign = [&](cv::Point2d a, cv::Point2d b) {
    scene.shapes.push_back(Stroke(middle + unit * a, middle + unit * b, 0.18 * unit, show(kWhite)));
  };
  if (style.pattern == "tick") {
    sign({-0.5, 0.05}, {-0.15, 0.45});
    sign({-0.15, 0.45}, {0.55, -0.45});
  } else if (style.pattern == "cross") {
    sign({-0.5, -0.5}, {0.5, 0.5});
    sign({-0.5, 0.5}, {0.5, -0.5});
  }
  const cv::Point2d half(style.defect_side / 2, style.defect_side / 2);
  for (const cv::Point2d at : style.defects) {
    scene.shapes.push_back(Box({at - half, at + half}, style.pattern == "black" ? show(kWhite) : black));
  }
  return scene;
}

}  // namespace qv
