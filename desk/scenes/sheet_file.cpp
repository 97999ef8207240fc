#include "desk/scenes/sheet_file.h"

#include <cairo-pdf.h>
#include <cairo-svg.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <memory>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/drawing/cairo_check.h"

namespace qv {

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
  CheckDrawn(cr.get(), "the sheet");
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

constexpr SheetFormat kFormats[] = {{".svg", Svg}, {".pdf", Pdf}, {".png", Png}};

}  // namespace

const SheetFormat& SheetFormatOf(const std::string& path) {
  const std::string extension = path == "-" ? ".png" : LowerExtension(path);
  for (const SheetFormat& format : kFormats) {
    if (extension == format.extension) return format;
  }
  throw Failure(kWrongUsage, path + ": name a .svg, .pdf or .png file");
}

}  // namespace qv
