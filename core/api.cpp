// The exported functions: each forwards to the member of its name, behind one guard.

#include "qvtester/api.h"

#include <opencv2/core.hpp>

#include "qvtester/log.h"
#include "qvtester/tester.h"

QVTester* theTester = nullptr;

namespace {

// What an exception is to the caller; one log line names the function and the cause. Called from a catch block.
int CodeOfException(const char* name) noexcept {
  try {
    throw;
  } catch (const cv::Exception& e) {
    QVDEBUGP("[%s] %s", name, e.what());
    return e.code == cv::Error::StsNoMem ? QV_ERROR_INTERNAL : QV_ERROR_UNUSABLE_INPUT;
  } catch (const std::exception& e) {
    QVDEBUGP("[%s] %s", name, e.what());
  } catch (...) {
    QVDEBUGP("[%s] unknown exception", name);
  }
  return QV_ERROR_INTERNAL;
}

template <typename Call>
int Guarded(const char* name, Call&& call) noexcept {
  if (theTester == nullptr) return QV_ERROR_NO_TESTER;
  try {
    return call(*theTester);
  } catch (...) {
    return CodeOfException(name);
  }
}

}  // namespace

int InitTestModule() {
  try {
    if (theTester == nullptr) theTester = new QVTester();
    return theTester->Initialize();
  } catch (...) {
    return CodeOfException("InitTestModule");
  }
}

int FinalizeTestModule() {
  QVDEBUGP("[OKAPI] finalize vision test");
  delete theTester;
  theTester = nullptr;
  return QV_DONE;
}

int RunTest(QV_TEST_INDEX test, bool fake_mode) {
  return Guarded("RunTest", [&](QVTester& tester) { return tester.RunTest(test, fake_mode); });
}

int SetLDRResource(QV_RESOURCE_INDEX index, int width, int height, unsigned short* data) {
  if (width < 1 || height < 1 || data == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("SetLDRResource", [&](QVTester& tester) { return tester.SetResource(index, width, height, data); });
}

int SetHDRResource(QV_RESOURCE_INDEX index, int width, int height, bool flag, float* data) {
  if (width < 1 || height < 1 || data == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("SetHDRResource",
                 [&](QVTester& tester) { return tester.SetHDRResource(index, width, height, flag, data); });
}

int SetResource(QV_RESOURCE_INDEX index, char* path) {
  if (path == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("SetResource", [&](QVTester& tester) { return tester.SetResource(index, path); });
}

int SetResource(QV_RESOURCE_INDEX index, int width, int height, void* data) {
  if (width < 1 || height < 1 || data == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("SetResource", [&](QVTester& tester) { return tester.SetResource(index, width, height, data); });
}

int SetResourceWithList(QV_RESOURCE_INDEX index, std::vector<std::string> paths) {
  return Guarded("SetResourceWithList", [&](QVTester& tester) { return tester.SetResource(index, paths); });
}

int SetResourceWithLDRs(QV_RESOURCE_INDEX index, int width, int height, bool flag, unsigned short* first,
                        unsigned short* second, unsigned short* third, unsigned short* fourth) {
  return Guarded("SetResourceWithLDRs", [&](QVTester& tester) {
    return tester.SetResource(index, width, height, flag, first, second, third, fourth);
  });
}

int GetImage(QV_RESOURCE_INDEX index, int* width, int* height, unsigned char** data) {
  return Guarded("GetImage", [&](QVTester& tester) { return tester.GetLDRImage(index, width, height, data); });
}

int SaveHDRImage(QV_RESOURCE_INDEX index, char* path) {
  return Guarded("SaveHDRImage", [&](QVTester& tester) { return tester.SaveHDRImage(index, path); });
}

int GetResult(QVResultData** out) {
  if (out == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("GetResult", [&](QVTester& tester) { return tester.GetResult(out); });
}

int SetProperty(QV_PROPERTY_INDEX index, void* value) {
  if (value == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("SetProperty", [&](QVTester& tester) { return tester.SetProperty(index, value); });
}

int GetProperty(QV_PROPERTY_INDEX index, void* out) {
  if (out == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("GetProperty", [&](QVTester& tester) { return tester.GetProperty(index, out); });
}

int ReleaseDataForTest(QV_TEST_INDEX test) {
  return Guarded("ReleaseDataForTest", [&](QVTester& tester) { return tester.ReleaseDataForTest(test); });
}

int ReleaseImage(QV_RESOURCE_INDEX index) {
  return Guarded("ReleaseImage", [&](QVTester& tester) { return tester.ReleaseImage(index); });
}

int ReleaseTestResult(QV_TEST_INDEX test) {
  return Guarded("ReleaseTestResult", [&](QVTester& tester) { return tester.ReleaseTestResult(test); });
}

int SetStep(int step) {
  return Guarded("SetStep", [&](QVTester& tester) { return tester.SetStep(step); });
}

int CheckMTF(float* mtf50Vertical, float* mtf50Horizontal) {
  if (mtf50Vertical == nullptr || mtf50Horizontal == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("CheckMTF", [&](QVTester& tester) { return tester.CheckMTF(mtf50Vertical, mtf50Horizontal); });
}

int CheckPatternCircles(int cam_id) {
  return Guarded("CheckPatternCircles", [&](QVTester& tester) { return tester.CheckPatternCircles(cam_id); });
}

int SavePreview(void* data, int frame, int width, int height) {
  if (data == nullptr || width < 1 || height < 1) return QV_ERROR_INVALID_ARGUMENT;
  return Guarded("SavePreview", [&](QVTester& tester) {
    tester.SavePreview(data, frame, width, height);
    return QV_SUCCESS;
  });
}

int TestCameraCapture(bool front) {
  return Guarded("TestCameraCapture", [&](QVTester& tester) { return tester.TestCameraCapture(front); });
}

int setWorkingBinaryThresh(int value) {
  return Guarded("setWorkingBinaryThresh", [&](QVTester& tester) { return tester.setWorkingBinaryThresh(value); });
}

int getWorkingBinaryThresh() {
  return Guarded("getWorkingBinaryThresh", [](QVTester& tester) { return tester.getWorkingBinaryThresh(); });
}
