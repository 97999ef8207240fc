// Fast forms against their plain forms on whatever bytes libFuzzer comes up with: results must agree to the last bit.
//   fast_forms_fuzzer -max_total_time=60

#include <fuzzer/FuzzedDataProvider.h>

#include <cstdio>
#include <cstdlib>

#include "core/file_gate.h"
#include "unit_tests/plain/agreement.h"

namespace {

using Bytes = FuzzedDataProvider;

class FuzzedDraws : public Draws {
 public:
  explicit FuzzedDraws(Bytes& bytes) : bytes_(bytes) {}
  int Whole(int low, int high) override { return bytes_.ConsumeIntegralInRange(low, high); }
  double Real(double low, double high) override { return bytes_.ConsumeFloatingPointInRange(low, high); }
  void Fill(cv::Mat matrix, double low, double high) override {
    for (int i = 0; i < matrix.rows; ++i) {
      cv::Mat row = matrix.row(i).reshape(1);
      for (int j = 0; j < row.cols; ++j) {
        const double share = bytes_.ConsumeIntegral<std::uint8_t>() / 256.0;
        row.col(j).setTo(row.depth() == CV_8U ? std::floor(low + share * (high - low)) : low + share * (high - low));
      }
    }
  }

 private:
  Bytes& bytes_;
};

void Demand(bool same, const char* what) {
  if (same) return;
  std::fprintf(stderr, "%s: not as its plain form\n", what);
  std::abort();
}

// No plain form: whatever a file holds, its header is read within its bytes.
void Gate(Bytes& bytes) {
  static const char* const kStarts[] = {"\xFF\xD8\xFF", "\xFF\x4F\xFF\x51", "BM", "P6\n", "P7\n",
                                        "#?RGBE\n",     "\x76\x2F\x31\x01"};
  const std::string start = bytes.PickValueInArray(kStarts);
  std::vector<unsigned char> file(start.begin(), start.end());
  const std::vector<unsigned char> rest = bytes.ConsumeRemainingBytes<unsigned char>();
  if (!rest.empty() && rest[0] % 2 == 0) file.clear();
  file.insert(file.end(), rest.begin(), rest.end());
  Demand(RefusePicture(file, 0) != nullptr, "RefusePicture");
  static_cast<void>(StartsAsFilm(file));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static constexpr struct {
    const char* name;
    plain::Agreement (*compare)(Draws& any);
  } kForms[] = {{"GetFinderPoints", plain::ScanOfRunsAndOfPixels},
                {"FindMarks", plain::ScanOfThePhotoAndOfItsCut},
                {"DetectDot", plain::Dots},
                {"CalculateSFR", plain::Sfr},
                {"ErrorAreaClustering", plain::Areas},
                {"rgb2xyz and xyz2cct", plain::Colours},
                {"WarpRegion", plain::Warp},
                {"DarkMask", plain::DarkPixels}};
  Bytes bytes(data, size);
  const auto subject = bytes.ConsumeIntegralInRange<std::size_t>(0, std::size(kForms));
  if (subject == std::size(kForms)) {
    Gate(bytes);
  } else {
    FuzzedDraws any(bytes);
    Demand(kForms[subject].compare(any).same, kForms[subject].name);
  }
  return 0;
}
