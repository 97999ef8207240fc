#include <algorithm>
#include <filesystem>
#include <iostream>
#include <memory>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/simulation/film.h"
#include "desk/simulation/photo_file.h"
#include "desk/simulation/simulation.h"
#include "tools/commands.h"
#include "tools/options.h"
#include "tools/program.h"

namespace qv {

namespace {

struct Output : PhotoFile {
  bool quiet = false;
};

// "photo.png" and "photo.second.png"
std::string NumberedPath(const std::string& path, std::size_t number) {
  if (number == 0) return path;
  std::filesystem::path second(path);
  return second.replace_extension(".second" + second.extension().string());
}

void DeclareCamera(Options& command, CameraModel& c) {
  command.Number("--fill", c.fill, 0.02, 3, "Share of the photo that the turned scene takes", "SHARE");
  command.Number("--turn", c.turn_deg, -360, 360, "Turn of the scene, counter-clockwise", "DEG");
  command.Number("--pan", c.pan_deg, -60, 60, "Turn about the vertical axis: the right side recedes", "DEG");
  command.Number("--tilt", c.tilt_deg, -60, 60, "Turn about the horizontal axis: the lower side recedes", "DEG");
  command.Number("--blur", c.blur_px, 0, 50, "Gaussian blur, sigma", "PX");
  command.Number("--defocus", c.defocus_px, 0, 30, "Defocus disc, radius", "PX");
  command.Number("--gain", c.gain, 0, 4, "Level of white paper in the photo, over 255", "FACTOR");
  command.Number("--exposure", c.exposure_ev, -8, 8, "Doublings of every level", "EV");
  command.Number("--shading", c.shading_percent, 0, 100, "How much darker the photo's corners are", "PERCENT");
  command.Number("--noise", c.noise_percent, 0, 100, "Read noise, standard deviation, of 255", "PERCENT");
  command.Number("--full-well", c.full_well, 0, 1e9, "Electrons at level 255, for shot noise; 0 for none", "N");
  command.Seed("--seed", c.seed, "Seed of the noise");
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

// The film, and its truth beside it.
int WriteFilm(const SimulationOptions& options, FilmStyle style, const std::string& lost, const Output& output) {
  std::istringstream words(lost);
  for (std::string word; std::getline(words, word, ',');) {
    style.lost.push_back(static_cast<int>(ParseNumbers("--lost", word, 1, 0, 100'000)[0]));
  }
  const Film film = SimulateFilm(options, style);
  WriteOutput(output.path, EncodeFilm(film, style, output.path));
  const std::string truth = std::filesystem::path(output.path).replace_extension(".truth.json");
  WriteOutput(truth, film.truth.dump(2) + "\n");
  if (!output.quiet) {
    std::cout << Format("%s  %zu frames of %d x %d\n%s\n", output.path.c_str(), film.kept.size(),
                        options.camera.size.width, options.camera.size.height, truth.c_str());
  }
  return static_cast<int>(kExitWithinLimits);
}

}  // namespace

CommandBody DeclareSimulate(Options& command) {
  struct Options : SimulationOptions {
    Output output;
    FilmStyle film;
    std::string lost;
    std::string size, cast = "1,1,1", smear = "0,0", motion = "4,0", tint = "1,1,1";
  };
  auto o = std::make_shared<Options>();
  command.Text("-o,--output", o->output.path,
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
      "a textured scene, a lit panel with dots in high dynamic range, a phone's display; films of a lens that "
      "finds its focus, of a flash, of a turning chart",
      "SCENE");
  command.Text("--size", o->size, "Pixels of the photo, 4000x3000; of a film, 1280x720", "WxH");
  DeclareCamera(command, o->camera);
  command.Text("--smear", o->smear, "Straight motion during the exposure", "DX,DY");
  command.Text("--cast", o->cast, "Colour cast: factors on red, green and blue", "R,G,B");
  command.Number("--edge-angle", o->style.edge_angle_deg, 3, 8, "chart: angle of the slanted edges", "DEG");
  command.Number("--contrast", o->style.contrast, 1.1, 100,
                 "chart: stored level of the paper over that of the edges' dark side", "RATIO");
  command.Choice("--marks", o->marks, {"auto", "fine", "medium", "coarse"},
                 "chart: size of the finder marks; auto suits the photo's size", "SIZE");
  command.Text("--motion", o->motion, "preview, pair: way of the scene to the second photo, p.second.png beside p.png",
               "DX,DY");
  command.Whole("--specks", o->specks, 0, 1000, "dust: number of specks", "N");
  command.Number("--speck-size", o->speck_px, 0.5, 500, "dust: diameter of a speck", "PX");
  command.Number("--speck-darkness", o->speck_darkness, 0, 1, "dust: how much darker than the target, 0 to 1", "SHARE");
  command.Number("--second-turn", o->second_turn_deg, -180, 180, "pair: turn of the second photo, counter-clockwise",
                 "DEG");
  command.Number("--second-scale", o->second_scale, 0.2, 2, "pair: size of the scene in the second photo", "FACTOR");
  command.Number("--second-gain", o->second_gain, 0, 4, "pair: levels of the second photo over the first's", "FACTOR");
  command.Whole("--dots", o->dots, 0, 100'000, "hdr: number of dots, half of them bright, half dark", "N");
  command.Whole("--dot-size", o->dot_px, 1, 1000, "hdr: side of a dot", "PX");
  command.Number("--dot-contrast", o->dot_contrast, 0, 1, "hdr: how much brighter or darker than the panel", "SHARE");
  command.Choice("--pattern", o->display.pattern, kDisplayPatterns, "display: what it shows", "PATTERN");
  command.Number("--surround", o->display.surround, 0, 255, "display: level of what lies around it", "LEVEL");
  command.Number("--bezel", o->display.bezel, 0, 400, "display: its dark rim, of a width of 1600", "UNITS");
  command.Text("--tint", o->tint, "display: factors on the red, green and blue that it shows", "R,G,B");
  command.Number("--dim-corner", o->dim_corner, 0, 1, "display: share of the light that its first corner lacks",
                 "SHARE");
  command.Whole("--defects", o->defects, 0, 1000, "display: black points, or white ones in black", "N");
  command.Number("--defect-size", o->display.defect_side, 0.5, 100, "display: their side, of a width of 1600", "UNITS");
  DeclareFilm(command, o->film, o->lost);
  command.Choice("--bits", o->output.bits, {8, 16}, "Bits a channel, 8 or 16", "N");
  command.Whole("--quality", o->output.jpeg_quality, 1, 100, "Quality of a JPEG file", "N");
  command.Flag("--quiet", o->output.quiet, "Print nothing");
  return [o] {
    const bool is_film = std::find(FilmScenes().begin(), FilmScenes().end(), o->scene) != FilmScenes().end();
    if (o->size.empty()) o->size = is_film ? "1280x720" : "4000x3000";
    o->camera.size = ParseSize("--size", o->size);
    const std::vector<double> cast = ParseNumbers("--cast", o->cast, 3, 0, 16);
    const std::vector<double> smear = ParseNumbers("--smear", o->smear, 2, -100, 100);
    const std::vector<double> motion = ParseNumbers("--motion", o->motion, 2, -30000, 30000);
    const std::vector<double> tint = ParseNumbers("--tint", o->tint, 3, 0, 4);
    o->display.tint = {tint[0], tint[1], tint[2]};
    o->camera.cast = {cast[0], cast[1], cast[2]};
    o->camera.smear_px = {smear[0], smear[1]};
    o->motion_px = {motion[0], motion[1]};
    if (is_film) return WriteFilm(*o, o->film, o->lost, o->output);
    Simulation simulation = Simulate(*o);
    simulation.truth["parameters"]["bits"] = o->output.bits;
    if (LowerExtension(o->output.path) == ".jpg")
      simulation.truth["parameters"]["jpeg_quality"] = o->output.jpeg_quality;
    if (o->output.path == "-" && simulation.levels.size() > 1) {
      throw Failure(kWrongUsage, "-o -: this scene makes two photos; name a file");
    }
    CameraModel sensor = o->camera;
    for (std::size_t i = 0; i < simulation.levels.size(); ++i) {
      const cv::Mat photo =
          simulation.is_hdr ? simulation.levels[i] : Sense(sensor, simulation.levels[i], o->output.bits);
      const std::string path = NumberedPath(o->output.path, i);
      WriteOutput(path, EncodePhoto(photo, o->output));
      if (!o->output.quiet && path != "-") std::cout << Format("%s  %d x %d\n", path.c_str(), photo.cols, photo.rows);
      sensor.seed += 0x9E3779B97F4A7C15;  // the next photo has noise of its own
    }
    if (o->output.path == "-") return static_cast<int>(kExitWithinLimits);
    const std::string truth = std::filesystem::path(o->output.path).replace_extension(".truth.json");
    WriteOutput(truth, simulation.truth.dump(2) + "\n");
    if (!o->output.quiet) std::cout << truth << '\n';
    return static_cast<int>(kExitWithinLimits);
  };
}

}  // namespace qv
