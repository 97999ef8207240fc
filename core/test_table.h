#ifndef QVTESTER_CORE_TEST_TABLE_H_
#define QVTESTER_CORE_TEST_TABLE_H_

#include <array>
#include <iterator>

#include "core/result_arrays.h"
#include "qvtester/tester.h"

// Every test in one row: its index and name, the slots it needs, the slots that ReleaseDataForTest empties, the arrays
// of the result block that ReleaseTestResult frees, its routine. A test that names no slot is refused by validation;
// one without a routine answers -97 after validation.

inline constexpr int kNoSlot = -1;
using Slots = std::array<int, 3>;  // padded with kNoSlot

struct QVTest {
  QV_TEST_INDEX index;
  const char* name;
  Slots needs;
  Slots releases;
  void (*frees)(QVResultData& r);  // null: the test leaves no arrays
  int (*routine)(QVTester& tester, bool fake_mode);
};

constexpr Slots Of(int first = kNoSlot, int second = kNoSlot, int third = kNoSlot) { return {first, second, third}; }

#define ROW(test, ...) \
  QVTest { test, #test, __VA_ARGS__ }
#define FREE(...) [](QVResultData& r) { Free(__VA_ARGS__); }
#define RUN(call) [](QVTester& tester, [[maybe_unused]] bool fake_mode) { return tester.call; }
#define RUN_QUIETLY(call)                    \
  [](QVTester& tester, bool /*fake_mode*/) { \
    tester.call;                             \
    return static_cast<int>(QV_SUCCESS);     \
  }
inline constexpr QVTest kTests[] = {
    ROW(QV_TEST_PHASE1_0, Of(0, 1), Of(0, 1), FREE(r.phase1_[0]), nullptr),
    ROW(QV_TEST_PHASE1_1, Of(2), Of(0, 2, 3), FREE(r.phase1_[1]), nullptr),
    ROW(QV_TEST_PHASE1_2, Of(4), Of(4), FREE(r.phase1_[2]), nullptr),
    ROW(QV_TEST_PHASE1_3, Of(), Of(), FREE(r.phase1_[3]), nullptr),
    ROW(QV_TEST_PHASE1_4, Of(4), Of(4), FREE(r.phase1_[4]), nullptr),
    ROW(QV_TEST_PHASE1_5, Of(13), Of(13), FREE(r.phase1_[5]), nullptr),
    ROW(QV_TEST_PHASE1_6, Of(4), Of(4), FREE(r.phase1_[6]), nullptr),
    ROW(QV_TEST_PHASE1_7, Of(4), Of(4), FREE(r.phase1_[7]), nullptr),
    ROW(QV_TEST_PHASE1_8, Of(9), Of(9), FREE(r.phase1_[8]), nullptr),
    ROW(QV_TEST_PHASE1_9, Of(10), Of(10), FREE(r.phase1_[9]), nullptr),
    ROW(QV_TEST_PHASE1_10, Of(11), Of(11), FREE(r.phase1_[10]), nullptr),
    ROW(QV_TEST_PHASE1_11, Of(12), Of(12), FREE(r.phase1_[11]), nullptr),
    ROW(QV_TEST_PHASE1_12, Of(7, 8), Of(7, 8), FREE(r.phase1_[12]), nullptr),
    ROW(QV_TEST_CAMERA_PREVIEW, Of(14, 15), Of(), FREE(r.preview_main_), RUN_QUIETLY(TestCameraPreview(false))),
    ROW(QV_TEST_CAMERA_AUTOFOCUS, Of(17), Of(),
        FREE(r.af_sfr_count_, r.af_sfr_first_, r.af_sfr_second_, r.af_sfr_third_), RUN(TestCameraAutofocus())),
    ROW(QV_TEST_CAMERA_FLASH, Of(16), Of(), nullptr, RUN(TestCameraFlash())),
    ROW(QV_TEST_CAMERA_CAPTURE, Of(17), Of(), FREE(r.capture_main_), RUN(TestCameraCapture(false))),
    ROW(QV_TEST_LENS_DUST, Of(19), Of(), FREE(r.dust_hist_main_), RUN(TestLensDust(false, fake_mode))),
    ROW(QV_TEST_CAMERA_FLASH_VT, Of(23), Of(), nullptr, RUN(TestCameraFlashVT())),
    ROW(QV_TEST_CAMERA_PREVIEW_2, Of(21, 22), Of(), FREE(r.preview_front_), RUN_QUIETLY(TestCameraPreview(true))),
    ROW(QV_TEST_CAMERA_CAPTURE_2, Of(24), Of(), FREE(r.capture_front_), RUN(TestCameraCapture(true))),
    ROW(QV_TEST_LENS_DUST_2, Of(26), Of(), FREE(r.dust_hist_front_), RUN(TestLensDust(true, fake_mode))),
    ROW(QV_TEST_VIDEO_PREVIEW, Of(28, 29), Of(), FREE(r.preview_video_), RUN(TestVideoPreview())),
    ROW(QV_TEST_VIDEO_AUTOFOCUS, Of(34), Of(),
        FREE(r.video_af_frame_count_, r.video_af_time_, r.video_af_mtf50_vertical_, r.video_af_mtf50_horizontal_),
        RUN(TestVideoAutofocus())),
    ROW(QV_TEST_VIDEO_FLASH, Of(34), Of(), FREE(r.video_flash_frame_count_, r.video_flash_time_, r.video_flash_mean_),
        RUN(TestVideoFlash())),
    ROW(QV_TEST_VIDEO_RECORD, Of(35), Of(), FREE(r.video_record_), RUN(TestVideoRecord())),
    ROW(QV_TEST_VIDEO_PLAY, Of(34), Of(), FREE(r.video_play_), RUN(TestVideoPlay())),
    ROW(QV_TEST_LED_LIGHT, Of(30), Of(), FREE(r.led_), RUN(TestLEDLight())),
    ROW(QV_TEST_TOUCH_PANEL_LED, Of(31), Of(), FREE(r.touch_led_), RUN(TestTouchPanelLED())),
    ROW(QV_TEST_TOUCH_PANEL_PRINT, Of(32, 36), Of(),
        FREE(r.print_error_count_, r.print_error_areas_, r.print_error_pixels_), RUN(TestTouchPanelPrint())),
};
#undef RUN_QUIETLY
#undef FREE
#undef RUN
#undef ROW

constexpr bool TestsAreInOrder() {
  for (std::size_t i = 0; i < std::size(kTests); ++i) {
    if (kTests[i].index != static_cast<int>(i)) return false;
  }
  return true;
}
static_assert(TestsAreInOrder(), "row i is test i");

#endif  // QVTESTER_CORE_TEST_TABLE_H_
