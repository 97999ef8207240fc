// Tests 17 and 21: dust on the lens, seen as dark blobs in a photo of a plain, evenly lit target.
//
// What the blob search sees, as it is tuned, and every limit in use refers to it as it is:
//   - The local threshold paints light pixels with the photo's mean grey level, not with 255, and the detector looks at
//     levels 0 and 125. A blob counts only when it is seen at both, so only photos of a mean above 125 show any.
//   - The local mean is taken over 15 pixels. A disc wider than about 16 is hollow in the binary picture, and a hollow
//     disc's middle is light: the detector's colour filter drops it.
//   - A blob under 20 pixels of area, about 5 across, is dropped.

#include <algorithm>
#include <array>
#include <climits>
#include <cstdio>
#include <opencv2/features2d.hpp>
#include <opencv2/imgproc.hpp>

#include "core/slots.h"
#include "platform/properties.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"
#include "tests/camera/lens_dust.h"

namespace {

constexpr double kDarkShare = 0.5;  // of the mean: darker pixels count in detectMung

struct DustResult {
  int& difference;
  int*& histogram;
  int& blob_count;
};

DustResult DustFields(QVResultData& r, bool front) {
  if (front) return {r.dust_hist_diff_front_, r.dust_hist_front_, r.dust_blob_count_front_};
  return {r.dust_hist_diff_main_, r.dust_hist_main_, r.dust_blob_count_main_};
}

// One row of 256 counts.
cv::Mat Histogram(const cv::Mat& gray) {
  const int channel = 0;
  const int bins = kGreyLevels;
  const float range[] = {0, kGreyLevels};
  const float* ranges[] = {range};
  cv::Mat histogram;
  cv::calcHist(&gray, 1, &channel, cv::noArray(), histogram, 1, &bins, ranges);
  histogram = histogram.t();
  histogram.convertTo(histogram, CV_32S);
  return histogram;
}

cv::SimpleBlobDetector::Params BlobParams() {
  cv::SimpleBlobDetector::Params params;
  params.thresholdStep = 125.0f;
  params.minThreshold = 0.0f;
  params.maxThreshold = 130.0f;
  params.filterByArea = true;
  params.minArea = 20.0f;
  params.filterByCircularity = false;
  params.filterByInertia = false;
  params.filterByConvexity = false;
  return params;
}

std::array<char, 32> MungKey(int index) {
  std::array<char, 32> key = {};
  std::snprintf(key.data(), key.size(), "t82.vi%d_mung_loc", index);
  return key;
}

}  // namespace

int QVTester::TestLensDust(bool front, bool fake_mode) {
  cv::Mat photo;
  const int slot = front ? QV_RESOURCE_FRONT_DUST_PHOTO : QV_RESOURCE_DUST_PHOTO;
  if (const int code = FetchImage(*this, slot, photo); code != QV_SUCCESS) return code;
  cv::Mat& gray = kept_->gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  QVDEBUGP("[%s] fake_mode: %d", "TestLensDust", fake_mode ? 1 : 0);
  const int blob_count = fake_mode ? -1 : detectBlob(gray);

  const cv::Mat histogram = Histogram(gray);
  auto copy = std::make_unique<int[]>(kGreyLevels);
  std::copy_n(histogram.ptr<int>(), kGreyLevels, copy.get());
  const cv::Mat& reference = front ? prop_table_0_ : prop_table_1_;
  const DustResult result = DustFields(Results(*this), front);
  if (!reference.empty()) {
    const double difference = cv::sum(cv::abs(histogram - reference))[0];
    result.difference = static_cast<int>(std::clamp<double>(difference, INT_MIN, INT_MAX));
  }
  result.blob_count = blob_count;
  delete[] result.histogram;
  result.histogram = copy.release();
  return QV_SUCCESS;
}

