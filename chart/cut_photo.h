#ifndef QVTESTER_CHART_CUT_PHOTO_H_
#define QVTESTER_CHART_CUT_PHOTO_H_

#include <cstdint>
#include <vector>

#include "qvtester/tester.h"

/// A colour photo cut at a threshold into dark and light, read where it lies: neither a grey nor a binary picture is
/// made, since the search for marks reads about a third of the rows, and some pixels of others.
class CutPhoto {
 public:
  static constexpr int kBlock = 64;  // pixels

  /// The photo's pixels must live as long.
  /// Throws cv::Exception (StsUnsupportedFormat) for a photo that is not of 8 bits and three or four channels.
  CutPhoto(const cv::Mat& photo, int threshold);

  int channels() const { return channels_; }
  bool IsDark(const uchar* pixel) const {
    return kWeights[0] * pixel[0] + kWeights[1] * pixel[1] + kWeights[2] * pixel[2] < dark_below_;
  }
  /// Of as many pixels as are left in the row, at most a block: bit k is set when pixel k is dark.
  std::uint64_t DarkMask(const uchar* pixels, int left) const;

 private:
  /// Those of cv::cvtColor (COLOR_RGB2GRAY, 8 bits), of 1 << 15; it adds a half and cuts the rest off.
  static constexpr int kWeights[3] = {9798, 19235, 3735};

  std::uint64_t MixedMask(const uchar* pixels) const;

  int channels_;
  int threshold_;   // -1 to 255
  int dark_below_;  // of a pixel's weighted sum
};

/// What QVTester::GetFinderPoints finds in the photo, binarised at the threshold (Binarise).
std::vector<cv::Point> FindMarks(QVTester& tester, const cv::Mat& photo, int threshold);

#endif  // QVTESTER_CHART_CUT_PHOTO_H_
