#ifndef QVTESTER_UNIT_TESTS_MODULE_TEST_H_
#define QVTESTER_UNIT_TESTS_MODULE_TEST_H_

#include <gmock/gmock.h>

#include <memory>
#include <string>

#include "qvtester/api.h"
#include "qvtester/host_properties.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"
#include "unit_tests/log_lines.h"

/// Tests through the function interface: each has a tester and a property store of its own, and its log lines are kept.
class ModuleTest : public ::testing::Test {
 protected:
  ModuleTest() {
    SetHostPropertyStore(store_.c_str());
    InitTestModule();
  }
  ~ModuleTest() override {
    FinalizeTestModule();
    SetHostPropertyStore(nullptr);
  }

  static void Load(int slot, const cv::Mat& image) {
    theTester->resources_[slot] = std::make_unique<QVResource>();
    theTester->resources_[slot]->SetImage(image);
  }
  static cv::Mat Loaded(int slot) {
    cv::Mat image;
    theTester->resources_[slot]->GetImage(&image);
    return image;
  }
  static QVResultData& Results() {
    QVResultData* results = nullptr;
    EXPECT_EQ(1, GetResult(&results));
    return *results;
  }

  std::string Property(const std::string& key) const { return ReadFile(store_ + "/" + key); }

  LogLines log_;
  TemporaryFolder folder_;
  std::string store_ = folder_.Path("properties");
};

#endif  // QVTESTER_UNIT_TESTS_MODULE_TEST_H_
