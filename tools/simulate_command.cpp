#include <cmath>
#include <filesystem>
#include <iostream>
#include <memory>
#include <opencv2/imgcodecs.hpp>
#include <sstream>

#include "chart/chart_layout.h"
#include "tools/camera.h"
#include "tools/commands.h"
#include "tools/method_law.h"
#include "tools/record.h"

namespace {

struct SimulateOptions {
  CameraModel camera;
  SfrChartStyle style;
  std::string output;
  std::string size = "4000x3000";
  std::string marks = "auto";
  bool quiet = false;
};

cv::Size ParseSize(const std::string& text) {
  int width = 0;
  int height = 0;
  char by = 0;
  std::istringstream words(text);
  words >> width >> by >> height;
  if (!words || !words.eof() || by != 'x' || std::min(width, height) < 16 || std::max(width, height) > 30000) {
    throw Failure(kWrongUsage, "--size " + text + ": give WIDTHxHEIGHT in pixels, 16 to 30000 each, as 4000x3000");
  }
  return {width, height};
}

double PixelsPerUnit(const CameraModel& camera) {
  const cv::Matx33d photo_from_scene = PhotoFromScene(camera, SfrChartBounds());
  return cv::norm(Map(photo_from_scene, {1, 0}) - Map(photo_from_scene, {0, 0}));
}

// "auto" suits the marks to an upright photo, so that turning the chart does not change it.
int ModuleOf(const std::string& marks, CameraModel camera) {
  for (const MarkSize& size : kMarkSizes) {
    if (marks == size.name) return size.module;
  }
  camera.turn_deg = 0;
  return SuitableMarks(PixelsPerUnit(camera)).module;
}

Json PointJson(cv::Point2d p) { return {{"x", p.x}, {"y", p.y}}; }

// What every measure of the photo should read; frequencies in units of Nyquist.
Json ChartTruth(const SimulateOptions& options) {
  const CameraModel& camera = options.camera;
  const cv::Matx33d photo_from_scene = PhotoFromScene(camera, SfrChartBounds());
  const double scale = PixelsPerUnit(camera);
  Json truth;
  truth["schema"] = "qvtester-truth-1";
  truth["scene"] = "chart";
  truth["parameters"] = {{"width", camera.size.width},
                         {"height", camera.size.height},
                         {"fill", camera.fill},
                         {"turn_deg", camera.turn_deg},
                         {"blur_px", camera.blur_px},
                         {"gain", camera.gain},
                         {"shading_percent", camera.shading_percent},
                         {"noise_percent", camera.noise_percent},
                         {"seed", camera.seed},
                         {"edge_angle_deg", options.style.edge_angle_deg},
                         {"module_units", options.style.module},
                         {"contrast", options.style.contrast}};
  truth["pixels_per_unit"] = scale;
  truth["module_px"] = scale * options.style.module;
  for (const auto& [x, y] : kMarkCentres) {
    truth["marks"].push_back(PointJson(Map(photo_from_scene, {static_cast<double>(x), static_cast<double>(y)})));
  }
  // Across either edge the pixel's square is seen turned by the edge's angle on the photo.
  const double edge = std::remainder(options.style.edge_angle_deg + camera.turn_deg, 90);
  const double mtf50 = method_law::TrueMtf50(camera.blur_px, edge);
  const int npix = static_cast<int>(kVerticalRegion.height * scale);
  const method_law::Bounds expected = method_law::MeasuredMtf50(camera.blur_px, npix);
  truth["edge_angle_deg"] = edge;
  truth["mtf50"] = {{"nyquist", mtf50}, {"cycles_per_pixel", mtf50 / 2}};
  truth["mtf50_expected_of_method"] = {{"nyquist_low", expected.low}, {"nyquist_high", expected.high}, {"npix", npix}};
  for (int i = 0; i < static_cast<int>(kPatches.size()); ++i) {
    const ChartPatch& patch = kPatches[i];
    const double level = camera.gain;
    truth["patches"].push_back({{"number", i},
                                {"name", patch.name},
                                {"drawn_srgb", {patch.red, patch.green, patch.blue}},
                                {"photo_srgb", {patch.red * level, patch.green * level, patch.blue * level}},
                                {"centre", PointJson(Map(photo_from_scene, PatchCentre(i)))}});
  }
  return truth;
}

std::string TruthPath(const std::string& photo) {
  return std::filesystem::path(photo).replace_extension(".truth.json");
}

void WritePhoto(const std::string& path, const cv::Mat& photo) {
  std::vector<uchar> file;
  const std::string extension = std::filesystem::path(path).extension();
  try {
    // Fast compression: the noise does not compress anyway.
    if (!cv::imencode(extension, photo, file, {cv::IMWRITE_PNG_COMPRESSION, 1, cv::IMWRITE_JPEG_QUALITY, 95})) {
      throw Failure(kWrongUsage, path + ": the photo can't be encoded");
    }
  } catch (const cv::Exception&) {
    throw Failure(kWrongUsage, path + ": name a .png, .jpg, .bmp or .tif file");
  }
  WriteWholeFile(path, {file.begin(), file.end()});
}

}  // namespace

