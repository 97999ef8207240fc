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

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_SCENE_PHOTOS_H_
