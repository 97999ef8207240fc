#ifndef QVTESTER_DESK_MEASURE_TELLING_H_
#define QVTESTER_DESK_MEASURE_TELLING_H_

#include <opencv2/core.hpp>
#include <string>

#include "desk/measure/record.h"

namespace qv {

// Words and measures that the findings' reports and pictures share.

/// The scale at which a photo's longer side fits; never enlarges.
double FitScale(const cv::Mat& photo, double side);

/// Whether a picture of the photo tells something: it was measured, or marks were looked for and not found.
bool ShowsPhoto(int code);

/// "0.4390", and "0.4390 ± 0.0021" where it is known how far it may be trusted.
std::string ValueText(const Reading& m, int decimals);

/// "0.3124 Nyquist  0.1562 c/p  937 LW/PH", and lp/mm when the pixel pitch is known (not 0).
std::string FrequencyText(const Reading& m, int photo_height, double pixel_pitch_um);

/// "at least 0.38, at most 0.6"; of a list "each at most 3, patch 7 at most 2".
std::string LimitWords(const Reading& m);

/// "  (at least 0.38, at most 0.6, FAIL)" for a figure with a limit, nothing for one without.
std::string LimitText(const Reading& m);

/// As it stands at a figure in a picture: "MEASURED", "FAIL, at most 3", "PASS, at least 0.38, marginal".
std::string VerdictText(const Reading& m);

/// What stands there behind the word: ", at least 0.38, marginal"; nothing without a limit.
std::string BehindVerdict(const Reading& m);

/// The same of a list's entry; empty where it has no limit.
std::string VerdictText(const Reading& list, std::size_t place);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_TELLING_H_
