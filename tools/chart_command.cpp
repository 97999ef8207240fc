#include <cairo-pdf.h>
#include <cairo-svg.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <iostream>
#include <memory>

#include "tools/chart_sheet.h"
#include "tools/commands.h"
#include "tools/options.h"
#include "tools/program.h"

namespace {

constexpr double kMmPerInch = 25.4;
constexpr double kPointsPerMm = 72 / kMmPerInch;

using Surface = std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)>;

cairo_status_t Append(void* file, const unsigned char* data, unsigned int length) {
  static_cast<std::string*>(file)->append(reinterpret_cast<const char*>(data), length);
  return CAIRO_STATUS_SUCCESS;
}

void DrawOn(cairo_surface_t* surface, double units_per_mm, const ChartSheet& sheet) {
  const std::unique_ptr<cairo_t, void (*)(cairo_t*)> cr(cairo_create(surface), cairo_destroy);
  cairo_scale(cr.get(), units_per_mm, units_per_mm);
  Draw(cr.get(), sheet);
  if (const cairo_status_t status = cairo_status(cr.get()); status != CAIRO_STATUS_SUCCESS) {
    throw Failure(kInternalFault, Format("the sheet can't be drawn (%s)", cairo_status_to_string(status)));
  }
}

std::string Svg(const ChartSheet& sheet, int /*dpi*/) {
  std::string file;
  // The size counts in the unit that is set afterwards.
  const Surface surface(cairo_svg_surface_create_for_stream(Append, &file, sheet.paper_mm.width, sheet.paper_mm.height),
                        cairo_surface_destroy);
  cairo_svg_surface_set_document_unit(surface.get(), CAIRO_SVG_UNIT_MM);
  DrawOn(surface.get(), 1, sheet);
  cairo_surface_finish(surface.get());
  return file;
}

std::string Pdf(const ChartSheet& sheet, int /*dpi*/) {
  std::string file;
  const Surface surface(cairo_pdf_surface_create_for_stream(Append, &file, sheet.paper_mm.width * kPointsPerMm,
                                                            sheet.paper_mm.height * kPointsPerMm),
                        cairo_surface_destroy);
  cairo_pdf_surface_set_metadata(surface.get(), CAIRO_PDF_METADATA_TITLE, sheet.facts.front().c_str());
  DrawOn(surface.get(), kPointsPerMm, sheet);
  cairo_surface_finish(surface.get());
  return file;
}

std::string BigEndian(std::uint32_t value) {
  std::string bytes;
  for (const int shift : {24, 16, 8, 0}) bytes += static_cast<char>(value >> shift & 0xFF);
  return bytes;
}

// A PNG chunk that says how large a pixel prints, so that 100 % means the same as in the other formats.
std::string PixelSizeChunk(int dpi) {
  const std::string per_metre = BigEndian(static_cast<std::uint32_t>(std::lround(dpi * 1000 / kMmPerInch)));
  const std::string content = "pHYs" + per_metre + per_metre + '\1';
  std::uint32_t crc = 0xFFFFFFFF;
  for (const char c : content) {
    crc ^= static_cast<unsigned char>(c);
    for (int bit = 0; bit < 8; ++bit) crc = (crc & 1) != 0 ? crc >> 1 ^ 0xEDB88320 : crc >> 1;
  }
  return BigEndian(static_cast<std::uint32_t>(content.size() - 4)) + content + BigEndian(~crc);
}

std::string Png(const ChartSheet& sheet, int dpi) {
  constexpr int kLongestSide = 32767;       // cairo's
  constexpr std::size_t kAfterHeader = 33;  // signature and first chunk
  const int width = static_cast<int>(std::lround(sheet.paper_mm.width * dpi / kMmPerInch));
  const int height = static_cast<int>(std::lround(sheet.paper_mm.height * dpi / kMmPerInch));
  if (std::max(width, height) > kLongestSide) {
    throw Failure(kWrongUsage, Format("--dpi %d: makes %d x %d pixels, more than a picture can have; take a lower one, "
                                      "or a .pdf or .svg file",
                                      dpi, width, height));
  }
  const Surface surface(cairo_image_surface_create(CAIRO_FORMAT_RGB24, width, height), cairo_surface_destroy);
  DrawOn(surface.get(), dpi / kMmPerInch, sheet);
  std::string file;
  if (cairo_surface_write_to_png_stream(surface.get(), Append, &file) != CAIRO_STATUS_SUCCESS) {
    throw Failure(kInternalFault, "the picture can't be encoded");
  }
  return file.insert(kAfterHeader, PixelSizeChunk(dpi));
}

struct FileFormat {
  const char* extension;
  std::string (*encode)(const ChartSheet& sheet, int dpi);
};
constexpr FileFormat kFormats[] = {{".svg", Svg}, {".pdf", Pdf}, {".png", Png}};

const FileFormat& FormatOf(const std::string& path) {
  const std::string extension = path == "-" ? ".png" : LowerExtension(path);
  for (const FileFormat& format : kFormats) {
    if (extension == format.extension) return format;
  }
  throw Failure(kWrongUsage, path + ": name a .svg, .pdf or .png file");
}

}  // namespace

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
    const FileFormat& format = FormatOf(o->output);
    const ChartSheet sheet = LayOut(*o);
    WriteWholeFile(o->output, format.encode(sheet, o->dpi));
    if (o->output != "-") {
      std::cout << o->output << '\n';
      for (const std::string& fact : sheet.facts) std::cout << "  " << fact << '\n';
    }
    return static_cast<int>(kWithinLimits);
  };
}
