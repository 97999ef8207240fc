#include "desk/simulation/simulation.h"

#include <algorithm>
#include <cmath>
#include <vector>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/scenes/targets.h"
#include "desk/simulation/truth.h"

namespace qv {

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
  CameraModel lens = camera;  // the specks lie on the lens, out of focus
  lens.blur_px = std::hypot(camera.blur_px, options.speck_blur_px);
  lens.distortion_percent = lens.shutter_px = 0;
  s.levels = {Expose(lens, DustyTarget(specks, options.speck_darkness), cv::Matx33d::eye())};
  s.truth["specks"] = Json::array();
  for (const DustSpeck& speck : specks) {
    Json json = ToJson(speck.centre);
    json["diameter_px"] = speck.diameter_px;
    json["blur_px"] = lens.blur_px;
    s.truth["specks"].push_back(json);
  }
  s.truth["darkness"] = options.speck_darkness;
  const cv::Mat gray = Gray(Stored(camera, s.levels[0]));
  s.truth["mean_level"] = cv::mean(gray)[0];
  std::vector<int> histogram(256);
  for (const float level : cv::Mat_<float>(gray)) ++histogram[std::clamp(cvRound(level), 0, 255)];
  s.truth["histogram"] = histogram;  // without noise
  return s;
}

}  // namespace qv