int QVTester::detectBlob(cv::Mat& gray) {
  const char* const name = "detectBlob";
  const auto mean = static_cast<float>(cv::mean(gray)[0]);
  QVDEBUGP("[%s] means: %.2f", name, mean);
  cv::Mat& binary = kept_->binary;
  cv::adaptiveThreshold(gray, binary, static_cast<int>(mean), cv::ADAPTIVE_THRESH_MEAN_C, cv::THRESH_BINARY, 15, 7.0);
  draw_guide_line(binary, binary.cols, binary.rows, 0);

  std::vector<cv::KeyPoint> keypoints;
  QVDEBUGP("[%s] dj_check1", name);
  cv::SimpleBlobDetector::create(BlobParams())->detect(binary, keypoints);
  QVDEBUGP("[%s] dj_check2", name);
  Blobs& blobs = kept_->blobs;
  cv::swap(blobs.image, binary);
  if (binary.u != nullptr && binary.u->refcount > 1) binary.release();  // somebody still looks at the former one
  blobs.keypoints = keypoints;
  blobs.drawing.release();

  remove_mung_location(step_);
  if (keypoints.empty()) {
    QVDEBUGP("[%s] no mung.", name);
    return 0;
  }
  QVDEBUGP("[%s] %d blobs!!!", name, static_cast<int>(keypoints.size()));
  int saved = 0;
  for (std::size_t i = 0; i < keypoints.size(); ++i) {
    const cv::Point2f p = keypoints[i].pt;
    QVDEBUGP("[%s] blob(%d) point: (%.2f, %.2f)", name, static_cast<int>(i), p.x, p.y);
    if (!isValidLocation(blobs.image.cols, blobs.image.rows, p)) continue;
    QVDEBUGP("[%s] detected mung.", name);
    save_mung_location(p, step_);
    if (++saved == kMostPlaces) {
      QVDEBUGP("[%s] enough!!!! too many mungs!!!", name);
      break;
    }
  }
  if (saved == 0) QVDEBUGP("[%s] no mung.", name);
  return saved;
}

bool QVTester::isValidLocation(int width, int height, cv::Point2f p) {
  const auto near_side = [](float place, int size) {
    return place <= kCornerPx || place >= static_cast<float>(size - kCornerPx);
  };
  if (!near_side(p.x, width) || !near_side(p.y, height)) return true;
  QVDEBUGP("[%s] invalid location!! x: %.2f, y: %.2f", "isValidLocation", p.x, p.y);
  return false;
}

void QVTester::save_mung_location(cv::Point2f p, int index) {
  if (!kept_->publishes) return;  // the store is not read either
  char item[128];
  std::snprintf(item, sizeof(item), "[%.0f,%.0f]", p.x, p.y);
  const std::array<char, 32> key = MungKey(index);
  char held[128];
  platform::property_get(key.data(), held, "");
  char joined[128];
  // An item that does not fit is cut here, and the store then refuses the whole: what it held stays as it was.
  if (std::snprintf(joined, sizeof(joined), "%s%s", held, item) < 0) return;
  Publish(*this, key.data(), joined);
}

void QVTester::remove_mung_location(int index) { Publish(*this, MungKey(index).data(), ""); }

// The detector takes what touches the picture's border for a blob unless the border itself is dark; dust that reaches
// into the frame is one with it, and is not seen. One pixel is enough, and costs the least.
void QVTester::draw_guide_line(cv::Mat& image, int width, int height, int value) {
  cv::rectangle(image, cv::Rect(0, 0, width, height), cv::Scalar(value), 1);
}

int QVTester::detectMung(cv::Mat gray, cv::Rect roi1, cv::Rect roi2) {
  const char* const name = "detectMung";
  const double mean = cv::mean(gray)[0];
  QVDEBUGP("[%s] gray_mean: %.2f", name, mean);
  const cv::Mat dark = gray < kDarkShare * mean;
  QVDEBUGP("[%s] total_pixels: %d(%d, %d), black_pixels: %d", name, static_cast<int>(gray.total()), gray.rows,
           gray.cols, cv::countNonZero(dark));
  const int first = cv::countNonZero(dark(roi1));
  QVDEBUGP("[%s] (roi1) total_pixels: %d, black_pixels: %d", name, roi1.area(), first);
  const int second = cv::countNonZero(dark(roi2));
  QVDEBUGP("[%s] (roi2) total_pixels: %d, black_pixels: %d", name, roi2.area(), second);
  QVDEBUGP(first + second > 0 ? "[%s] detecting black pixel!!!" : "[%s] no black pixel.", name);
  return first + second;
}

const cv::Mat& QVTester::DrawBlobs() {
  Blobs& blobs = kept_->blobs;
  if (blobs.drawing.empty() && !blobs.image.empty()) {
    cv::drawKeypoints(blobs.image, blobs.keypoints, blobs.drawing, cv::Scalar(255, 0, 0),
                      cv::DrawMatchesFlags::DRAW_RICH_KEYPOINTS);
  }
  return blobs.drawing;
}
