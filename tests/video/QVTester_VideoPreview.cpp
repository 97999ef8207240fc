// Test 22: the difference of two preview frames of the video camera.

#include "qvtester/tester.h"
#include "tests/camera/preview_measure.h"

int QVTester::TestVideoPreview() {
  return MeasurePreview(*this, QV_RESOURCE_VIDEO_PREVIEW_FIRST_FRAME, QV_TEST_VIDEO_PREVIEW,
                        &QVResultData::preview_video_);
}
