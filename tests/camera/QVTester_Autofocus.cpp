// Test 14: the SFR of a chart photo, handed to the caller as it was measured.

#include <algorithm>
#include <memory>

#include "core/slots.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

std::unique_ptr<float[]> CopyOf(const std::vector<float>& values, std::size_t count) {
  auto copy = std::make_unique<float[]>(count);
  std::copy_n(values.begin(), count, copy.get());
  return copy;
}

}  // namespace

int QVTester::TestCameraAutofocus() {
  cv::Mat photo;
  if (const int code = FetchImage(*this, QV_RESOURCE_CHART_PHOTO, photo); code != QV_SUCCESS) return code;
  std::vector<float> freq;
  std::vector<float> sfr_vertical;
  std::vector<float> sfr_horizontal;
  float mtf50_vertical = 0;
  float mtf50_horizontal = 0;
  const int code = GetSFRFromImage(photo, freq, sfr_vertical, sfr_horizontal, mtf50_vertical, mtf50_horizontal);
  if (code != QV_SUCCESS) {
    QVDEBUGP("%s Fail to get SFR data (Result:%d)", "TestCameraAutofocus", code);
    return code;
  }

  QVResultData& results = Results(*this);
  auto first = CopyOf(freq, freq.size());
  auto second = CopyOf(sfr_vertical, freq.size());
  auto third = CopyOf(sfr_horizontal, freq.size());
  ReleaseTestResult(QV_TEST_CAMERA_AUTOFOCUS);
  results.af_sfr_count_ = static_cast<int>(freq.size());
  results.af_sfr_first_ = first.release();
  results.af_sfr_second_ = second.release();
  results.af_sfr_third_ = third.release();
  results.af_sfr_scalar1_ = mtf50_vertical;
  results.af_sfr_scalar2_ = mtf50_horizontal;
  return QV_SUCCESS;
}
