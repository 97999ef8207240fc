#include <algorithm>
#include <array>
#include <filesystem>
#include <iostream>
#include <memory>
#include <optional>
#include <set>
#include <sstream>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/simulation/camera_table.h"
#include "desk/simulation/film.h"
#include "desk/simulation/photo_file.h"
#include "desk/simulation/simulation.h"
#include "qvtester/resource.h"
#include "tools/commands.h"
#include "tools/options.h"
#include "tools/program.h"

namespace qv {

namespace {

struct SimulateOptions : SimulationOptions {
  PhotoFile file;
  FilmStyle film;
  std::string lost;
  bool quiet = false;
  std::string size, cast = "1,1,1", smear = "0,0", motion = "4,0", tint = "1,1,1", saturation = "auto",
                    light = "255,214,170";
  std::string pipeline = "none", transfer = "auto", mosaic = "auto";
  std::array<std::optional<double>, std::size(kCameraNumbers)> numbers;  // as given

  bool is_film() const { return std::find(FilmScenes().begin(), FilmScenes().end(), scene) != FilmScenes().end(); }
};

// "photo.png", then "photo.second.png", or the name that the scene gives: "photo.samples/00.png".
std::string NumberedPath(const std::string& path, const Simulation& simulation, std::size_t number) {
  if (number == 0) return path;
  const std::string name = simulation.names.empty() ? "second" : simulation.names.at(number - 1);
  std::filesystem::path other(path);
  return other.replace_extension("." + name + other.extension().string());
}

// Those of a scene's further photos. One that holds other files is refused: it would be read as a whole.
void MakeFolders(const std::string& path, const Simulation& simulation) {
  std::set<std::filesystem::path> files;
  for (std::size_t i = 0; i < simulation.names.size(); ++i) files.insert(NumberedPath(path, simulation, i + 1));
  for (const std::filesystem::path& file : files) {
    const std::filesystem::path folder = file.parent_path();
    if (folder.empty()) continue;
    std::error_code failed;
    std::filesystem::create_directories(folder, failed);
    if (failed) throw Failure(kWrongUsage, folder.string() + ": can't be made: " + failed.message());
    for (const auto& entry : std::filesystem::directory_iterator(folder)) {
      if (files.count(entry.path()) == 0) {
        throw Failure(kWrongUsage, folder.string() + ": holds " + entry.path().filename().string() +
                                       ", which is not of this run; name another photo");
      }
    }
  }
}

// The camera's numbers are made of their table; those of --pipeline phone say so.
void DeclareCamera(Options& command, SimulateOptions& o) {
  command.Text("--size", o.size, "Pixels of the photo, 4000x3000; of a film, 1280x720; 16 to 30000 each", "WxH");
  for (std::size_t i = 0; i < o.numbers.size(); ++i) {
    const CameraNumber& row = kCameraNumbers[i];
    const std::string phone = row.phone ? Format("; phone: %g", *row.phone) : "";
    command.Number(row.option, o.numbers[i], row.low, row.high, Format("%g", CameraModel().*row.member) + phone,
                   row.help, row.unit);
  }
  command.Seed("--seed", o.camera.seed, "Seed of the noise");
  command.Text("--smear", o.smear, "Straight motion during the exposure; -100 to 100 each", "DX,DY");
  command.Text("--cast", o.cast, "Colour cast: factors on red, green and blue; 0 to 16 each", "R,G,B");
}

void DeclareDevelopment(Options& command, SimulateOptions& o) {
  command.Choice("--pipeline", o.pipeline, {"none", "phone"},
                 "What becomes of the sensor's levels: phone does what phones do, each part as given or by its default "
                 "for phones",
                 "NAME");
  command.Choice(
      "--transfer", o.transfer, {"auto", "none", "srgb"},
      "srgb: the scene's levels stand for light, on which the camera acts, and light is stored as sRGB; none: "
      "all act on stored levels; auto: as the pipeline",
      "NAME");
  command.Choice("--mosaic", o.mosaic, {"auto", "none", "bayer"},
                 "bayer: each pixel sees one colour, the others come from its neighbours; auto: as the pipeline",
                 "NAME");
  command.Text("--saturation", o.saturation,
               Format("Levels over 255 at which the sensor's red, green and blue are full, 0 for never, up to 64 each; "
                      "auto: as the pipeline, phone: %s",
                      kPhoneSaturation),
               "R,G,B");
}

void DeclareChartPhoto(Options& command, SimulateOptions& o) {
  command.Number("--edge-angle", o.style.edge_angle_deg, 3, 8, "chart: angle of the slanted edges", "DEG");
  command.Number("--contrast", o.style.contrast, 1.1, 100,
                 "chart: stored level of the paper over that of the edges' dark side", "RATIO");
  command.Choice("--marks", o.marks, {"auto", "fine", "medium", "coarse"},
                 "chart: size of the finder marks; auto suits the photo's size", "SIZE");
  command.Text("--motion", o.motion,
               "preview, pair: way of the scene to the second photo, p.second.png beside p.png; print: way from the "
               "good ones to the photo; -30000 to 30000 each",
               "DX,DY");
  command.Number("--second-turn", o.second_turn_deg, -180, 180,
                 "pair, print: turn of the second photo, counter-clockwise", "DEG");
  command.Number("--second-scale", o.second_scale, 0.2, 2, "pair, print: size of the scene in the second photo",
                 "FACTOR");
  command.Number("--second-gain", o.second_gain, 0, 4, "pair: levels of the second photo over the first's", "FACTOR");
}

void DeclareSpots(Options& command, SimulateOptions& o) {
  command.Whole("--specks", o.specks, 0, 1000, "dust: number of specks", "N");
  command.Number("--speck-size", o.speck_px, 0.5, 500, "dust: diameter of a speck", "PX");
  command.Number("--speck-darkness", o.speck_darkness, 0, 1, "dust: how much darker than the target, 0 to 1", "SHARE");
  command.Number("--speck-blur", o.speck_blur_px, 0, 200, "dust: softness of a speck, Gaussian, sigma", "PX");
  command.Whole("--dots", o.dots, 0, 100'000, "hdr: number of dots, half of them bright, half dark", "N");
  command.Whole("--dot-size", o.dot_px, 1, 1000, "hdr: side of a dot", "PX");
  command.Number("--dot-contrast", o.dot_contrast, 0, 1, "hdr: how much brighter or darker than the panel", "SHARE");
}

void DeclareDisplay(Options& command, SimulateOptions& o) {
  command.Choice("--pattern", o.display.pattern, kDisplayPatterns, "display: what it shows", "PATTERN");
  command.Number("--surround", o.display.surround, 0, 255, "display: level of what lies around it", "LEVEL");
  command.Number("--bezel", o.display.bezel, 0, 400, "display: its dark rim, of a width of 1600", "UNITS");
  command.Text("--tint", o.tint, "display: factors on the red, green and blue that it shows; 0 to 4 each", "R,G,B");
  command.Number("--dim-corner", o.dim_corner, 0, 1, "display: share of the light that its first corner lacks",
                 "SHARE");
  command.Whole("--defects", o.defects, 0, 1000, "display: black points, or white ones in black", "N");
  command.Number("--defect-size", o.display.defect_side, 0.5, 100, "display: their side, of a width of 1600", "UNITS");
}

void DeclareLightsAndPrint(Options& command, SimulateOptions& o) {
  command.Text("--light", o.light, "lights: red, green and blue of each, as stored levels; 0 to 255 each", "R,G,B");
  command.Whole("--spots", o.spots, 0, 1000, "lights: number of dark squares", "N");
  command.Number("--spot-size", o.spot_px, 1, 500, "lights: side of a dark square", "PX");
  command.Number("--spot-darkness", o.lights.spot_darkness, 0, 1, "lights: share of the light that they lack", "SHARE");
  command.Whole("--samples", o.samples, 0, 100, "print: photos of good prints, into p.samples beside p.png", "N");
  command.Whole("--missing", o.missing, 0, 100, "print: places where ink is missing", "N");
  command.Whole("--extra", o.extra, 0, 100, "print: places where there is ink too much", "N");
  command.Number("--print-defect-size", o.print_defect_px, 1, 200, "print: side of such a place", "PX");
  command.Number("--print-defect-contrast", o.print.defect_contrast, 0, 1,
                 "print: share of the way from what should be there to its opposite", "SHARE");
  command.Seed("--print-seed", o.print.seed, "print: seed of the signs");
}

void DeclareFile(Options& command, SimulateOptions& o) {
  command.Choice("--bits", o.file.bits, {8, 16}, "Bits a channel", "N");
  command.Whole("--quality", o.file.jpeg_quality, 1, 100, "Quality of a JPEG file", "N");
  command.Choice("--chroma", o.file.chroma, {"420", "422", "444"},
                 "Chroma of a JPEG file: for 2 x 2 pixels, for 2 x 1, for each", "NAME");
  command.Flag("--quiet", o.quiet, "Print nothing");
}

void DeclareFilm(Options& command, FilmStyle& f, std::string& lost) {
  command.Whole("--frames", f.frames, 3, 100'000, "film: frames filmed, lost ones among them", "N");
  command.Number("--rate", f.rate, 1, 1000, "film: frames a second", "RATE");
  command.Number("--jitter", f.jitter, 0, 0.2, "film: how far frames come early or late, in intervals", "SHARE");
  command.Text("--lost", lost, "film: numbers of the frames that are lost, from 0", "N,N,...");
  command.Number("--focus-from", f.from_px, 0, 30, "film-focus: blur at the start, beside the camera's own", "PX");
  command.Number("--focus-time", f.sweep_ms, 1, 1e6, "film-focus: until the lens first comes to its best", "MS");
  command.Number("--overshoot", f.overshoot_px, 0, 30, "film-focus: blur where it has gone too far", "PX");
  command.Number("--return-time", f.return_ms, 1, 1e6, "film-focus: until it is back for good", "MS");
  command.Number("--pulse", f.pulse_ms, 1, 1e6, "film-flash: width of the pulse at half height", "MS");
  command.Number("--pulse-at", f.pulse_at_ms, -1e6, 1e6, "film-flash: time of its peak", "MS");
  command.Number("--base", f.base, 0, 1, "film-flash: light without the flash, over that with it", "SHARE");
  command.Number("--turn-rate", f.turn_deg_s, -3600, 3600, "film-chart: degrees a second", "DEG");
}

cv::Vec3d ParseTriple(const char* option, const std::string& text, double high) {
  const std::vector<double> numbers = ParseNumbers(option, text, 3, 0, high);
  return {numbers[0], numbers[1], numbers[2]};
}

cv::Point2d ParsePair(const char* option, const std::string& text, double most) {
  const std::vector<double> numbers = ParseNumbers(option, text, 2, -most, most);
  return {numbers[0], numbers[1]};
}

// What the words say, and where they leave it open, the pipeline.
void Complete(SimulateOptions& o) {
  const bool phone = o.pipeline == "phone";
  CameraModel& camera = o.camera;
  if (o.size.empty()) o.size = o.is_film() ? "1280x720" : "4000x3000";
  camera.size = ParseSize("--size", o.size);
  if (std::int64_t{camera.size.width} * camera.size.height > QVResource::most_pixels_) {
    throw Failure(kWrongUsage, Format("--size %s: more than %lld megapixels, which nothing would read", o.size.c_str(),
                                      static_cast<long long>(QVResource::most_pixels_ / 1'000'000)));
  }
  for (std::size_t i = 0; i < o.numbers.size(); ++i) {
    const CameraNumber& row = kCameraNumbers[i];
    if (o.numbers[i]) {
      camera.*row.member = *o.numbers[i];
    } else if (phone && row.phone) {
      camera.*row.member = *row.phone;
    }
  }
  camera.srgb = o.transfer == "srgb" || (o.transfer == "auto" && phone);
  camera.mosaic = o.mosaic == "bayer" || (o.mosaic == "auto" && phone);
  const std::string full = phone ? kPhoneSaturation : "0,0,0";
  camera.saturation = ParseTriple("--saturation", o.saturation == "auto" ? full : o.saturation, 64);
  camera.cast = ParseTriple("--cast", o.cast, 16);
  camera.smear_px = ParsePair("--smear", o.smear, 100);
  o.motion_px = ParsePair("--motion", o.motion, 30000);
  o.display.tint = ParseTriple("--tint", o.tint, 4);
  o.lights.colour = ParseTriple("--light", o.light, 255);
}

void WriteWithDigest(const std::string& path, const std::string& content, Json& truth) {
  WriteOutput(path, content);
  truth["sha256"][std::filesystem::path(path).filename().string()] = HexDigest(content, "SHA256");
}

void WriteTruth(const SimulateOptions& o, const Json& truth) {
  const std::string path = std::filesystem::path(o.file.path).replace_extension(".truth.json");
  WriteOutput(path, truth.dump(2, ' ', false, Json::error_handler_t::replace) + "\n");
  if (!o.quiet) std::cout << Printable(path) << '\n';
}

// Told before minutes of work: a name of no format, a place that can't be written.
void CheckPhotoFile(const SimulateOptions& o) {
  const int type = o.scene == "hdr" ? CV_32FC3 : o.file.bits == 16 ? CV_16UC3 : CV_8UC3;
  EncodePhoto(cv::Mat(16, 16, type, cv::Scalar::all(0)), o.file);
  CheckOutputs({}, {{"the photo", o.file.path}});
}

// The film, and its truth beside it.
int WriteFilm(const SimulateOptions& o) {
  FilmStyle style = o.film;
  std::istringstream words(o.lost);
  for (std::string word; std::getline(words, word, ',');) {
    style.lost.push_back(static_cast<int>(ParseNumbers("--lost", word, 1, 0, 100'000)[0]));
  }
  Film film = SimulateFilm(o, style);
  WriteWithDigest(o.file.path, EncodeFilm(film, style, o.file.path), film.truth);
  if (!o.quiet) {
    std::cout << Format("%s  %s of %d x %d\n", Printable(o.file.path).c_str(), Count(film.kept.size(), "frame").c_str(),
                        o.camera.size.width, o.camera.size.height);
  }
  WriteTruth(o, film.truth);
  return kExitWithinLimits;
}

int Run(SimulateOptions& o) {
  Complete(o);
  if (o.is_film()) return WriteFilm(o);
  CheckPhotoFile(o);
  Simulation simulation = Simulate(o);
  simulation.truth["parameters"]["bits"] = o.file.bits;
  if (LowerExtension(o.file.path) == ".jpg") {
    simulation.truth["parameters"]["jpeg_quality"] = o.file.jpeg_quality;
    simulation.truth["parameters"]["jpeg_chroma"] = o.file.chroma;
  }
  if (o.file.path == "-" && simulation.levels.size() > 1) {
    throw Failure(kWrongUsage, "-o -: this scene makes several photos; name a file");
  }
  MakeFolders(o.file.path, simulation);
  CameraModel sensor = o.camera;
  for (std::size_t i = 0; i < simulation.levels.size(); ++i) {
    const cv::Mat photo = simulation.is_hdr ? simulation.levels[i] : Sense(sensor, simulation.levels[i], o.file.bits);
    const std::string path = NumberedPath(o.file.path, simulation, i);
    WriteWithDigest(path, EncodePhoto(photo, o.file), simulation.truth);
    if (!o.quiet && path != "-") std::cout << Format("%s  %d x %d\n", Printable(path).c_str(), photo.cols, photo.rows);
    sensor.seed += 0x9E3779B97F4A7C15;  // the next photo has noise of its own
  }
  if (o.file.path == "-") return kExitWithinLimits;
  WriteTruth(o, simulation.truth);
  return kExitWithinLimits;
}

}  // namespace

CommandBody DeclareSimulate(Options& command) {
  auto o = std::make_shared<SimulateOptions>();
  command.Text("-o,--output", o->file.path,
               "Photo to write: .png, .jpg, .bmp, .tif, or .nv21 for a raw preview frame; .exr, .tif or .pfm for "
               "hdr; .mp4, .mkv or .mov for a film; - is standard output, as PNG or PFM. Its truth goes beside it: "
               "that of p.png to p.truth.json",
               "PHOTO", true);
  std::vector<std::string> scenes = SceneNames();
  scenes.insert(scenes.end(), FilmScenes().begin(), FilmScenes().end());
  command.Choice(
      "--scene", o->scene, scenes,
      "What stands before the camera: the sharpness chart, the three marks of an "
      "aiming target, two preview frames of a moving chart, a plain target seen through dust, two photos of "
      "a textured scene, a lit panel with dots in high dynamic range, a phone's display, a panel of lights, "
      "a print with photos of good ones; films of a lens that finds its focus, of a flash, of a turning chart",
      "SCENE");
  DeclareCamera(command, *o);
  DeclareDevelopment(command, *o);
  DeclareChartPhoto(command, *o);
  DeclareSpots(command, *o);
  DeclareDisplay(command, *o);
  DeclareLightsAndPrint(command, *o);
  DeclareFilm(command, o->film, o->lost);
  DeclareFile(command, *o);
  return [o] { return Run(*o); };
}

}  // namespace qv
