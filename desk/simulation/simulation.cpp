#include "desk/simulation/simulation.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/base/failure.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/scenes/charts.h"
#include "desk/scenes/targets.h"
#include "desk/simulation/display_photo.h"
#include "desk/simulation/method_law.h"

namespace qv {

namespace {

Json ToJson(cv::Point2d p) { return {{"x", p.x}, {"y", p.y}}; }

Json ToJson(const cv::Vec3d& v) { return {v[0], v[1], v[2]}; }

Json Parameters(const SimulationOptions& o) {
  const CameraModel& c = o.camera;
  return {{"width", c.size.width},
          {"height", c.size.height},
          {"fill", c.fill},
          {"turn_deg", c.turn_deg},
          {"pan_deg", c.pan_deg},
          {"tilt_deg", c.tilt_deg},
          {"blur_px", c.blur_px},
          {"defocus_px", c.defocus_px},
          {"smear_px", ToJson(c.smear_px)},
          {"gain", c.gain},
          {"exposure_ev", c.exposure_ev},
          {"cast", ToJson(c.cast)},
          {"shading_percent", c.shading_percent},
          {"noise_percent", c.noise_percent},
          {"full_well", c.full_well},
          {"seed", c.seed}};
}

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

// Grey as the tests weigh it: the first channel of a BGR photo is taken for red.
cv::Mat Gray(const cv::Mat& levels) {
  cv::Mat gray;
  cv::transform(levels, gray, cv::Matx13f(0.299f, 0.587f, 0.114f));
  return gray;
}

double PixelsPerUnit(const cv::Matx33d& photo_from_scene) {
  const cv::Point2d middle(kChartSide / 2.0, kChartSide / 2.0);
  return cv::norm(Map(photo_from_scene, middle + cv::Point2d(1, 0)) - Map(photo_from_scene, middle));
}

// "auto" suits the marks to an upright photo, so that turning the chart does not change it.
int ModuleOf(const SimulationOptions& options) {
  for (const MarkSize& size : kMarkSizes) {
    if (options.marks == size.name) return size.module;
  }
  CameraModel upright = options.camera;
  upright.turn_deg = upright.pan_deg = upright.tilt_deg = 0;
  return SuitableMarks(PixelsPerUnit(PhotoFromScene(upright, SfrChartBounds()))).module;
}

// Marks and what the tests read of their places.
Json MarkTruth(const cv::Matx33d& photo_from_scene, double module) {
  std::array<cv::Point2d, 3> marks;
  for (std::size_t i = 0; i < marks.size(); ++i) {
    const auto& [x, y] = kMarkCentres[i];
    marks[i] = Map(photo_from_scene, {static_cast<double>(x), static_cast<double>(y)});
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

// True figure of one edge and what the measure may read of it, in units of Nyquist.
Json EdgeTruth(const CameraModel& camera, cv::Point2d from, cv::Point2d to, int npix) {
  const cv::Point2d along = to - from;
  const cv::Point2d normal(along.y, -along.x);
  const auto response = [&](double f) { return LensResponse(camera, f, normal); };
  const double mtf50 = 2 * method_law::HalfPoint(response, 1.0);
  const method_law::Bounds expected = method_law::MeasuredMtf50(response, npix);
  Json sfr = Json::array();
  for (int i = 0; i <= 20; ++i) sfr.push_back({i / 20.0, response(i / 40.0)});
  const double direction = std::atan2(along.y, along.x) * 180 / CV_PI;
  return {{"edge_direction_deg", direction},
          {"edge_angle_deg", std::remainder(direction, 90)},
          {"sfr", sfr},  // frequency in units of Nyquist, response
          {"mtf50_nyquist", mtf50},
          {"mtf50_cycles_per_pixel", mtf50 / 2},
          {"expected_low_nyquist", expected.low},
          {"expected_high_nyquist", expected.high}};
}

Json PatchTruth(const CameraModel& camera, const cv::Matx33d& photo_from_scene) {
  Json patches = Json::array();
  const cv::Vec3d gains = camera.Gains();
  for (int i = 0; i < static_cast<int>(kPatches.size()); ++i) {
    const cv::Vec3d drawn(kPatches[i].red, kPatches[i].green, kPatches[i].blue);
    const cv::Vec3d seen = drawn.mul(gains);  // at the photo's middle; shading is not in it
    patches.push_back({{"number", i},
                       {"name", kPatches[i].name},
                       {"drawn_srgb", ToJson(drawn)},
                       {"photo_srgb", ToJson(seen)},
                       {"lab", ToJson(Lab(seen))},
                       {"centre", ToJson(Map(photo_from_scene, PatchCentre(i)))}});
  }
  return patches;
}

Simulation ChartPhoto(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  SfrChartStyle style = options.style;
  style.module = ModuleOf(options);
  const cv::Matx33d map = PhotoFromScene(camera, SfrChartBounds());
  Simulation s;
  s.levels = {Expose(camera, SfrChart(style), map)};

  const double scale = PixelsPerUnit(map);
  const int npix = static_cast<int>(kVerticalRegion.height * scale);
  const auto target = EdgeTarget(style.edge_angle_deg);
  s.truth["edge_angle_deg"] = style.edge_angle_deg;
  s.truth["contrast"] = style.contrast;
  s.truth["module_units"] = style.module;
  s.truth["pixels_per_unit"] = scale;
  s.truth["npix"] = npix;
  s.truth.update(MarkTruth(map, style.module));
  s.truth["mtf50"] = {{"vertical", EdgeTruth(camera, Map(map, target[0]), Map(map, target[1]), npix)},
                      {"horizontal", EdgeTruth(camera, Map(map, target[0]), Map(map, target[3]), npix)}};
  s.truth["patches"] = PatchTruth(camera, map);
  s.truth["flash_mean"] = cv::mean(cv::min(s.levels[0], 255))[0];
  return s;
}

Simulation TargetPhoto(const SimulationOptions& options) {
  const cv::Matx33d map = PhotoFromScene(options.camera, SfrChartBounds());
  Simulation s;
  s.levels = {Expose(options.camera, AimingTarget(), map)};
  s.truth.update(MarkTruth(map, kMarkSizes.back().module));
  return s;
}

Simulation PreviewFrames(const SimulationOptions& options) {
  Simulation s = ChartPhoto(options);
  SfrChartStyle style = options.style;
  style.module = ModuleOf(options);
  const cv::Matx33d moved = cv::Matx33d(1, 0, options.motion_px.x, 0, 1, options.motion_px.y, 0, 0, 1) *
                            PhotoFromScene(options.camera, SfrChartBounds());
  s.levels.push_back(Expose(options.camera, SfrChart(style), moved));
  s.truth["motion_px"] = ToJson(options.motion_px);
  cv::Mat difference;
  cv::absdiff(Gray(s.levels[0]), Gray(s.levels[1]), difference);
  s.truth["difference_mean"] = cv::mean(difference)[0] / 255;
  return s;
}

// Specks at random places, apart from each other and from the border.
Simulation DustPhoto(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  const double apart = 4 * options.speck_px + 40;
  const double border = std::min(options.speck_px + 25, std::min(camera.size.width, camera.size.height) / 2.0 - 1);
  cv::RNG random(camera.seed + 12345);
  std::vector<DustSpeck> specks;
  for (int tries = 0; static_cast<int>(specks.size()) < options.specks && tries < 1000 * (options.specks + 1);
       ++tries) {
    const double x = random.uniform(border, camera.size.width - border);
    const double y = random.uniform(border, camera.size.height - border);
    const cv::Point2d at(x, y);
    const bool free = std::none_of(specks.begin(), specks.end(),
                                   [&](const DustSpeck& speck) { return cv::norm(speck.centre - at) < apart; });
    if (free) specks.push_back({at, options.speck_px});
  }
  if (static_cast<int>(specks.size()) < options.specks) {
    throw Failure(kWrongUsage, Format("--specks %d: only %zu have room in the photo", options.specks, specks.size()));
  }
  Simulation s;
  s.levels = {Expose(camera, DustyTarget(specks, options.speck_darkness), cv::Matx33d::eye())};
  s.truth["specks"] = Json::array();
  for (const DustSpeck& speck : specks) {
    Json json = ToJson(speck.centre);
    json["diameter_px"] = speck.diameter_px;
    s.truth["specks"].push_back(json);
  }
  s.truth["darkness"] = options.speck_darkness;
  const cv::Mat gray = Gray(cv::min(s.levels[0], 255));
  s.truth["mean_level"] = cv::mean(gray)[0];
  std::vector<int> histogram(256);
  for (const float level : cv::Mat_<float>(gray)) ++histogram[std::clamp(cvRound(level), 0, 255)];
  s.truth["histogram"] = histogram;  // without noise
  return s;
}

// The second photo is the first one's view turned and scaled about its middle, then moved.
Simulation PhotoPair(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  const double side = 1.6 * std::hypot(camera.size.width, camera.size.height);  // beyond both views
  const cv::Point2d middle((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  const cv::Matx33d first(1, 0, middle.x - side / 2, 0, 1, middle.y - side / 2, 0, 0, 1);
  const double turn = options.second_turn_deg * CV_PI / 180;
  const double c = options.second_scale * std::cos(turn);
  const double s = options.second_scale * std::sin(turn);
  const cv::Point2d to = middle + options.motion_px;
  const cv::Matx33d move(c, s, to.x - c * middle.x - s * middle.y, -s, c, to.y + s * middle.x - c * middle.y, 0, 0, 1);
  const Scene scene = TexturedScene(side, camera.seed);
  CameraModel second = camera;
  second.gain *= options.second_gain;
  Simulation pair;
  pair.levels = {Expose(camera, scene, first), Expose(second, scene, move * first)};
  pair.truth["matrix"] = {move(0, 0), move(0, 1), move(0, 2), move(1, 0), move(1, 1), move(1, 2)};
  pair.truth["shift_px"] = ToJson(options.motion_px);
  pair.truth["turn_deg"] = options.second_turn_deg;
  pair.truth["scale"] = options.second_scale;
  pair.truth["gain"] = options.second_gain;
  return pair;
}

// The first four dots lie in the corners, the next four at the middle of the edges, the rest anywhere; by turns bright
// and dark.
Simulation HdrCapture(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  const int right = camera.size.width - options.dot_px;
  const int bottom = camera.size.height - options.dot_px;
  const int apart = options.dot_px + 8;
  if (right < 0 || bottom < 0) throw Failure(kWrongUsage, "--dot-size: larger than the photo");
  cv::Mat factors(camera.size, CV_32FC3, cv::Scalar::all(1));
  cv::Mat taken = cv::Mat::zeros(camera.size, CV_8U);  // where another dot would come too near
  cv::RNG random(camera.seed + 12345);
  std::vector<cv::Rect> dots;
  Simulation s;
  s.truth["dots"] = Json::array();
  const std::vector<cv::Point> first = {{0, 0},         {right, 0},          {0, bottom},         {right, bottom},
                                        {right / 2, 0}, {right, bottom / 2}, {right / 2, bottom}, {0, bottom / 2}};
  for (int tries = 0; static_cast<int>(dots.size()) < options.dots && tries < 1000 * options.dots; ++tries) {
    cv::Point at;
    if (tries < static_cast<int>(first.size())) {
      at = first[tries];
    } else {
      at.x = random.uniform(0, right + 1);
      at.y = random.uniform(0, bottom + 1);
    }
    if (taken.at<uchar>(at) != 0) continue;
    taken(cv::Rect(at - cv::Point(apart, apart), cv::Size(2 * apart + 1, 2 * apart + 1)) & cv::Rect({}, camera.size)) =
        1;
    const double contrast = dots.size() % 2 == 0 ? options.dot_contrast : -options.dot_contrast;
    dots.emplace_back(at, cv::Size(options.dot_px, options.dot_px));
    factors(dots.back()).setTo(cv::Scalar::all(1 + contrast));
    s.truth["dots"].push_back({{"column", at.x}, {"row", at.y}, {"side_px", options.dot_px}, {"contrast", contrast}});
  }
  if (static_cast<int>(dots.size()) < options.dots) {
    throw Failure(kWrongUsage, Format("--dots %d: only %zu have room in the photo", options.dots, dots.size()));
  }
  if (camera.blur_px > 0) {
    cv::GaussianBlur(factors, factors, {}, camera.blur_px, camera.blur_px, cv::BORDER_REPLICATE);
  }
  CameraModel panel = camera;
  panel.blur_px = panel.defocus_px = 0;  // an even panel
  cv::Mat levels = Expose(panel, Scene(), cv::Matx33d::eye()).mul(factors);
  cv::RNG noise(camera.seed);
  AddNoise(camera, levels, noise);
  s.levels = {levels / 255};
  s.is_hdr = true;
  return s;
}

struct SceneRow {
  const char* name;
  Simulation (*simulate)(const SimulationOptions& options);
};

constexpr SceneRow kScenes[] = {{"chart", ChartPhoto},    {"target", TargetPhoto}, {"preview", PreviewFrames},
                                {"dust", DustPhoto},      {"pair", PhotoPair},     {"hdr", HdrCapture},
                                {"display", DisplayPhoto}};

}  // namespace

std::vector<std::string> SceneNames() {
  std::vector<std::string> names;
  for (const SceneRow& row : kScenes) names.emplace_back(row.name);
  return names;
}

Simulation Simulate(const SimulationOptions& options) {
  for (const SceneRow& row : kScenes) {
    if (options.scene != row.name) continue;
    Simulation s = row.simulate(options);
    Json truth = {{"schema", "qvtester-truth-1"}, {"scene", options.scene}, {"parameters", Parameters(options)}};
    truth.update(s.truth);
    s.truth = truth;
    return s;
  }
  throw Failure(kWrongUsage, "--scene " + options.scene + ": no such scene");
}

}  // namespace qv
