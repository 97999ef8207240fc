#include <filesystem>
#include <iostream>
#include <memory>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
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

void DeclareCamera(CLI::App& command, CameraModel& c) {
  AddNumber(command, "--fill", c.fill, "Share of the photo that the turned scene takes [0.8]", 0.02, 3, "SHARE");
  AddNumber(command, "--turn", c.turn_deg, "Turn of the scene, counter-clockwise [0]", -360, 360, "DEG");
  AddNumber(command, "--pan", c.pan_deg, "Turn about the vertical axis: the right side recedes [0]", -60, 60, "DEG");
  AddNumber(command, "--tilt", c.tilt_deg, "Turn about the horizontal axis: the lower side recedes [0]", -60, 60,
            "DEG");
  AddNumber(command, "--blur", c.blur_px, "Gaussian blur, sigma [0]", 0, 50, "PX");
  AddNumber(command, "--defocus", c.defocus_px, "Defocus disc, radius [0]", 0, 30, "PX");
  AddNumber(command, "--gain", c.gain, "Level of white paper in the photo, over 255 [0.92]", 0, 4, "FACTOR");
  AddNumber(command, "--exposure", c.exposure_ev, "Doublings of every level [0]", -8, 8, "EV");
  AddNumber(command, "--shading", c.shading_percent, "How much darker the photo's corners are [0]", 0, 100, "PERCENT");
  AddNumber(command, "--noise", c.noise_percent, "Read noise, standard deviation, of 255 [0]", 0, 100, "PERCENT");
  AddNumber(command, "--full-well", c.full_well, "Electrons at level 255, for shot noise; 0 for none [0]", 0, 1e9, "N");
  command.add_option("--seed", c.seed, "Seed of the noise [1]")
      ->check([](const std::string& text) {
        const bool whole =
            !text.empty() && text.size() < 19 && text.find_first_not_of("0123456789") == std::string::npos;
        return whole ? std::string() : text + " is no whole number of up to 18 digits";
      })
      ->type_name("N");
}

}  // namespace

CommandBody DeclareSimulate(CLI::App& command) {
  struct Options : SimulationOptions {
    Output output;
    std::string size = "4000x3000", cast = "1,1,1", smear = "0,0", motion = "4,0";
  };
  auto o = std::make_shared<Options>();
  command
      .add_option("-o,--output", o->output.path,
                  "Photo to write: .png, .jpg, .bmp, .tif, or .nv21 for a raw preview frame; .exr, .tif or .pfm for "
                  "hdr; - is standard output, as PNG or PFM. Its truth goes beside it: that of p.png to p.truth.json")
      ->required()
      ->type_name("PHOTO");
  command
      .add_option(
          "--scene", o->scene,
          "What stands before the camera: the sharpness chart, the three marks of an "
          "aiming target, two preview frames of a moving chart, a plain target seen through dust, two photos of "
          "a textured scene, a lit panel with dots in high dynamic range [chart]")
      ->check(CLI::IsMember(SceneNames()))
      ->type_name("SCENE");
  command.add_option("--size", o->size, "Pixels of the photo [4000x3000]")->type_name("WxH");
  DeclareCamera(command, o->camera);
  command.add_option("--smear", o->smear, "Straight motion during the exposure [0,0]")->type_name("DX,DY");
  command.add_option("--cast", o->cast, "Colour cast: factors on red, green and blue [1,1,1]")->type_name("R,G,B");
  AddNumber(command, "--edge-angle", o->style.edge_angle_deg, "chart: angle of the slanted edges [5]", 3, 8, "DEG");
  AddNumber(command, "--contrast", o->style.contrast,
            "chart: stored level of the paper over that of the edges' dark side [5]", 1.1, 100, "RATIO");
  command.add_option("--marks", o->marks, "chart: size of the finder marks [auto: suits the photo's size]")
      ->check(CLI::IsMember({"auto", "fine", "medium", "coarse"}))
      ->type_name("SIZE");
  command
      .add_option("--motion", o->motion,
                  "preview, pair: way of the scene to the second photo, p.second.png beside p.png [4,0]")
      ->type_name("DX,DY");
  command.add_option("--specks", o->specks, "dust: number of specks [5]")->check(CLI::Range(0, 1000))->type_name("N");
  AddNumber(command, "--speck-size", o->speck_px, "dust: diameter of a speck [10]", 0.5, 500, "PX");
  AddNumber(command, "--speck-darkness", o->speck_darkness, "dust: how much darker than the target, 0 to 1 [0.6]", 0, 1,
            "SHARE");
  AddNumber(command, "--second-turn", o->second_turn_deg, "pair: turn of the second photo, counter-clockwise [0]", -180,
            180, "DEG");
  AddNumber(command, "--second-scale", o->second_scale, "pair: size of the scene in the second photo [1]", 0.2, 2,
            "FACTOR");
  AddNumber(command, "--second-gain", o->second_gain, "pair: levels of the second photo over the first's [1]", 0, 4,
            "FACTOR");
  command.add_option("--dots", o->dots, "hdr: number of dots, half of them bright, half dark [100]")
      ->check(CLI::Range(0, 100'000))
      ->type_name("N");
  command.add_option("--dot-size", o->dot_px, "hdr: side of a dot [1]")->check(CLI::Range(1, 1000))->type_name("PX");
  AddNumber(command, "--dot-contrast", o->dot_contrast, "hdr: how much brighter or darker than the panel [0.5]", 0, 1,
            "SHARE");
  command.add_option("--bits", o->output.bits, "Bits a channel, 8 or 16 [8]")
      ->check(CLI::IsMember({8, 16}))
      ->type_name("N");
  command.add_option("--quality", o->output.jpeg_quality, "Quality of a JPEG file [95]")
      ->check(CLI::Range(1, 100))
      ->type_name("N");
  command.add_flag("--quiet", o->output.quiet, "Print nothing");
  return [o] {
    o->camera.size = ParseSize("--size", o->size);
    const std::vector<double> cast = ParseNumbers("--cast", o->cast, 3, 0, 16);
    const std::vector<double> smear = ParseNumbers("--smear", o->smear, 2, -100, 100);
    const std::vector<double> motion = ParseNumbers("--motion", o->motion, 2, -30000, 30000);
    o->camera.cast = {cast[0], cast[1], cast[2]};
    o->camera.smear_px = {smear[0], smear[1]};
    o->motion_px = {motion[0], motion[1]};
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
