#ifndef QVTESTER_UNIT_TESTS_PLAIN_AGREEMENT_H_
#define QVTESTER_UNIT_TESTS_PLAIN_AGREEMENT_H_

#include <algorithm>
#include <opencv2/imgproc.hpp>

#include "chart/cut_photo.h"
#include "chart/find_chart.h"
#include "chart/region_warp.h"
#include "unit_tests/plain/colour.h"
#include "unit_tests/plain/error_areas.h"
#include "unit_tests/plain/finder.h"
#include "unit_tests/plain/hdr_dots.h"
#include "unit_tests/plain/sfr.h"
#include "unit_tests/random_cases.h"

// Fast forms against their plain forms on a random case: they agree to the last bit.
namespace plain {

struct Agreement {
  bool same;
  std::size_t found = 0, of = 1;  // two that find nothing agree on nothing
};

// What a search leaves; the cross checks' counts tell of its last call, also of one that failed.
inline std::vector<float> Traces(const QVTester& tester) {
  std::vector<float> traces(tester.crossCheckStateCount, tester.crossCheckStateCount + 5);
  traces.push_back(static_cast<float>(tester.startSize));
  traces.push_back(tester.hasSkipped ? 1 : 0);
  for (const QVFinderPattern& c : tester.possibleCenters) {
    traces.insert(traces.end(), {c.x, c.y, c.estimatedModuleSize, c.average, static_cast<float>(c.count)});
  }
  return traces;
}

inline Agreement ScanOfRunsAndOfPixels(Draws& any) {
  const cv::Mat image = RandomMarks(any);
  QVTester plain;
  QVTester fast;
  const auto expected = GetFinderPoints(plain, image);
  return {expected == fast.GetFinderPoints(image) && Bits(Traces(plain)) == Bits(Traces(fast)), expected.size()};
}

inline Agreement ScanOfThePhotoAndOfItsCut(Draws& any) {
  const cv::Mat photo = RandomMarkPhoto(any);
  const int threshold = any.Pick({125, 125, 125, -1, 0, 254, 255, 400});
  QVTester whole;
  QVTester cut;
  const auto expected = whole.GetFinderPoints(Binarise(whole, photo, threshold, nullptr));
  return {expected == FindMarks(cut, photo, threshold) && Bits(Traces(whole)) == Bits(Traces(cut)), expected.size()};
}

// A block of a photo whose channels lie near the threshold, by blocks and by pixels.
inline Agreement DarkPixels(Draws& any) {
  cv::Mat row(1, any.Whole(1, CutPhoto::kBlock), any.OneIn(4) ? CV_8UC4 : CV_8UC3);
  const int threshold = any.Whole(-2, 257);
  const int middle = std::clamp(threshold, 0, 255);
  const int spread = any.Pick({1, 2, 5, 40, 256});
  any.Fill(row, std::max(middle - spread, 0), std::min(middle + spread, 255) + 1);
  QVTester tester;
  const cv::Mat binary = Binarise(tester, row, threshold, nullptr);
  const CutPhoto cut(row, threshold);
  const std::uint64_t mask = cut.DarkMask(row.data, row.cols);
  bool same = row.cols == CutPhoto::kBlock || mask >> row.cols == 0;
  for (int k = 0; k < row.cols; ++k) {
    const bool dark = binary.at<uchar>(k) == 0;
    same = same && (mask >> k & 1) == (dark ? 1U : 0U) && cut.IsDark(row.ptr(0, k)) == dark;
  }
  return {same, static_cast<std::size_t>(cv::countNonZero(binary)), static_cast<std::size_t>(row.cols)};
}

inline Agreement Dots(Draws& any) {
  RandomCapture c(any);
  std::vector<unsigned char> expected(c.data.size() / 3, 7);  // what is not flagged is not written
  std::vector<unsigned char> mask = expected;
  DetectDot(c.data.data(), c.height, c.width, c.threshold, c.radius, expected.data());
  QVTester().DetectDot(c.data.data(), c.height, c.width, c.threshold, c.radius, mask.data());
  return {expected == mask, static_cast<std::size_t>(std::count(mask.begin(), mask.end(), 1)), mask.size()};
}

inline Agreement Sfr(Draws& any) {
  const cv::Mat region = RandomRegion(any);
  QVTester tester;
  return {Outcome([&](auto&... out) { CalculateSFR(tester, region, out...); }) ==
          Outcome([&](auto&... out) { tester.CalculateSFR(region, out...); })};
}

inline Agreement Areas(Draws& any) {
  const int distance = any.Whole(0, 12);
  const cv::Size size{any.Whole(2, 300), any.Whole(2, 200)};
  std::vector<ErrorArea> areas;
  for (int n = any.Whole(2, 150); n > 0; --n) {
    const cv::Point at{any.Whole(0, size.width - 1), any.Whole(0, size.height - 1)};
    const cv::Point extent{any.Whole(0, 8), any.OneIn(40) ? 59 : any.Whole(0, 8)};
    areas.push_back({at, at + extent, any.Whole(0, 9), 0});
  }
  const auto merged = ClusterByTester(distance, size.width, size.height, areas);
  return {ErrorAreaClustering(distance, size.width, size.height, areas) == merged, areas.size() - merged.size(),
          areas.size()};
}

inline Agreement Colours(Draws& any) {
  RandomPixels c(any);
  const std::size_t pixels = c.triples.size() / 3;
  QVTester tester;
  std::copy(c.matrix.begin(), c.matrix.end(), tester.prop_color_matrix_);
  std::vector<float> xyz(3 * pixels);
  rgb2xyz(tester.prop_color_matrix_, c.triples.data(), pixels, xyz.data());
  std::vector<float> cct(pixels);
  xyz2cct(c.triples.data(), pixels, cct.data());
  float* const fast_xyz = tester.rgb2xyz(c.triples.data(), c.rows, c.cols);
  float* const fast_cct = tester.xyz2cct(c.triples.data(), c.rows, c.cols);
  const bool same =
      Bits(xyz) == Bits({fast_xyz, fast_xyz + xyz.size()}) && Bits(cct) == Bits({fast_cct, fast_cct + pixels});
  std::free(fast_xyz);
  std::free(fast_cct);
  return {same, pixels - static_cast<std::size_t>(std::count(cct.begin(), cct.end(), 0.0f)), pixels};
}

inline Agreement Warp(Draws& any) {
  const RandomTurn c(any);
  cv::Mat whole;
  cv::warpAffine(c.image, whole, c.map, c.canvas, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
  const cv::Mat expected = whole(c.region);
  const cv::Mat warped = WarpRegion(c.image, c.map, c.canvas, c.region);
  return {expected.size() == warped.size() && (warped.empty() || cv::norm(expected, warped, cv::NORM_INF) == 0)};
}

}  // namespace plain

#endif  // QVTESTER_UNIT_TESTS_PLAIN_AGREEMENT_H_
