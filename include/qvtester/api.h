#ifndef QVTESTER_API_H_
#define QVTESTER_API_H_

// The functions that a test application calls, in this order: InitTestModule, SetProperty, the setters that load the
// slots of a test, RunTest, GetResult, the release calls, and at the end FinalizeTestModule. One thread, no overlap.
//
// All answer a QV_RESULT_CODE; no exception leaves them. Common to all: QV_ERROR_NO_TESTER before InitTestModule,
// QV_ERROR_INVALID_ARGUMENT for a null pointer, a size below 1 or an index out of range (nothing changes),
// QV_ERROR_UNUSABLE_INPUT when OpenCV refuses what a slot holds, QV_ERROR_INTERNAL for any other failure.

#include <string>
#include <vector>

#include "qvtester/indices.h"
#include "qvtester/results.h"

class QVTester;

/// The one tester of the process; null before InitTestModule and after FinalizeTestModule.
extern QV_API QVTester* theTester;

/// Creates the tester, or empties the slots and results of the one there is; properties keep their values. Answers 1.
QV_API int InitTestModule();
/// Destroys the tester and all it holds. Answers 0, also without a tester.
QV_API int FinalizeTestModule();

/// Copies a property's value in from, or out to, memory of the property's type (`qvtester list properties`). The
/// histograms 87 and 88 are not copied in: the tester reads them where the caller keeps them.
QV_API int SetProperty(QV_PROPERTY_INDEX index, void* value);
QV_API int GetProperty(QV_PROPERTY_INDEX index, void* out);

/// Stores the caller's step number, which is logged and selects the dirt-location property. Answers 0.
QV_API int SetStep(int step);

/// Grey level at which chart photos are binarised (property 93). Setting answers 1, without a range check.
QV_API int setWorkingBinaryThresh(int value);
QV_API int getWorkingBinaryThresh();

/// Copies a 16-bit image: height x width pixels of three values, rows packed, as they come. Slots 14 to 35.
QV_API int SetLDRResource(QV_RESOURCE_INDEX index, int width, int height, unsigned short* data);
/// Copies an HDR buffer: height x width pixels of three floats, rows packed. Slots 0 to 13.
QV_API int SetHDRResource(QV_RESOURCE_INDEX index, int width, int height, bool flag, float* data);
/// Reads an image file (slots 14 to 33, as 8-bit colour) or opens a video file (34, 35). -97 for what is no regular
/// file, no picture or film by its first bytes, or a picture of more than 200 megapixels (qvtester/resource.h).
QV_API int SetResource(QV_RESOURCE_INDEX index, char* path);
/// Converts a preview frame, NV21 of height + height / 2 rows and width columns, to four 8-bit channels.
/// -95 for a size that NV21 can't have.
QV_API int SetResource(QV_RESOURCE_INDEX index, int width, int height, void* data);
/// Reads a list of image files into slot 36: registered onto the first, binarised, taken apart into principal
/// components. -97 for an empty list or a file that is missing or unreadable, -90 when one can't be registered; nothing
/// changes then.
QV_API int SetResourceWithList(QV_RESOURCE_INDEX index, std::vector<std::string> paths);
/// Inert: answers 1 and does nothing.
QV_API int SetResourceWithLDRs(QV_RESOURCE_INDEX index, int width, int height, bool flag, unsigned short* first,
                               unsigned short* second, unsigned short* third, unsigned short* fourth);
/// Inert: answers 1 and touches no output.
QV_API int GetImage(QV_RESOURCE_INDEX index, int* width, int* height, unsigned char** data);
/// Inert: answers 1 and writes nothing.
QV_API int SaveHDRImage(QV_RESOURCE_INDEX index, char* path);

/// Empties one of the slots 0 to 13; -97 for any other, which stays as it is until InitTestModule.
QV_API int ReleaseImage(QV_RESOURCE_INDEX index);

/// Runs a test on what its slots hold. fake_mode reaches the two lens-dust tests only.
/// Answers the test's own code; -97 for an unknown test or one without a routine, -98 when a slot it needs is empty.
QV_API int RunTest(QV_TEST_INDEX test, bool fake_mode);

/// Hands out the result block, which stays the tester's own.
QV_API int GetResult(QVResultData** out);

/// Frees the arrays that a test left in the result block.
QV_API int ReleaseTestResult(QV_TEST_INDEX test);

/// Frees input slots and result of one of the tests 0 to 12; -97 for test 3 and any other.
QV_API int ReleaseDataForTest(QV_TEST_INDEX test);

/// Sharpness of the photo in slot 17 outside the numbered tests: both MTF50 values, in units of Nyquist
/// (1.0 = 0.5 cycles/pixel). -91 when three finder marks are not found, -98 when the slot is empty; outputs untouched.
QV_API int CheckMTF(float* mtf50Vertical, float* mtf50Horizontal);

/// Looks for the chart's three finder marks in the preview frame of slot 17 and publishes what it finds as system
/// properties (cam_id 0: main camera, 2: second rear camera). 1 when exactly three were found, else 0; -98 without a
/// frame.
QV_API int CheckPatternCircles(int cam_id);

/// Saves a preview frame (NV21 of height + height / 2 rows and width columns) as vi_pview_<frame / 3>.jpg in the
/// preview folder. Answers 1, also when the file can't be written; -95 for a size that NV21 can't have.
QV_API int SavePreview(void* data, int frame, int width, int height);

/// Test 16 (false) or 20 (true) by its own name: 1, -91, -87 or -98.
QV_API int TestCameraCapture(bool front);

#endif  // QVTESTER_API_H_
