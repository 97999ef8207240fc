#ifndef QVTESTER_INDICES_H_
#define QVTESTER_INDICES_H_

// Numbers that a caller passes in or gets back. None of them ever moves: they are stored in station scripts.

#define QV_API __attribute__((visibility("default")))

/// The tests, each in one row: its name and number, the slots that it needs, those that ReleaseDataForTest empties,
/// what of QVResultData `r` ReleaseTestResult frees, the member of QVTester that runs it. 0 to 12 are validated and
/// released but have no routine.
#define QV_TESTS(ROW)                                                                                              \
  ROW(QV_TEST_PHASE1_0, 0, NEEDS(0, 1), RELEASES(0, 1), FREES(r.phase1_[0]), NO_ROUTINE)                           \
  ROW(QV_TEST_PHASE1_1, 1, NEEDS(2), RELEASES(0, 2, 3), FREES(r.phase1_[1]), NO_ROUTINE)                           \
  ROW(QV_TEST_PHASE1_2, 2, NEEDS(4), RELEASES(4), FREES(r.phase1_[2]), NO_ROUTINE)                                 \
  ROW(QV_TEST_PHASE1_3, 3, NEEDS(), RELEASES(), FREES(r.phase1_[3]), NO_ROUTINE) /* refused by validation */       \
  ROW(QV_TEST_PHASE1_4, 4, NEEDS(4), RELEASES(4), FREES(r.phase1_[4]), NO_ROUTINE)                                 \
  ROW(QV_TEST_PHASE1_5, 5, NEEDS(13), RELEASES(13), FREES(r.phase1_[5]), NO_ROUTINE)                               \
  ROW(QV_TEST_PHASE1_6, 6, NEEDS(4), RELEASES(4), FREES(r.phase1_[6]), NO_ROUTINE)                                 \
  ROW(QV_TEST_PHASE1_7, 7, NEEDS(4), RELEASES(4), FREES(r.phase1_[7]), NO_ROUTINE)                                 \
  ROW(QV_TEST_PHASE1_8, 8, NEEDS(9), RELEASES(9), FREES(r.phase1_[8]), NO_ROUTINE)                                 \
  ROW(QV_TEST_PHASE1_9, 9, NEEDS(10), RELEASES(10), FREES(r.phase1_[9]), NO_ROUTINE)                               \
  ROW(QV_TEST_PHASE1_10, 10, NEEDS(11), RELEASES(11), FREES(r.phase1_[10]), NO_ROUTINE)                            \
  ROW(QV_TEST_PHASE1_11, 11, NEEDS(12), RELEASES(12), FREES(r.phase1_[11]), NO_ROUTINE)                            \
  ROW(QV_TEST_PHASE1_12, 12, NEEDS(7, 8), RELEASES(7, 8), FREES(r.phase1_[12]), NO_ROUTINE)                        \
  ROW(QV_TEST_CAMERA_PREVIEW, 13, NEEDS(14, 15), RELEASES(), FREES(r.preview_main_),                               \
      RUNS_QUIETLY(TestCameraPreview(false))) /* motion between two preview frames, main camera */                 \
  ROW(QV_TEST_CAMERA_AUTOFOCUS, 14, NEEDS(17), RELEASES(),                                                         \
      FREES(r.af_sfr_count_, r.af_sfr_first_, r.af_sfr_second_, r.af_sfr_third_),                                  \
      RUNS(TestCameraAutofocus())) /* sharpness of a chart photo */                                                \
  ROW(QV_TEST_CAMERA_FLASH, 15, NEEDS(16), RELEASES(), NO_ARRAYS,                                                  \
      RUNS(TestCameraFlash())) /* brightness of a photo taken with the flash */                                    \
  ROW(QV_TEST_CAMERA_CAPTURE, 16, NEEDS(17), RELEASES(), FREES(r.capture_main_),                                   \
      RUNS(TestCameraCapture(false))) /* colour patches, main camera; slot 18 for a comparison */                  \
  ROW(QV_TEST_LENS_DUST, 17, NEEDS(19), RELEASES(), FREES(r.dust_hist_main_),                                      \
      RUNS(TestLensDust(false, fake_mode))) /* dark blobs and grey levels of a plain target, main camera */        \
  ROW(QV_TEST_CAMERA_FLASH_VT, 18, NEEDS(23), RELEASES(), NO_ARRAYS,                                               \
      RUNS(TestCameraFlashVT())) /* as 15, for the camera of video calls */                                        \
  ROW(QV_TEST_CAMERA_PREVIEW_2, 19, NEEDS(21, 22), RELEASES(), FREES(r.preview_front_),                            \
      RUNS_QUIETLY(TestCameraPreview(true))) /* as 13, front camera */                                             \
  ROW(QV_TEST_CAMERA_CAPTURE_2, 20, NEEDS(24), RELEASES(), FREES(r.capture_front_),                                \
      RUNS(TestCameraCapture(true))) /* as 16, front camera; slot 25 for a comparison */                           \
  ROW(QV_TEST_LENS_DUST_2, 21, NEEDS(26), RELEASES(), FREES(r.dust_hist_front_),                                   \
      RUNS(TestLensDust(true, fake_mode))) /* as 17, front camera */                                               \
  ROW(QV_TEST_VIDEO_PREVIEW, 22, NEEDS(28, 29), RELEASES(), FREES(r.preview_video_),                               \
      RUNS(TestVideoPreview())) /* two frames of a video preview */                                                \
  ROW(QV_TEST_VIDEO_AUTOFOCUS, 23, NEEDS(34), RELEASES(),                                                          \
      FREES(r.video_af_frame_count_, r.video_af_time_, r.video_af_mtf50_vertical_, r.video_af_mtf50_horizontal_),  \
      RUNS(TestVideoAutofocus())) /* sharpness in a film */                                                        \
  ROW(QV_TEST_VIDEO_FLASH, 24, NEEDS(34), RELEASES(),                                                              \
      FREES(r.video_flash_frame_count_, r.video_flash_time_, r.video_flash_mean_),                                 \
      RUNS(TestVideoFlash())) /* the light in a film */                                                            \
  ROW(QV_TEST_VIDEO_RECORD, 25, NEEDS(35), RELEASES(), FREES(r.video_record_),                                     \
      RUNS(TestVideoRecord())) /* a film that the phone recorded */                                                \
  ROW(QV_TEST_VIDEO_PLAY, 26, NEEDS(34), RELEASES(), FREES(r.video_play_),                                         \
      RUNS(TestVideoPlay())) /* a film of the phone playing one */                                                 \
  ROW(QV_TEST_LED_LIGHT, 27, NEEDS(30), RELEASES(), FREES(r.led_), RUNS(TestLEDLight())) /* the indicator light */ \
  ROW(QV_TEST_TOUCH_PANEL_LED, 28, NEEDS(31), RELEASES(), FREES(r.touch_led_),                                     \
      RUNS(TestTouchPanelLED())) /* lights of the touch panel */                                                   \
  ROW(QV_TEST_TOUCH_PANEL_PRINT, 29, NEEDS(32, 36), RELEASES(),                                                    \
      FREES(r.print_error_count_, r.print_error_areas_, r.print_error_pixels_),                                    \
      RUNS(TestTouchPanelPrint())) /* print of the touch panel, beside good ones */

