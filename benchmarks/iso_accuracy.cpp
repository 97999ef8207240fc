// How true the ISO 12233 figure is: edges of known blur, seen as cameras see them, measured beside VIGRA's
// slantedEdgeMTF and the standard's textbook form on the same regions in the same light. Errors are of MTF50, in
// percent of the true one. "rough" is VIGRA's with its smoothing of the curve turned off.
//   iso_accuracy [--check [--quick]]     --check: exit status 1 where a promise is broken

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdio>
#include <functional>
#include <map>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <stdexcept>
#include <string>
#include <vector>
#ifdef QV_HAVE_VIGRA
#include <vigra/multi_array.hxx>
#include <vigra/slanted_edge_mtf.hxx>
#endif

#include "benchmarks/trials.h"
#include "desk/measure/iso_mtf.h"
#include "desk/simulation/method_law.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

constexpr double kBlurs[] = {0.3, 0.5, 0.8, 1.2, 2.0, 3.0};

// An upright region, as large as in an upright photo of 12 or 2 megapixels, and what happens to it.
struct EdgeSetting {
  const char* name;
  int rows = 650, columns = 225, jpeg = 0;
  bool srgb = false;
  double noise_percent = 0, contrast = 5;
  double fall = 0, fall_towards_deg = 0, bow_px = 0;
  const char* promise = nullptr;  // of the mean error at each blur, from `promised_from` px on
  double promised_from = 0.3;
};
// From the sRGB rows on there is noise of half a level, as in every photo: without any, a plateau is rounded as a
// whole, by up to half a level, which alone is up to 1 % of MTF50.
constexpr EdgeSetting kEdgeSettings[] = {
    {"12 MP", 650, 225, 0, false, 0, 5, 0, 0, 0, "iso_plain"},
    {"12 MP, noise 2 %", 650, 225, 0, false, 2, 5, 0, 0, 0, "iso_noisy"},
    {"12 MP, noise 5 %", 650, 225, 0, false, 5, 5, 0, 0, 0, "iso_very_noisy"},
    {"2 MP", 260, 90, 0, false, 0, 5, 0, 0, 0, "iso_plain"},
    {"2 MP, noise 2 %", 260, 90, 0, false, 2, 5, 0, 0, 0, "iso_noisy"},
    {"2 MP, noise 5 %", 260, 90, 0, false, 5, 5, 0, 0, 0, "iso_very_noisy"},
    {"sRGB, 4 : 1", 650, 225, 0, true, 0.2, 4, 0, 0, 0, "iso_srgb"},
    {"sRGB, 10 : 1", 650, 225, 0, true, 0.2, 10, 0, 0, 0, "iso_srgb"},
    {"sRGB, 30 : 1", 650, 225, 0, true, 0.2, 30, 0, 0, 0, "iso_srgb"},
    {"sRGB, 30 : 1, 2 MP", 260, 90, 0, true, 0.2, 30, 0, 0, 0, "iso_srgb"},
    {"light 20 % across", 650, 225, 0, false, 0.2, 5, 0.2, 0, 0, "iso_uneven"},
    {"light 40 % across", 650, 225, 0, false, 0.2, 5, 0.4, 0, 0, "iso_uneven"},
    {"light 40 % across, the other way", 650, 225, 0, false, 0.2, 5, -0.4, 0, 0, "iso_uneven"},
    {"light 40 % along", 650, 225, 0, false, 0.2, 5, 0.4, 90, 0, "iso_uneven"},
    {"light 40 % askew, 2 MP", 260, 90, 0, false, 0.2, 5, 0.4, 45, 0, "iso_uneven"},
    {"bowed by 1 px", 650, 225, 0, false, 0.2, 5, 0, 0, 1, "iso_srgb"},
    {"bowed by 1 px, 2 MP", 260, 90, 0, false, 0.2, 5, 0, 0, -1, "iso_srgb"},
    {"sRGB, JPEG 75 with 4:2:0", 650, 225, 75, true, 0.2, 5, 0, 0, 0, "iso_jpeg", 0.5},
    {"sRGB, JPEG 75 with 4:2:0, 2 MP", 260, 90, 75, true, 0.2, 5, 0, 0, 0, "iso_jpeg", 0.5},
    {"all of these, 10 : 1, noise 1 %", 650, 225, 75, true, 1, 10, 0.4, 45, 1, "iso_jpeg", 0.5},
};

// MTF50 in units of Nyquist of a stored region, NaN for none.
using Method = std::function<double(const cv::Mat& stored, const Transfer& transfer)>;

