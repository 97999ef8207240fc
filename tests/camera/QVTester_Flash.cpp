// Tests 15 and 18: mean brightness of a photo taken with the flash.

#include "core/slots.h"
#include "qvtester/tester.h"

namespace {

// Mean of the first channel, in grey levels.
int MeasureFlash(const QVTester& tester, int slot, float& mean) {
  cv::Mat photo;
  if (const int code = FetchImage(tester, slot, photo); code != QV_SUCCESS) return code;
  mean = static_cast<float>(cv::mean(photo)[0]);
  return QV_SUCCESS;
}

}  // namespace

int QVTester::TestCameraFlash() { return MeasureFlash(*this, QV_RESOURCE_FLASH_PHOTO, Results(*this).flash_mean_); }

int QVTester::TestCameraFlashVT() {
  return MeasureFlash(*this, QV_RESOURCE_VT_FLASH_PHOTO, Results(*this).flash_mean_vtcam_);
}
