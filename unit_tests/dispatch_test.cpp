#include <gmock/gmock.h>

#include <set>

#include "unit_tests/failing_new.h"
#include "unit_tests/module_test.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsSupersetOf;

QV_TEST_INDEX Index(int test) { return static_cast<QV_TEST_INDEX>(test); }

class Dispatch : public ModuleTest {
 protected:
  static void Fill(int slot) { Load(slot, cv::Mat(20, 20, CV_8UC3, cv::Scalar(200, 3, 7))); }
};

TEST_F(Dispatch, TestsNeedTheirSlots) {
  const std::vector<std::vector<int>> needs = {
      {0, 1}, {2},  {4},  {},   {4},      {13}, {4},  {4},      {9},  {10}, {11}, {12}, {7, 8}, {14, 15}, {17},
      {16},   {17}, {19}, {23}, {21, 22}, {24}, {26}, {28, 29}, {34}, {34}, {35}, {34}, {30},   {31},     {32, 36}};
  for (int test = 0; test < 30; ++test) {
    InitTestModule();
    for (const int slot : needs[test]) {
      EXPECT_EQ(-98, RunTest(Index(test), false)) << "test " << test;
      Fill(slot);
    }
    EXPECT_EQ(test == 3 ? -97 : 1, theTester->ValidateTest(Index(test))) << "test " << test;
  }
  for (const int unknown : {3, 30, -1, 1 << 30}) {
    const LogLines log;
    EXPECT_EQ(-97, RunTest(Index(unknown), false));
    EXPECT_THAT(LogLines::Texts(), ElementsAre("[OKAPI] Error : Invalid parameter or insufficient image"));
  }
  Fill(13);
  SetStep(4);
  const LogLines log;
  EXPECT_EQ(-97, RunTest(Index(5), true)) << "a test without a routine";
  EXPECT_THAT(LogLines::Texts(), ElementsAre("[OKAPI] RunTest, testindex: 5, fake_mode: 1, step: 4"));
}

TEST_F(Dispatch, ASlotWithoutAnImageIsUnusable) {
  theTester->resources_[16] = std::make_unique<QVResource>();
  EXPECT_EQ(-95, RunTest(QV_TEST_CAMERA_FLASH, false));
  EXPECT_EQ(-98, theTester->TestCameraAutofocus()) << "a direct call with its slot empty";
  QVTester bare;  // never initialised: no slot is filled, and no result block is needed to say so
  EXPECT_THAT((std::array{bare.TestCameraFlash(), bare.TestCameraFlashVT(), bare.TestCameraAutofocus(),
                          bare.TestCameraCapture(false), bare.CheckPatternCircles(0)}),
              Each(-98));
}

TEST_F(Dispatch, RecordsOwnTheirArrays) {  // the address sanitizer sees what is freed twice or not at all
  QVPhase1Result& record = Results().phase1_[4];
  for (int i = 0; i < 2; ++i) {
    theTester->SetResultImage(&record, 2, 3, new unsigned char[6]{});
    theTester->SetResultRawData(&record, 4, 5, new float[20]{});
    theTester->SetResultErrorPoint(&record, new QVRECT[2]{}, 2);
  }
  theTester->SetResultImage(&record, 2, 3, record.image_);  // its own again
  record.image_[5] = 1;
  EXPECT_EQ(5, record.raw_height_);
  EXPECT_EQ(1, ReleaseTestResult(Index(4)));
  EXPECT_EQ(nullptr, record.image_);
  EXPECT_EQ(0, record.error_point_count_);
  for (QVPhase1Result& any : Results().phase1_) theTester->SetResultRawData(&any, 1, 1, new float[1]{});
  for (int test = 0; test < 13; ++test) {
    EXPECT_NE(nullptr, Results().phase1_[test].raw_data_) << test;
    ReleaseTestResult(Index(test));
    EXPECT_EQ(nullptr, Results().phase1_[test].raw_data_) << test;
  }
  theTester->SetResultRawData(&record, 1, 1, new float[1]{});  // left for Initialize
  EXPECT_EQ(1, InitTestModule());
  for (int test = -1; test <= 30; ++test) EXPECT_EQ(test >= 0 && test < 30 ? 1 : -97, ReleaseTestResult(Index(test)));
}

TEST_F(Dispatch, ReleasingATestsDataEmptiesItsSlots) {
  const std::vector<std::set<int>> releases = {{0, 1}, {0, 2, 3}, {4},  {},   {4},  {13},  {4},
                                               {4},    {9},       {10}, {11}, {12}, {7, 8}};
  for (int test = -1; test <= 30; ++test) {
    InitTestModule();
    for (int slot = 0; slot < QVTester::kSlotCount; ++slot) Fill(slot);
    const std::set<int> emptied = test >= 0 && test <= 12 ? releases[test] : std::set<int>();
    EXPECT_EQ(emptied.empty() ? -97 : 1, ReleaseDataForTest(Index(test))) << "test " << test;
    for (int slot = 0; slot < QVTester::kSlotCount; ++slot) {
      EXPECT_EQ(emptied.count(slot) == 1, theTester->resources_[slot] == nullptr) << "test " << test << ", " << slot;
    }
  }
}

