#include "desk/simulation/simulation.h"

#include <algorithm>
#include <cmath>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/simulation/truth.h"

namespace qv {

namespace {

// The largest upright square inside a light as it is turned in the photo, off its blurred rim.
cv::Rect RegionOf(const CameraModel& camera, const cv::Matx33d& map, cv::Point2d middle) {
  const cv::Point2d at = Seen(camera, map, middle);
  const double side = cv::norm(Seen(camera, map, middle + cv::Point2d(kLightSide / 2, 0)) - at);
  const double turn = camera.turn_deg * CV_PI / 180;
  const double rim = 3 * camera.blur_px + camera.defocus_px + cv::norm(camera.smear_px) / 2 + 2;
  const int half = static_cast<int>(side / (std::abs(std::cos(turn)) + std::abs(std::sin(turn))) - rim);
  if (half < 1) throw Failure(kWrongUsage, "--size: too small for the lights");
  return {cvRound(at.x) - half, cvRound(at.y) - half, 2 * half + 1, 2 * half + 1};
}

// In whole regions of the photo, apart from each other and from the rim. Sides are in photo pixels.
std::vector<cv::Point2d> PlaceSpots(const std::vector<cv::Rect>& regions, const SimulationOptions& options) {
  cv::RNG random(options.camera.seed + 12345);
  const double apart = options.spot_px + 30;
  std::vector<cv::Point2d> places;
  for (int tries = 0; static_cast<int>(places.size()) < options.spots && tries < 1000 * options.spots; ++tries) {
    const cv::Rect& region = regions[random.uniform(0, static_cast<int>(regions.size()))];
    const double rim = options.spot_px / 2 + 3;
    if (region.width < 2 * rim + 2) continue;
    const double x = random.uniform(region.x + rim, region.br().x - rim);
    const double y = random.uniform(region.y + rim, region.br().y - rim);
    const cv::Point2d at(x, y);
    const bool free =
        std::none_of(places.begin(), places.end(), [&](cv::Point2d other) { return cv::norm(other - at) < apart; });
    if (free) places.push_back(at);
  }
  if (static_cast<int>(places.size()) < options.spots) {
    throw Failure(kWrongUsage, Format("--spots %d: only %zu have room in the lights", options.spots, places.size()));
  }
  return places;
}

// CIE x and y of what is stored of this colour at the photo's middle (primaries of IEC 61966-2-1).
cv::Point2d ChromaticityOf(const CameraModel& camera, const cv::Vec3d& colour) {
  const cv::Vec3d gains = camera.Gains();
  cv::Vec3d light;
  for (int i = 0; i < 3; ++i) light[i] = camera.srgb ? LightOf(colour[i]) * gains[i] : LightOf(colour[i] * gains[i]);
  const cv::Matx33d xyz_from_rgb(0.4124, 0.3576, 0.1805, 0.2126, 0.7152, 0.0722, 0.0193, 0.1192, 0.9505);
  const cv::Vec3d xyz = xyz_from_rgb * light;
  return cv::Point2d(xyz[0], xyz[1]) / (xyz[0] + xyz[1] + xyz[2]);
}

}  // namespace

Simulation LightsPhoto(const SimulationOptions& options) {
  LightsStyle style = options.lights;
  const cv::Matx33d map = PhotoFromScene(options.camera, LightsBounds(style));
  Simulation s;
  s.truth["regions"] = Json::array();
  std::vector<cv::Rect> regions;
  for (int i = 0; i < style.columns * style.rows; ++i) {
    regions.push_back(RegionOf(options.camera, map, LightMiddle(style, i)));
    const cv::Rect& r = regions.back();
    s.truth["regions"].push_back({{"left", r.x}, {"top", r.y}, {"width", r.width}, {"height", r.height}, {"label", i}});
  }
  const cv::Matx33d back = map.inv();
  s.truth["spots"] = Json::array();
  for (const cv::Point2d at : PlaceSpots(regions, options)) {
    const double side = cv::norm(Map(back, at + cv::Point2d(options.spot_px, 0)) - Map(back, at));
    style.spots.push_back({Map(back, at), side});
    Json spot = ToJson(Seen(options.camera, map, style.spots.back().middle));
    spot["side_px"] = options.spot_px;
    s.truth["spots"].push_back(spot);
  }
  s.truth["spot_darkness"] = style.spot_darkness;
  s.levels = {Expose(options.camera, Lights(style), map)};
  s.truth["chromaticity"] = ToJson(ChromaticityOf(options.camera, style.colour));
  return s;
}

}  // namespace qv
