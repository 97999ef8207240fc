// The single door to every test, and the result block that the tests fill.

#include "core/test_table.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

const QVTest* FindTest(int index) {
  return index >= 0 && index < static_cast<int>(std::size(kTests)) ? &kTests[index] : nullptr;
}

template <typename... T>
void FreeArrays(T*&... arrays) {
  ((delete[] arrays, arrays = nullptr), ...);
}

// Takes the new array over; giving a record the array it already holds is no reason to free it.
template <typename T>
void ReplaceArray(T*& array, T* fresh) {
  if (array != fresh) delete[] array;
  array = fresh;
}

void Free(QVPhase1Result& r) {
  FreeArrays(r.image_, r.raw_data_, r.error_points_);
  r.image_width_ = r.image_height_ = r.raw_width_ = r.raw_height_ = r.error_point_count_ = 0;
}

void Free(QVPreviewResult& r) {
  FreeArrays(r.preview_diff_map_);
  r.preview_diff_cols_ = r.preview_diff_rows_ = 0;
}

void Free(QVCaptureResult& r) {
  FreeArrays(r.capture_lab_, r.capture_delta_e_);
  r.capture_lab_count_ = r.capture_delta_e_count_ = 0;
}

void Free(QVVideoChartResult& r) {
  FreeArrays(r.time_, r.mark_count_, r.angle_, r.corner_row_, r.corner_column_);
  r.frame_count_ = 0;
}

void Free(QVLightResult& r) {
  FreeArrays(r.regions_, r.error_areas_, r.error_pixels_);
  r.region_count_ = r.error_count_ = 0;
}

}  // namespace

int QVTester::RunTest(QV_TEST_INDEX test, bool fake_mode) {
  if (const int code = ValidateTest(test); code != QV_SUCCESS) {
    QVDEBUGP("[OKAPI] Error : Invalid parameter or insufficient image");
    return code;
  }
  QVDEBUGP("[OKAPI] %s, testindex: %d, fake_mode: %d, step: %d", "RunTest", test, fake_mode ? 1 : 0, step_);
  const QVTest& row = *FindTest(test);
  return row.routine == nullptr ? QV_ERROR_INVALID_ARGUMENT : row.routine(*this, fake_mode);
}

int QVTester::ValidateTest(QV_TEST_INDEX test) {
  const QVTest* row = FindTest(test);
  if (row == nullptr || row->needs == Of()) return QV_ERROR_INVALID_ARGUMENT;
  for (const int slot : row->needs) {
    if (slot != kNoSlot && resources_[slot] == nullptr) return QV_ERROR_SLOT_EMPTY;
  }
  return QV_SUCCESS;
}

int QVTester::GetResult(QVResultData** out) {
  *out = results_.get();
  return QV_SUCCESS;
}

int QVTester::ReleaseTestResult(QV_TEST_INDEX test) {
  if (FindTest(test) == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  if (results_ == nullptr) return QV_SUCCESS;
  QVResultData& results = *results_;
  if (test <= QV_TEST_PHASE1_12) Free(results.phase1_[test]);
  switch (test) {
    case QV_TEST_CAMERA_PREVIEW: Free(results.preview_main_); break;
    case QV_TEST_CAMERA_PREVIEW_2: Free(results.preview_front_); break;
    case QV_TEST_CAMERA_AUTOFOCUS:
      FreeArrays(results.af_sfr_first_, results.af_sfr_second_, results.af_sfr_third_);
      results.af_sfr_count_ = 0;
      break;
    case QV_TEST_CAMERA_CAPTURE: Free(results.capture_main_); break;
    case QV_TEST_CAMERA_CAPTURE_2: Free(results.capture_front_); break;
    case QV_TEST_LENS_DUST: FreeArrays(results.dust_hist_main_); break;
    case QV_TEST_LENS_DUST_2: FreeArrays(results.dust_hist_front_); break;
    case QV_TEST_VIDEO_PREVIEW: Free(results.preview_video_); break;
    case QV_TEST_VIDEO_AUTOFOCUS:
      FreeArrays(results.video_af_time_, results.video_af_mtf50_vertical_, results.video_af_mtf50_horizontal_);
      results.video_af_frame_count_ = 0;
      break;
    case QV_TEST_VIDEO_FLASH:
      FreeArrays(results.video_flash_time_, results.video_flash_mean_);
      results.video_flash_frame_count_ = 0;
      break;
    case QV_TEST_VIDEO_RECORD: Free(results.video_record_); break;
    case QV_TEST_VIDEO_PLAY: Free(results.video_play_); break;
    case QV_TEST_LED_LIGHT: Free(results.led_); break;
    case QV_TEST_TOUCH_PANEL_LED: Free(results.touch_led_); break;
    case QV_TEST_TOUCH_PANEL_PRINT:
      FreeArrays(results.print_error_areas_, results.print_error_pixels_);
      results.print_error_count_ = 0;
      break;
    default: break;  // the others leave no arrays
  }
  return QV_SUCCESS;
}

int QVTester::ReleaseDataForTest(QV_TEST_INDEX test) {
  const QVTest* row = FindTest(test);
  if (row == nullptr || row->releases == Of()) return QV_ERROR_INVALID_ARGUMENT;
  for (const int slot : row->releases) {
    if (slot != kNoSlot) ReleaseImage(static_cast<QV_RESOURCE_INDEX>(slot));
  }
  return ReleaseTestResult(test);
}

int QVTester::SetResult(QVPhase1Result* r, int code) {
  r->result_ = code;
  return QV_SUCCESS;
}

int QVTester::SetResultImage(QVPhase1Result* r, int width, int height, unsigned char* image) {
  r->image_width_ = width;
  r->image_height_ = height;
  ReplaceArray(r->image_, image);
  return QV_SUCCESS;
}

int QVTester::SetResultRawData(QVPhase1Result* r, int width, int height, float* data) {
  r->raw_width_ = width;
  r->raw_height_ = height;
  ReplaceArray(r->raw_data_, data);
  return QV_SUCCESS;
}

int QVTester::SetResultErrorPoint(QVPhase1Result* r, QVRECT* points, int count) {
  r->error_point_count_ = count;
  ReplaceArray(r->error_points_, points);
  return QV_SUCCESS;
}
