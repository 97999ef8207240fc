#include "desk/measure/capture_trust.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <string>
#include <utility>
#include <vector>

#include "desk/measure/cielab.h"
#include "desk/measure/patch_trust.h"

namespace qv {

namespace {

// Of an upright square well within a patch, whatever its turn, channels as the measures weigh them: as they are stored.
cv::Mat InnerPixels(const cv::Mat& photo, const std::array<cv::Point2d, 4>& outline) {
  constexpr double kInner = 0.45;  // of the patch's side, to each side of its middle
  const cv::Point2d middle = (outline[0] + outline[2]) / 2;
  const double half = kInner / std::sqrt(2.0) * cv::norm(outline[1] - outline[0]);
  const cv::Rect part(cv::Point(cvCeil(middle.x - half), cvCeil(middle.y - half)),
                      cv::Point(cvFloor(middle.x + half) + 1, cvFloor(middle.y + half) + 1));
  return photo(part & cv::Rect({}, photo.size()));
}

// Of each patch what its colour may be, and the same of the standard's.
struct Draws {
  std::vector<std::vector<cv::Vec3d>> measured, standard;
};

Draws DrawColours(const PatchScene& scene) {
  Draws draws;
  for (std::size_t i = 0; i < scene.measured.size() && i < scene.outlines.size(); ++i) {
    const cv::Mat pixels = InnerPixels(scene.photo, scene.outlines[i]);
    if (pixels.cols < 3 || pixels.rows < 1) return {};
    const double area = std::pow(cv::norm(scene.outlines[i][1] - scene.outlines[i][0]), 2);
    draws.measured.push_back(DrawPatchColours(pixels, area, scene.measured[i], i, scene.codec));
    if (i < scene.standard.size()) {
      draws.standard.push_back(DrawStandardColours(pixels, area, scene.standard[i], 100 + i, scene.codec));
    }
  }
  return draws;
}

// The numbers of a list's entries, as far as they were drawn.
std::vector<std::size_t> PatchesOf(const Phase& phase, const char* figure, const Draws& draws) {
  std::vector<std::size_t> patches;
  const Reading* const reading = phase.Find(figure);
  if (reading == nullptr) return patches;
  for (const double number : reading->axis) {
    if (number < static_cast<double>(draws.measured.size())) patches.push_back(static_cast<std::size_t>(number));
  }
  return patches;
}

using LabOf = cv::Vec3d (*)(const cv::Vec3d& rgb);

void TrustColours(Phase& phase, const std::string& figure, const PatchScene& scene, const Draws& draws, LabOf lab) {
  constexpr std::array<const char*, 3> kParts = {"l", "a", "b"};
  for (int k = 0; k < 3; ++k) {
    std::vector<Uncertainty> known;
    for (const std::size_t i : PatchesOf(phase, (figure + kParts[k]).c_str(), draws)) {
      known.push_back(
          TrustInColour(scene.measured[i], draws.measured[i], [&](const cv::Vec3d& rgb) { return lab(rgb)[k]; }));
    }
    if (Reading* const reading = phase.Find(figure + kParts[k])) reading->Trust(known);
  }
}

// The list, its mean and its largest.
void TrustDifferences(Phase& phase, const std::string& figure, const DrawnDifferences& drawn) {
  Reading* const each = phase.Find(figure);
  if (each == nullptr || drawn.size() == 0 || drawn.size() != each->values.size()) return;
  std::vector<Uncertainty> known;
  for (std::size_t i = 0; i < drawn.size(); ++i) known.push_back(drawn.OfPatch(i));
  each->Trust(std::move(known));
  phase.Find(figure + "_mean")->Trust({drawn.OfAll([](const std::vector<double>& all) {
    return std::accumulate(all.begin(), all.end(), 0.0) / static_cast<double>(all.size());
  })});
  phase.Find(figure + "_max")->Trust({drawn.OfAll([](const std::vector<double>& all) {
    return *std::max_element(all.begin(), all.end());
  })});
}

double Difference76(const cv::Vec3d& a, const cv::Vec3d& b) { return cv::norm(OwnLab(a) - OwnLab(b)); }
double Difference2000(const cv::Vec3d& a, const cv::Vec3d& b) { return DeltaE2000(LabD65OfSrgb(a), LabD65OfSrgb(b)); }

}  // namespace

void TrustPatches(Phase& phase, const PatchScene& scene) {
  const Draws draws = DrawColours(scene);
  if (draws.measured.empty()) return;
  TrustColours(phase, "lab_", scene, draws, OwnLab);
  TrustColours(phase, "lab_d65_", scene, draws, [](const cv::Vec3d& rgb) { return LabD65OfSrgb(rgb); });
  const auto compare = [&](DrawnDifferences& all, std::size_t i, const DrawnDifferences::PairFigure& difference) {
    all.Add(scene.measured[i], draws.measured[i], scene.standard[i], draws.standard[i], difference);
  };
  DrawnDifferences own;
  for (const std::size_t i : PatchesOf(phase, "delta_e_76", draws)) compare(own, i, Difference76);
  TrustDifferences(phase, "delta_e_76", own);

  DrawnDifferences by_cie;
  for (const std::size_t i : PatchesOf(phase, "delta_e_2000", draws)) {
    const auto given = scene.given.find(static_cast<int>(i));
    if (given == scene.given.end()) {
      compare(by_cie, i, Difference2000);
      continue;
    }
    const auto off = [&](const cv::Vec3d& rgb) { return DeltaE2000(LabD65OfSrgb(rgb), given->second); };
    std::vector<double> drawn;
    for (const cv::Vec3d& rgb : draws.measured[i]) drawn.push_back(off(rgb));
    by_cie.Add(off(LevelsOf(scene.measured[i])), std::move(drawn));
  }
  TrustDifferences(phase, "delta_e_2000", by_cie);
}

}  // namespace qv