#define QV_TEST_NUMBER(name, number, ...) name = number,
enum QV_TEST_INDEX : int { QV_TESTS(QV_TEST_NUMBER) };
#undef QV_TEST_NUMBER

/// An input slot, 0 to 36. 0-13 take float HDR buffers, 14-33 images, 34-35 video files, 36 a list of image files.
/// The slots that a test reads have names; any other number is cast.
enum QV_RESOURCE_INDEX : int {
  QV_RESOURCE_HDR_FIRST = 0,                    // float HDR buffers of the tests 0 to 12
  QV_RESOURCE_HDR_LAST = 13,                    // the last of them
  QV_RESOURCE_PREVIEW_FIRST_FRAME = 14,         // test 13: preview frame, main camera
  QV_RESOURCE_PREVIEW_SECOND_FRAME = 15,        // test 13: a later one of the same size
  QV_RESOURCE_FLASH_PHOTO = 16,                 // test 15: photo taken with the flash
  QV_RESOURCE_CHART_PHOTO = 17,                 // tests 14 and 16, both direct checks: photo or frame of the chart
  QV_RESOURCE_CHART_STANDARD = 18,              // test 16: photo of the chart by a good camera
  QV_RESOURCE_DUST_PHOTO = 19,                  // test 17: photo of a plain, evenly lit target
  QV_RESOURCE_FRONT_PREVIEW_FIRST_FRAME = 21,   // test 19: preview frame, front camera
  QV_RESOURCE_FRONT_PREVIEW_SECOND_FRAME = 22,  // test 19: a later one of the same size
  QV_RESOURCE_VT_FLASH_PHOTO = 23,              // test 18: photo of the camera of video calls, with the flash
  QV_RESOURCE_FRONT_CHART_PHOTO = 24,           // test 20: photo of the chart, front camera
  QV_RESOURCE_FRONT_CHART_STANDARD = 25,        // test 20: photo of the chart by a good front camera
  QV_RESOURCE_FRONT_DUST_PHOTO = 26,            // test 21: photo of a plain, evenly lit target
  QV_RESOURCE_VIDEO_PREVIEW_FIRST_FRAME = 28,   // test 22: frame of a video preview
  QV_RESOURCE_VIDEO_PREVIEW_SECOND_FRAME = 29,  // test 22: a later one of the same size
  QV_RESOURCE_LED_PHOTO = 30,                   // test 27: photo of the indicator light
  QV_RESOURCE_TOUCH_PANEL_LED_PHOTO = 31,       // test 28: photo of the touch panel's lights
  QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO = 32,     // test 29: photo of the touch panel's print
  QV_RESOURCE_VIDEO = 34,                       // tests 23, 24 and 26: film
  QV_RESOURCE_RECORDED_VIDEO = 35,              // test 25: film that the phone recorded
  QV_RESOURCE_IMAGE_LIST = 36,                  // test 29: photos of good prints
};