CommandBody DeclareSimulate(CLI::App& command) {
  auto o = std::make_shared<SimulateOptions>();
  command.add_option("-o,--output", o->output, "Photo to write; its truth is written beside it")
      ->required()
      ->type_name("PHOTO");
  command.add_option("--size", o->size, "Pixels of the photo [4000x3000]")->type_name("WxH");
  command.add_option("--fill", o->camera.fill, "Share of the photo that the turned chart takes [0.8]")
      ->check(CLI::Range(0.02, 2.0))
      ->type_name("SHARE");
  command.add_option("--turn", o->camera.turn_deg, "Turn of the chart, counter-clockwise [0]")->type_name("DEG");
  command.add_option("--blur", o->camera.blur_px, "Gaussian blur, sigma [0]")
      ->check(CLI::Range(0.0, 100.0))
      ->type_name("PX");
  command.add_option("--gain", o->camera.gain, "Level of white paper in the photo, over 255 [0.92]")
      ->check(CLI::Range(0.0, 4.0))
      ->type_name("FACTOR");
  command.add_option("--shading", o->camera.shading_percent, "How much darker the photo's corners are [0]")
      ->check(CLI::Range(0.0, 100.0))
      ->type_name("PERCENT");
  command.add_option("--noise", o->camera.noise_percent, "Standard deviation of the noise, of 255 [0]")
      ->check(CLI::Range(0.0, 100.0))
      ->type_name("PERCENT");
  command.add_option("--seed", o->camera.seed, "Seed of the noise [1]")->type_name("N");
  command.add_option("--edge-angle", o->style.edge_angle_deg, "Angle of the slanted edges [5]")
      ->check(CLI::Range(3.0, 8.0))
      ->type_name("DEG");
  command
      .add_option("--contrast", o->style.contrast, "Stored level of the paper over that of the edges' dark side [5]")
      ->check(CLI::Range(1.1, 100.0))
      ->type_name("RATIO");
  command.add_option("--marks", o->marks, "Size of the finder marks [auto: suits the photo's size]")
      ->check(CLI::IsMember({"auto", "fine", "medium", "coarse"}))
      ->type_name("SIZE");
  command.add_flag("--quiet", o->quiet, "Print nothing");
  return [o] {
    o->camera.size = ParseSize(o->size);
    o->style.module = ModuleOf(o->marks, o->camera);
    const cv::Mat photo = TakePhoto(o->camera, SfrChart(o->style), SfrChartBounds());
    WritePhoto(o->output, photo);
    const std::string truth = TruthPath(o->output);
    WriteWholeFile(truth, ChartTruth(*o).dump(2) + "\n");
    if (!o->quiet) {
      std::cout << Format("%s  %d x %d\n%s\n", o->output.c_str(), photo.cols, photo.rows, truth.c_str());
    }
    return static_cast<int>(kWithinLimits);
  };
}
