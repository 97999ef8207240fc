// Slanted-edge SFR (ISO 12233). Ours departs from the textbook, and every limit in use refers to it as it is:
//   - one bin per pixel across the edge, no oversampling;
//   - the response is |Re(DFT)| / |Re(DFT)[0]| of the centred line spread; the imaginary part is dropped;
//   - MTF50 is interpolated between the two samples nearest to 0.5, wherever they lie.
// All working arrays are single precision; where a step is held in double it says so.
//
// The plain form, equal to the last bit, is unit_tests/plain/sfr.h. Here derivative and window of a row are one loop
// without matrices of its own, and the window's cosine is a polynomial wherever that provably rounds to the same float.
// A derivative of halves of whole grey levels, and sums of such levels, are exact in any order; other regions take the
// plain order.

#include <algorithm>
#include <array>
#include <cfloat>
#include <cmath>
#include <cstdlib>
#include <opencv2/imgproc.hpp>

#include "qvtester/tester.h"
#include "sharpness/sfr_steps.h"

namespace {

constexpr float kNoFractions = 1 << 23;  // floats from here on are whole

// Whether each value is a grey level of 8 bits, and no bin's sum of them can reach 2^24.
bool HoldsWholeLevels(const cv::Mat& region) {
  if (region.type() != CV_32FC1 || region.rows > (1 << 14)) return false;
  for (int m = 0; m < region.rows; ++m) {
    const auto* values = region.ptr<float>(m);
    int others = 0;
    for (int n = 0; n < region.cols; ++n) {
      const float whole = (values[n] + kNoFractions) - kNoFractions;
      others |= static_cast<int>(values[n] != whole) | static_cast<int>(!(std::fabs(whole - 127.5f) < 128));
    }
    if (others != 0) return false;
  }
  return true;
}

// Whether ceil(n - shift) in single precision grows by one from column to column: n - shift is rounded, but no integer
// is within reach of that, unless every difference is one.
bool KeepsStep(float shift, int npix) {
  const float to_integer = std::fabs(shift - std::nearbyint(shift));
  return to_integer == 0 || to_integer > (static_cast<float>(npix) + std::fabs(shift)) * FLT_EPSILON;
}

// 0.54 + 0.46 cos(x) for |x| <= kCosineReach, from x squared: the least greatest error, 0.8e-12, that eight powers
// allow.
constexpr double kCosineReach = 3.25;
constexpr double kMargin = 1e-12;
double ApproximateWindow(double z) {
  double w = 1.881097988438079e-14;
  w = w * z - 5.215239945610941e-12;
  w = w * z + 9.596845573037727e-10;
  w = w * z - 1.26759678215741e-07;
  w = w * z + 1.1408715652038327e-05;
  w = w * z - 0.0006388888592246493;
  w = w * z + 0.019166666636258493;
  w = w * z - 0.22999999998799472;
  return w * z + 0.9999999999992197;
}

// w[i] = 0.54 + 0.46 cos(pi (i - mid) / wid): double inside, stored as float.
// Pi is cut to 3.141592, and i starts at 0, so the peak leans half a sample to the right. Both are meant.
// The cosine itself is called only where the approximation's error could reach the next float.
void FillHammingWindow(int n, float mid, float* window) {
  const float wid = std::max(mid - 1, static_cast<float>(n) - mid);
  const auto exact = [&](int i) {
    return static_cast<float>(0.54 + 0.46 * std::cos((static_cast<float>(i) - mid) * 3.141592 / wid));
  };
  const double step = 3.141592 / wid;
  const bool in_reach = std::max(std::fabs(mid), std::fabs(static_cast<float>(n - 1) - mid)) * step < kCosineReach;
  constexpr int kBlock = 64;
  std::array<float, kBlock> above;
  for (int first = 0; first < n; first += kBlock) {
    const int count = std::min(kBlock, n - first);
    float* const below = window + first;
    int doubtful = in_reach ? 0 : 1;
    for (int i = 0; i < count; ++i) {
      const double x = (static_cast<float>(first + i) - mid) * step;
      const double w = ApproximateWindow(x * x);
      below[i] = static_cast<float>(w - kMargin);
      above[i] = static_cast<float>(w + kMargin);
      doubtful |= static_cast<int>(below[i] != above[i]);
    }
    for (int i = 0; doubtful != 0 && i < count; ++i) {
      if (!in_reach || below[i] != above[i]) below[i] = exact(first + i);
    }
  }
}

constexpr int kTogether = 8;

// The centroid of each row, half a column less. A sum has to wait for its last addition, so the sums of several rows
// advance side by side.
void EdgesInRows(const cv::Mat& rows, int count, float* loc) {
  const int npix = rows.cols;
  const auto* x = rows.ptr<float>();
  std::array<float, kTogether> moments = {};
  for (int i = 0; i < npix; ++i) {
    for (int r = 0; r < kTogether; ++r) moments[r] += static_cast<float>(i) * x[r * npix + i];
  }
  for (int r = 0; r < count; ++r) loc[r] = static_cast<float>(moments[r] / cv::sum(rows.row(r))[0]) - 0.5f;
}

// Two passes of windowed centroids and a straight line; the second pass centres each row's window on the first line.
EdgeLine LocateEdge(QVTester& tester, const cv::Mat& region, bool whole_levels, float* fil) {
  const int nlin = region.rows;
  const int npix = region.cols;
  cv::Mat derivative;
  if (!whole_levels) tester.GetFirstDerivative(region, nlin, npix, fil, 2, derivative);

  EdgeLine line = {};
  cv::Mat loc(nlin, 1, CV_32F);
  std::vector<float> window(npix);
  cv::Mat profiles(kTogether, npix, CV_32F, cv::Scalar(0));
  FillHammingWindow(npix, static_cast<float>(npix + 1) * 0.5f, window.data());
  for (const bool moving : {false, true}) {
    for (int n = 0; n < nlin; ++n) {
      if (moving) FillHammingWindow(npix, line.offset + line.slope * static_cast<float>(n), window.data());
      const int r = n % kTogether;
      auto* profile = profiles.ptr<float>(r);
      if (whole_levels) {
        const auto* row = region.ptr<float>(n);
        for (int i = 1; i < npix; ++i) profile[i] = (row[i - 1] - row[i]) * fil[0] * window[i];
        profile[0] = (row[0] - row[1]) * fil[0] * window[0];
      } else {
        const auto* row = derivative.ptr<float>(n);
        for (int i = 0; i < npix; ++i) profile[i] = row[i] * window[i];
      }
      if (r == kTogether - 1 || n == nlin - 1) EdgesInRows(profiles, r + 1, loc.ptr<float>(n - r));
    }
    tester.FindEdge(loc, nlin, &line.slope, &line.offset);
  }
  return line;
}

// Derivative of the edge spread, its centre of gravity moved to the middle, Hamming-windowed. npix x 1.
cv::Mat CentredLineSpread(QVTester& tester, const cv::Mat& esf, float* fil) {
  const int npix = esf.rows;
  cv::Mat row;
  cv::transpose(esf, row);
  cv::Mat lsf;
  tester.GetFirstDerivative(row, 1, npix, fil, 3, lsf);
  cv::transpose(lsf, lsf);
  const double mid = tester.GetCentroid(lsf) + 0.5;
  // Without a finite centre there is nothing to move to: all moves out of view, and the response is 0 / 0.
  lsf = tester.GetShiftedArray(lsf, std::fabs(mid) < kBeyondAnyArray ? static_cast<int>(mid) : 2 * npix);
  return lsf.mul(tester.GetAHammingWindow(npix, static_cast<float>(npix + 1) * 0.5f));
}

}  // namespace

