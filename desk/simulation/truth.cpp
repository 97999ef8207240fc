#include "desk/simulation/truth.h"

#include <algorithm>
#include <array>
#include <cmath>

#include "chart/chart_layout.h"
#include "desk/scenes/scene.h"
#include "desk/simulation/camera_table.h"
#include "desk/simulation/development.h"
#include "desk/simulation/method_law.h"

namespace qv {

namespace {

// CIE L*a*b* of stored levels (sRGB transfer function, D65 matrix), relative to an implicit white of 1, 1, 1.
cv::Vec3d Lab(const cv::Vec3d& rgb) {
  const auto linear = [](double v) {
    const double c = std::clamp(v / 255, 0.0, 1.0);
    return c <= 0.04045 ? c / 12.92 : std::pow((c + 0.055) / 1.055, 2.4);
  };
  const auto f = [](double t) { return t > 216.0 / 24389 ? std::cbrt(t) : (24389.0 / 27 * t + 16) / 116; };
  const cv::Matx33d xyz_from_rgb(0.4124, 0.3576, 0.1805, 0.2126, 0.7152, 0.0722, 0.0193, 0.1192, 0.9505);
  const cv::Vec3d xyz = xyz_from_rgb * cv::Vec3d(linear(rgb[0]), linear(rgb[1]), linear(rgb[2]));
  return {116 * f(xyz[1]) - 16, 500 * (f(xyz[0]) - f(xyz[1])), 200 * (f(xyz[1]) - f(xyz[2]))};
}

}  // namespace

Json ToJson(cv::Point2d p) { return {{"x", p.x}, {"y", p.y}}; }

Json ToJson(const cv::Vec3d& v) { return {v[0], v[1], v[2]}; }

Json Parameters(const CameraModel& camera) {
  Json json = {{"width", camera.size.width}, {"height", camera.size.height}};
  for (const CameraNumber& row : kCameraNumbers) json[row.key] = camera.*row.member;
  json["smear_px"] = ToJson(camera.smear_px);
  json["cast"] = ToJson(camera.cast);
  json["saturation"] = ToJson(camera.saturation);
  json["transfer"] = camera.srgb ? "srgb" : "none";
  json["mosaic"] = camera.mosaic ? "bayer" : "none";
  json["seed"] = camera.seed;
  return json;
}

cv::Point2d Seen(const CameraModel& camera, const cv::Matx33d& photo_from_scene, cv::Point2d point) {
  return OnSensor(camera, Map(photo_from_scene, point));
}

double PixelsPerUnit(const cv::Matx33d& photo_from_scene) {
  const cv::Point2d middle(kChartSide / 2.0, kChartSide / 2.0);
  return cv::norm(Map(photo_from_scene, middle + cv::Point2d(1, 0)) - Map(photo_from_scene, middle));
}

int ModuleOf(const SimulationOptions& options) {
  for (const MarkSize& size : kMarkSizes) {
    if (options.marks == size.name) return size.module;
  }
  CameraModel upright = options.camera;
  upright.turn_deg = upright.pan_deg = upright.tilt_deg = 0;
  return SuitableMarks(PixelsPerUnit(PhotoFromScene(upright, SfrChartBounds()))).module;
}

cv::Mat Stored(const CameraModel& camera, const cv::Mat& levels) {
  return cv::max(cv::min(Develops(camera) ? Develop(camera, levels) : levels, 255), 0);
}

cv::Mat Gray(const cv::Mat& levels) {
  cv::Mat gray;
  cv::transform(levels, gray, cv::Matx13f(0.299f, 0.587f, 0.114f));
  return gray;
}

Json MarkTruth(const CameraModel& camera, const cv::Matx33d& photo_from_scene, double module) {
  std::array<cv::Point2d, 3> marks;
  for (std::size_t i = 0; i < marks.size(); ++i) {
    const auto& [x, y] = kMarkCentres[i];
    marks[i] = Seen(camera, photo_from_scene, {static_cast<double>(x), static_cast<double>(y)});
  }
  const cv::Point2d right = marks[1] - marks[0];
  const cv::Point2d down = marks[2] - marks[0];
  return {{"marks", {ToJson(marks[0]), ToJson(marks[1]), ToJson(marks[2])}},
          {"module_px", PixelsPerUnit(photo_from_scene) * module},
          {"legs_ratio", cv::norm(right) / cv::norm(down)},
          {"legs_angle_deg", std::acos(right.dot(down) / cv::norm(right) / cv::norm(down)) * 180 / CV_PI},
          {"chart_turn_deg", std::atan2(-right.y, right.x) * 180 / CV_PI},
          {"centre", ToJson((marks[1] + marks[2]) / 2)}};  // middle of the longest side
}

Json EdgeTruth(const CameraModel& camera, cv::Point2d from, cv::Point2d to, int npix, double contrast) {
  const cv::Point2d along = to - from;
  const cv::Point2d normal(along.y, -along.x);
  const auto response = [&](double f) { return LensResponse(camera, f, normal); };
  const double mtf50 = 2 * method_law::HalfPoint(response, 1.0);
  const method_law::Bounds expected = method_law::MeasuredMtf50(response, npix);
  Json sfr = Json::array();
  for (int i = 0; i <= 20; ++i) sfr.push_back({i / 20.0, response(i / 40.0)});
  const double direction = std::atan2(along.y, along.x) * 180 / CV_PI;
  Json truth = {{"edge_direction_deg", direction},
                {"edge_angle_deg", std::remainder(direction, 90)},
                {"sfr", sfr},  // frequency in units of Nyquist, response
                {"mtf50_nyquist", mtf50},
                {"mtf50_cycles_per_pixel", mtf50 / 2},
                {"expected_low_nyquist", expected.low},
                {"expected_high_nyquist", expected.high}};
  if (Develops(camera)) truth["system"] = SystemTruth(camera, along, contrast);
  return truth;
}

Json PatchTruth(const CameraModel& camera, const cv::Matx33d& photo_from_scene) {
  Json patches = Json::array();
  const cv::Vec3d gains = camera.Gains();
  for (int i = 0; i < static_cast<int>(kPatches.size()); ++i) {
    const cv::Vec3d drawn(kPatches[i].red, kPatches[i].green, kPatches[i].blue);
    const cv::Vec3d light = camera.srgb ? cv::Vec3d(LightOf(drawn[0]), LightOf(drawn[1]), LightOf(drawn[2])) : drawn;
    const cv::Vec3d seen = DevelopColour(camera, light.mul(gains));  // at the photo's middle; shading is not in it
    patches.push_back({{"number", i},
                       {"name", kPatches[i].name},
                       {"drawn_srgb", ToJson(drawn)},
                       {"photo_srgb", ToJson(seen)},
                       {"lab", ToJson(Lab(seen))},
                       {"centre", ToJson(Seen(camera, photo_from_scene, PatchCentre(i)))}});
  }
  return patches;
}

}  // namespace qv