double MeasureOurs(const cv::Mat& stored, const Transfer& transfer) {
  const cv::Point2d middle((stored.cols - 1) / 2.0, (stored.rows - 1) / 2.0);
  return MeasureIsoMtf(stored, TurnedRectangle(middle, stored.rows, stored.cols, 0), transfer).figures.mtf50;
}

// Centroids under a Hamming window, a straight line through them, two passes.
cv::Vec2d TextbookLine(const cv::Mat& light) {
  cv::Vec2d line(light.cols / 2.0, 0);
  for (int pass = 0; pass < 2; ++pass) {
    cv::Mat basis(light.rows, 2, CV_64F);
    cv::Mat places(light.rows, 1, CV_64F);
    for (int row = 0; row < light.rows; ++row) {
      double sum = 0;
      double moment = 0;
      for (int i = 0; i + 1 < light.cols; ++i) {
        const double off = i + 0.5 - line[0] - line[1] * row;
        const double reach = light.cols / 2.0;
        const double window = std::fabs(off) < reach ? 0.54 + 0.46 * std::cos(CV_PI * off / reach) : 0;
        const double weight = window * (light.at<double>(row, i + 1) - light.at<double>(row, i));
        sum += weight;
        moment += weight * (i + 0.5);
      }
      basis.at<cv::Vec2d>(row, 0) = cv::Vec2d(1, row);
      places.at<double>(row) = moment / sum;
    }
    cv::Mat fit;
    cv::solve(basis, places, fit, cv::DECOMP_QR);
    line = {fit.at<double>(0), fit.at<double>(1)};
  }
  return line;
}

// The standard as it is printed: four bins a pixel along the rows, a Hamming window over the whole region, the
// derivative corrected.
double MeasureTextbook(const cv::Mat& stored, const Transfer& transfer) {
  const cv::Mat light = LinearLight(stored, transfer);
  const cv::Vec2d line = TextbookLine(light);
  std::vector<double> sums(4 * light.cols);
  std::vector<double> pixels(sums.size());
  for (int row = 0; row < light.rows; ++row) {
    for (int i = 0; i < light.cols; ++i) {
      const int bin = cvFloor(4 * (i - line[1] * (row - light.rows / 2.0)));
      if (bin < 0 || bin >= static_cast<int>(sums.size())) continue;
      sums[bin] += light.at<double>(row, i);
      pixels[bin] += 1;
    }
  }
  const double middle = 4 * (line[0] + line[1] * light.rows / 2.0);
  const double cosine = 1 / std::hypot(1, line[1]);
  const auto response = [&](double f) {  // cycles/pixel along the normal
    std::complex<double> sum;
    double whole = 0;
    for (std::size_t k = 1; k + 1 < sums.size(); ++k) {
      const double off = (static_cast<double>(k) - middle) / (2.0 * light.cols);
      const double window = std::fabs(off) < 1 ? 0.54 + 0.46 * std::cos(CV_PI * off) : 0;
      const double weight = window * (sums[k + 1] / pixels[k + 1] - sums[k - 1] / pixels[k - 1]);
      sum += weight * std::polar(1.0, -2 * CV_PI * f * cosine * static_cast<double>(k) / 4);
      whole += weight;
    }
    return std::abs(sum / whole) / method_law::Sinc(f / 2);
  };
  constexpr double kNowhere = 1;
  const double half = method_law::HalfPoint(response, kNowhere);
  return half < kNowhere ? 2 * half : std::nan("");
}

