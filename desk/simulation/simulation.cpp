#include "desk/simulation/simulation.h"

#include "desk/base/failure.h"
#include "desk/simulation/truth.h"

namespace qv {

// The scenes, one file each: photos and what is true of them.
Simulation ChartPhoto(const SimulationOptions& options);     // the sharpness chart
Simulation TargetPhoto(const SimulationOptions& options);    // the three marks of an aiming target
Simulation PreviewFrames(const SimulationOptions& options);  // two frames of a moving chart
Simulation DustPhoto(const SimulationOptions& options);      // a plain target through specks on the lens
Simulation PhotoPair(const SimulationOptions& options);      // a textured scene from two places
Simulation HdrCapture(const SimulationOptions& options);     // a lit panel with dots
Simulation DisplayPhoto(const SimulationOptions& options);   // the screen's corners, what it shows, its defects
// A panel of lights: a region within each, its colour, where its dark spots are.
Simulation LightsPhoto(const SimulationOptions& options);
// A print with defects, then good ones: the map from the first good one's photo to the photo, the defects in the
// former.
Simulation PrintPhoto(const SimulationOptions& options);

namespace {

struct SceneRow {
  const char* name;
  Simulation (*simulate)(const SimulationOptions& options);
};

constexpr SceneRow kScenes[] = {{"chart", ChartPhoto},     {"target", TargetPhoto}, {"preview", PreviewFrames},
                                {"dust", DustPhoto},       {"pair", PhotoPair},     {"hdr", HdrCapture},
                                {"display", DisplayPhoto}, {"lights", LightsPhoto}, {"print", PrintPhoto}};

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
    Json truth = {{"schema", "qvtester-truth-1"}, {"scene", options.scene}, {"parameters", Parameters(options.camera)}};
    truth.update(s.truth);
    s.truth = truth;
    return s;
  }
  throw Failure(kWrongUsage, "--scene " + options.scene + ": no such scene");
}

}  // namespace qv
