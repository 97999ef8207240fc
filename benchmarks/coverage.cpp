// Whether uncertainties keep their word: simulated readings of known truth, and the share of them whose true value lies
// within the expanded uncertainty. 95 in 100 is meant, 93 to 97 is promised.
//   coverage [--check] [--quick] [WORD...]     --quick: 200 readings a row in place of 1000; of rows that hold all
//   words

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstdio>
#include <functional>
#include <opencv2/core.hpp>
#include <opencv2/core/utility.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "benchmarks/trials.h"
#include "desk/measure/edge_resampling.h"
#include "desk/measure/iso_mtf.h"
#include "desk/measure/patch_trust.h"
#include "desk/measure/uncertainty.h"
#include "desk/simulation/method_law.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

struct Condition {
  const char* name;
  double blur = 0.8, noise_percent = 1, contrast = 5, turn_deg = 0;
  bool srgb = true;
  int jpeg = 0;
  int rows = 260, columns = 90;

  constexpr bool blur_only() const {
    return blur != 0.8 || contrast != 5 || turn_deg != 0 || !srgb || jpeg != 0 || rows != 260;
  }
};
constexpr Condition kConditions[] = {
    {"as it comes"},
    {"12 MP", 0.8, 1, 5, 0, true, 0, 650, 224},
    {"blur 0.5 px", 0.5},
    {"blur 1.2 px", 1.2},
    {"blur 2 px", 2},
    {"noise 0.3 %", 0.8, 0.3},
    {"noise 2 %", 0.8, 2},
    {"noise 5 %", 0.8, 5},
    {"contrast 30 : 1", 0.8, 1, 30},
    {"turned by 12 degrees", 0.8, 1, 5, 12},
    {"linear", 0.8, 1, 5, 0, false},
    {"JPEG 90", 0.8, 1, 5, 0, true, 90},
    {"JPEG 75", 0.8, 1, 5, 0, true, 75},
};

// One reading's error and what it claims of it.
struct Trial {
  double error = 0, expanded = 0, truth = 0;
};

cv::Mat ThroughJpeg(const cv::Mat& gray, int quality) {
  std::vector<uchar> file;
  cv::imencode(".jpg", gray, file, {cv::IMWRITE_JPEG_QUALITY, quality});
  return cv::imdecode(file, cv::IMREAD_GRAYSCALE);
}

struct Edge {
  EdgePhoto view;
  cv::Mat levels;  // CV_32F, as the camera encodes them, without noise
};

// A photo some pixels larger than the region in its middle.
Edge DrawTrial(const Condition& condition, cv::RNG& random) {
  const double turn = condition.turn_deg * CV_PI / 180;
  const int width = cvCeil(condition.columns * std::cos(turn) + condition.rows * std::sin(turn)) + 4;
  const int height = cvCeil(condition.rows * std::cos(turn) + condition.columns * std::sin(turn)) + 4;
  EdgePhoto view;
  view.size = {width, height};
  const double x = random.uniform(-2.0, 2.0);
  view.through = {(width - 1) / 2.0 + x, (height - 1) / 2.0};
  const double slope = random.uniform(3.0, 8.0);
  view.normal_deg = condition.turn_deg + slope;
  view.sigma_px = condition.blur;
  view.light = random.uniform(150.0, 190.0);
  view.dark = view.light / condition.contrast;
  const cv::Mat light = DrawEdgePhoto(view);
  return {view, condition.srgb ? EncodeSrgb(light) : light};
}

cv::Mat Photograph(const Condition& condition, const cv::Mat& levels, double noise_percent, cv::RNG& random) {
  cv::Mat noise(levels.size(), CV_32F);
  random.fill(noise, cv::RNG::NORMAL, 0, std::max(noise_percent * 2.55, 1e-9));
  cv::Mat photo;
  cv::Mat(levels + noise).convertTo(photo, CV_8U);
  return condition.jpeg == 0 ? photo : ThroughJpeg(photo, condition.jpeg);
}

Transfer TransferOf(const Condition& condition) {
  return {condition.srgb ? Transfer::Kind::kSrgb : Transfer::Kind::kLinear, 1};
}

using IsoFigure = double IsoFigures::*;

