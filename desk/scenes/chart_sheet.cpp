#include "desk/scenes/chart_sheet.h"

#include <qrencode.h>

#include <algorithm>
#include <cctype>
#include <memory>
#include <sstream>

#include "chart/chart_layout.h"
#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/scenes/charts.h"

namespace qv {

namespace {

// What surrounds the chart is printed in this grey. The QR code has marks of the same shape as the chart's, and specks
// of text may pass for some: in a photo all of it must stay above the threshold of 125, down to paper as dark as 188.
constexpr double kInkLevel = 170;

constexpr double kRulerMm = 100;
constexpr double kRulerInsetMm = 4;  // room for half a number at the ruler's ends
constexpr double kTextMm = 3;
constexpr double kLineMm = 3.4;
constexpr double kQrMm = 26;
constexpr double kQrQuietMm = 4;
constexpr double kTextWidthMm = kRulerMm + 2 * kRulerInsetMm;
constexpr double kLabelWidthMm = kTextWidthMm + kQrQuietMm + kQrMm;
constexpr double kLabelHeightMm = kQrMm;
constexpr double kGapMm = 5;             // between chart and label
constexpr double kSmallestChartMm = 90;  // fine marks have 0.3 mm a module then: seven dots at 600 dpi

struct NamedPaper {
  const char* name;
  double width, height;  // mm
};
constexpr NamedPaper kPapers[] = {{"A5", 148, 210}, {"A4", 210, 297},  {"A3", 297, 420},        {"A2", 420, 594},
                                  {"A1", 594, 841}, {"A0", 841, 1189}, {"Letter", 215.9, 279.4}};

cv::Size2d PaperSize(const std::string& paper) {
  for (const NamedPaper& named : kPapers) {
    if (paper == named.name) return {named.width, named.height};
  }
  cv::Size2d size;
  char by = 0;
  std::string rest;
  std::istringstream words(paper);
  words >> size.width >> by >> size.height;
  const bool read = !words.fail() && by == 'x';
  words >> rest;
  if (!read || !(rest.empty() || rest == "mm") || !(std::min(size.width, size.height) > 0) ||
      std::max(size.width, size.height) > 3000) {
    throw Failure(kWrongUsage,
                  "--paper " + paper + ": name A5 to A0 or Letter, or give WIDTHxHEIGHT in mm, to 3000 each");
  }
  return size;
}

struct Kind {
  const char* name;
  Scene (*scene)(const SfrChartStyle& style);
  cv::Rect2d (*bounds)();
  std::vector<std::string> (*facts)(const SheetOptions& options, double mm_per_unit);
};

std::string ScaleFact(double mm_per_unit) {
  return Format("%.5f mm per chart unit, marks %.1f mm apart", mm_per_unit, mm_per_unit * kChartSide);
}

const Kind kKinds[] = {
    {"sfr", SfrChart, SfrChartBounds,
     [](const SheetOptions& o, double mm_per_unit) {
       return std::vector<std::string>{
           ScaleFact(mm_per_unit),
           Format("contrast %.3g : 1 in light (%g : 1 in sRGB levels), edges %g degrees, marks %s",
                  LightContrast(o.style.contrast), o.style.contrast, o.style.edge_angle_deg, o.marks.c_str())};
     }},
    {"target", [](const SfrChartStyle&) { return AimingTarget(); }, SfrChartBounds,
     [](const SheetOptions&, double mm_per_unit) { return std::vector<std::string>{ScaleFact(mm_per_unit)}; }},
    // Bare paper is more even than any printed grey; 4 : 3 as most photos.
    {"dust", [](const SfrChartStyle&) { return Scene(); }, [] { return cv::Rect2d(0, 0, 4, 3); },
     [](const SheetOptions&, double mm_per_unit) {
       return std::vector<std::string>{
           Format("fill the photo with bare paper: %.0f x %.0f mm above", 4 * mm_per_unit, 3 * mm_per_unit)};
     }},
};

const Kind& FindKind(const std::string& name) {
  for (const Kind& kind : kKinds) {
    if (name == kind.name) return kind;
  }
  throw Failure(kWrongUsage, "--kind " + name + ": no such chart");
}

// Where the chart may go on paper of this size.
cv::Rect2d ChartArea(cv::Size2d paper, double margin) {
  return {margin, margin, paper.width - 2 * margin, paper.height - 2 * margin - kLabelHeightMm - kGapMm};
}

bool Fits(const cv::Rect2d& area) { return area.width >= kLabelWidthMm && area.height >= kSmallestChartMm; }

// Millimetres per chart unit; 0 where the chart has no room.
double Scale(const cv::Rect2d& area, const cv::Rect2d& bounds) {
  return Fits(area) ? std::min(area.width / bounds.width, area.height / bounds.height) : 0;
}

void Ink(cairo_t* cr) { cairo_set_source_rgb(cr, kInkLevel / 255, kInkLevel / 255, kInkLevel / 255); }

// Baseline from `place` on; shrunk when wider than `width`.
void Text(cairo_t* cr, const std::string& text, cv::Point2d place, double size, double width) {
  cairo_text_extents_t extents;
  cairo_set_font_size(cr, size);
  cairo_text_extents(cr, text.c_str(), &extents);
  if (extents.x_advance > width) cairo_set_font_size(cr, size * width / extents.x_advance);
  cairo_move_to(cr, place.x, place.y);
  cairo_show_text(cr, text.c_str());
}

// 100 mm from the middle of the first tick to that of the last.
void Ruler(cairo_t* cr, cv::Point2d origin) {
  constexpr double kTickMm = 0.25;
  constexpr double kNumberMm = 2.6;
  constexpr double kLongMm = 4.5;
  cairo_set_font_size(cr, kNumberMm);
  for (int mm = 0; mm <= kRulerMm; ++mm) {
    const double length = mm % 10 == 0 ? kLongMm : mm % 5 == 0 ? 3.2 : 2;
    cairo_rectangle(cr, origin.x + mm - kTickMm / 2, origin.y, kTickMm, length);
  }
  cairo_rectangle(cr, origin.x - kTickMm / 2, origin.y, kRulerMm + kTickMm, kTickMm);
  cairo_fill(cr);
  for (int mm = 0; mm <= kRulerMm; mm += 10) {
    const std::string number = Format(mm == 0 ? "%d mm" : "%d", mm);
    cairo_text_extents_t extents;
    cairo_text_extents(cr, Format("%d", mm).c_str(), &extents);
    cairo_move_to(cr, origin.x + mm - extents.x_advance / 2, origin.y + kLongMm + kNumberMm);
    cairo_show_text(cr, number.c_str());
  }
}

void QrCode(cairo_t* cr, const std::string& text, cv::Point2d origin) {
  const std::unique_ptr<QRcode, void (*)(QRcode*)> code(QRcode_encodeString8bit(text.c_str(), 0, QR_ECLEVEL_L),
                                                        QRcode_free);
  if (!code) throw Failure(kInternalFault, "the QR code can't be made");
  const double module = kQrMm / code->width;
  for (int i = 0; i < code->width; ++i) {
    const unsigned char* const row = code->data + static_cast<std::ptrdiff_t>(i) * code->width;
    for (int j = 0; j < code->width; ++j) {
      if ((row[j] & 1) == 0) continue;
      const int first = j;
      while (j + 1 < code->width && (row[j + 1] & 1) != 0) ++j;
      cairo_rectangle(cr, origin.x + first * module, origin.y + i * module, (j + 1 - first) * module, module);
    }
  }
  cairo_fill(cr);  // all at once, so that no seams show between rows
}

}  // namespace

std::vector<std::string> SheetKinds() {
  std::vector<std::string> names;
  for (const Kind& kind : kKinds) names.emplace_back(kind.name);
  return names;
}

ChartSheet LayOut(const SheetOptions& options) {
  const Kind& kind = FindKind(options.kind);
  const cv::Rect2d bounds = kind.bounds();
  cv::Size2d paper = PaperSize(options.paper);
  const cv::Size2d turned(paper.height, paper.width);
  if (Scale(ChartArea(turned, options.margin_mm), bounds) > Scale(ChartArea(paper, options.margin_mm), bounds)) {
    paper = turned;
  }
  const cv::Rect2d area = ChartArea(paper, options.margin_mm);
  if (!Fits(area)) {
    throw Failure(
        kWrongUsage,
        Format("--paper %s --margin %g: chart and label need %g x %g mm inside the margins; take larger paper "
               "or a smaller margin",
               options.paper.c_str(), options.margin_mm, kLabelWidthMm, kSmallestChartMm + kGapMm + kLabelHeightMm));
  }

  ChartSheet sheet;
  sheet.paper_mm = paper;
  SfrChartStyle style = options.style;
  for (const MarkSize& size : kMarkSizes) {
    if (options.marks == size.name) style.module = size.module;
  }
  sheet.chart = kind.scene(style);
  const double scale = Scale(area, bounds);
  const cv::Point2d middle = (area.tl() + area.br()) / 2 - scale * (bounds.tl() + bounds.br()) / 2;
  sheet.mm_from_chart = {scale, 0, middle.x, 0, scale, middle.y, 0, 0, 1};
  sheet.label_mm = {area.x, area.br().y + kGapMm, area.width, kLabelHeightMm};
  sheet.facts = {Format("qvtester %s chart, revision %d", kind.name, kChartRevision)};
  for (const std::string& fact : kind.facts(options, scale)) sheet.facts.push_back(fact);
  const bool named = std::isalpha(static_cast<unsigned char>(options.paper[0])) != 0;
  sheet.facts.push_back(Format("paper %s%g x %g mm, margin %g mm", named ? (options.paper + ", ").c_str() : "",
                               paper.width, paper.height, options.margin_mm));
  sheet.facts.push_back(Format("print at 100 %%: the ruler measures %g mm", kRulerMm));
  return sheet;
}

void Draw(cairo_t* cr, const ChartSheet& sheet) {
  const Scene& chart = sheet.chart;
  cairo_set_antialias(cr, CAIRO_ANTIALIAS_BEST);
  cairo_set_source_rgb(cr, chart.paper[0] / 255, chart.paper[1] / 255, chart.paper[2] / 255);
  cairo_paint(cr);
  Fill(cr, chart, sheet.mm_from_chart);

  // Letters keep their width on every target.
  const std::unique_ptr<cairo_font_options_t, void (*)(cairo_font_options_t*)> font(cairo_font_options_create(),
                                                                                    cairo_font_options_destroy);
  cairo_font_options_set_hint_style(font.get(), CAIRO_HINT_STYLE_NONE);
  cairo_font_options_set_hint_metrics(font.get(), CAIRO_HINT_METRICS_OFF);
  cairo_set_font_options(cr, font.get());
  cairo_select_font_face(cr, "sans-serif", CAIRO_FONT_SLANT_NORMAL, CAIRO_FONT_WEIGHT_BOLD);
  Ink(cr);
  const cv::Rect2d& label = sheet.label_mm;
  Ruler(cr, {label.x + kRulerInsetMm, label.y});
  std::string all;
  const auto lines = static_cast<int>(sheet.facts.size());
  for (int i = 0; i < lines; ++i) {
    Text(cr, sheet.facts[i], {label.x, label.br().y - 1 - (lines - 1 - i) * kLineMm}, kTextMm, kTextWidthMm);
    all += (i > 0 ? "\n" : "") + sheet.facts[i];
  }
  QrCode(cr, all, {label.br().x - kQrMm, label.y});
}

}  // namespace qv
