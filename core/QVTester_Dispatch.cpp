// The single door to every test, and the result block that the tests fill.

#include "core/test_table.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

const QVTest* FindTest(int index) {
  return index >= 0 && index < static_cast<int>(std::size(kTests)) ? &kTests[index] : nullptr;
}

// Takes the new array over; giving a record the array it already holds is no reason to free it.
template <typename T>
void ReplaceArray(T*& array, T* fresh) {
  if (array != fresh) delete[] array;
  array = fresh;
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
  const QVTest* row = FindTest(test);
  if (row == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  if (results_ != nullptr && row->frees != nullptr) row->frees(*results_);
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