#ifdef QV_HAVE_VIGRA
// VIGRA's curve comes without a figure, so the same is taken from it: the first crossing of one half. By default it is
// smoothed at a scale of 2.
double MeasureVigra(const cv::Mat& stored, const Transfer& transfer, double smoothing_scale) {
  cv::Mat levels;
  LinearLight(stored, transfer).convertTo(levels, CV_32F, 255);
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

cv::Mat GreyThroughJpeg(const cv::Mat& gray, int quality) {
  cv::Mat photo;
  cv::cvtColor(gray, photo, cv::COLOR_GRAY2BGR);
  std::vector<uchar> file;
  cv::imencode(".jpg", photo, file, {cv::IMWRITE_JPEG_QUALITY, quality});  // 4:2:0
  cv::Mat back;
  cv::cvtColor(cv::imdecode(file, cv::IMREAD_COLOR), back, cv::COLOR_BGR2GRAY);
  return back;
}

// One photo of many: slopes from 3 to 8 degrees, either way.
EdgePhoto View(const EdgeSetting& setting, double sigma_px, int index, int photos, cv::RNG& random) {
  EdgePhoto view;
  view.size = {setting.columns, setting.rows};
  view.through = {setting.columns / 2.0 + random.uniform(-2.0, 2.0), setting.rows / 2.0};
  view.normal_deg = (3 + 5.0 * index / (photos - 1)) * (index % 2 == 0 ? 1 : -1);
  view.sigma_px = sigma_px;
  view.light = setting.srgb || setting.fall != 0 ? random.uniform(180.0, 190.0) : 235;
  view.dark = view.light / setting.contrast;
  view.bow_px = setting.bow_px;
  view.fall = setting.fall;
  view.fall_towards_deg = setting.fall_towards_deg;
  return view;
}

cv::Mat Photograph(const EdgeSetting& setting, const EdgePhoto& view, cv::RNG& random) {
  cv::Mat levels = DrawEdgePhoto(view);
  if (setting.srgb) levels = EncodeSrgb(levels);
  cv::Mat noise(levels.size(), CV_32F);
  random.fill(noise, cv::RNG::NORMAL, 0, std::max(setting.noise_percent / 100 * 255, 1e-9));
  levels += noise;
  cv::Mat stored;
  levels.convertTo(stored, CV_8U);
  return setting.jpeg == 0 ? stored : GreyThroughJpeg(stored, setting.jpeg);
}

struct Errors {
  double bias = 0, mean = 0, largest = 0;  // mean error, mean and largest size of it
  int none = 0;
};

Errors Measure(const Method& method, const EdgeSetting& setting, double sigma_px, int photos) {
  cv::RNG random(2024);
  Errors errors;
  for (int i = 0; i < photos; ++i) {
    const EdgePhoto view = View(setting, sigma_px, i, photos, random);
    const cv::Mat stored = Photograph(setting, view, random);
    const Transfer transfer = {setting.srgb ? Transfer::Kind::kSrgb : Transfer::Kind::kLinear, 1};
    const double error = (method(stored, transfer) / method_law::TrueMtf50(sigma_px, view.normal_deg) - 1) * 100;
    if (!std::isfinite(error)) {
      ++errors.none;
      continue;
    }
    errors.bias += error;
    errors.mean += std::fabs(error);
    errors.largest = std::max(errors.largest, std::fabs(error));
  }
  errors.bias /= std::max(photos - errors.none, 1);
  errors.mean /= std::max(photos - errors.none, 1);
  return errors;
}

// Answers the largest size of the mean error at a blur that is promised.
double PrintRow(const char* name, const Method& method, const EdgeSetting& setting, int photos) {
  std::printf("| %s | %s |", setting.name, name);
  double largest = 0;
  for (const double sigma_px : kBlurs) {
    if (Trials(1, 0) == 0 && sigma_px != 0.8 && sigma_px != 2.0) continue;
    const Errors errors = Measure(method, setting, sigma_px, photos);
    std::printf(" %+.2f %.2f %.2f", errors.bias, errors.mean, errors.largest);
    if (errors.none > 0) std::printf(" (none: %d)", errors.none);
    std::printf(" |");
    if (sigma_px >= setting.promised_from) largest = std::max(largest, std::fabs(errors.bias));
  }
  std::printf("\n");
  std::fflush(stdout);
  return largest;
}

void PrintIso() {
  const int photos = Trials(50, 12);
  std::printf("MTF50 by ISO 12233: mean error, mean and largest size of it, percent, of %d photos, by blur in px\n\n",
              photos);
  std::printf("| region | by | 0.3 | 0.5 | 0.8 | 1.2 | 2.0 | 3.0 |\n|---|---|---|---|---|---|---|---|\n");
  std::map<std::string, double> largest;  // by promise
  for (const EdgeSetting& setting : kEdgeSettings) {
    // Noise of 5 % moves readings of small regions by 4 %: their mean takes more of them.
    const bool noisy = setting.noise_percent > 1;
    if (noisy && setting.rows < 650 && Trials(1, 0) == 0) continue;
    const bool many = IsChecking() && noisy;
    const double error = PrintRow("ours", MeasureOurs, setting, many ? Trials(200, 60) : photos);
    largest[setting.promise] = std::max(largest[setting.promise], error);
    if (IsChecking()) continue;
    PrintRow("textbook", MeasureTextbook, setting, photos);
#ifdef QV_HAVE_VIGRA
    const auto vigra = [](double scale) {
      return [scale](const cv::Mat& stored, const Transfer& transfer) { return MeasureVigra(stored, transfer, scale); };
    };
    PrintRow("VIGRA", vigra(2), setting, photos);
    PrintRow("VIGRA, rough", vigra(0), setting, photos);
#endif
  }
  for (const auto& [promise, error] : largest) Hold(promise.c_str(), error);
}

}  // namespace
}  // namespace qv

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  qv::PrintIso();
  return AllKept() ? 0 : 1;
}
