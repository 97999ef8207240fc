// Plain form: cv::warpAffine of the whole canvas. It rounds a pixel's place in two steps, from its absolute row and
// column, so a map shifted to the region's origin would change some pixels by a level. Here the same fixed-point places
// are formed for the region alone, and cv::remap is called with them, as cv::warpAffine does. OpenCV 4.6 is meant;
// should another compute places otherwise (its build may fuse multiply and add), region_warp_test.cpp says so, and
// warping the whole is always right.

#include "chart/region_warp.h"

#include <algorithm>
#include <opencv2/core.hpp>
#include <opencv2/core/hal/intrin.hpp>
#include <opencv2/imgproc.hpp>
#include <vector>

namespace {

constexpr int kPlaceBits = 10;  // fraction of a place before it is cut to cv::INTER_BITS
constexpr int kPlaceScale = 1 << kPlaceBits;
constexpr int kHalfStep = kPlaceScale / cv::INTER_TAB_SIZE / 2;
constexpr int kBandRows = 16;

int FixedPoint(double place) { return cv::saturate_cast<int>(place * kPlaceScale); }

// Inverse of an affine map, in the order of operations of cv::warpAffine.
cv::Matx23d Inverse(const cv::Matx23d& m) {
  const double determinant = m(0, 0) * m(1, 1) - m(0, 1) * m(1, 0);
  const double d = determinant != 0 ? 1 / determinant : 0;
  cv::Matx23d inverse(m(1, 1) * d, m(0, 1) * -d, 0, m(1, 0) * -d, m(0, 0) * d, 0);
  for (int k = 0; k < 2; ++k) inverse(k, 2) = -inverse(k, 0) * m(0, 2) - inverse(k, 1) * m(1, 2);
  return inverse;
}

// Whole pixels (column, row) and 32nds of them along one row of the canvas, eight at a time.
void FormPlaces(cv::Point row, const std::vector<int>& column_x, const std::vector<int>& column_y, short* place,
                ushort* fraction) {
  constexpr int kShift = kPlaceBits - cv::INTER_BITS;
  constexpr int kFractions = cv::INTER_TAB_SIZE - 1;
  const int width = static_cast<int>(column_x.size());
  int j = 0;
#if CV_SIMD128
  const cv::v_int32x4 row_x = cv::v_setall_s32(row.x);
  const cv::v_int32x4 row_y = cv::v_setall_s32(row.y);
  const cv::v_int32x4 mask = cv::v_setall_s32(kFractions);
  for (; j + 8 <= width; j += 8) {
    const cv::v_int32x4 x0 = (row_x + cv::v_load(&column_x[j])) >> kShift;
    const cv::v_int32x4 x1 = (row_x + cv::v_load(&column_x[j + 4])) >> kShift;
    const cv::v_int32x4 y0 = (row_y + cv::v_load(&column_y[j])) >> kShift;
    const cv::v_int32x4 y1 = (row_y + cv::v_load(&column_y[j + 4])) >> kShift;
    cv::v_store_interleave(place + 2 * j, cv::v_pack(x0 >> cv::INTER_BITS, x1 >> cv::INTER_BITS),
                           cv::v_pack(y0 >> cv::INTER_BITS, y1 >> cv::INTER_BITS));
    cv::v_store(fraction + j, cv::v_pack_u(((y0 & mask) << cv::INTER_BITS) + (x0 & mask),
                                           ((y1 & mask) << cv::INTER_BITS) + (x1 & mask)));
  }
#endif
  for (; j < width; ++j) {
    const int x32 = (row.x + column_x[j]) >> kShift;
    const int y32 = (row.y + column_y[j]) >> kShift;
    place[2 * j] = cv::saturate_cast<short>(x32 >> cv::INTER_BITS);
    place[2 * j + 1] = cv::saturate_cast<short>(y32 >> cv::INTER_BITS);
    fraction[j] = static_cast<ushort>((y32 & kFractions) * cv::INTER_TAB_SIZE + (x32 & kFractions));
  }
}

}  // namespace

cv::Mat WarpRegion(const cv::Mat& image, const cv::Mat& map, cv::Size canvas_size, cv::Rect region) {
  // A header without pixels cuts as the whole canvas would: it throws for a region outside; one of no area is 0 x 0.
  uchar none = 0;
  const cv::Mat header(canvas_size, CV_8UC1, &none);
  if (header(region).empty()) return cv::Mat(0, 0, image.type());
  const cv::Matx23d m = Inverse(map);
  std::vector<int> column_x(static_cast<std::size_t>(region.width));  // what a column adds to a row's place
  std::vector<int> column_y(column_x.size());
  for (int j = 0; j < region.width; ++j) {
    column_x[j] = FixedPoint(m(0, 0) * (region.x + j));
    column_y[j] = FixedPoint(m(1, 0) * (region.x + j));
  }

  cv::Mat warped(region.size(), image.type());
  cv::Mat places(kBandRows, region.width, CV_16SC2);     // whole pixels of the picture
  cv::Mat fractions(kBandRows, region.width, CV_16UC1);  // 32nds of a pixel: row, column
  for (int first = 0; first < region.height; first += kBandRows) {
    const int rows = std::min(kBandRows, region.height - first);
    for (int i = 0; i < rows; ++i) {
      const int y = region.y + first + i;
      const cv::Point row(FixedPoint(m(0, 1) * y + m(0, 2)) + kHalfStep, FixedPoint(m(1, 1) * y + m(1, 2)) + kHalfStep);
      FormPlaces(row, column_x, column_y, places.ptr<short>(i), fractions.ptr<ushort>(i));
    }
    cv::Mat band = warped.rowRange(first, first + rows);
    cv::remap(image, band, places.rowRange(0, rows), fractions.rowRange(0, rows), cv::INTER_LINEAR, cv::BORDER_CONSTANT,
              cv::Scalar(0));
  }
  return warped;
}
