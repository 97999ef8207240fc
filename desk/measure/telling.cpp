#include "desk/measure/telling.h"

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "qvtester/indices.h"

namespace qv {

double FitScale(const cv::Mat& photo, double side) { return std::min(1.0, side / std::max(photo.cols, photo.rows)); }

bool ShowsPhoto(int code) {
  return code == QV_SUCCESS || code == QV_ERROR_PATTERN_NOT_FOUND || code == QV_DONE || code == QV_ERROR_UNUSABLE_INPUT;
}

std::string FrequencyText(double nyquist, int photo_height, double pixel_pitch_um) {
  if (!std::isfinite(nyquist)) return "none (the curve gives no figure)";
  std::string text = Format("%.4f Nyquist  %.4f c/p  %.0f LW/PH", nyquist, nyquist / 2, nyquist * photo_height);
  if (pixel_pitch_um > 0) text += Format("  %.1f lp/mm", nyquist / 2 * 1000 / pixel_pitch_um);
  return text;
}

std::string LimitText(const Reading& m) {
  if (!m.limit.given()) return "";
  std::string text = "  (";
  if (m.limit.min) text += Format("at least %g, ", *m.limit.min);
  if (m.limit.max) text += Format("at most %g, ", *m.limit.max);
  return text + Name(m.outcome) + (m.marginal ? ", marginal)" : ")");
}

}  // namespace qv
