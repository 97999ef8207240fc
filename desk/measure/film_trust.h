#ifndef QVTESTER_DESK_MEASURE_FILM_TRUST_H_
#define QVTESTER_DESK_MEASURE_FILM_TRUST_H_

#include <vector>

#include "desk/measure/record.h"

namespace qv {

// How far figures of films may be trusted: times by the steps of their stamps, what was read of each frame by how far
// neighbouring frames differ beyond what the film does. Times are in ms, one a frame.

/// `mean_rate` and `longest_gap`.
void TrustTimes(Phase& phase, const std::vector<double>& time);

/// Of one frame's reading, from all of a film; those that are no numbers are left out. NaN for fewer than five.
Uncertainty OfFrame(const std::vector<double>& course);

/// How far the conversion of a film's frame from luma and chroma has lowered its first channel: it cuts what each of
/// them adds to whole levels.
struct ConversionCut {
  double mean;         // levels; not a number for frames that were converted otherwise
  double apart;        // standard deviation of what it is at other levels: noise of a lattice's width makes all alike
  double rounded = 0;  // and of what an encoder's rounding to steps of luma leaves
};
ConversionCut CutOf(const cv::Mat& frame);

/// `peak`, `base`, `width` and `mean` of a flash; the cuts of a usual frame and of the one with most light.
void TrustFlash(Phase& phase, const std::vector<double>& time, const ConversionCut& base_cut,
                const ConversionCut& peak_cut);

/// `best_mtf50`, `final_mtf50`, `settle_time` and both courses of a focus.
void TrustFocus(Phase& phase, const std::vector<double>& time);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_FILM_TRUST_H_
