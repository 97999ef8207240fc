#ifndef QVTESTER_TESTS_CAMERA_PREVIEW_MEASURE_H_
#define QVTESTER_TESTS_CAMERA_PREVIEW_MEASURE_H_

#include "qvtester/tester.h"

/// Difference of the preview frames in two neighbouring slots, into the fields of their test. Frames of different sizes
/// are logged, and nothing is stored. 1, or -98 when a slot is empty.
int MeasurePreview(QVTester& tester, int first_slot, QV_TEST_INDEX test, QVPreviewResult QVResultData::*fields);

#endif  // QVTESTER_TESTS_CAMERA_PREVIEW_MEASURE_H_
