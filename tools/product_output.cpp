// --output of the commands whose measurement makes a picture of its inputs.

#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "desk/base/failure.h"
#include "desk/measure/measurement.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

std::string Encode(const cv::Mat& picture, const std::string& path) {
  const std::string extension = path == "-" ? ".png" : std::filesystem::path(path).extension().string();
  std::vector<uchar> file;
  try {
    cv::imencode(extension, picture, file);
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
    throw Failure(kWrongUsage, path + ": name a .png, .jpg, .bmp or .tif file");
  }
  return {file.begin(), file.end()};
}

class ProductOutput : public CommandExtra {
 public:
  void Declare(Options& command) override {
    command.Text("-o,--output", path_, "Where the resampled picture goes: .png, .jpg, .bmp or .tif", "OUT");
  }

  void Prepare() override {
    if (path_.empty()) return;
    Encode(cv::Mat(1, 1, CV_8UC3, cv::Scalar::all(0)), path_);  // a name of no format is told first
  }

  std::vector<NamedFile> Outputs() const override { return {{"the resampled picture", path_}}; }

  void Write(const Record& record) const override {
    if (path_.empty()) return;
    const cv::Mat product = record.finding == nullptr ? cv::Mat() : record.finding->Product();
    if (!product.empty()) {
      WriteOutput(path_, Encode(product, path_));
    } else if (path_ != "-") {
      std::error_code ignored;
      std::filesystem::remove(path_, ignored);  // one of an earlier run would be taken for this run's
    }
  }

 private:
  std::string path_;
};

}  // namespace

std::shared_ptr<CommandExtra> MakeProductOutput() { return std::make_shared<ProductOutput>(); }

}  // namespace qv