Trial TryIso(const Condition& condition, IsoFigure figure, double truth_level, cv::RNG& random) {
  const Edge edge = DrawTrial(condition, random);
  const cv::Mat photo = Photograph(condition, edge.levels, condition.noise_percent, random);
  const cv::Point2d middle((photo.cols - 1) / 2.0, (photo.rows - 1) / 2.0);
  const IsoMtf iso = MeasureIsoMtf(
      photo, TurnedRectangle(middle, condition.rows, condition.columns, condition.turn_deg), TransferOf(condition));
  double truth = 0;
  if (truth_level > 0) {
    const auto response = [&](double f) {
      return method_law::TrueResponse(f, condition.blur, edge.view.normal_deg) * 0.5 / truth_level;
    };
    truth = 2 * method_law::HalfPoint(response, 1);
  } else {
    while (EdgeRise(truth, condition.blur, edge.view.normal_deg) < 0.9) truth += 1e-4;
    truth *= 2;
  }
  return {iso.figures.*figure - truth, UncertaintyOf(iso, figure).expanded, truth};
}

// Upright, as the test straightens it.
cv::Mat Region(const Condition& condition, const cv::Mat& photo) {
  const cv::Point2f middle((photo.cols - 1) / 2.0f, (photo.rows - 1) / 2.0f);
  cv::Mat upright = photo;
  if (condition.turn_deg != 0) {
    cv::warpAffine(photo, upright, cv::getRotationMatrix2D(middle, condition.turn_deg, 1), photo.size());
  }
  const cv::Rect part((photo.cols - condition.columns) / 2, (photo.rows - condition.rows) / 2, condition.columns,
                      condition.rows);
  return upright(part).clone();
}

double ReadOwn(const cv::Mat& region) {
  thread_local QVTester tester;
  std::vector<float> freq;
  std::vector<float> sfr;
  float mtf50 = 0;
  cv::Mat levels;
  region.convertTo(levels, CV_32F);
  tester.CalculateSFR(levels, freq, sfr, mtf50);
  return mtf50;
}

Trial TryOwn(const Condition& condition, cv::RNG& random) {
  const Edge edge = DrawTrial(condition, random);
  const cv::Mat region = Region(condition, Photograph(condition, edge.levels, condition.noise_percent, random));
  // Without noise, and without the rounding that noise spreads.
  const double truth =
      ReadOwn(Region(condition, condition.jpeg == 0 ? edge.levels : Photograph(condition, edge.levels, 0, random)));
  return {ReadOwn(region) - truth, ResampleEdge(region, ReadOwn).expanded, truth};
}

// A patch of some colour, as the test measures it: the mean of its stored levels, cut. `part`: 0 to 2 of L*a*b*, 3 the
// difference to a standard of a near colour.
Trial TryPatch(const Condition& condition, int part, cv::RNG& random) {
  constexpr int kSide = 60;
  const auto photograph = [&](const cv::Vec3d& rgb) {
    cv::Mat noise(kSide, kSide, CV_32FC3);
    random.fill(noise, cv::RNG::NORMAL, cv::Scalar(rgb[0], rgb[1], rgb[2]),
                cv::Scalar::all(condition.noise_percent * 2.55));
    cv::Mat photo;
    noise.convertTo(photo, CV_8U);
    return photo;
  };
  const auto cut = [](const cv::Mat& photo) {
    const cv::Scalar mean = cv::mean(photo);
    return cv::Point3i(cvFloor(mean[0]), cvFloor(mean[1]), cvFloor(mean[2]));
  };
  cv::Vec3d truth;
  cv::Vec3d standard;
  for (int k = 0; k < 3; ++k) {
    truth[k] = random.uniform(60.0, 200.0);
    standard[k] = truth[k] + random.uniform(-15.0, 15.0);
  }
  const cv::Mat photo = photograph(truth);
  const cv::Mat other = photograph(standard);
  const cv::Point3i mean = cut(photo);
  const double area = kSide * kSide;
  const std::vector<cv::Vec3d> draws = DrawPatchColours(photo, area, mean, 1);
  const auto levels = [](const cv::Point3i& p) { return cv::Vec3d(p.x, p.y, p.z); };
  if (part < 3) {
    const auto figure = [part](const cv::Vec3d& rgb) { return OwnLab(rgb)[part]; };
    return {figure(levels(mean)) - figure(truth), TrustInColour(mean, draws, figure).expanded, 100};
  }
  const auto difference = [](const cv::Vec3d& a, const cv::Vec3d& b) { return cv::norm(OwnLab(a) - OwnLab(b)); };
  const cv::Point3i of_standard = cut(other);
  return {difference(levels(mean), levels(of_standard)) - difference(truth, standard),
          TrustInPair(mean, draws, of_standard, DrawPatchColours(photo, area, of_standard, 2), difference).expanded,
          100};
}

