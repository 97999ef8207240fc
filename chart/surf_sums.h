#ifndef QVTESTER_CHART_SURF_SUMS_H_
#define QVTESTER_CHART_SURF_SUMS_H_

#include <cstdint>
#include <memory>
#include <opencv2/core.hpp>

// Box sums of a grey picture, from a summed-area table (Crow 1984) that is kept modulo 2^32: sums of boxes, and sums
// and differences of a few of them, come out exact as long as they themselves fit, whatever the picture's size.

class SurfSums {
 public:
  /// Of a picture of CV_8UC1.
  explicit SurfSums(const cv::Mat& image);

  int rows() const { return rows_; }
  int cols() const { return cols_; }
  /// Entry x: the sum over all rows above y and all columns left of x; y from 0 to rows(), x from 0 to cols().
  const std::uint32_t* Row(int y) const { return sums_.get() + static_cast<std::size_t>(y) * (cols_ + 1); }

  /// Differences of the right and left, and of the lower and upper, halves of the square of 2 x half pixels whose
  /// middle is the corner between pixel (x, y) and the one up and left of it.
  struct Haar {
    int x, y;
  };
  Haar HaarAt(int x, int y, int half) const {
    const std::uint32_t* const top = Row(y - half) + x;
    const std::uint32_t* const middle = Row(y) + x;
    const std::uint32_t* const bottom = Row(y + half) + x;
    const std::uint32_t left = bottom[-half] - top[-half];
    const std::uint32_t right = bottom[half] - top[half];
    const std::uint32_t lower = bottom[half] - bottom[-half];
    const std::uint32_t upper = top[half] - top[-half];
    return {static_cast<int>(right + left - 2 * (bottom[0] - top[0])),
            static_cast<int>(lower + upper - 2 * (middle[half] - middle[-half]))};
  }

 private:
  int rows_, cols_;
  std::unique_ptr<std::uint32_t[]> sums_;
};

#endif  // QVTESTER_CHART_SURF_SUMS_H_
