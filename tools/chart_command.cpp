#include <iostream>
#include <memory>

#include "desk/base/text.h"
#include "desk/scenes/chart_sheet.h"
#include "desk/scenes/sheet_file.h"
#include "tools/commands.h"
#include "tools/options.h"
#include "tools/program.h"

namespace qv {

CommandBody DeclareChart(Options& command) {
  struct Options : SheetOptions {
    std::string output;
    int dpi = 600;
  };
  auto o = std::make_shared<Options>();
  command.Text("-o,--output", o->output, "Sheet to write: .svg, .pdf or .png; - is standard output, as PNG", "FILE",
               true);
  command.Choice("--kind", o->kind, SheetKinds(),
                 "sfr: slanted edges, colour patches and marks; target: three large marks to aim at; dust: bare paper",
                 "KIND");
  command.Text("--paper", o->paper, "A5 to A0, Letter, or WIDTHxHEIGHT in mm; turned as the chart needs", "PAPER");
  command.Number("--margin", o->margin_mm, 0, 1000, "Bare border of the paper", "MM");
  command.Whole("--dpi", o->dpi, 50, 2400, "Pixels an inch of a PNG", "N");
  command.Number("--contrast", o->style.contrast, 4, 10, "sfr: level of the paper over that of the edges' dark side",
                 "RATIO");
  command.Number("--edge-angle", o->style.edge_angle_deg, 3, 8, "sfr: angle of the slanted edges", "DEG");
  command.Choice("--marks", o->marks, {"fine", "medium", "coarse"},
                 "sfr: size of the finder marks: fine for photos from 8 megapixels, medium from 2, coarse below",
                 "SIZE");
  return [o] {
    const SheetFormat& format = SheetFormatOf(o->output);
    const ChartSheet sheet = LayOut(*o);
    WriteOutput(o->output, format.encode(sheet, o->dpi));
    if (o->output != "-") {
      std::cout << Printable(o->output) << '\n';
      for (const std::string& fact : sheet.facts) std::cout << "  " << fact << '\n';
    }
    return static_cast<int>(kExitWithinLimits);
  };
}

}  // namespace qv
