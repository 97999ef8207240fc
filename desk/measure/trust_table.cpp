#include "desk/measure/trust_table.h"

#include <string_view>

#include "desk/measure/uncertainty.h"

namespace qv {

namespace {

constexpr char kByRule[] =
    "middles of rectangles of whole pixels, exact by their rule; what noise does to dots shows in their count";
constexpr char kCurve[] = "a curve, of which the MTF figures are the summary, and have one";

struct TrustRow {
  const char* measurement;  // null: any
  const char* figure;       // how its name begins
  TrustLaw law;
};

constexpr TrustRow ByMethod(const char* measurement, const char* figure, const char* method) {
  return {measurement, figure, {method, nullptr, false}};
}
constexpr TrustRow Without(const char* measurement, const char* figure, const char* reason) {
  return {measurement, figure, {nullptr, reason, false}};
}

// The first row that fits counts.
constexpr TrustRow kRows[] = {
    Without(nullptr, "mtf50_noiseless_",
            "it serves the doubts: what noise leaves in the mean of the edge's rows, no noise of the photo tells"),
    Without(nullptr, "sfr_", kCurve),
    ByMethod("video_autofocus", "settle_time", kStampTrust),
    ByMethod("video_autofocus", "", kCourseMethod),
    ByMethod("video_flash", "", kCourseMethod),
    Without(nullptr, "angle",
            "that of whole pixels, by the search's rule; in a photo the chart's turn (chart_turn) has one"),
    Without(nullptr, "corner_", "a whole pixel, by the search's rule; in a photo the marks have one"),
    ByMethod("video_play", "", kStampTrust),
    ByMethod("video_record", "", kStampTrust),
    {nullptr, "mtf50_vertical", {kResamplingMethod, nullptr, true}},
    {nullptr, "mtf50_horizontal", {kResamplingMethod, nullptr, true}},
    ByMethod(nullptr, "mtf", kBandsMethod),
    ByMethod(nullptr, "response_peak", kBandsMethod),
    ByMethod(nullptr, "edge_width", kBandsMethod),
    ByMethod(nullptr, "overshoot", kBandsMethod),
    ByMethod(nullptr, "marks", kResidualMethod),
    ByMethod(nullptr, "module_size", kResidualMethod),
    ByMethod(nullptr, "legs_", kResidualMethod),
    ByMethod(nullptr, "chart_turn", kResidualMethod),
    Without(nullptr, "centre", "the middle of two of the marks, which have one each"),
    ByMethod("registration", "", kResidualMethod),
    ByMethod(nullptr, "lab_", kPixelMethod),
    ByMethod(nullptr, "delta_e_", kPixelMethod),
    Without(nullptr, "areas", kByRule),
    Without(nullptr, "dots_by_noise", "itself an estimate of chance, from the median of the picture's noise"),
    Without(nullptr, "dots", kByRule),
    Without(nullptr, "blobs", "the places of the test's own detector, which counts; the spots have one each"),
    ByMethod("lcd", "mean_", kPixelMethod),
    ByMethod("lcd", "share_", kPixelMethod),
    ByMethod("lcd", "levels", kPixelMethod),
    ByMethod("lcd", "uniformity", kPixelMethod),
    Without("lcd", "ratio", "it follows the corners"),
    Without(
        "lcd", "corners",
        "what moves a line fitted to hundreds of pixels is the lens's distortion, a rounded corner or a reflection: "
        "noise is the least of it, and one photo tells no other"),
    ByMethod("touch_panel_print", "correlation", kResidualMethod),
    ByMethod("touch_panel_print", "matrix", kResidualMethod),
    Without("touch_panel_print", "unseen_share", "exact for the map, which has one"),
    Without("touch_panel_print", "rms",
            "it is made where strokes end, by how the print lies on the pixels, and not by noise"),
    ByMethod("led_light", "clipped_share", kMeanMethod),
    ByMethod("touch_panel_led", "clipped_share", kMeanMethod),
    ByMethod("led_light", "", kPixelMethod),
    ByMethod("touch_panel_led", "", kPixelMethod),
    ByMethod(nullptr, "mean", kMeanMethod),
    ByMethod(nullptr, "clipped_", kMeanMethod),
    ByMethod(nullptr, "difference_mean", kMeanMethod),
    ByMethod("lens_dust", "", kSpotMethod),
    ByMethod("lens_dust_front", "", kSpotMethod),
};

}  // namespace

const TrustLaw* LawOf(const FigureInfo& info) {
  if (info.figure->number != Number::kReal) return nullptr;
  const std::string_view name = info.figure->name;
  for (const TrustRow& row : kRows) {
    if (row.measurement != nullptr && info.measurement != row.measurement) continue;
    if (name.substr(0, std::string_view(row.figure).size()) == row.figure) return &row.law;
  }
  return nullptr;
}

}  // namespace qv
