#include <iostream>
#include <memory>

#include "desk/scenes/chart_sheet.h"
#include "desk/scenes/sheet_file.h"
#include "tools/commands.h"
#include "tools/options.h"
#include "tools/program.h"

namespace qv {

CommandBody DeclareChart(CLI::App& command) {
  struct Options : SheetOptions {
    std::string output;
    int dpi = 600;
  };
  auto o = std::make_shared<Options>();
  command.add_option("-o,--output", o->output, "Sheet to write: .svg, .pdf or .png; - is standard output, as PNG")
      ->required()
      ->type_name("FILE");
  command
      .add_option("--kind", o->kind,
                  "sfr: slanted edges, colour patches and marks; target: three large marks to aim at; dust: bare paper "
                  "[sfr]")
      ->check(CLI::IsMember(SheetKinds()))
      ->type_name("KIND");
  command.add_option("--paper", o->paper, "A5 to A0, Letter, or WIDTHxHEIGHT in mm; turned as the chart needs [A4]")
      ->type_name("PAPER");
  AddNumber(command, "--margin", o->margin_mm, "Bare border of the paper [10]", 0, 1000, "MM");
  command.add_option("--dpi", o->dpi, "Pixels an inch of a PNG [600]")->check(CLI::Range(50, 2400))->type_name("N");
  AddNumber(command, "--contrast", o->style.contrast, "sfr: level of the paper over that of the edges' dark side [5]",
            4, 10, "RATIO");
  AddNumber(command, "--edge-angle", o->style.edge_angle_deg, "sfr: angle of the slanted edges [5]", 3, 8, "DEG");
  command
      .add_option(
          "--marks", o->marks,
          "sfr: size of the finder marks: fine for photos from 8 megapixels, medium from 2, coarse below [fine]")
      ->check(CLI::IsMember({"fine", "medium", "coarse"}))
      ->type_name("SIZE");
  return [o] {
    const SheetFormat& format = SheetFormatOf(o->output);
    const ChartSheet sheet = LayOut(*o);
    WriteOutput(o->output, format.encode(sheet, o->dpi));
    if (o->output != "-") {
      std::cout << o->output << '\n';
      for (const std::string& fact : sheet.facts) std::cout << "  " << fact << '\n';
    }
    return static_cast<int>(kExitWithinLimits);
  };
}

}  // namespace qv
