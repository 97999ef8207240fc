#include "tools/measurements.h"

#include <algorithm>
#include <iterator>

namespace {

constexpr char kSfrMethod[] = "slanted edge, oversampling 1, real part";
constexpr char kMarkMethod[] = "row scan for 1:1:3:1:1 with three cross-checks";
constexpr char kMeanMethod[] = "mean over all pixels of the first channel";

// What was seen of the chart is the same for every test that looks for it.
#define CHART_ROWS(test)                                                                                               \
  {test "_marks_found", kOne, Shape::kCount, kMarkMethod, "Finder marks that came back; three are needed."},           \
      {test "_mark_candidates", kOne, Shape::kCount, kMarkMethod,                                                      \
       "Places that passed as finder marks before the best three were chosen; more than three deserve a look."},       \
      {test "_marks", kPixel, Shape::kPlaces, kMarkMethod,                                                             \
       "Centres of the marks that came back, column and row, pixel centres at whole numbers: corner, second, third."}, \
      {test "_module_size", kPixel, Shape::kValue, kMarkMethod,                                                        \
       "Mean module of the marks used, a seventh of a mark's width along the scanned rows. Under 3 px marks are "      \
       "missed."},                                                                                                     \
      {test "_legs_ratio", kOne, Shape::kValue, kMarkMethod,                                                           \
       "Distance of corner and second mark over that of corner and third; 1 when the chart is seen straight on."},     \
      {test "_legs_angle", kDegree, Shape::kValue, kMarkMethod,                                                        \
       "Angle between the two legs at the corner mark; 90 when the chart is seen straight on."},                       \
      {test "_chart_turn", kDegree, Shape::kValue, kMarkMethod,                                                        \
       "Turn of the chart in the photo, counter-clockwise, in whole degrees; the photo is straightened by it."},       \
  {                                                                                                                    \
    test "_threshold", kGreyLevel, Shape::kCount, kMarkMethod, "Grey level above which a pixel counts as light."       \
  }

#define SFR_ROWS(test)                                                           \
  {test "_mtf50_vertical", kNyquist, Shape::kValue, kSfrMethod,                  \
   "Frequency at which the SFR of the vertical region falls to one half."},      \
  {                                                                              \
    test "_mtf50_horizontal", kNyquist, Shape::kValue, kSfrMethod,               \
        "Frequency at which the SFR of the horizontal region falls to one half." \
  }

constexpr MeasurementInfo kMeasurements[] = {
    SFR_ROWS("camera_autofocus"),
    {"camera_autofocus_sfr_vertical", kOne, Shape::kResponse, kSfrMethod,
     "Spatial frequency response of the vertical region over frequency in units of Nyquist."},
    {"camera_autofocus_sfr_horizontal", kOne, Shape::kResponse, kSfrMethod,
     "Spatial frequency response of the horizontal region over frequency in units of Nyquist."},
    CHART_ROWS("camera_autofocus"),
    SFR_ROWS("mtf_check"),
    CHART_ROWS("mtf_check"),
    {"camera_flash_mean", kGreyLevel, Shape::kValue, kMeanMethod, "Mean brightness of the flash photo, 0 to 255."},
    {"camera_flash_vt_mean", kGreyLevel, Shape::kValue, kMeanMethod,
     "Mean brightness of the second camera's flash photo, 0 to 255."},
};

}  // namespace

const MeasurementInfo* FindMeasurement(std::string_view name) {
  const auto* found = std::find_if(std::begin(kMeasurements), std::end(kMeasurements),
                                   [&](const MeasurementInfo& info) { return name == info.name; });
  return found == std::end(kMeasurements) ? nullptr : found;
}