// A flash photo whose light falls off, and its mean without noise.
Trial TryMean(const Condition& condition, cv::RNG& random) {
  cv::Mat levels(120, 160, CV_32F);
  for (int row = 0; row < levels.rows; ++row) {
    for (int i = 0; i < levels.cols; ++i) levels.at<float>(row, i) = 150 - 0.3f * static_cast<float>(row + i);
  }
  const cv::Mat photo = Photograph(condition, levels, condition.noise_percent, random);
  const double truth = cv::mean(levels)[0];
  return {cv::mean(photo)[0] - truth, OfMeanLevel(photo).expanded, truth};
}

struct Row {
  const char* figure;
  std::function<Trial(const Condition&, cv::RNG&)> run;
};
const std::vector<Row>& Rows() {
  const auto iso = [](IsoFigure figure, double level) {
    return [=](const Condition& condition, cv::RNG& random) { return TryIso(condition, figure, level, random); };
  };
  const auto patch = [](int part) {
    return [=](const Condition& condition, cv::RNG& random) { return TryPatch(condition, part, random); };
  };
  static const std::vector<Row> rows = {{"MTF50 ISO", iso(&IsoFigures::mtf50, 0.5)},
                                        {"MTF30 ISO", iso(&IsoFigures::mtf30, 0.3)},
                                        {"MTF10 ISO", iso(&IsoFigures::mtf10, 0.1)},
                                        {"edge width", iso(&IsoFigures::edge_width, 0)},
                                        {"MTF50 of the test", TryOwn},
                                        {"L* of a patch", patch(0)},
                                        {"a* of a patch", patch(1)},
                                        {"b* of a patch", patch(2)},
                                        {"difference of patches", patch(3)},
                                        {"mean level", TryMean}};
  return rows;
}

void PrintRow(const Row& row, const Condition& condition, int trials, cv::Vec2d& within) {
  std::vector<Trial> done(trials);
  cv::parallel_for_({0, trials}, [&](const cv::Range& range) {
    for (int i = range.start; i < range.end; ++i) {
      cv::RNG random(1000 + i);
      done[i] = row.run(condition, random);
    }
  });
  double covered = 0;
  double none = 0;
  double expanded = 0;
  double squares = 0;
  double bias = 0;
  for (const Trial& trial : done) {
    if (!std::isfinite(trial.error) || !std::isfinite(trial.expanded)) {
      ++none;
      continue;
    }
    covered += std::fabs(trial.error) <= trial.expanded ? 1 : 0;
    expanded += trial.expanded / trial.truth;
    squares += trial.error * trial.error / (trial.truth * trial.truth);
    bias += trial.error / trial.truth;
  }
  const double n = trials - none;
  if (condition.jpeg != 75) within += cv::Vec2d(covered, n);
  const double share = 100 * covered / n;
  const bool kept = share >= 93 && share <= 97;
  std::printf("| %s | %s | %.2f %% | %+.2f %% | %.2f %% | %.1f %s|", row.figure, condition.name,
              100 * std::sqrt(squares / n), 100 * bias / n, 100 * expanded / n, share, kept ? "" : "(missed) ");
  if (none > 0) std::printf(" no figure in %.0f", none);
  std::printf("\n");
  std::fflush(stdout);
}

}  // namespace
}  // namespace qv

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  const int trials = Trials(1000, 12);
  cv::Vec2d within;  // of all that are promised: truths within U, readings
  std::printf("Coverage, %d readings a row\n\n| figure | photo | scatter | bias | mean U | within U, of 100 |\n",
              trials);
  std::printf("|---|---|---|---|---|---|\n");
  for (const auto& row : qv::Rows()) {
    for (const auto& condition : qv::kConditions) {
      // Of what has no edge, only the noise varies.
      const bool edge =
          std::string(row.figure).find("patch") == std::string::npos && row.figure != std::string("mean level");
      if (!edge && condition.blur_only()) continue;
      const std::string name = std::string(row.figure) + ", " + condition.name;
      const auto asked = [&](const std::string& word) { return name.find(word) != std::string::npos; };
      if (std::all_of(words.begin(), words.end(), asked)) qv::PrintRow(row, condition, trials, within);
    }
  }
  if (words.empty()) Hold("coverage", 100 * within[0] / within[1]);
  return AllKept() ? 0 : 1;
}
