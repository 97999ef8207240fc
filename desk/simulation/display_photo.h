#ifndef QVTESTER_DESK_SIMULATION_DISPLAY_PHOTO_H_
#define QVTESTER_DESK_SIMULATION_DISPLAY_PHOTO_H_

#include "desk/simulation/simulation.h"

namespace qv {

/// A photo of a display; the truth tells the screen's corners as seen, what it shows and where its defects are.
Simulation DisplayPhoto(const SimulationOptions& options);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_DISPLAY_PHOTO_H_
