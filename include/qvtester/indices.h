#ifndef QVTESTER_INDICES_H_
#define QVTESTER_INDICES_H_

// Numbers that a caller passes in or gets back. None of them ever moves: they are stored in station scripts.

#define QV_API __attribute__((visibility("default")))

/// A test. 0 to 12 are validated and released but have no routine; `qvtester list tests` shows the slots each one
/// needs.
enum QV_TEST_INDEX : int {
  QV_TEST_PHASE1_0 = 0,
  QV_TEST_PHASE1_1 = 1,
  QV_TEST_PHASE1_2 = 2,
  QV_TEST_PHASE1_3 = 3,
  QV_TEST_PHASE1_4 = 4,
  QV_TEST_PHASE1_5 = 5,
  QV_TEST_PHASE1_6 = 6,
  QV_TEST_PHASE1_7 = 7,
  QV_TEST_PHASE1_8 = 8,
  QV_TEST_PHASE1_9 = 9,
  QV_TEST_PHASE1_10 = 10,
  QV_TEST_PHASE1_11 = 11,
  QV_TEST_PHASE1_12 = 12,
  QV_TEST_CAMERA_PREVIEW = 13,
  QV_TEST_CAMERA_AUTOFOCUS = 14,
  QV_TEST_CAMERA_FLASH = 15,
  QV_TEST_CAMERA_CAPTURE = 16,
  QV_TEST_LENS_DUST = 17,
  QV_TEST_CAMERA_FLASH_VT = 18,
  QV_TEST_CAMERA_PREVIEW_2 = 19,
  QV_TEST_CAMERA_CAPTURE_2 = 20,
  QV_TEST_LENS_DUST_2 = 21,
  QV_TEST_VIDEO_PREVIEW = 22,
  QV_TEST_VIDEO_AUTOFOCUS = 23,
  QV_TEST_VIDEO_FLASH = 24,
  QV_TEST_VIDEO_RECORD = 25,
  QV_TEST_VIDEO_PLAY = 26,
  QV_TEST_LED_LIGHT = 27,
  QV_TEST_TOUCH_PANEL_LED = 28,
  QV_TEST_TOUCH_PANEL_PRINT = 29,
};

/// An input slot, 0 to 36. 0-13 take float HDR buffers, 14-33 images, 34-35 video files, 36 a list of image files.
/// The slots that a test reads have names; any other number is cast.
enum QV_RESOURCE_INDEX : int {
  QV_RESOURCE_HDR_FIRST = 0,
  QV_RESOURCE_HDR_LAST = 13,
  QV_RESOURCE_PREVIEW_FIRST_FRAME = 14,
  QV_RESOURCE_PREVIEW_SECOND_FRAME = 15,
  QV_RESOURCE_FLASH_PHOTO = 16,
  QV_RESOURCE_CHART_PHOTO = 17,
  QV_RESOURCE_CHART_STANDARD = 18,
  QV_RESOURCE_DUST_PHOTO = 19,
  QV_RESOURCE_FRONT_PREVIEW_FIRST_FRAME = 21,
  QV_RESOURCE_FRONT_PREVIEW_SECOND_FRAME = 22,
  QV_RESOURCE_VT_FLASH_PHOTO = 23,
  QV_RESOURCE_FRONT_CHART_PHOTO = 24,
  QV_RESOURCE_FRONT_CHART_STANDARD = 25,
  QV_RESOURCE_FRONT_DUST_PHOTO = 26,
  QV_RESOURCE_VIDEO_PREVIEW_FIRST_FRAME = 28,
  QV_RESOURCE_VIDEO_PREVIEW_SECOND_FRAME = 29,
  QV_RESOURCE_LED_PHOTO = 30,
  QV_RESOURCE_TOUCH_PANEL_LED_PHOTO = 31,
  QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO = 32,
  QV_RESOURCE_VIDEO = 34,
  QV_RESOURCE_RECORDED_VIDEO = 35,
  QV_RESOURCE_IMAGE_LIST = 36,
};

/// A property, 0 to 94 with gaps. Those with a known meaning have names; any other number is cast.
enum QV_PROPERTY_INDEX : int {
  QV_PROPERTY_COLOR_MATRIX = 52,             // float[9], row by row
  QV_PROPERTY_CAMERA_MATRIX_0 = 62,          // float[9], row by row
  QV_PROPERTY_CAMERA_MATRIX_1 = 63,          // float[9], row by row
  QV_PROPERTY_DIST_COEFFS_0 = 64,            // float[5]: k1, k2, p1, p2, k3; reading gives nine floats
  QV_PROPERTY_DIST_COEFFS_1 = 65,            // float[5]: k1, k2, p1, p2, k3; reading gives nine floats
  QV_PROPERTY_REGION_COUNT_0 = 75,           // int; set before the list
  QV_PROPERTY_REGION_LIST_0 = 76,            // records of five 32-bit fields
  QV_PROPERTY_REGION_COUNT_1 = 77,           // int; set before the list
  QV_PROPERTY_REGION_LIST_1 = 78,            // records of five 32-bit fields
  QV_PROPERTY_LIST_COMPONENTS = 80,          // int
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
