// Plain form: Binarise and GetFinderPoints, one after the other. Both conversions see single pixels, so
// rows can be made in any order, and apart.

#include "chart/chart_rows.h"

#include <algorithm>
#include <opencv2/imgproc.hpp>

namespace {

// The tester searches on these rows while this lives.
class Attached {
 public:
  Attached(QVTester& tester, ChartRows& rows) : tester_(tester) { tester_.kept_->rows = &rows; }
  ~Attached() { tester_.kept_->rows = nullptr; }
  Attached(const Attached&) = delete;
  Attached& operator=(const Attached&) = delete;

 private:
  QVTester& tester_;
};

// `count` rows, `step` rows apart, as a picture of their own.
cv::Mat Comb(cv::Mat& image, int row, int step, int count) {
  return {count, image.cols, image.type(), image.ptr(row), image.step[0] * static_cast<std::size_t>(step)};
}

}  // namespace

ChartRows::ChartRows(QVTester& tester, const cv::Mat& photo, int threshold)
    : photo_(photo), gray_(tester.kept_->gray), binary_(tester.kept_->binary), threshold_(threshold) {
  if (photo.depth() != CV_8U || photo.channels() < 3 || photo.channels() > 4) {
    CV_Error(cv::Error::StsUnsupportedFormat, "a chart photo needs three or four channels of 8 bits");
  }
  gray_.create(photo.size(), CV_8UC1);
  binary_.create(photo.size(), CV_8UC1);
  made_.assign(static_cast<std::size_t>(photo.rows), 0);
}

void ChartRows::Make(int row, int step, int count) {
  count = std::min(count, (photo_.rows - 1 - row) / step + 1);
  cv::Mat photo = photo_;
  cv::Mat gray = Comb(gray_, row, step, count);
  cv::Mat binary = Comb(binary_, row, step, count);
  cv::cvtColor(Comb(photo, row, step, count), gray, cv::COLOR_RGB2GRAY);
  cv::threshold(gray, binary, threshold_, 255, cv::THRESH_BINARY);
  for (int k = 0; k < count; ++k, row += step) made_[static_cast<std::size_t>(row)] = 1;
}

std::vector<cv::Point> FindMarks(QVTester& tester, const cv::Mat& photo, int threshold) {
  ChartRows rows(tester, photo, threshold);
  const Attached attached(tester, rows);
  return tester.GetFinderPoints(tester.kept_->binary);
}
