#include "desk/simulation/simulation.h"

#include "desk/base/failure.h"
#include "desk/simulation/scene_photos.h"
#include "desk/simulation/truth.h"

namespace qv {

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
