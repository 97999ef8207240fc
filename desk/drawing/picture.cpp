#include "desk/drawing/picture.h"

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/drawing/cairo_check.h"

namespace qv {

namespace {

void SetColour(cairo_t* cr, Colour c) { cairo_set_source_rgb(cr, c.red, c.green, c.blue); }

// Halved as long as it stays as large as asked for: means of 2 x 2 pixels cost a quarter of those of fractions.
cv::Mat Halved(const cv::Mat& image, cv::Size size) {
  cv::Mat halved = image;
  while (halved.cols % 2 == 0 && halved.rows % 2 == 0 && halved.cols >= 2 * size.width &&
         halved.rows >= 2 * size.height) {
    cv::resize(halved, halved, {halved.cols / 2, halved.rows / 2}, 0, 0, cv::INTER_AREA);
  }
  return halved;
}

}  // namespace

Picture::Picture(int width, int height)
    : surface_(cairo_image_surface_create(CAIRO_FORMAT_RGB24, width, height), cairo_surface_destroy),
      cr_(cairo_create(surface_.get()), cairo_destroy) {
  if (cairo_status(cr_.get()) != CAIRO_STATUS_SUCCESS) {
    throw Failure(kInternalFault, Format("no memory for a picture of %d x %d pixels", width, height));
  }
  cairo_select_font_face(cr_.get(), "sans-serif", CAIRO_FONT_SLANT_NORMAL, CAIRO_FONT_WEIGHT_NORMAL);
  SetColour(cr_.get(), kPaper);
  cairo_paint(cr_.get());
}

PhotoPlace Picture::PlacePhoto(const cv::Mat& image, cv::Point2d origin, double scale) {
  const cv::Size size(cv::saturate_cast<int>(image.cols * scale), cv::saturate_cast<int>(image.rows * scale));
  cv::Mat scaled = Halved(image, size);
  cv::resize(scaled, scaled, size, 0, 0, scale < 1 ? cv::INTER_AREA : cv::INTER_NEAREST);
  cv::Mat pixels = scaled;
  if (scaled.channels() != 4) {
    cv::cvtColor(scaled, pixels, scaled.channels() == 1 ? cv::COLOR_GRAY2BGRA : cv::COLOR_BGR2BGRA);
  }
  const std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> source(
      cairo_image_surface_create_for_data(pixels.data, CAIRO_FORMAT_RGB24, pixels.cols, pixels.rows,
                                          static_cast<int>(pixels.step)),
      cairo_surface_destroy);
  cairo_set_source_surface(cr_.get(), source.get(), origin.x, origin.y);
  cairo_paint(cr_.get());
  return {origin, scale};
}

void Picture::Line(const std::vector<cv::Point2d>& points, Tone tone, double width, bool closed) {
  Line(points, kLabel, width + 2, closed);
  Line(points, OnLabel(tone), width, closed);
}

void Picture::Circle(cv::Point2d centre, double radius, Tone tone, double width) {
  Circle(centre, radius, kLabel, width + 2);
  Circle(centre, radius, OnLabel(tone), width);
}

void Picture::Line(const std::vector<cv::Point2d>& points, Colour colour, double width, bool closed, Dash dash) {
  const double lengths[] = {dash == Dash::kDashed ? 7.0 : 1.5, dash == Dash::kDashed ? 4.0 : 3.0};
  SetColour(cr_.get(), colour);
  cairo_set_line_width(cr_.get(), width);
  cairo_set_line_join(cr_.get(), CAIRO_LINE_JOIN_ROUND);
  cairo_set_dash(cr_.get(), lengths, dash == Dash::kSolid ? 0 : 2, 0);
  cairo_new_path(cr_.get());
  for (const cv::Point2d& p : points) cairo_line_to(cr_.get(), p.x, p.y);
  if (closed) cairo_close_path(cr_.get());
  cairo_stroke(cr_.get());
  cairo_set_dash(cr_.get(), nullptr, 0, 0);
}

void Picture::FillRectangle(const cv::Rect2d& r, Colour colour) {
  SetColour(cr_.get(), colour);
  cairo_rectangle(cr_.get(), r.x, r.y, r.width, r.height);
  cairo_fill(cr_.get());
}

void Picture::Circle(cv::Point2d centre, double radius, Colour colour, double width) {
  SetColour(cr_.get(), colour);
  cairo_set_line_width(cr_.get(), width);
  cairo_new_sub_path(cr_.get());
  cairo_arc(cr_.get(), centre.x, centre.y, radius, 0, 2 * CV_PI);
  cairo_stroke(cr_.get());
}

void Picture::Text(const std::string& text, cv::Point2d place, double size, Tone tone, Align align, bool backed) {
  words_.push_back({text, tone});
  cairo_set_font_size(cr_.get(), size);
  cairo_text_extents_t extents;
  cairo_text_extents(cr_.get(), text.c_str(), &extents);
  const double share = align == Align::kLeft ? 0 : align == Align::kCentre ? 0.5 : 1;
  const double left = place.x - share * extents.x_advance;
  if (backed) FillRectangle({left - 4, place.y - size, extents.x_advance + 8, size * 1.3}, kLabel);
  SetColour(cr_.get(), backed ? OnLabel(tone) : OnPaper(tone));
  cairo_move_to(cr_.get(), left, place.y);
  cairo_show_text(cr_.get(), text.c_str());
}

double Picture::Badge(const std::string& text, cv::Point2d place, double size, Tone tone) {
  words_.push_back({text, tone});
  const double width = WidthOf(text, size);
  FillRectangle({place.x, place.y - size, width + 12, size * 1.35}, OnPaper(tone));
  cairo_set_font_size(cr_.get(), size);
  SetColour(cr_.get(), kPaper);
  cairo_move_to(cr_.get(), place.x + 6, place.y);
  cairo_show_text(cr_.get(), text.c_str());
  return place.x + width + 12;
}

void Picture::TextUpwards(const std::string& text, cv::Point2d place, double size, Tone tone) {
  cairo_save(cr_.get());
  cairo_translate(cr_.get(), place.x, place.y);
  cairo_rotate(cr_.get(), -CV_PI / 2);
  Text(text, {0, 0}, size, tone, Align::kCentre);
  cairo_restore(cr_.get());
}

double WidthOf(const std::string& text, double size) {
  const std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> surface(
      cairo_image_surface_create(CAIRO_FORMAT_A8, 1, 1), cairo_surface_destroy);
  const std::unique_ptr<cairo_t, void (*)(cairo_t*)> cr(cairo_create(surface.get()), cairo_destroy);
  cairo_select_font_face(cr.get(), "sans-serif", CAIRO_FONT_SLANT_NORMAL, CAIRO_FONT_WEIGHT_NORMAL);
  cairo_set_font_size(cr.get(), size);
  cairo_text_extents_t extents;
  cairo_text_extents(cr.get(), text.c_str(), &extents);
  return extents.x_advance;
}

std::vector<std::string> Wrapped(const std::string& text, double size, double width) {
  std::vector<std::string> lines(1);
  std::istringstream words(text);
  for (std::string word; words >> word;) {
    const std::string longer = lines.back() + (lines.back().empty() ? "" : " ") + word;
    if (lines.back().empty() || WidthOf(longer, size) <= width) {
      lines.back() = longer;
    } else {
      lines.push_back(word);
    }
  }
  return lines;
}

std::string Picture::Png() const {
  CheckDrawn(cr_.get(), "the picture");
  cairo_surface_flush(surface_.get());
  const cv::Mat pixels(height(), width(), CV_8UC4, cairo_image_surface_get_data(surface_.get()),
                       static_cast<std::size_t>(cairo_image_surface_get_stride(surface_.get())));
  cv::Mat bgr;
  cv::cvtColor(pixels, bgr, cv::COLOR_BGRA2BGR);
  // OpenCV's fast settings: cairo's own writer takes seven times as long for a file a tenth smaller.
  std::vector<uchar> file;
  cv::imencode(".png", bgr, file);
  return {file.begin(), file.end()};
}

}  // namespace qv