TEST_F(Dispatch, ASecondSuccessTakesTheFirstOnesPlace) {  // the address sanitizer sees what the first one left
  for (const int slot : {16, 17, 18, 23, 24, 25}) Load(slot, DrawChart());
  for (const int slot : {14, 15, 19, 21, 22, 26}) Load(slot, cv::Mat(60, 80, CV_8UC3, cv::Scalar::all(180 + slot)));
  for (int test = QV_TEST_CAMERA_PREVIEW; test <= QV_TEST_LENS_DUST_2; ++test) {
    for (int run = 0; run < 2; ++run) EXPECT_EQ(1, RunTest(Index(test), false)) << "test " << test;
  }
}

TEST_F(Dispatch, TheTesterOutlivesASecondInit) {
  const QVTester* const before = theTester;
  EXPECT_EQ(1, setWorkingBinaryThresh(-99));
  Fill(17);
  Results().flash_mean_ = 5;
  EXPECT_EQ(1, InitTestModule());
  EXPECT_EQ(before, theTester);
  EXPECT_EQ(-99, getWorkingBinaryThresh());
  EXPECT_EQ(0, SetStep(3));
  EXPECT_THAT(LogLines::Texts(), IsSupersetOf({"setWorkingBinaryThresh value: -99", "getWorkingBinaryThresh value: -99",
                                               "SetStep, step: 3"}));
  EXPECT_EQ(nullptr, theTester->resources_[17]);
  EXPECT_EQ(0.0f, Results().flash_mean_);
}

TEST_F(Dispatch, NullPointersAreRefused) {
  float value = 5;
  EXPECT_THAT((std::array{GetResult(nullptr), SetProperty(QV_PROPERTY_BINARY_THR_WORKING, nullptr),
                          GetProperty(QV_PROPERTY_BINARY_THR_WORKING, nullptr), CheckMTF(&value, nullptr)}),
              Each(-97));
  EXPECT_EQ(-98, CheckMTF(&value, &value));
  EXPECT_EQ(5.0f, value);
  EXPECT_EQ(1, GetImage(QV_RESOURCE_CHART_PHOTO, nullptr, nullptr, nullptr));
  EXPECT_EQ(1, SaveHDRImage(QV_RESOURCE_HDR_FIRST, nullptr));
  EXPECT_EQ(1, SetResourceWithLDRs(QV_RESOURCE_HDR_FIRST, 0, 0, false, nullptr, nullptr, nullptr, nullptr));
}

TEST(WithoutATester, EveryFunctionSaysSo) {
  const LogLines log;
  EXPECT_EQ(0, FinalizeTestModule());
  EXPECT_THAT(LogLines::All(), ElementsAre("[OKAPI] [OKAPI] finalize vision test\r\n"));
  ASSERT_EQ(nullptr, theTester);
  float value = 0;
  char path[] = "a.png";
  QVResultData* results = nullptr;
  EXPECT_THAT((std::array{RunTest(QV_TEST_CAMERA_FLASH, false), SetResource(QV_RESOURCE_CHART_PHOTO, path),
                          GetResult(&results), SetProperty(QV_PROPERTY_BINARY_THR_WORKING, &value),
                          ReleaseImage(QV_RESOURCE_HDR_FIRST), SetStep(1), CheckMTF(&value, &value),
                          getWorkingBinaryThresh(), GetImage(QV_RESOURCE_CHART_PHOTO, nullptr, nullptr, nullptr),
                          SaveHDRImage(QV_RESOURCE_HDR_FIRST, nullptr), SetResource(QV_RESOURCE_CHART_PHOTO, nullptr),
                          SetLDRResource(QV_RESOURCE_CHART_PHOTO, 0, 0, nullptr), GetResult(nullptr),
                          SetHDRResource(QV_RESOURCE_HDR_FIRST, 0, 0, true, nullptr), CheckMTF(nullptr, nullptr),
                          SetResource(QV_RESOURCE_CHART_PHOTO, 0, 0, static_cast<void*>(nullptr)),
                          SetProperty(QV_PROPERTY_BINARY_THR_WORKING, nullptr), SavePreview(nullptr, 0, 0, 0),
                          GetProperty(QV_PROPERTY_BINARY_THR_WORKING, nullptr)}),
              Each(-96));
}

TEST(WithoutATester, HalfATesterIsNone) {
  const auto init = [](int allocations) {
    new_left = allocations;
    const int code = InitTestModule();
    new_left = -1;
    return code;
  };
  QVResultData* results = nullptr;
  int allowed = 0;
  for (; init(allowed) != 1; ++allowed) {
    ASSERT_LT(allowed, 100);
    EXPECT_EQ(-96, GetResult(&results)) << allowed << " allocations";
  }
  EXPECT_GT(allowed, 2) << "nothing was refused";
  EXPECT_EQ(1, GetResult(&results));
  EXPECT_EQ(-99, init(0)) << "no memory for a new result block";
  EXPECT_EQ(1, GetResult(&results)) << "the tester there is stays";
  FinalizeTestModule();
  EXPECT_EQ(-96, GetResult(&results)) << "a tester that is gone";
}

}  // namespace
