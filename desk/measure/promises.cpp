#include "desk/measure/promises.h"

#include <algorithm>
#include <cmath>
#include <stdexcept>

#include "desk/base/text.h"

namespace qv {

namespace {

constexpr auto kAtMost = Promise::kAtMost;
constexpr auto kAtLeast = Promise::kAtLeast;
constexpr auto kAbout = Promise::kAbout;

struct Row {
  const char* figure;
  const char* error;
};

constexpr Row kTable[] = {
    {"MTF50, the test's own",
     "reads low by a known law: by {own_low_0.3} at a blur of 0.3 px, {own_low_0.8} at 0.8, {own_low_1.2} at 1.2, "
     "{own_low_3.0} at 3.0; never further than {own_law} outside the law without noise; a turned chart costs up to "
     "{own_turned} more"},
    {"MTF50 by ISO 12233",
     "mean error {iso_plain} without noise, {iso_noisy} with 2 % noise, {iso_very_noisy} with 5 %; uneven light "
     "{iso_uneven}, bowed edges, sRGB {iso_srgb}; JPEG 75 {iso_jpeg}"},
    {"marks", "median {marks_median} at most, none further than {marks_largest}"},
    {"patches",
     "{patches_mean} in the mean (CIE 1976), {patches_upright} at most on an upright chart, {patches_turned} turned by "
     "up to 10 degrees"},
    {"dust",
     "{dust_found} of sharp-rimmed discs of 4 to 16 px at a contrast of 0.3, {dust_hollow} of those of 20 px or "
     "more; spots of 3 to 300 px nine times out of the noise: {spots_found}"},
    {"dots", "{dots_found} of 1,000 at radii of 1 to 50 px, corners included"},
    {"registration",
     "drawn textures with 3 % noise: median {registration_median}, {registration_near} under 10 px; by all matches "
     "median {robust_median}, {robust_within} under 0.3 px"},
    {"displays", "corners: median {display_corners}; {display_wrong} of the verdicts wrong"},
    {"lights",
     "x and y within {lights_xy} at 2 % noise; {lights_spots} of dark spots of 2 px at a contrast of 0.4, of 5 "
     "px at 0.15"},
    {"prints",
     "{prints_extra} of extra ink of 4 px from a contrast of 0.4; {prints_missing} of missing ink of 8 px at "
     "full contrast"},
    {"films",
     "focus settles within {film_settling} of the truth; {film_lost} of lost frames; widths of pulses within "
     "{film_pulse}"},
    {"uncertainties", "hold for {coverage} of the readings, meant is 95 %"},
    {"doubts",
     "{doubts_caught} of own MTF50 off by over 5 % are doubted, {doubts_false} of good ones; of patches off by "
     "over 3 and not doubted there are {doubts_patches}; of maps that pass {doubts_maps} are off by over 3 px"},
};

}  // namespace

const std::vector<Promise>& Promises() {
  static const std::vector<Promise> promises = {
      {"own_low_0.3", kAbout, 53, " %", "the test's own MTF50 below the lens's, mean, blur 0.3 px, no noise", 3},
      {"own_low_0.8", kAbout, 28, " %", "the same, blur 0.8 px", 3},
      {"own_low_1.2", kAbout, 17, " %", "the same, blur 1.2 px", 3},
      {"own_low_3.0", kAbout, 4, " %", "the same, blur 3.0 px", 1},
      {"own_law", kAtMost, 1, " %",
       "the test's own MTF50 beyond the law's bounds, upright, blur 0.3 to 3 px, no noise"},
      {"own_turned", kAtMost, 15, " %", "own MTF50 of a turned chart below that of the upright one, blur 0.5 to 2 px"},
      {"own_noiseless", kAtMost, 2, " %",
       "noiseless reading to that of the photo without noise, 90 of 100, noise to 2 %"},
      {"iso_plain", kAtMost, 0.15, " %", "MTF50 by ISO 12233, mean error, no noise"},
      {"iso_noisy", kAtMost, 0.5, " %", "the same, 2 % noise"},
      {"iso_very_noisy", kAtMost, 1, " %", "the same, 5 % noise"},
      {"iso_srgb", kAtMost, 0.5, " %", "the same, stored as sRGB, contrast 4 : 1 to 30 : 1, or edges bowed by 1 px"},
      {"iso_uneven", kAtMost, 1, " %", "the same, light that falls by 40 % across the region; or all of these at once"},
      {"iso_jpeg", kAtMost, 1.5, " %", "the same, JPEG of quality 75, from a blur of 0.5 px on"},
      {"marks_median", kAtMost, 0.9, " px", "furthest of a photo's three marks, median, any turn"},
      {"marks_largest", kAtMost, 0.3, " of a module", "furthest mark of all"},
      {"patches_mean", kAtMost, 0.5, "", "CIE 1976 difference to the colour as photographed, mean"},
      {"patches_upright", kAtMost, 1.2, "", "the same, largest, upright, noise to 2 %"},
      {"patches_turned", kAtMost, 2.4, "", "the same, turned by 5 and 10 degrees"},
      {"dust_found", kAtLeast, 100, " %",
       "sharp-rimmed discs of 4 to 16 px, 0.3 or more darker than the target, found"},
      {"dust_hollow", kAtMost, 0, " %", "sharp-rimmed discs of 20 px and more found"},
      {"dust_light", kAbout, 126, "", "least mean level of photos in which blobs are found", 0.5},
      {"spots_found", kAtLeast, 93, " %",
       "dark spots of 3 to 300 px found, contrast times root of pixels 9 x the noise"},
      {"spots_false", kAtMost, 0.1, "", "false spots a photo"},
      {"dots_found", kAtLeast, 100, " %",
       "dots of contrast 0.2 at threshold 0.1, noise 0.5 %, radius 1 to 50 px, found"},
      {"registration_median", kAtMost, 2, " px", "the test's own map, drawn textures, noise 3 %, median error"},
      {"registration_near", kAtLeast, 83, " %", "the same, under 10 px"},
      {"robust_median", kAtMost, 0.02, " px", "the map of all matches, the same pairs, median error"},
      {"robust_within", kAtLeast, 100, " %", "the same, under 0.3 px"},
      {"refined_within", kAtLeast, 100, " %", "maps of three matches right to 10 px, refined, under 0.3 px"},
      {"display_corners", kAtMost, 0.05, " px",
       "corners of a display, median, pan and tilt to 30 degrees, 800 x 600 and more"},
      {"display_jpeg", kAtMost, 0.5, " px", "the same, photos stored as JPEG of quality 75"},
      {"display_wrong", kAtMost, 0.5, " %", "verdicts of displays that are wrong"},
      {"lights_xy", kAtMost, 0.0004, "", "x and y of simulated black bodies, largest error, noise to 2 %"},
      {"lights_fit", kAtMost, 25, " K", "colour temperature's fit on the locus, 2,700 to 10,000 K"},
      {"lights_spots", kAtLeast, 100, " %",
       "dark squares found at 1 % noise: 2 px from 0.4, 3 px from 0.25, 5 px from 0.15"},
      {"prints_extra", kAtLeast, 100, " %", "extra ink of 4 px and more from a contrast of 0.4 found"},
      {"prints_missing", kAtLeast, 100, " %", "missing ink of 8 px and more at full contrast found"},
      {"prints_false", kAtMost, 0.1, "", "false areas a print"},
      {"prints_untold", kAtMost, 0, "", "prints registered off by over 1 px with a correlation above 0.8"},
      {"film_settling", kAtMost, 1, " frame interval", "settling time in films with up to 1 % noise, largest error"},
      {"film_pulse", kAtMost, 0.15, " of a frame", "width of pulses of three frames and more, largest error"},
      {"film_lost", kAtLeast, 100, " %", "lost frames counted, and no other"},
      {"coverage", kAtLeast, 93, " %",
       "truths within the expanded uncertainty, all rows but the known misses together"},
      {"doubts_caught", kAtLeast, 90, " %",
       "own MTF50 off by over 5 % (noise, light, clipping, view) that are doubted"},
      {"doubts_false", kAtMost, 1, " %", "good own MTF50 doubted: noise to 1 %, light falling by 10 % at most"},
      {"doubts_patches", kAtMost, 0, "", "photos with a patch off by over 3 and no doubt, pan and tilt to 15 degrees"},
      {"doubts_dots", kAtLeast, 90, " %", "float pictures with a dot that noise made that are doubted"},
      {"doubts_dust", kAtLeast, 90, " %",
       "photos whose blobs say nothing, or were not counted as drawn, that are doubted"},
      {"doubts_dust_false", kAtMost, 1, " %", "photos of plain targets, counted as drawn, that are doubted"},
      {"doubts_maps", kAtMost, 3, " %", "maps that pass without a doubt and are off by over 3 px"},
      {"misses_named", kAtLeast, 90, " %", "charts not found, of nine known causes, that are told the true one first"},
  };
  return promises;
}

const Promise& FindPromise(std::string_view name) {
  for (const Promise& promise : Promises()) {
    if (promise.name == name) return promise;
  }
  throw std::logic_error("no such promise: " + std::string(name));
}

bool IsKept(const Promise& promise, double measured) {
  switch (promise.bound) {
    case kAtMost: return measured <= promise.value;
    case kAtLeast: return measured >= promise.value;
    default: return std::fabs(measured - promise.value) <= promise.slack;
  }
}

std::string NumberText(const Promise& promise) {
  if (promise.bound == kAtLeast && promise.value == 100) return "all";
  if (promise.bound == kAtMost && promise.value == 0) return "none";
  return Format("%g%s", promise.value, promise.unit);
}

std::string WithNumbers(std::string_view text) {
  std::string filled;
  for (std::size_t open = text.find('{'); open != std::string_view::npos; open = text.find('{')) {
    const std::size_t close = text.find('}', open);
    if (close == std::string_view::npos) throw std::logic_error("a brace stays open: " + std::string(text));
    filled += std::string(text.substr(0, open)) + NumberText(FindPromise(text.substr(open + 1, close - open - 1)));
    text = text.substr(close + 1);
  }
  return filled + std::string(text);
}

std::string PromiseTable() {
  std::string table = "| figure | error |\n|---|---|\n";
  for (const Row& row : kTable) table += std::string("| ") + row.figure + " | " + WithNumbers(row.error) + " |\n";
  return table;
}

std::string PromiseList() {
  std::string list = "| promise | number | of |\n|---|---|---|\n";
  for (const Promise& promise : Promises()) {
    const char* const bound = promise.bound == kAtMost ? "at most" : promise.bound == kAtLeast ? "at least" : "about";
    list += Format("| %s | %s %g%s | %s |\n", promise.name, bound, promise.value, promise.unit, promise.of);
  }
  return list;
}

}  // namespace qv
