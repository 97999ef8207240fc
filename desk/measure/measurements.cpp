#include "desk/measure/measurements.h"

#include <algorithm>
#include <array>

namespace qv {

namespace {

constexpr Method kSfr = {
    "slanted edge, oversampling 1, real part",
    "Reads low by a known law, 40 % at a blur of 0.5 px to 4 % at 3 px, and lies within that law by 2 % without noise; "
    "with 1 to 2 % noise single readings jump upwards by up to half in blurs under 1.2 px.",
    "Moved by focus, motion, sharpening and denoising; by the turn of the chart, whose straightening costs up to 12 %; "
    "by the parity of the region's width, hence by the distance."};
constexpr Method kIso = {"slanted edge (ISO 12233), oversampling 4, magnitude, derivative and bin width corrected",
                         "Mean error 0.1 % without noise and under 0.8 % with 2 % noise, at blurs of 0.3 to 3 px.",
                         "Moved by focus, motion, sharpening and denoising; reads far too high where the paper is "
                         "clipped at level 255; there is none where the edge lies along the pixel grid."};
constexpr Method kScan = {
    "row scan for 1:1:3:1:1 with three cross-checks",
    "Centres are good to 0.3 to 0.9 px, at most a fifth of a module on charts turned by about 30 degrees.",
    "Moved by threshold and light where they reach a mark's edges, and by modules under 3 px."};
constexpr Method kMean = {
    "mean over all pixels of the first channel", "Exact for the photo as stored.",
    "Moved by exposure, flash, shading and clipping; the first channel of a photo read from a file is blue."};
constexpr Method kLab = {"mean over the patch, sRGB to L*a*b* relative to an implicit white of 1, 1, 1",
                         "Within 0.3 of the colour as photographed in the mean, 0.7 at most on an upright chart; patch "
                         "means are cut to whole levels.",
                         "Moved by exposure, white balance, light and shading; by clipping."};
constexpr Method kDelta = {"CIE 1976 difference to the standard photo's patch",
                           "As good as the two L*a*b* readings: about 0.4 in the mean.",
                           "Moved by whatever makes the photo's light or colour unlike the standard's."};
constexpr Method kBlob = {
    "local threshold 15 x 15, blob detector at levels 0 and 125",
    "Of discs 0.3 or more darker than the target, all of 4 to 16 px are found, none of 20 px and more.",
    "Moved by focus on the target, by light (photos of mean level under 126 show none), by noise near the local "
    "threshold."};
constexpr Method kBins = {"256 bins of one grey level", "Exact for the photo as stored.",
                          "Moved by exposure, shading and noise."};
constexpr Method kDots = {
    "relative difference to the mean of a square window, single precision",
    "All of 1,000 dots of contrast 0.2 are found at a threshold of 0.1 and 0.5 % noise, corners included; the means "
    "are single precision, whose rounding counts on large pictures with small windows.",
    "Moved by the picture's noise, by neighbouring dots in the same window, by formats that round."};
constexpr Method kAreas = {"connected dots, then rectangles closer than the distance, merged until none are",
                           "Exact for the dots that were found.", "Moved by the dots and by the distance."};
constexpr Method kSurf = {"SURF key points, the affine map of the three best of the good matches",
                          "Median error 1.4 px on textured pairs with shift, turn, scale, gain and 3 % noise; 30 in "
                          "100 are off by over 3 px, 14 by over 10.",
                          "Moved by false matches among the three best: repeated texture, noise, blur."};
constexpr Method kDifference = {"mean absolute difference of the grey frames over 255",
                                "Exact for the frames as delivered.",
                                "Moved by motion, noise, flicker and exposure between the frames."};

constexpr auto kWhole = Number::kWhole;
constexpr auto kReal = Number::kReal;

struct Row {
  std::vector<const char*> phases;
  Figure figure;
};

const std::vector<const char*> kSfrTests = {"camera_autofocus", "mtf_check"};
const std::vector<const char*> kChartTests = {"camera_autofocus", "mtf_check", "camera_capture", "camera_capture_front",
                                              "circle_check"};
const std::vector<const char*> kCaptureTests = {"camera_capture", "camera_capture_front"};
const std::vector<const char*> kDustTests = {"lens_dust", "lens_dust_front"};

const std::vector<Row>& Rows() {
  static const std::vector<Row> rows = {
      {kSfrTests,
       {"mtf50_vertical", kNyquist, kReal, nullptr, kSfr,
        "Frequency at which the SFR of the vertical region falls to one half."}},
      {kSfrTests,
       {"mtf50_horizontal", kNyquist, kReal, nullptr, kSfr,
        "Frequency at which the SFR of the horizontal region falls to one half."}},
      {kSfrTests,
       {"mtf50_iso_vertical", kNyquist, kReal, nullptr, kIso,
        "MTF50 of the vertical region after ISO 12233, from the photo as it was taken."}},
      {kSfrTests,
       {"mtf50_iso_horizontal", kNyquist, kReal, nullptr, kIso,
        "MTF50 of the horizontal region after ISO 12233, from the photo as it was taken."}},
      {{"camera_autofocus"},
       {"sfr_vertical", kOne, kReal, &kFrequencyAxis, kSfr,
        "Spatial frequency response of the vertical region over frequency in units of Nyquist."}},
      {{"camera_autofocus"},
       {"sfr_horizontal", kOne, kReal, &kFrequencyAxis, kSfr,
        "Spatial frequency response of the horizontal region over frequency in units of Nyquist."}},

      // What was seen of the chart, by every test that looks for it.
      {kChartTests, {"marks_found", kOne, kWhole, nullptr, kScan, "Finder marks that came back; three are needed."}},
      {kChartTests,
       {"mark_candidates", kOne, kWhole, nullptr, kScan,
        "Places that passed as finder marks before the best three were chosen; more than three deserve a look."}},
      {kChartTests,
       {"marks", kPixel, kReal, &kColumnAxis, kScan,
        "Centres of the marks that came back, column and row, pixel centres at whole numbers: corner, second, third."}},
      {kChartTests,
       {"module_size", kPixel, kReal, nullptr, kScan,
        "Mean module of the marks, a seventh of a mark's width along the scanned rows. Under 3 px marks may be "
        "missed."}},
      {kChartTests,
       {"legs_ratio", kOne, kReal, nullptr, kScan,
        "Distance of corner and second mark over that of corner and third; 1 when the chart is seen straight on."}},
      {kChartTests,
       {"legs_angle", kDegree, kReal, nullptr, kScan,
        "Angle between the two legs at the corner mark; 90 when the chart is seen straight on."}},
      {kChartTests,
       {"chart_turn", kDegree, kReal, nullptr, kScan,
        "Turn of the chart in the photo, counter-clockwise: of the leg from the corner to the second mark."}},
      {kChartTests,
       {"straightened_by", kDegree, kWhole, nullptr, kScan,
        "Whole degrees, clockwise, by which the photo was turned upright before it was measured."}},
      {kChartTests,
       {"threshold", kGreyLevel, kWhole, nullptr, kScan, "Grey level above which a pixel counts as light."}},
      {kChartTests,
       {"grey_peak_dark", kGreyLevel, kWhole, nullptr, kBins,
        "After a miss: the commonest level of what is dark in the photo."}},
      {kChartTests,
       {"grey_peak_light", kGreyLevel, kWhole, nullptr, kBins,
        "After a miss: the commonest level of what is light in the photo."}},
      {kChartTests,
       {"suggested_threshold", kGreyLevel, kWhole, nullptr, kScan,
        "After a miss: a threshold between the grey peaks at which a search found three marks."}},

      {kCaptureTests, {"patches", kOne, kWhole, nullptr, kLab, "Patches measured; 24 when the whole ring is in view."}},
      {kCaptureTests, {"lab_l", kOne, kReal, &kPatchAxis, kLab, "L* of each patch."}},
      {kCaptureTests, {"lab_a", kOne, kReal, &kPatchAxis, kLab, "a* of each patch."}},
      {kCaptureTests, {"lab_b", kOne, kReal, &kPatchAxis, kLab, "b* of each patch."}},
      {kCaptureTests,
       {"delta_e_76", kOne, kReal, &kPatchAxis, kDelta, "Colour difference of each patch to the standard photo's."}},
      {kCaptureTests, {"delta_e_76_mean", kOne, kReal, nullptr, kDelta, "Mean colour difference over the patches."}},
      {kCaptureTests, {"delta_e_76_max", kOne, kReal, nullptr, kDelta, "Largest colour difference of a patch."}},

      {kDustTests,
       {"blob_count", kOne, kWhole, nullptr, kBlob,
        "Dark blobs outside the corners, counted up to five. Discs of 4 to 16 pixels are seen."}},
      {kDustTests, {"blobs", kPixel, kReal, &kColumnAxis, kBlob, "Places of the counted blobs, column and row."}},
      {kDustTests,
       {"mean_level", kGreyLevel, kReal, nullptr, kBins, "Mean grey level of the photo; blobs are seen from 126 up."}},
      {kDustTests, {"histogram", kOne, kWhole, &kLevelAxis, kBins, "Pixels of each grey level."}},
      {kDustTests,
       {"histogram_difference", kOne, kWhole, nullptr, kBins,
        "Sum of absolute differences to the reference histogram, pixels."}},

      {{"hdr_dots"}, {"dot_count", kOne, kWhole, nullptr, kDots, "Pixels that depart from their local mean."}},
      {{"hdr_dots"}, {"area_count", kOne, kWhole, nullptr, kAreas, "Areas that the dots make."}},
      {{"hdr_dots"},
       {"areas", kPixel, kReal, &kColumnAxis, kAreas, "Middle of each area's rectangle, column and row."}},
      {{"hdr_dots"}, {"area_pixels", kPixel, kWhole, &kAreaAxis, kAreas, "Dots in each area."}},
      {{"hdr_dots"}, {"area_width", kPixel, kWhole, &kAreaAxis, kAreas, "Columns of each area's rectangle."}},
      {{"hdr_dots"}, {"area_height", kPixel, kWhole, &kAreaAxis, kAreas, "Rows of each area's rectangle."}},

      {{"registration"},
       {"good_matches", kOne, kWhole, nullptr, kSurf, "Feature matches within the distance limit; three are needed."}},
      {{"registration"},
       {"agreeing_matches", kOne, kWhole, nullptr, kSurf,
        "Good matches that the map explains to within 3 px. The three that make the map always agree: a map that few "
        "others agree with is doubtful."}},
      {{"registration"},
       {"matrix", kOne, kReal, &kMatrixAxis, kSurf,
        "a, b, c, d, e, f: column = a x + b y + c and row = d x + e y + f in the image, for column x and row y of the "
        "reference."}},
      {{"registration"},
       {"shift_columns", kPixel, kReal, nullptr, kSurf, "How far the reference's middle has moved to the right."}},
      {{"registration"},
       {"shift_rows", kPixel, kReal, nullptr, kSurf, "How far the reference's middle has moved down."}},
      {{"registration"},
       {"turn", kDegree, kReal, nullptr, kSurf, "Turn of the image against the reference, counter-clockwise."}},
      {{"registration"},
       {"scale", kOne, kReal, nullptr, kSurf, "Size of the scene in the image over that in the reference."}},
      {{"registration"},
       {"stretch", kOne, kReal, nullptr, kSurf,
        "Largest over smallest enlargement along any direction; 1 when the map keeps shapes."}},

      {{"camera_preview", "camera_preview_front"},
       {"difference_mean", kOne, kReal, nullptr, kDifference,
        "Mean difference of the two frames, 0 to 1: how much the preview moves."}},
      {{"circle_check"},
       {"centre", kPixel, kReal, &kColumnAxis, kScan,
        "The chart's centre, column and row: the middle of the longest side between the three marks."}},
      {{"camera_flash", "camera_flash_vt"},
       {"mean", kGreyLevel, kReal, nullptr, kMean, "Mean brightness of the flash photo, 0 to 255."}},
  };
  return rows;
}

}  // namespace

std::string Explanation(const Figure& figure) {
  return std::string(figure.docstring) + " " + figure.method.accuracy + " " + figure.method.moved_by;
}

double Repeatability(const Figure& figure) { return figure.number == Number::kWhole ? 0 : figure.unit.repeatability; }

const std::vector<MeasurementInfo>& AllMeasurements() {
  static const std::vector<MeasurementInfo> all = [] {
    std::vector<MeasurementInfo> list;
    for (const Row& row : Rows()) {
      for (const char* phase : row.phases) {
        list.push_back({std::string(phase) + "_" + row.figure.name, phase, &row.figure});
      }
    }
    return list;
  }();
  return all;
}

const MeasurementInfo* FindMeasurement(std::string_view name) {
  const auto found = std::find_if(AllMeasurements().begin(), AllMeasurements().end(),
                                  [&](const MeasurementInfo& info) { return info.name == name; });
  return found == AllMeasurements().end() ? nullptr : &*found;
}

}  // namespace qv
