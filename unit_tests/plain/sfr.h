#ifndef QVTESTER_UNIT_TESTS_PLAIN_SFR_H_
#define QVTESTER_UNIT_TESTS_PLAIN_SFR_H_

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "qvtester/tester.h"
#include "sharpness/sfr_steps.h"

// The SFR of a region by OpenCV's calls, step by step, each on fresh matrices: what sharpness/QVTester_MTF.cpp must
// equal to the last bit. Steps that the library takes just so are the tester's, or those of sharpness/sfr_steps.h.
namespace plain {

// w[i] = 0.54 + 0.46 cos(pi (i - mid) / wid): double inside, stored as float.
// Pi is cut to 3.141592, and i starts at 0, so the peak leans half a sample to the right. Both are meant.
inline cv::Mat GetAHammingWindow(int n, float mid) {
  const float wid = std::max(mid - 1, static_cast<float>(n) - mid);
  cv::Mat window(n, 1, CV_32F);
  for (int i = 0; i < n; ++i) {
    window.at<float>(i) = static_cast<float>(0.54 + 0.46 * std::cos((static_cast<float>(i) - mid) * 3.141592 / wid));
  }
  return window;
}

// Pixel (row m, column n) falls into bin ceil((n - m slope) fac) - offset of an array with room for the slant and a
// hundredfold margin. Only npix fac bins from `start` are read, so only those and their two neighbours are kept.
inline cv::Mat ProjectData(cv::Mat bb, float slope, int fac) {
  const int nlin = bb.rows;
  const int npix = bb.cols;
  const int nn = npix * fac;
  const auto scale = static_cast<float>(fac);
  const float inverse = 1 / slope;  // infinite for an upright edge; the quotients below are then 0
  const float slant = scale * (0 - static_cast<float>(nlin - 1) / inverse);
  // No edge, or one along the rows: no pixel has a bin, and every bin is 0 / 0.
  if (!(std::fabs(slant) < kBeyondAnyArray)) return {nn, 1, CV_32F, cv::Scalar(std::nanf(""))};

  const int offset = std::min(static_cast<int>(slant), 0);
  const int del = std::abs(static_cast<int>(slant));
  const double bins = nn + 100.0 * del;
  const int start = (del + 1) / 2;
  const int first = start - 1;                       // bin of the first element kept
  cv::Mat kept = cv::Mat::zeros(2, nn + 2, CV_32F);  // counts, sums
  auto* counts = kept.ptr<float>(0);
  auto* sums = kept.ptr<float>(1);
  for (int n = 0; n < npix; ++n) {
    for (int m = 0; m < nlin; ++m) {
      const float place = (static_cast<float>(n) - static_cast<float>(m) / inverse) * scale;
      const double bin = std::ceil(place) - static_cast<float>(offset);
      if (!(bin >= 0 && bin < bins && bin >= first && bin < first + nn + 2)) continue;
      const int k = static_cast<int>(bin) - first;
      counts[k] += 1;
      sums[k] += bb.at<float>(m, n);
    }
  }

  return BinMeans(counts, sums, nn, first);
}

inline float EdgeInRow(QVTester& tester, const cv::Mat& derivative, int row, const cv::Mat& window) {
  cv::Mat profile;
  cv::transpose(derivative.row(row), profile);
  return tester.GetCentroid(profile.mul(window)) - 0.5f;
}

// Two passes of windowed centroids and a straight line; the second pass centres each row's window on the first line.
inline EdgeLine LocateEdge(QVTester& tester, const cv::Mat& region, float* fil) {
  const int nlin = region.rows;
  const int npix = region.cols;
  cv::Mat derivative;
  tester.GetFirstDerivative(region, nlin, npix, fil, 2, derivative);

  EdgeLine line = {};
  cv::Mat loc(nlin, 1, CV_32F);
  const cv::Mat centred = GetAHammingWindow(npix, static_cast<float>(npix + 1) * 0.5f);
  for (int n = 0; n < nlin; ++n) loc.at<float>(n) = EdgeInRow(tester, derivative, n, centred);
  tester.FindEdge(loc, nlin, &line.slope, &line.offset);

  for (int n = 0; n < nlin; ++n) {
    const float place = line.offset + line.slope * static_cast<float>(n);
    loc.at<float>(n) = EdgeInRow(tester, derivative, n, GetAHammingWindow(npix, place));
  }
  tester.FindEdge(loc, nlin, &line.slope, &line.offset);
  return line;
}

// Derivative of the edge spread, its centre of gravity moved to the middle, Hamming-windowed. npix x 1.
inline cv::Mat CentredLineSpread(QVTester& tester, const cv::Mat& esf, float* fil) {
  const int npix = esf.rows;
  cv::Mat row;
  cv::transpose(esf, row);
  cv::Mat lsf;
  tester.GetFirstDerivative(row, 1, npix, fil, 3, lsf);
  cv::transpose(lsf, lsf);
  const double mid = tester.GetCentroid(lsf) + 0.5;
  // Without a finite centre there is nothing to move to: all moves out of view, and the response is 0 / 0.
  lsf = tester.GetShiftedArray(lsf, std::fabs(mid) < kBeyondAnyArray ? static_cast<int>(mid) : 2 * npix);
  return lsf.mul(GetAHammingWindow(npix, static_cast<float>(npix + 1) * 0.5f));
}

inline bool CalculateSFR(QVTester& tester, cv::Mat roi, std::vector<float>& freq, std::vector<float>& sfr,
                         float& mtf50) {
  if (roi.depth() != CV_32F) roi.convertTo(roi, CV_32F);
  cv::Mat region = tester.ConvertToVertical(roi);  // nlin x npix, the edge runs down the rows
  const Kernels fil(tester, region);
  const EdgeLine edge = LocateEdge(tester, region, fil.fil1.get());
  const cv::Mat esf = ProjectData(region, edge.slope, 1);              // npix x 1, edge spread
  const cv::Mat lsf = CentredLineSpread(tester, esf, fil.fil2.get());  // npix x 1, line spread
  const std::size_t first = sfr.size();
  AppendResponse(lsf, freq, sfr);
  const int count = static_cast<int>(sfr.size() - first);
  mtf50 = InterpolateMTF50(freq.data() + (freq.size() - count), sfr.data() + first, count);
  return true;
}

// To the last bit, any NaN as one.
inline std::vector<std::uint32_t> Bits(const std::vector<float>& values) {
  std::vector<std::uint32_t> bits;
  for (const float value : values) {
    const float one_nan = std::isnan(value) ? NAN : value;
    std::memcpy(&bits.emplace_back(), &one_nan, sizeof one_nan);
  }
  return bits;
}

/// Bits of all that a measurement gives, or the error that it ends with.
template <typename Measure>
std::vector<std::uint32_t> Outcome(const Measure& measure) {
  std::vector<float> freq;
  std::vector<float> sfr;
  float mtf50 = 0;
  try {
    measure(freq, sfr, mtf50);
  } catch (const cv::Exception& e) {
    return {static_cast<std::uint32_t>(e.code)};
  }
  sfr.push_back(mtf50);
  sfr.insert(sfr.end(), freq.begin(), freq.end());
  return Bits(sfr);
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_SFR_H_
