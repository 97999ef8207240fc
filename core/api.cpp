// The exported functions: each forwards to the member of its name, behind one guard.

#include "qvtester/api.h"

#include <memory>
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

// Without a tester that is the answer, whatever the arguments.
template <typename Call>
int Guarded(const char* name, bool valid, Call&& call) noexcept {
  if (theTester == nullptr) return QV_ERROR_NO_TESTER;
  if (!valid) return QV_ERROR_INVALID_ARGUMENT;
  try {
    return call(*theTester);
  } catch (...) {
    return CodeOfException(name);
  }
}

}  // namespace

int InitTestModule() {
  try {
    if (theTester != nullptr) return theTester->Initialize();
    auto fresh = std::make_unique<QVTester>();
    const int code = fresh->Initialize();
    theTester = fresh.release();  // only when it is complete
    return code;
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
  return Guarded("RunTest", true, [&](QVTester& tester) { return tester.RunTest(test, fake_mode); });
}

int SetLDRResource(QV_RESOURCE_INDEX index, int width, int height, unsigned short* data) {
  return Guarded("SetLDRResource", width > 0 && height > 0 && data != nullptr,
                 [&](QVTester& tester) { return tester.SetResource(index, width, height, data); });
}

int SetHDRResource(QV_RESOURCE_INDEX index, int width, int height, bool flag, float* data) {
  return Guarded("SetHDRResource", width > 0 && height > 0 && data != nullptr,
                 [&](QVTester& tester) { return tester.SetHDRResource(index, width, height, flag, data); });
}

int SetResource(QV_RESOURCE_INDEX index, char* path) {
  return Guarded("SetResource", path != nullptr, [&](QVTester& tester) { return tester.SetResource(index, path); });
}

int SetResource(QV_RESOURCE_INDEX index, int width, int height, void* data) {
  return Guarded("SetResource", width > 0 && height > 0 && data != nullptr,
                 [&](QVTester& tester) { return tester.SetResource(index, width, height, data); });
}

int SetResourceWithList(QV_RESOURCE_INDEX index, std::vector<std::string> paths) {
  return Guarded("SetResourceWithList", true, [&](QVTester& tester) { return tester.SetResource(index, paths); });
}

int SetResourceWithLDRs(QV_RESOURCE_INDEX index, int width, int height, bool flag, unsigned short* first,
                        unsigned short* second, unsigned short* third, unsigned short* fourth) {
  return Guarded("SetResourceWithLDRs", true, [&](QVTester& tester) {
    return tester.SetResource(index, width, height, flag, first, second, third, fourth);
  });
}

int GetImage(QV_RESOURCE_INDEX index, int* width, int* height, unsigned char** data) {
  return Guarded("GetImage", true, [&](QVTester& tester) { return tester.GetLDRImage(index, width, height, data); });
}

int SaveHDRImage(QV_RESOURCE_INDEX index, char* path) {
  return Guarded("SaveHDRImage", true, [&](QVTester& tester) { return tester.SaveHDRImage(index, path); });
}

int GetResult(QVResultData** out) {
  return Guarded("GetResult", out != nullptr, [&](QVTester& tester) { return tester.GetResult(out); });
}

int SetProperty(QV_PROPERTY_INDEX index, void* value) {
  return Guarded("SetProperty", value != nullptr, [&](QVTester& tester) { return tester.SetProperty(index, value); });
}

int GetProperty(QV_PROPERTY_INDEX index, void* out) {
  return Guarded("GetProperty", out != nullptr, [&](QVTester& tester) { return tester.GetProperty(index, out); });
}

int ReleaseDataForTest(QV_TEST_INDEX test) {
  return Guarded("ReleaseDataForTest", true, [&](QVTester& tester) { return tester.ReleaseDataForTest(test); });
}

int ReleaseImage(QV_RESOURCE_INDEX index) {
  return Guarded("ReleaseImage", true, [&](QVTester& tester) { return tester.ReleaseImage(index); });
}

int ReleaseTestResult(QV_TEST_INDEX test) {
  return Guarded("ReleaseTestResult", true, [&](QVTester& tester) { return tester.ReleaseTestResult(test); });
}

int SetStep(int step) {
  return Guarded("SetStep", true, [&](QVTester& tester) { return tester.SetStep(step); });
}

int CheckMTF(float* mtf50Vertical, float* mtf50Horizontal) {
  return Guarded("CheckMTF", mtf50Vertical != nullptr && mtf50Horizontal != nullptr,
                 [&](QVTester& tester) { return tester.CheckMTF(mtf50Vertical, mtf50Horizontal); });
}

int CheckPatternCircles(int cam_id) {
  return Guarded("CheckPatternCircles", true, [&](QVTester& tester) { return tester.CheckPatternCircles(cam_id); });
}

int SavePreview(void* data, int frame, int width, int height) {
  return Guarded("SavePreview", data != nullptr && width > 0 && height > 0, [&](QVTester& tester) {
    tester.SavePreview(data, frame, width, height);
    return QV_SUCCESS;
  });
}

int TestCameraCapture(bool front) {
  return Guarded("TestCameraCapture", true, [&](QVTester& tester) { return tester.TestCameraCapture(front); });
}

int setWorkingBinaryThresh(int value) {
  return Guarded("setWorkingBinaryThresh", true,
                 [&](QVTester& tester) { return tester.setWorkingBinaryThresh(value); });
}

int getWorkingBinaryThresh() {
  return Guarded("getWorkingBinaryThresh", true, [](QVTester& tester) { return tester.getWorkingBinaryThresh(); });
}