/// A property, 0 to 94 with gaps. Those with a known meaning have names; any other number is cast.
enum QV_PROPERTY_INDEX : int {
  QV_PROPERTY_COLOR_MATRIX = 52,             // float[9], row by row
  QV_PROPERTY_DOT_THRESHOLD = 53,            // float, share of the local mean (tests 27 and 28)
  QV_PROPERTY_DOT_RADIUS = 55,               // int, pixels (tests 27 and 28)
  QV_PROPERTY_AREA_DISTANCE = 59,            // int, pixels: areas closer than this are merged (tests 27 to 29)
  QV_PROPERTY_AREA_LEAST_PIXELS = 60,        // int: smaller areas are dropped (tests 27 to 29)
  QV_PROPERTY_CAMERA_MATRIX_0 = 62,          // float[9], row by row
  QV_PROPERTY_CAMERA_MATRIX_1 = 63,          // float[9], row by row
  QV_PROPERTY_DIST_COEFFS_0 = 64,            // float[5]: k1, k2, p1, p2, k3; reading gives nine floats
  QV_PROPERTY_DIST_COEFFS_1 = 65,            // float[5]: k1, k2, p1, p2, k3; reading gives nine floats
  QV_PROPERTY_REGION_COUNT_0 = 75,           // int; set before the list
  QV_PROPERTY_REGION_LIST_0 = 76,            // left, top, width, height, label of each (test 27)
  QV_PROPERTY_REGION_COUNT_1 = 77,           // int; set before the list
  QV_PROPERTY_REGION_LIST_1 = 78,            // left, top, width, height, label of each (test 28)
  QV_PROPERTY_LIST_COMPONENTS = 80,          // int: principal components of a rebuild (slot 36, test 29)
  QV_PROPERTY_STANDARD_BINARY_THR = 86,      // int, grey level
  QV_PROPERTY_FRONT_DUST_HISTOGRAM = 87,     // int[256], stays in the caller's memory
  QV_PROPERTY_DUST_HISTOGRAM = 88,           // int[256], stays in the caller's memory
  QV_PROPERTY_VIDEO_FLASH_FRAME_COUNT = 89,  // int
  QV_PROPERTY_REF_PATCH_VALUES_1 = 91,       // float[72]
  QV_PROPERTY_REF_PATCH_VALUES_0 = 92,       // float[72]
  QV_PROPERTY_BINARY_THR_WORKING = 93,       // int, grey level
};

/// Answers of every operation. `qvtester list codes` tells what to look at for each.
enum QV_RESULT_CODE : int {
  QV_SUCCESS = 1,
  QV_DONE = 0,                       // SetStep and FinalizeTestModule; no further meaning
  QV_ERROR_NO_PATCHES = -87,         // no colour patch could be measured
  QV_ERROR_NO_REGISTRATION = -90,    // too few feature matches between image and reference
  QV_ERROR_PATTERN_NOT_FOUND = -91,  // the chart does not show exactly three finder marks
  QV_ERROR_UNUSABLE_INPUT = -95,     // what a slot holds can't be processed
  QV_ERROR_NO_TESTER = -96,          // InitTestModule was not called
  QV_ERROR_INVALID_ARGUMENT = -97,   // bad index, path, size or pointer; or a test without a routine
  QV_ERROR_SLOT_EMPTY = -98,         // an input slot that the test needs is empty
  QV_ERROR_INTERNAL = -99,           // any other failure, exhausted memory among them
};

#endif  // QVTESTER_INDICES_H_
