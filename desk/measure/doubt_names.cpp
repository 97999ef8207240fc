#include "desk/measure/doubt_names.h"

#include <algorithm>
#include <stdexcept>

namespace qv {

const std::vector<DoubtInfo>& Doubts() {
  static const std::vector<DoubtInfo> doubts = {
      {Doubt::kDecoderComplaint, "decoder_complaint", "a picture or film is cut or damaged; the decoder filled it up"},
      {Doubt::kFilmCut, "film_cut", "a film ends before nine tenths of what its container promises"},
      {Doubt::kClipped, "clipped", "light or dark was cut off where a figure is read: an edge, dust or a light"},
      {Doubt::kMirrored, "mirrored", "the chart is seen in a mirror"},
      {Doubt::kImplausibleMarks, "implausible_marks", "the three marks do not lie as a chart's"},
      {Doubt::kOblique, "oblique", "the chart is not seen straight on"},
      {Doubt::kImpossibleFigure, "impossible_figure", "an MTF50 that no edge has"},
      {Doubt::kNoPlainEdge, "no_plain_edge", "a region does not show one edge with room to both sides"},
      {Doubt::kUnevenLight, "uneven_light", "light that falls across a region moved its MTF50 by more than 5 %"},
      {Doubt::kNoise, "noise", "noise moved an MTF50 by more than 5 %"},
      {Doubt::kUnevenPatches, "uneven_patches", "a patch is not of one colour"},
      {Doubt::kNoPlainTarget, "no_plain_target", "dust was looked for on what is no plain, evenly lit target"},
      {Doubt::kLargeDarkAreas, "large_dark_areas",
       "a plain target has dark areas over 14 px wide that are no counted blob"},
      {Doubt::kTooManySpots, "too_many_spots", "a plain target has more spots than dust makes"},
      {Doubt::kDotsInNoise, "dots_in_noise", "the picture's own noise would give dots at this threshold"},
      {Doubt::kTooManyDots, "too_many_dots", "a region shows more dots than defects make"},
      {Doubt::kSmallRegion, "region_smaller_than_window", "a region has no room for the window that dots are told by"},
      {Doubt::kMapsDiffer, "maps_differ", "the map of three matches lies over 3 px from that of all"},
      {Doubt::kMapNotAgreed, "map_not_agreed", "most matches contradict the map"},
      {Doubt::kRobustMap, "robust_map_doubtful",
       "too few matches agree with the map of all, or its refinement went astray"},
      {Doubt::kNotRegistered, "not_registered", "the print does not lie on the good one"},
      {Doubt::kPrintCutOff, "print_cut_off", "part of the good print lies outside the photo"},
  };
  return doubts;
}

const DoubtInfo& Info(Doubt doubt) {
  for (const DoubtInfo& info : Doubts()) {
    if (info.doubt == doubt) return info;
  }
  throw std::logic_error("a doubt without a name");
}

const DoubtInfo* FindDoubt(const std::string& name) {
  const auto found =
      std::find_if(Doubts().begin(), Doubts().end(), [&](const DoubtInfo& info) { return name == info.name; });
  return found == Doubts().end() ? nullptr : &*found;
}

std::string DoubtTable() {
  std::string table = "| doubt | when |\n|---|---|\n";
  for (const DoubtInfo& info : Doubts()) table += std::string("| `") + info.name + "` | " + info.meaning + " |\n";
  return table;
}

}  // namespace qv
