// The tester's life: constructor, Initialize, Release, properties, step, threshold.

#include "qvtester/tester.h"

#include <algorithm>
#include <cstring>

#include "core/property_table.h"
#include "core/test_table.h"
#include "qvtester/log.h"

namespace {

const QVProperty* FindProperty(int index) {
  const auto* row = std::lower_bound(std::begin(kProperties), std::end(kProperties), index,
                                     [](const QVProperty& property, int wanted) { return property.index < wanted; });
  return row != std::end(kProperties) && row->index == index ? row : nullptr;
}

struct Default {
  QVTester& tester;

  void operator()(const IntProperty& p) const { tester.*p.member = p.initial; }
  void operator()(const FloatProperty& p) const { tester.*p.member = p.initial; }
  void operator()(const FloatArray& p) const { std::copy(p.initial.begin(), p.initial.end(), tester.*p.member); }
  void operator()(const MatrixProperty& p) const {
    cv::Mat matrix(p.rows, p.cols, CV_32F);
    std::copy_n(p.initial.begin(), matrix.total(), matrix.ptr<float>());
    tester.*p.member = matrix;
  }
  void operator()(const RegionList& /*unset*/) const {}
  void operator()(const SharedTable& /*unset*/) const {}
  void operator()(const PatchValues& p) const { std::fill_n(tester.*p.member, 72, 0.0f); }
};

struct Setter {
  QVTester& tester;
  const void* value;

  template <typename T>
  const T* Values() const {
    return static_cast<const T*>(value);
  }

  int operator()(const IntProperty& p) const { return Copy(&(tester.*p.member)); }
  int operator()(const FloatProperty& p) const { return Copy(&(tester.*p.member)); }
  int operator()(const FloatArray& p) const { return Copy(&(tester.*p.member)); }
  int operator()(const MatrixProperty& p) const {
    cv::Mat& matrix = tester.*p.member;
    std::copy_n(Values<float>(), matrix.total(), matrix.ptr<float>());
    return QV_SUCCESS;
  }
  int operator()(const RegionList& p) const {
    const int count = tester.*p.count;
    if (count < 0) return QV_ERROR_INVALID_ARGUMENT;
    auto records = std::make_unique<QVRegionRecord[]>(count);
    std::copy_n(Values<QVRegionRecord>(), count, records.get());
    tester.*p.member = {std::move(records), count};
    return QV_SUCCESS;
  }
  int operator()(const SharedTable& p) const {
    tester.*p.member = cv::Mat(1, p.length, CV_32S, const_cast<void*>(value));
    return QV_SUCCESS;
  }
  int operator()(const PatchValues& p) const {
    tester.*p.set = true;
    return Copy(&(tester.*p.member));
  }

 private:
  template <typename T>
  int Copy(T* member) const {
    std::memcpy(member, value, sizeof(T));
    return QV_SUCCESS;
  }
};

struct Getter {
  const QVTester& tester;
  void* out;

  int operator()(const IntProperty& p) const { return Copy(&(tester.*p.member), sizeof(int)); }
  int operator()(const FloatProperty& p) const { return Copy(&(tester.*p.member), sizeof(float)); }
  int operator()(const FloatArray& p) const { return Copy(tester.*p.member, sizeof(tester.*p.member)); }
  // Nine floats for every matrix, the five distortion coefficients included: callers give room for nine.
  int operator()(const MatrixProperty& p) const {
    const cv::Mat& matrix = tester.*p.member;
    std::array<float, 9> values = {};
    std::copy_n(matrix.ptr<float>(), matrix.total(), values.begin());
    return Copy(values.data(), sizeof(values));
  }
  int operator()(const RegionList& p) const {
    const QVRegionRecord* records = (tester.*p.member).records.get();
    return Copy(&records, sizeof(void*));
  }
  int operator()(const SharedTable& p) const {
    const cv::Mat& table = tester.*p.member;
    return table.empty() ? QV_ERROR_INVALID_ARGUMENT : Copy(table.ptr<int>(), p.length * sizeof(int));
  }
  int operator()(const PatchValues& p) const { return Copy(tester.*p.member, sizeof(tester.*p.member)); }

 private:
  int Copy(const void* value, std::size_t bytes) const {
    std::memcpy(out, value, bytes);
    return QV_SUCCESS;
  }
};

}  // namespace

QVTester::QVTester() : kept_(std::make_unique<Kept>()) {
  for (const QVProperty& property : kProperties) std::visit(Default{*this}, property.kind);
}

QVTester::~QVTester() { Release(); }

int QVTester::Initialize() {
  auto fresh = std::make_unique<QVResultData>();
  Release();
  results_ = std::move(fresh);
  return QV_SUCCESS;
}

int QVTester::Release() {
  for (auto& resource : resources_) resource.reset();
  kept_->image_list = ImageList();
  for (const QVTest& test : kTests) ReleaseTestResult(test.index);
  results_.reset();
  return QV_SUCCESS;
}

int QVTester::SetProperty(QV_PROPERTY_INDEX index, void* value) {
  const QVProperty* property = FindProperty(index);
  if (property == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return std::visit(Setter{*this, value}, property->kind);
}

int QVTester::GetProperty(QV_PROPERTY_INDEX index, void* out) {
  const QVProperty* property = FindProperty(index);
  if (property == nullptr) return QV_ERROR_INVALID_ARGUMENT;
  return std::visit(Getter{*this, out}, property->kind);
}

int QVTester::SetStep(int step) {
  QVDEBUGP("%s, step: %d", "SetStep", step);
  step_ = step;
  return QV_DONE;
}

int QVTester::setWorkingBinaryThresh(int value) {
  QVDEBUGP("%s value: %d", "setWorkingBinaryThresh", value);
  prop_binary_thr_working_ = value;
  return QV_SUCCESS;
}

int QVTester::getWorkingBinaryThresh() {
  QVDEBUGP("%s value: %d", "getWorkingBinaryThresh", prop_binary_thr_working_);
  return prop_binary_thr_working_;
}
