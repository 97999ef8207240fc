#ifndef QVTESTER_SHARPNESS_SFR_STEPS_H_
#define QVTESTER_SHARPNESS_SFR_STEPS_H_

#include <array>
#include <cmath>
#include <memory>
#include <opencv2/core.hpp>
#include <vector>

#include "qvtester/tester.h"

// Steps of the slanted-edge response (QVTester_MTF.cpp) that its plain form takes just so.

// Both derivative kernels of a region, freed also when a step throws.
struct Kernels {
  Kernels(QVTester& tester, cv::Mat& region) {
    float* two_taps = nullptr;
    float* three_taps = nullptr;
    tester.CalculateFilterValue(&region, &two_taps, &three_taps);
    fil1.reset(two_taps);
    fil2.reset(three_taps);
  }
  std::unique_ptr<float[]> fil1, fil2;
};

struct EdgeLine {
  float slope;   // columns per row
  float offset;  // column in row 0
};

inline constexpr float kBeyondAnyArray = 1e9f;  // such values, and NaN, are never converted to an integer

// The edge spread from the pixels' number and sum in each of nn bins, which lie between two neighbours; `first` is the
// bin of the first neighbour. An empty bin takes a count from its neighbours, but no sum: its value is 0. Bin 0 has but
// one neighbour.
inline cv::Mat BinMeans(float* counts, const float* sums, int nn, int first) {
  for (int k = 1; k <= nn; ++k) {
    if (counts[k] == 0) counts[k] = first + k == 0 ? counts[k + 1] : (counts[k - 1] + counts[k + 1]) * 0.5f;
  }
  cv::Mat esf(nn, 1, CV_32F);
  for (int i = 0; i < nn; ++i) esf.at<float>(i) = sums[i + 1] / counts[i + 1];
  return esf;
}

// response[k] = |Re(DFT(lsf))[k]| / |Re(DFT(lsf))[0]|, k = 0 .. npix/2; frequencies 2k / npix of Nyquist.
inline void AppendResponse(const cv::Mat& lsf, std::vector<float>& freq, std::vector<float>& sfr) {
  const int npix = lsf.rows;
  std::array<cv::Mat, 2> planes = {lsf, cv::Mat::zeros(lsf.size(), CV_32F)};
  cv::Mat spectrum;
  cv::merge(planes.data(), planes.size(), spectrum);
  cv::dft(spectrum, spectrum);
  cv::split(spectrum, planes.data());
  const float dc = std::fabs(planes[0].at<float>(0));
  for (int k = 0; k <= npix / 2; ++k) {
    freq.push_back(static_cast<float>(2 * k) / static_cast<float>(npix));
    sfr.push_back(std::fabs(planes[0].at<float>(k)) / dc);
  }
}

// Straight line through the samples nearest (a) and second nearest (b) to 0.5. A sample as far as a but nearer than b
// becomes b; equal distances change nothing else.
inline float InterpolateMTF50(const float* freq, const float* sfr, int count) {
  struct Sample {
    float frequency, response, distance;
  };
  Sample a = {0, 0, 1.0f};
  Sample b = a;
  for (int k = 0; k < count; ++k) {
    const Sample sample = {freq[k], sfr[k], std::fabs(sfr[k] - 0.5f)};
    if (!(sample.distance < b.distance)) continue;
    if (sample.distance < a.distance) {
      b = a;
      a = sample;
    } else {
      b = sample;
    }
  }
  const Sample& high = b.frequency > a.frequency ? b : a;
  const Sample& low = b.frequency > a.frequency ? a : b;
  const float t = std::fabs(high.response - 0.5f) / std::fabs(high.response - low.response);
  return low.frequency * t + high.frequency * (1 - t);
}

#endif  // QVTESTER_SHARPNESS_SFR_STEPS_H_
