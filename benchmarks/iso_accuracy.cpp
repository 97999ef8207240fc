// How true the ISO 12233 figure is: edges of known blur, measured beside VIGRA's slantedEdgeMTF on the same regions.
// Prints a table for each kind of region; errors are of MTF50, in percent of the true one. "rough" is VIGRA's with its
// smoothing of the curve turned off.

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <functional>
#include <opencv2/core.hpp>
#include <stdexcept>
#include <vector>
#ifdef QV_HAVE_VIGRA
#include <vigra/multi_array.hxx>
#include <vigra/slanted_edge_mtf.hxx>
#endif

#include "desk/measure/iso_mtf.h"
#include "desk/simulation/method_law.h"
#include "unit_tests/drawing.h"

namespace {

constexpr double kBlurs[] = {0.3, 0.5, 0.8, 1.2, 2.0, 3.0};
constexpr int kPhotos = 50;  // of each blur; their slopes go from 3 to 8 degrees, either way

// An upright region, as large as in an upright photo of 12 or 2 megapixels, and how much noise it is seen with.
struct Setting {
  int rows, columns;
  double noise_percent;
};
constexpr Setting kSettings[] = {{650, 225, 0}, {650, 225, 2}, {260, 90, 0}, {260, 90, 2}};

using Method = std::function<double(const cv::Mat& region)>;  // MTF50 in units of Nyquist, NaN for none

double MeasureIso(const cv::Mat& region) {
  const cv::Point2d middle((region.cols - 1) / 2.0, (region.rows - 1) / 2.0);
  return qv::MeasureIsoMtf(region, TurnedRectangle(middle, region.rows, region.cols, 0)).mtf50;
}

#ifdef QV_HAVE_VIGRA
// VIGRA's curve comes without a figure, so the same is taken from it: the first crossing of one half. By default it is
// smoothed at a scale of 2.
double MeasureVigra(const cv::Mat& region, double smoothing_scale) {
  cv::Mat levels;
  region.convertTo(levels, CV_32F);
  const vigra::MultiArrayView<2, float> view(vigra::Shape2(levels.cols, levels.rows), levels.ptr<float>());
  std::vector<vigra::TinyVector<double, 2>> mtf;
  try {
    vigra::slantedEdgeMTF(view, mtf, vigra::SlantedEdgeMTFOptions().mtfSmoothingScale(smoothing_scale));
  } catch (const std::exception&) {
    return std::nan("");
  }
  for (std::size_t i = 1; i < mtf.size(); ++i) {
    if (mtf[i][1] > 0.5) continue;
    const double t = (mtf[i - 1][1] - 0.5) / (mtf[i - 1][1] - mtf[i][1]);
    return 2 * (mtf[i - 1][0] + t * (mtf[i][0] - mtf[i - 1][0]));
  }
  return std::nan("");
}
#endif

struct Errors {
  double bias = 0, mean = 0, largest = 0;  // mean error, mean and largest size of it
  int none = 0;
};

Errors Measure(const Method& method, const Setting& setting, double sigma_px) {
  cv::RNG random(2024);
  Errors errors;
  for (int i = 0; i < kPhotos; ++i) {
    EdgePhoto view;
    view.size = {setting.columns, setting.rows};
    view.through = {setting.columns / 2.0 + random.uniform(-2.0, 2.0), setting.rows / 2.0};
    view.normal_deg = (3 + 5.0 * i / (kPhotos - 1)) * (i % 2 == 0 ? 1 : -1);
    view.sigma_px = sigma_px;
    cv::Mat levels = DrawEdgePhoto(view);
    cv::Mat noise(levels.size(), CV_32F);
    random.fill(noise, cv::RNG::NORMAL, 0, std::max(setting.noise_percent / 100 * 255, 1e-9));
    levels += noise;
    cv::Mat photo;
    levels.convertTo(photo, CV_8U);
    const double truth = qv::method_law::TrueMtf50(sigma_px, view.normal_deg);
    const double error = (method(photo) / truth - 1) * 100;
    if (!std::isfinite(error)) {
      ++errors.none;
      continue;
    }
    errors.bias += error;
    errors.mean += std::fabs(error);
    errors.largest = std::max(errors.largest, std::fabs(error));
  }
  errors.bias /= std::max(kPhotos - errors.none, 1);
  errors.mean /= std::max(kPhotos - errors.none, 1);
  return errors;
}

void PrintTable(const char* name, const Method& method, const Setting& setting) {
  std::printf("%-8s", name);
  double mean = 0;
  for (const double sigma_px : kBlurs) {
    const Errors errors = Measure(method, setting, sigma_px);
    std::printf("  %+6.2f %5.2f %6.2f", errors.bias, errors.mean, errors.largest);
    if (errors.none > 0) std::printf(" (none: %d)", errors.none);
    mean += errors.mean / static_cast<double>(std::size(kBlurs));
  }
  std::printf("   %5.2f\n", mean);
}

}  // namespace

int main() {
  for (const Setting& setting : kSettings) {
    std::printf("Region of %d x %d px, noise %g %%: bias, mean and largest error of %d photos, percent\n",
                setting.columns, setting.rows, setting.noise_percent, kPhotos);
    std::printf("blur, px");
    for (const double sigma_px : kBlurs) std::printf("  %20.1f", sigma_px);
    std::printf("    mean\n");
    PrintTable("ours", MeasureIso, setting);
#ifdef QV_HAVE_VIGRA
    PrintTable(
        "VIGRA", [](const cv::Mat& region) { return MeasureVigra(region, 2); }, setting);
    PrintTable(
        "  rough", [](const cv::Mat& region) { return MeasureVigra(region, 0); }, setting);
#endif
    std::printf("\n");
  }
}
