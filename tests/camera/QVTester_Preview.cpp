// Tests 13 and 19, and what runs on live preview frames: the three-mark target check and saved frames.

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/find_chart.h"
#include "chart/points.h"
#include "core/slots.h"
#include "platform/files.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"
#include "tests/camera/preview_measure.h"

namespace {

constexpr int kMainCamera = 0;
constexpr int kSecondRearCamera = 2;

// Keys and values are cut to the 31 characters that their readers have room for.
template <typename... Arguments>
std::array<char, 32> Short(const char* format, Arguments... arguments) {
  std::array<char, 32> text = {};
  std::snprintf(text.data(), text.size(), format, arguments...);
  return text;
}

void Publish(QVTester& tester, const std::array<char, 32>& key, const std::array<char, 32>& value) {
  Publish(tester, key.data(), value.data());
}

int Middle(int a, int b) { return static_cast<int>((static_cast<std::int64_t>(a) + b) / 2); }

}  // namespace

int MeasurePreview(QVTester& tester, int first_slot, QV_TEST_INDEX test, QVPreviewResult QVResultData::*fields) {
  cv::Mat first;
  cv::Mat second;
  if (const int code = FetchImage(tester, first_slot, first); code != QV_SUCCESS) return code;
  if (const int code = FetchImage(tester, first_slot + 1, second); code != QV_SUCCESS) return code;
  if (first.size() != second.size()) {
    QVDEBUGP("[OKAPI] image size does not match");
    return QV_SUCCESS;
  }
  cv::Mat& gray = tester.kept_->gray;
  cv::Mat& difference = tester.kept_->binary;
  cv::cvtColor(first, gray, cv::COLOR_RGB2GRAY);
  cv::cvtColor(second, difference, cv::COLOR_RGB2GRAY);
  cv::absdiff(difference, gray, difference);  // the last step that may refuse: from here on the map is written

  QVPreviewResult& result = Results(tester).*fields;
  const bool fits = result.preview_diff_map_ != nullptr && result.preview_diff_cols_ == difference.cols &&
                    result.preview_diff_rows_ == difference.rows;
  std::unique_ptr<float[]> fresh(fits ? nullptr : new float[difference.total()]);
  cv::Mat map(difference.size(), CV_32F, fits ? result.preview_diff_map_ : fresh.get());
  difference.convertTo(map, CV_32F, 1 / 255.0);
  double maximum = 0;
  cv::minMaxLoc(map, nullptr, &maximum);
  const auto mean = static_cast<float>(cv::mean(map)[0]);
  map /= maximum;  // identical frames give 0 / 0, and are stored so
  if (!fits) {
    tester.ReleaseTestResult(test);
    result.preview_diff_map_ = fresh.release();
  }
  result.preview_diff_cols_ = map.cols;
  result.preview_diff_rows_ = map.rows;
  result.preview_diff_mean_ = mean;
  return QV_SUCCESS;
}

void QVTester::TestCameraPreview(bool front) {
  if (front) {
    MeasurePreview(*this, QV_RESOURCE_FRONT_PREVIEW_FIRST_FRAME, QV_TEST_CAMERA_PREVIEW_2,
                   &QVResultData::preview_front_);
  } else {
    MeasurePreview(*this, QV_RESOURCE_PREVIEW_FIRST_FRAME, QV_TEST_CAMERA_PREVIEW, &QVResultData::preview_main_);
  }
}

int QVTester::CheckPatternCircles(int cam_id) {
  const char* const name = "CheckPatternCircles";
  cv::Mat frame;
  if (const int code = FetchImage(*this, QV_RESOURCE_CHART_PHOTO, frame); code != QV_SUCCESS) return code;
  FoundChart& chart = FindChart(frame, prop_binary_thr_working_);
  QVDEBUGP("[%s] binary_image.rows :%d binary_image.cols : %d", name, chart.gray.rows, chart.gray.cols);

  const std::array<char, 32> count = Short("%d", static_cast<int>(chart.points.size()));
  if (cam_id == kSecondRearCamera) Publish(*this, Short("%s", "t82.vi_c_num_mw"), count);
  if (cam_id == kMainCamera) Publish(*this, Short("%s", "t82.vi_c_num_main"), count);
  if (cam_id == kMainCamera || cam_id == kSecondRearCamera) GetImageCenter(chart.points, cam_id);

  const bool found = chart.points.size() == kMarks;
  QVDEBUGP(found ? "[%s]Find 3Circles in Preview!!" : "[%s]Cannot find 3Circles in Preview!!", name);
  return found ? 1 : 0;
}

int QVTester::GetImageCenter(std::vector<cv::Point>& points, int cam_id) {
  const char* const name = "GetImageCenter";
  const int n = static_cast<int>(points.size());
  QVDEBUGP("[%s] Calculate center point number : %d, cam_id : %d", name, n, cam_id);
  cv::Point centre(0, 0);
  double longest = 0;
  for (int i = 0; i < n; ++i) {
    const cv::Point a = points[i];
    const cv::Point b = points[(i + 1) % n];
    const double length = Distance(a, b);
    if (length > longest) {
      longest = length;
      centre = {Middle(a.x, b.x), Middle(a.y, b.y)};
    }
    QVDEBUGP("[%s] %dth temp_length : %f, cal_length : %f, x : %d, y : %d, final x : %d, final y : %d", name, i,
             longest, length, a.x, a.y, centre.x, centre.y);
    Publish(*this, Short("t82.vi_circle_loc_%d_%d", cam_id, i), Short("%d,%d", a.x, a.y));
  }
  if (n != 3) centre = {0, 0};
  Publish(*this, Short("t82.vi_center_loc_%d", cam_id), Short("%d,%d", centre.x, centre.y));
  return 0;
}

void QVTester::SavePreview(void* data, int frame, int width, int height) {
  cv::Mat picture;
  ConvertPreviewFrame(data, width, height, picture);
  std::vector<unsigned char> file;
  cv::imencode(".jpg", picture, file);
  platform::WritePreview(Short("vi_pview_%d.jpg", frame / 3).data(), file);
}
