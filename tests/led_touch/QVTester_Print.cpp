// Test 29: a print against a list of good ones. What good prints differ by from one another is what their principal
// components span; what a print has beyond that is an error.

#include <algorithm>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "chart/image_list.h"
#include "core/slots.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"
#include "tests/led_touch/spots.h"

namespace {

constexpr const char* kPrint = "TestTouchPanelPrint";
constexpr double kLight = 255;  // dark is 0
constexpr int kOpening = 3;

// Grey as the list's pictures are read, and smoothed like them: the photo of a sample is that sample.
cv::Mat Smoothed(const cv::Mat& photo) {
  if (photo.depth() != CV_8U) CV_Error(cv::Error::StsUnsupportedFormat, "a print needs 8 bits a channel");
  cv::Mat gray = photo;
  if (photo.channels() != 1) cv::cvtColor(photo, gray, cv::COLOR_BGR2GRAY);
  cv::Mat smoothed;
  cv::medianBlur(gray, smoothed, kMedianAperture);
  return smoothed;
}

struct Print {
  cv::Mat binary;  // in the frame of the list's first picture, CV_32F: 0 or 255
  cv::Mat seen;    // CV_8UC1: not 0 where the photo shows it
};

Print Straighten(const cv::Mat& photo, const cv::Mat& map, cv::Size size) {
  Print print;
  cv::Mat straight;
  cv::warpAffine(photo, straight, map, size, cv::INTER_LINEAR | cv::WARP_INVERSE_MAP, cv::BORDER_REPLICATE);
  cv::threshold(straight, straight, cv::mean(straight)[0], kLight, cv::THRESH_BINARY);
  straight.convertTo(print.binary, CV_32F);
  cv::warpAffine(cv::Mat(photo.size(), CV_8U, cv::Scalar(1)), print.seen, map, size,
                 cv::INTER_NEAREST | cv::WARP_INVERSE_MAP, cv::BORDER_CONSTANT, cv::Scalar(0));
  return print;
}

// The print as the list's mean and first components make it.
cv::Mat Rebuild(const QVTester::ImageList& list, int components, const cv::Mat& print) {
  cv::Mat row = print.reshape(1, 1) - list.mean;
  const int used = UsableComponents(list, components);
  if (used == 0) return list.mean.reshape(1, print.rows);
  const cv::Mat basis = list.eigenvectors.rowRange(0, used);
  row = row * basis.t() * basis + list.mean;
  return row.reshape(1, print.rows);
}

}  // namespace

int QVTester::TestTouchPanelPrint() {
  cv::Mat photo;
  if (const int code = FetchImage(*this, QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO, photo); code != QV_SUCCESS) return code;
  const ImageList& list = kept_->image_list;
  if (list.gray.empty()) CV_Error_(cv::Error::StsBadArg, ("slot %d holds no list of images", QV_RESOURCE_IMAGE_LIST));
  QVResultData& results = Results(*this);
  const cv::Mat& reference = list.gray.front();
  const cv::Mat smoothed = Smoothed(photo);

  cv::Mat unwarped;
  if (const int code = GetUnwarpedImage(reference, smoothed, unwarped); code != QV_SUCCESS) return code;
  cv::Mat map = kept_->unwarp.matrix.clone();
  const float correlation = RefineUnwarp(reference, smoothed, map);
  if (std::isnan(correlation))
    QVDEBUGP("[%s] the registration did not converge: it is good to some pixels only", kPrint);

  const Print print = Straighten(smoothed, map, reference.size());
  const cv::Mat departure = cv::abs(print.binary - Rebuild(list, prop_param_80_, print.binary));
  cv::Mat flagged = departure > kLight / 2;
  flagged.setTo(0, print.seen == 0);
  cv::morphologyEx(flagged, flagged, cv::MORPH_OPEN, cv::Mat::ones(kOpening, kOpening, CV_8U));
  ErrorAreas errors = FindErrorAreas(*this, kPrint, flagged);
  const int seen = cv::countNonZero(print.seen);

  ReleaseTestResult(QV_TEST_TOUCH_PANEL_PRINT);
  results.print_rms_ = static_cast<float>(cv::norm(departure, cv::NORM_L2, print.seen) / std::sqrt(seen) / kLight);
  results.print_correlation_ = correlation;
  results.print_error_count_ = errors.count;
  results.print_error_areas_ = errors.areas.release();
  results.print_error_pixels_ = errors.pixels.release();
  print_map_ = map;
  return QV_SUCCESS;
}