bool QVTester::CalculateSFR(cv::Mat roi, std::vector<float>& freq, std::vector<float>& sfr, float& mtf50) {
  if (roi.depth() != CV_32F) roi.convertTo(roi, CV_32F);
  cv::Mat region = ConvertToVertical(roi);  // nlin x npix, the edge runs down the rows
  const Kernels fil(*this, region);
  const EdgeLine edge = LocateEdge(*this, region, HoldsWholeLevels(region), fil.fil1.get());
  const cv::Mat esf = ProjectData(region, edge.slope, edge.offset, 1);  // npix x 1, edge spread
  const cv::Mat lsf = CentredLineSpread(*this, esf, fil.fil2.get());    // npix x 1, line spread
  const std::size_t first = sfr.size();
  AppendResponse(lsf, freq, sfr);
  const int count = static_cast<int>(sfr.size() - first);
  mtf50 = InterpolateMTF50(freq.data() + (freq.size() - count), sfr.data() + first, count);
  return true;
}

int QVTester::CalculateMTF(cv::Mat roi, float& mtf50) {
  std::vector<float> freq;
  std::vector<float> sfr;
  return CalculateSFR(roi, freq, sfr, mtf50) ? QV_SUCCESS : QV_DONE;
}

cv::Mat QVTester::ConvertToVertical(cv::Mat roi) {
  if (roi.rows >= roi.cols) return roi;
  cv::Mat turned;
  cv::transpose(roi, turned);
  return turned;
}

