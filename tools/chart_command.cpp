#include <filesystem>
#include <iostream>
#include <memory>
#include <opencv2/imgcodecs.hpp>

#include "chart/chart_layout.h"
#include "tools/camera.h"
#include "tools/commands.h"
#include "tools/program.h"

CommandBody DeclareChart(CLI::App& command) {
  struct Options {
    std::string output;
    int pixels = 3000;
    std::string marks = "fine";
    SfrChartStyle style;
  };
  auto o = std::make_shared<Options>();
  command.add_option("-o,--output", o->output, "Picture to write")->required()->type_name("PNG");
  command.add_option("--pixels", o->pixels, "Side of the picture [3000]")
      ->check(CLI::Range(200, 20000))
      ->type_name("N");
  command.add_option("--contrast", o->style.contrast, "Level of the paper over that of the edges' dark side [5]")
      ->check(CLI::Range(4.0, 10.0))
      ->type_name("RATIO");
  command
      .add_option("--marks", o->marks,
                  "Size of the finder marks: fine for photos from 8 megapixels, medium from 2, coarse below [fine]")
      ->check(CLI::IsMember({"fine", "medium", "coarse"}))
      ->type_name("SIZE");
  return [o] {
    if (o->output != "-" && std::filesystem::path(o->output).extension() != ".png") {
      throw Failure(kWrongUsage, o->output + ": name a .png file");
    }
    for (const MarkSize& size : kMarkSizes) {
      if (o->marks == size.name) o->style.module = size.module;
    }
    CameraModel printer;
    printer.size = {o->pixels, o->pixels};
    printer.gain = 1;
    printer.fill = 0.92;
    std::vector<uchar> file;
    cv::imencode(".png",
                 Sense(printer, Expose(printer, SfrChart(o->style), PhotoFromScene(printer, SfrChartBounds())), 8),
                 file);
    WriteWholeFile(o->output, {file.begin(), file.end()});
    if (o->output != "-") std::cout << Format("%s  %d x %d\n", o->output.c_str(), o->pixels, o->pixels);
    return static_cast<int>(kWithinLimits);
  };
}
