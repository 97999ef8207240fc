#include "desk/measure/telling.h"

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

std::string BoundsWords(const Limit& limit) {
  std::string text;
  if (limit.min) text += Format("at least %g", *limit.min);
  if (limit.max) text += Format("%sat most %g", text.empty() ? "" : ", ", *limit.max);
  return text;
}

std::string HowSure(const Reading& m) {
  const bool unsure = m.decision && m.decision->near_limit && !m.uncertainties.empty();
  return std::string(m.marginal ? ", marginal" : "") +
         (unsure ? Format(", wrong with a probability of %.0f %%", 100 * m.decision->wrong_probability) : "");
}

}  // namespace

double FitScale(const cv::Mat& photo, double side) { return std::min(1.0, side / std::max(photo.cols, photo.rows)); }

bool ShowsPhoto(int code) {
  return code == QV_SUCCESS || code == QV_ERROR_PATTERN_NOT_FOUND || code == QV_DONE || code == QV_ERROR_UNUSABLE_INPUT;
}

std::string ValueText(const Reading& m, int decimals) {
  if (std::isnan(m.value())) return "none";
  const std::string text = Format("%.*f", decimals, m.value());
  const std::string spread = m.repeats.empty() ? "" : Format(" (spread %.*f)", decimals, Spread(m.repeats));
  if (m.uncertainties.size() != 1) return text + spread;
  const double expanded = m.uncertainty().expanded;
  const bool shows = expanded == 0 || expanded >= 0.5 * std::pow(10, -decimals);
  return text + (shows ? Format(" \u00b1 %.*f", decimals, expanded) : Format(" \u00b1 %.1g", expanded)) + spread;
}

std::string FrequencyText(const Reading& m, int photo_height, double pixel_pitch_um) {
  const double nyquist = m.value();
  if (!std::isfinite(nyquist)) return "none (the curve gives no figure)";
  std::string text =
      Format("%s Nyquist  %.4f c/p  %.0f LW/PH", ValueText(m, 4).c_str(), nyquist / 2, nyquist * photo_height);
  if (pixel_pitch_um > 0) text += Format("  %.1f lp/mm", nyquist / 2 * 1000 / pixel_pitch_um);
  return text;
}

std::string LimitWords(const Reading& m) {
  std::string text = BoundsWords(m.limit);
  const Unit* const axis = m.info->figure->axis;
  if (axis == nullptr) return text;
  if (!text.empty()) text = "each " + text;
  for (const auto& [number, own] : m.limit.by_number) {
    text += (text.empty() ? "" : ", ") + Format("%s %d %s", axis->name, number, BoundsWords(own).c_str());
  }
  return text;
}

std::string LimitText(const Reading& m) {
  if (!m.limit.given()) return "";
  const std::string bounds = LimitWords(m);
  return "  (" + bounds + (bounds.empty() ? "" : ", ") + Name(m.outcome) + HowSure(m) + ")";
}

std::string VerdictText(const Reading& m) { return Name(m.outcome) + BehindVerdict(m); }

std::string BehindVerdict(const Reading& m) {
  if (!m.limit.given()) return "";
  const std::string bounds = LimitWords(m);
  return (bounds.empty() ? "" : ", " + bounds) + HowSure(m);
}

std::string VerdictText(const Reading& list, std::size_t place) {
  for (const EntryVerdict& entry : list.entries) {
    if (entry.place != place) continue;
    const std::string bounds = BoundsWords(list.limit.Of(list.axis[place]));
    return Name(entry.decision.pass ? Outcome::kPass : Outcome::kFail) + (bounds.empty() ? "" : ", " + bounds) +
           (entry.marginal ? ", marginal" : "");
  }
  return "";
}

}  // namespace qv
