#include "chart/surf_sums.h"

#include <algorithm>

SurfSums::SurfSums(const cv::Mat& image) : rows_(image.rows), cols_(image.cols) {
  const std::size_t stride = static_cast<std::size_t>(cols_) + 1;
  sums_.reset(new std::uint32_t[stride * (rows_ + std::size_t{1})]);
  std::fill_n(sums_.get(), stride, 0);
  for (int y = 0; y < rows_; ++y) {
    const auto* const pixels = image.ptr<unsigned char>(y);
    const std::uint32_t* const above = Row(y);
    std::uint32_t* const row = sums_.get() + (y + 1) * stride;
    row[0] = 0;
    std::uint32_t sum = 0;
    for (int x = 0; x < cols_; ++x) {
      sum += pixels[x];
      row[x + 1] = above[x + 1] + sum;
    }
  }
}
