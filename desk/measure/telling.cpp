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

std::string ValueText(const Reading& m, int decimals) {
  const std::string text = Format("%.*f", decimals, m.value());
  const std::string spread = m.repeats.empty() ? "" : Format(" (spread %.*f)", decimals, Spread(m.repeats));
  if (m.uncertainties.size() != 1) return text + spread;
  return text + Format(" \u00b1 %.*f", decimals, m.uncertainty().expanded) + spread;
}

std::string FrequencyText(const Reading& m, int photo_height, double pixel_pitch_um) {
  const double nyquist = m.value();
  if (!std::isfinite(nyquist)) return "none (the curve gives no figure)";
  std::string text =
      Format("%s Nyquist  %.4f c/p  %.0f LW/PH", ValueText(m, 4).c_str(), nyquist / 2, nyquist * photo_height);
  if (pixel_pitch_um > 0) text += Format("  %.1f lp/mm", nyquist / 2 * 1000 / pixel_pitch_um);
  return text;
}

std::string LimitText(const Reading& m) {
  if (!m.limit.given()) return "";
  std::string text = "  (";
  if (m.limit.min) text += Format("at least %g, ", *m.limit.min);
  if (m.limit.max) text += Format("at most %g, ", *m.limit.max);
  text += Name(m.outcome) + std::string(m.marginal ? ", marginal" : "");
  const bool unsure = m.decision && m.decision->near_limit && !m.uncertainties.empty();
  return text + (unsure ? Format(", wrong with a probability of %.0f %%)", 100 * m.decision->wrong_probability) : ")");
}

}  // namespace qv
