#ifndef QVTESTER_CORE_TEST_TABLE_H_
#define QVTESTER_CORE_TEST_TABLE_H_

#include <array>
#include <iterator>

#include "qvtester/tester.h"

// Every test in one row: its index and name, the slots it needs, the slots that ReleaseDataForTest empties, its
// routine. A test that names no slot is refused by validation; one without a routine answers -97 after validation.

inline constexpr int kNoSlot = -1;
using Slots = std::array<int, 3>;  // padded with kNoSlot

struct QVTest {
  QV_TEST_INDEX index;
  const char* name;
  Slots needs;
  Slots releases;
  int (*routine)(QVTester& tester, bool fake_mode);
};

constexpr Slots Of(int first = kNoSlot, int second = kNoSlot, int third = kNoSlot) { return {first, second, third}; }

#define ROW(test, ...) \
  QVTest { test, #test, __VA_ARGS__ }
#define RUN(call) [](QVTester& tester, [[maybe_unused]] bool fake_mode) { return tester.call; }
#define RUN_QUIETLY(call)                    \
  [](QVTester& tester, bool /*fake_mode*/) { \
    tester.call;                             \
    return static_cast<int>(QV_SUCCESS);     \
  }
inline constexpr QVTest kTests[] = {
    ROW(QV_TEST_PHASE1_0, Of(0, 1), Of(0, 1), nullptr),
    ROW(QV_TEST_PHASE1_1, Of(2), Of(0, 2, 3), nullptr),
    ROW(QV_TEST_PHASE1_2, Of(4), Of(4), nullptr),
    ROW(QV_TEST_PHASE1_3, Of(), Of(), nullptr),
    ROW(QV_TEST_PHASE1_4, Of(4), Of(4), nullptr),
    ROW(QV_TEST_PHASE1_5, Of(13), Of(13), nullptr),
    ROW(QV_TEST_PHASE1_6, Of(4), Of(4), nullptr),
    ROW(QV_TEST_PHASE1_7, Of(4), Of(4), nullptr),
    ROW(QV_TEST_PHASE1_8, Of(9), Of(9), nullptr),
    ROW(QV_TEST_PHASE1_9, Of(10), Of(10), nullptr),
    ROW(QV_TEST_PHASE1_10, Of(11), Of(11), nullptr),
    ROW(QV_TEST_PHASE1_11, Of(12), Of(12), nullptr),
    ROW(QV_TEST_PHASE1_12, Of(7, 8), Of(7, 8), nullptr),
    ROW(QV_TEST_CAMERA_PREVIEW, Of(14, 15), Of(), RUN_QUIETLY(TestCameraPreview(false))),
    ROW(QV_TEST_CAMERA_AUTOFOCUS, Of(17), Of(), RUN(TestCameraAutofocus())),
    ROW(QV_TEST_CAMERA_FLASH, Of(16), Of(), RUN(TestCameraFlash())),
    ROW(QV_TEST_CAMERA_CAPTURE, Of(17), Of(), RUN(TestCameraCapture(false))),
    ROW(QV_TEST_LENS_DUST, Of(19), Of(), RUN(TestLensDust(false, fake_mode))),
    ROW(QV_TEST_CAMERA_FLASH_VT, Of(23), Of(), RUN(TestCameraFlashVT())),
    ROW(QV_TEST_CAMERA_PREVIEW_2, Of(21, 22), Of(), RUN_QUIETLY(TestCameraPreview(true))),
    ROW(QV_TEST_CAMERA_CAPTURE_2, Of(24), Of(), RUN(TestCameraCapture(true))),
    ROW(QV_TEST_LENS_DUST_2, Of(26), Of(), RUN(TestLensDust(true, fake_mode))),
    ROW(QV_TEST_VIDEO_PREVIEW, Of(28, 29), Of(), RUN(TestVideoPreview())),
    ROW(QV_TEST_VIDEO_AUTOFOCUS, Of(34), Of(), RUN(TestVideoAutofocus())),
    ROW(QV_TEST_VIDEO_FLASH, Of(34), Of(), RUN(TestVideoFlash())),
    ROW(QV_TEST_VIDEO_RECORD, Of(35), Of(), RUN(TestVideoRecord())),
    ROW(QV_TEST_VIDEO_PLAY, Of(34), Of(), RUN(TestVideoPlay())),
    ROW(QV_TEST_LED_LIGHT, Of(30), Of(), RUN(TestLEDLight())),
    ROW(QV_TEST_TOUCH_PANEL_LED, Of(31), Of(), RUN(TestTouchPanelLED())),
    ROW(QV_TEST_TOUCH_PANEL_PRINT, Of(32, 36), Of(), RUN(TestTouchPanelPrint())),
};
#undef RUN_QUIETLY
#undef RUN
#undef ROW

constexpr bool TestsAreInOrder() {
  for (std::size_t i = 0; i < std::size(kTests); ++i) {
    if (kTests[i].index != static_cast<int>(i)) return false;
  }
  return true;
}
static_assert(std::size(kTests) == 30 && TestsAreInOrder(), "row i is test i");

#endif  // QVTESTER_CORE_TEST_TABLE_H_
