#include <algorithm>
#include <cmath>
#include <filesystem>
#include <memory>
#include <numeric>
#include <opencv2/imgcodecs.hpp>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "tools/commands.h"
#include "tools/measure.h"
#include "tools/program.h"

namespace qv {

namespace {

constexpr double kAgreePx = 3;
constexpr double kLeastAgreeing = 0.25;  // of the good matches
constexpr double kMostStretch = 1.2;

struct RegisterOptions : MeasureOptions {
  std::string reference, image, output;
};

struct Pose {
  cv::Point2d shift;  // of the reference's middle
  double turn_deg, scale, stretch;
};

// The parts of an affine map: its linear part is a turn after a stretch along some direction (polar decomposition).
Pose Decompose(const cv::Matx23d& m, cv::Size reference) {
  const cv::Vec3d middle((reference.width - 1) / 2.0, (reference.height - 1) / 2.0, 1);
  const cv::Vec2d to = m * middle;
  const cv::Matx22d linear(m(0, 0), m(0, 1), m(1, 0), m(1, 1));
  cv::Vec2d enlargements;
  cv::SVD::compute(linear, enlargements, cv::SVD::NO_UV);
  // Rows run down, so a turn that raises columns with rows is counter-clockwise.
  return {{to[0] - middle[0], to[1] - middle[1]},
          std::atan2(m(0, 1) - m(1, 0), m(0, 0) + m(1, 1)) * 180 / CV_PI,
          std::sqrt(std::fabs(cv::determinant(linear))),
          enlargements[0] / enlargements[1]};
}

int CountAgreeing(const QVTester::Unwarp& found) {
  const cv::Matx23d map(found.matrix);
  return static_cast<int>(std::count_if(found.good.begin(), found.good.end(), [&](const cv::DMatch& match) {
    const cv::Point2d from = found.reference_keypoints[match.queryIdx].pt;
    const cv::Point2d to = found.image_keypoints[match.trainIdx].pt;
    const cv::Vec2d at = map * cv::Vec3d(from.x, from.y, 1);
    return std::hypot(at[0] - to.x, at[1] - to.y) <= kAgreePx;
  }));
}

void Collect(Phase& phase, const QVTester::Unwarp& found) {
  phase.Add("good_matches", static_cast<double>(found.good.size()));
  phase.Add("agreeing_matches", CountAgreeing(found));
  const std::vector<double> matrix(found.matrix.begin<double>(), found.matrix.end<double>());
  std::vector<double> numbers(matrix.size());
  std::iota(numbers.begin(), numbers.end(), 0);
  phase.Add("matrix", numbers, matrix);
  const Pose pose = Decompose(cv::Matx23d(found.matrix), found.reference.size());
  phase.Add("shift_columns", pose.shift.x);
  phase.Add("shift_rows", pose.shift.y);
  phase.Add("turn", pose.turn_deg);
  phase.Add("scale", pose.scale);
  phase.Add("stretch", pose.stretch);
}

// The method trusts its three best matches: what the others say of them tells a false map.
void Look(Record& record) {
  if (record.phase.code != QV_SUCCESS) return;
  const double good = record.phase.Find("good_matches")->value();
  const double agreeing = record.phase.Find("agreeing_matches")->value();
  const double stretch = record.phase.Find("stretch")->value();
  if (agreeing >= kLeastAgreeing * good && agreeing > 3 && stretch <= kMostStretch) return;
  record.doubtful = true;
  const std::string shape = stretch < 1000 ? Format("stretches the picture by %.2f", stretch) : "folds it to a line";
  record.details.push_back(
      Format("%s: doubtful: %.0f of %.0f good matches agree with the map, which %s; one of the "
             "three matches that make it may be false",
             record.inputs[1].path.c_str(), agreeing, good, shape.c_str()));
}

std::string Report(const Record& record) {
  const auto value = [&](const char* figure) { return record.phase.Find(figure)->value(); };
  const std::vector<double>& m = record.phase.Find("matrix")->values;
  return Format("matches    %.0f good, %.0f agree with the map\n", value("good_matches"), value("agreeing_matches")) +
         Format("shift      %.2f columns, %.2f rows\n", value("shift_columns"), value("shift_rows")) +
         Format("turn       %.3f degrees counter-clockwise\n", value("turn")) +
         Format("scale      %.4f, stretch %.4f\n", value("scale"), value("stretch")) +
         Format("matrix     %11.6f %11.6f %11.3f\n           %11.6f %11.6f %11.3f\n", m[0], m[1], m[2], m[3], m[4],
                m[5]);
}

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

std::string Png(const cv::Mat& picture) { return Encode(picture, "-"); }

}  // namespace

CommandBody DeclareRegister(Options& command) {
  auto options = std::make_shared<RegisterOptions>();
  command.Argument("REFERENCE", options->reference, "Picture whose frame is taken; - is standard input");
  command.Argument("IMAGE", options->image, "Picture of the same scene, brought into that frame");
  command.Text("-o,--output", options->output, "Where the resampled picture goes: .png, .jpg, .bmp or .tif", "OUT");
  options->DeclareOn(command, "--matches", "Draw the good matches between both pictures");
  return [options] {
    if (!options->output.empty()) {
      Encode(cv::Mat(1, 1, CV_8UC3, cv::Scalar::all(0)), options->output);  // a name of no format is told first
    }
    if (options->output == "-") {
      if (options->json == "-" || options->annotate == "-") {
        throw Failure(kWrongUsage, "standard output takes one of picture, record and drawing");
      }
      options->quiet = true;
    }
    auto unwarped = std::make_shared<cv::Mat>();
    Measuring m;
    m.phase = "registration";
    m.test_name = "GetUnwarpedImage";
    m.inputs = {{QV_RESOURCE_CHART_STANDARD, options->reference}, {QV_RESOURCE_CHART_PHOTO, options->image}};
    m.run = [unwarped] {
      return theTester->GetUnwarpedImage(SlotPhoto(QV_RESOURCE_CHART_STANDARD), SlotPhoto(QV_RESOURCE_CHART_PHOTO),
                                         *unwarped);
    };
    m.collect = [](Phase& phase, const QVResultData& /*results*/) { Collect(phase, theTester->kept_->unwarp); };
    m.look = Look;
    m.report = Report;
    m.annotate = [](const Record& /*record*/) { return Png(theTester->DrawUnwarpMatches()); };
    RefuseInputAsOutput(options->output, m.inputs);
    const int status = Measure(*options, m);
    if (options->output.empty()) return status;
    if (unwarped->empty()) {
      std::error_code ignored;
      std::filesystem::remove(options->output, ignored);  // one of an earlier run would be taken for this run's
    } else {
      WriteOutput(options->output, Encode(*unwarped, options->output));
    }
    return status;
  };
}

}  // namespace qv
