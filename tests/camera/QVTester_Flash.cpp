// Tests 15 and 18: mean brightness of a photo taken with the flash.

#include "core/slots.h"
#include "qvtester/tester.h"

namespace {

// Mean of the first channel, in grey levels.
int MeasureFlash(QVTester& tester, int slot, float QVResultData::*mean) {
  cv::Mat photo;
  if (const int code = FetchImage(tester, slot, photo); code != QV_SUCCESS) return code;
  Results(tester).*mean = static_cast<float>(cv::mean(photo)[0]);
  return QV_SUCCESS;
}

}  // namespace

int QVTester::TestCameraFlash() { return MeasureFlash(*this, QV_RESOURCE_FLASH_PHOTO, &QVResultData::flash_mean_); }

int QVTester::TestCameraFlashVT() {
  return MeasureFlash(*this, QV_RESOURCE_VT_FLASH_PHOTO, &QVResultData::flash_mean_vtcam_);
}
