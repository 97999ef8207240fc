// --truth of the sharpness commands: true figure, what this method makes of it, and what was measured, side by side.

#include <algorithm>
#include <filesystem>
#include <opencv2/core.hpp>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/measure/sharpness.h"
#include "desk/simulation/camera.h"
#include "desk/simulation/method_law.h"
#include "tools/commands.h"

namespace qv {

namespace {

// Columns across the edge, whose parity bounds what the method can read; from the axis of the curve, 2 k / npix.
int ColumnsAcross(const Record& record, int otherwise) {
  const Reading* curve = record.phase.Find("sfr_vertical");
  return curve == nullptr ? otherwise : cvRound(2 / curve->axis.at(1));
}

CameraModel LensOf(const Json& parameters) {
  CameraModel lens;
  lens.blur_px = parameters.at("blur_px");
  lens.defocus_px = parameters.at("defocus_px");
  lens.smear_px = {parameters.at("smear_px").at("x"), parameters.at("smear_px").at("y")};
  return lens;
}

// Straightening a turned chart interpolates between pixels, which costs a further sinc^2 along the way.
std::string Compare(const Record& record, const Json& truth) {
  const int npix = ColumnsAcross(record, truth.at("npix"));
  const CameraModel lens = LensOf(truth.at("parameters"));
  const auto straightened_by = static_cast<int>(record.phase.Find("straightened_by")->value());
  std::string text = "MTF50, Nyquist       true   expected of the method   measured   by ISO 12233\n";
  for (const std::string region : kRegionNames) {
    const Json& edge = truth.at("mtf50").at(region);
    const double angle = edge.at("edge_direction_deg").get<double>() * CV_PI / 180;
    const auto response = [&](double f) {
      const double interpolated = straightened_by == 0 ? 1 : method_law::Sinc(f);
      return LensResponse(lens, f, {-std::sin(angle), std::cos(angle)}) * interpolated * interpolated;
    };
    const auto [low, high] = method_law::MeasuredMtf50(response, npix);
    text += Format("  %-14s   %.4f      %.4f to %.4f       %.4f         %.4f\n", region.c_str(),
                   edge.at("mtf50_nyquist").get<double>(), low, high, record.phase.Find("mtf50_" + region)->value(),
                   record.phase.Find("mtf50_iso_" + region)->value());
  }
  return text +
         Format("  (expected of a region %d pixels across, straightened by %d degrees; noise moves single readings)\n",
                npix, straightened_by);
}

// Earlier versions kept no digests; whether the photo can be read at all is told when it is measured.
void RefuseOtherPhoto(const Json& truth, const Input& photo, const std::string& path) {
  if (!truth.is_object() || !truth.contains("sha256") || !truth["sha256"].is_object()) return;
  const Json& digests = truth["sha256"];
  std::error_code ignored;
  if (!photo.content && !std::filesystem::is_regular_file(photo.name, ignored)) return;
  const std::string digest =
      HexDigest(photo.content ? *photo.content : ReadWholeFile(photo.name, kCouldNotMeasure), "SHA256");
  if (std::any_of(digests.begin(), digests.end(), [&](const Json& one) { return one == digest; })) return;
  throw Failure(kWrongUsage, Printable(path) + ": the truth of another photo than " + Printable(photo.name));
}

// NOLINTNEXTLINE(bugprone-exception-escape): letting go of JSON throws nothing
class TruthComparison : public CommandExtra {
 public:
  void Declare(Options& command) override {
    command.Text("--truth", path_, "Truth of a simulated photo, to compare with", "FILE");
  }

  void Prepare() override {
    if (!path_.empty()) truth_ = ReadJson(path_);
  }

  // A simulated photo's levels stand for light as its truth says; before version 0.6 they were the light itself.
  void Complete(Request& request) const override {
    if (path_.empty()) return;
    RefuseOtherPhoto(truth_, request.inputs.at(0), path_);
    if (request.parameters.contains("transfer")) return;
    const auto place = Json::json_pointer("/parameters/transfer");
    const bool srgb = truth_.contains(place) && truth_[place] == "srgb";
    request.parameters["transfer"] = srgb ? "srgb" : "linear";
  }

  std::string Report(const Record& record) const override {
    if (path_.empty()) return "";
    try {
      return Compare(record, truth_);
    } catch (const Json::exception& e) {
      throw Failure(kWrongUsage, Printable(path_) + ": not the truth of a simulated chart photo: " + SentenceOf(e));
    }
  }

 private:
  std::string path_;
  Json truth_;
};

}  // namespace

std::shared_ptr<CommandExtra> MakeTruthComparison() { return std::make_shared<TruthComparison>(); }

}  // namespace qv