// {0.5, -0.5} and {0.5, 0, -0.5}, negated when the left strip is the brighter one. Both strips are four columns wide,
// and the right one stops a column short of the border.
void QVTester::CalculateFilterValue(cv::Mat* roi, float** fil1, float** fil2) {
  const auto left = static_cast<float>(cv::sum((*roi)(cv::Rect(0, 0, 4, roi->rows)))[0]);
  const auto right = static_cast<float>(cv::sum((*roi)(cv::Rect(roi->cols - 5, 0, 4, roi->rows)))[0]);
  const float half = left > right ? -0.5f : 0.5f;
  auto two_taps = std::unique_ptr<float[]>(new float[2]{half, -half});
  *fil2 = new float[3]{half, 0.0f, -half};
  *fil1 = two_taps.release();
}

cv::Mat QVTester::GetAHammingWindow(int n, float mid) {
  cv::Mat window(n, 1, CV_32F);
  FillHammingWindow(n, mid, window.ptr<float>());
  return window;
}

// Correlation (the kernel is not flipped) with OpenCV's default anchor and border, row by row. The first nfil - 1
// columns would see the border: the last of them repeats its neighbour, those before it stay 0.
void QVTester::GetFirstDerivative(cv::Mat src, int nlin, int npix, float* fil, int nfil, cv::Mat& out) {
  cv::Mat derivative = cv::Mat::zeros(nlin, npix, CV_32F);
  const cv::Mat kernel(1, nfil, CV_32F, fil);
  const int first = nfil - 1;
  for (int i = 0; i < nlin; ++i) {
    cv::Mat filtered;
    cv::filter2D(src(cv::Rect(0, i, npix, 1)), filtered, -1, kernel);
    filtered(cv::Rect(first, 0, npix - first, 1)).copyTo(derivative(cv::Rect(first, i, npix - first, 1)));
    derivative.at<float>(i, first - 1) = derivative.at<float>(i, first);
  }
  out = derivative;
}

// sum(i x[i]) in single precision over sum(x) in double.
float QVTester::GetCentroid(cv::Mat x) {
  float moment = 0;
  for (int i = 0; i < x.rows; ++i) moment += static_cast<float>(i) * x.at<float>(i);
  return static_cast<float>(moment / cv::sum(x)[0]);
}

cv::Mat QVTester::GetShiftedArray(cv::Mat x, int center) {
  const int n = x.rows;
  const int del = center - (n + 1) / 2;
  cv::Mat shifted = cv::Mat::zeros(n, 1, CV_32F);
  for (int i = std::max(0, -del); i < n && i + del < n; ++i) shifted.at<float>(i) = x.at<float>(i + del);
  return shifted;
}

// dst = (X' X)^-1 X' y, X[i][k] = x[i]^k.
void QVTester::polyfit(const cv::Mat& src_x, const cv::Mat& src_y, cv::Mat& dst, int order) {
  if (!((src_x.rows > 0) && (src_y.rows > 0) && (src_x.cols == 1) && (src_y.cols == 1) && (dst.cols == 1) &&
        (dst.rows == (order + 1)) && (order >= 1))) {
    cv::error(cv::Error::StsAssert,
              "(src_x.rows>0)&&(src_y.rows>0)&&(src_x.cols==1)&&(src_y.cols==1) "
              "&&(dst.cols==1)&&(dst.rows==(order+1))&&(order>=1)",
              "polyfit", "external/vision/lib/QVTester_MTF", __LINE__);
  }
  cv::Mat powers = cv::Mat::zeros(src_x.rows, order + 1, CV_32F);
  for (int k = 0; k <= order; ++k) {
    cv::Mat column;
    cv::pow(src_x, k, column);
    column.copyTo(powers.col(k));
  }
  cv::Mat transposed;
  cv::Mat inverse;
  cv::transpose(powers, transposed);
  cv::invert(transposed * powers, inverse, cv::DECOMP_LU);
  cv::Mat(inverse * transposed * src_y).copyTo(dst);
}

