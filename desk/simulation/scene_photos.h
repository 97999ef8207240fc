#ifndef QVTESTER_DESK_SIMULATION_SCENE_PHOTOS_H_
#define QVTESTER_DESK_SIMULATION_SCENE_PHOTOS_H_

#include "desk/simulation/simulation.h"

// The scenes, one file each: photos and what is true of them.

namespace qv {

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

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_SCENE_PHOTOS_H_
