#ifndef QVTESTER_DESK_MEASURE_TRANSFER_H_
#define QVTESTER_DESK_MEASURE_TRANSFER_H_

#include <opencv2/core.hpp>
#include <optional>
#include <string>
#include <string_view>

// How a photo's levels stand for light. Figures of the standards are of light; a photo file is encoded.

namespace qv {

struct Transfer {
  enum class Kind { kSrgb, kLinear, kGamma };
  Kind kind = Kind::kSrgb;
  double gamma = 1;  // of kGamma: light is level to this power

  /// Light of a level; both are shares of full scale.
  double Light(double level) const;
  /// Of which `Light` makes this.
  double Level(double light) const;
  /// "srgb", "linear" or "gamma:G".
  std::string Text() const;
};

/// What `Text` writes; nothing for any other word, and for a gamma outside 0.1 to 10.
std::optional<Transfer> ParseTransfer(std::string_view text);

/// Light of each pixel, CV_64FC1, as a share of full scale: 255 in CV_8UC1, 65535 in CV_16UC1, 1 in CV_32FC1.
cv::Mat LinearLight(const cv::Mat& levels, const Transfer& transfer);

/// Levels of 0 to 255, CV_32FC1, of which it makes light like this, CV_64FC1; not rounded, and light cut off at 0
/// and 1.
cv::Mat Encoded(const cv::Mat& light, const Transfer& transfer);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_TRANSFER_H_