bool QVTester::FindEdge(cv::Mat loc, int nlin, float* slope, float* offset) {
  cv::Mat rows(nlin, 1, CV_32F);
  for (int i = 0; i < nlin; ++i) rows.at<float>(i) = static_cast<float>(i);
  cv::Mat line(2, 1, CV_32F);
  polyfit(rows, loc, line, 1);
  *slope = line.at<float>(1);
  *offset = line.at<float>(0);
  return true;
}

namespace {

// Where pixels fall: (row m, column n) into bin ceil((n - m slope) fac) - offset of an array with room for the slant.
// Only the npix fac bins in its middle are read, so only those and their two neighbours are kept.
struct Bins {
  Bins(const cv::Mat& region, float slope, int fac)
      : nn(region.cols * fac),
        scale(static_cast<float>(fac)),
        inverse(1 / slope),
        slant(scale * (0 - static_cast<float>(region.rows - 1) / inverse)) {
    if (!exist()) return;
    offset = std::min(static_cast<int>(slant), 0);
    first = (std::abs(static_cast<int>(slant)) + 1) / 2 - 1;
    kept = cv::Mat::zeros(2, nn + 2, CV_32F);
  }

  // Without an edge, or with one along the rows, no pixel has a bin.
  bool exist() const { return std::fabs(slant) < kBeyondAnyArray; }
  // Whether bins are exact in single precision.
  bool in_pixels() const { return scale == 1 && std::fabs(slant) < 1e6f; }

  void Add(int m, int n, float value) {
    const float place = (static_cast<float>(n) - static_cast<float>(m) / inverse) * scale;
    const double bin = std::ceil(place) - static_cast<float>(offset);
    if (!(bin >= first && bin < first + nn + 2.0)) return;
    const int k = static_cast<int>(bin) - first;
    counts()[k] += 1;
    sums()[k] += value;
  }

  // A row of which each pixel falls one bin further than the one before.
  void AddRow(int m, const float* row, int npix) {
    const int k = static_cast<int>(std::ceil(-(static_cast<float>(m) / inverse))) - offset - first;  // of column 0
    float* const count = counts();
    float* const sum = sums();
    for (int n = std::max(-k, 0); n < std::min(nn + 2 - k, npix); ++n) {
      count[k + n] += 1;
      sum[k + n] += row[n];
    }
  }

  float* counts() { return kept.ptr<float>(0); }
  float* sums() { return kept.ptr<float>(1); }

  int nn;
  float scale;
  float inverse;  // infinite for an upright edge; quotients by it are then 0
  float slant;
  int offset = 0;
  int first = 0;  // bin of the first element kept
  cv::Mat kept;   // counts, sums
};

}  // namespace

cv::Mat QVTester::ProjectData(cv::Mat bb, float slope, float /*loc*/, int fac) {
  Bins bins(bb, slope, fac);
  if (!bins.exist()) return {bins.nn, 1, CV_32F, cv::Scalar(std::nanf(""))};  // every bin is 0 / 0
  if (HoldsWholeLevels(bb)) {
    for (int m = 0; m < bb.rows; ++m) {
      const auto* row = bb.ptr<float>(m);
      if (bins.in_pixels() && KeepsStep(static_cast<float>(m) / bins.inverse, bb.cols)) {
        bins.AddRow(m, row, bb.cols);
      } else {
        for (int n = 0; n < bb.cols; ++n) bins.Add(m, n, row[n]);
      }
    }
  } else {
    for (int n = 0; n < bb.cols; ++n) {
      for (int m = 0; m < bb.rows; ++m) bins.Add(m, n, bb.at<float>(m, n));
    }
  }
  return BinMeans(bins.counts(), bins.sums(), bins.nn, bins.first);
}
