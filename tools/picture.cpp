#include "tools/picture.h"

#include <algorithm>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "tools/program.h"

namespace {

void SetColour(cairo_t* cr, Colour c) { cairo_set_source_rgb(cr, c.red, c.green, c.blue); }

// The widest of the steps 1, 2, 5, 10, 20 ... that cuts the span into at least `parts`.
double TickStep(double span, int parts) {
  const double decade = std::pow(10, std::floor(std::log10(span / parts)));
  for (const double step : {10.0, 5.0, 2.0}) {
    if (step * decade * parts <= span * (1 + 1e-9)) return step * decade;
  }
  return decade;
}

// As few digits as tell neighbouring ticks apart.
std::string TickText(double value, double step) {
  const int decimals = step >= 1 ? 0 : std::clamp(static_cast<int>(std::ceil(-std::log10(step) - 1e-9)), 1, 3);
  return Format("%.*f", decimals, value);
}

}  // namespace

Picture::Picture(int width, int height)
    : surface_(cairo_image_surface_create(CAIRO_FORMAT_RGB24, width, height), cairo_surface_destroy),
      cr_(cairo_create(surface_.get()), cairo_destroy) {
  if (cairo_status(cr_.get()) != CAIRO_STATUS_SUCCESS) {
    throw Failure(kInternalFault, Format("no memory for a picture of %d x %d pixels", width, height));
  }
  cairo_select_font_face(cr_.get(), "sans-serif", CAIRO_FONT_SLANT_NORMAL, CAIRO_FONT_WEIGHT_NORMAL);
  SetColour(cr_.get(), {1, 1, 1});
  cairo_paint(cr_.get());
}

PhotoPlace Picture::PlacePhoto(const cv::Mat& image, cv::Point2d origin, double scale) {
  cv::Mat scaled;
  cv::resize(image, scaled, cv::Size(), scale, scale, scale < 1 ? cv::INTER_AREA : cv::INTER_NEAREST);
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

void Picture::Line(const std::vector<cv::Point2d>& points, Colour colour, double width, bool closed) {
  SetColour(cr_.get(), colour);
  cairo_set_line_width(cr_.get(), width);
  cairo_set_line_join(cr_.get(), CAIRO_LINE_JOIN_ROUND);
  cairo_new_path(cr_.get());
  for (const cv::Point2d& p : points) cairo_line_to(cr_.get(), p.x, p.y);
  if (closed) cairo_close_path(cr_.get());
  cairo_stroke(cr_.get());
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

void Picture::Text(const std::string& text, cv::Point2d place, double size, Colour colour, Align align, bool backed) {
  cairo_set_font_size(cr_.get(), size);
  cairo_text_extents_t extents;
  cairo_text_extents(cr_.get(), text.c_str(), &extents);
  const double share = align == Align::kLeft ? 0 : align == Align::kCentre ? 0.5 : 1;
  const double left = place.x - share * extents.x_advance;
  if (backed) {
    cairo_rectangle(cr_.get(), left - 4, place.y - size, extents.x_advance + 8, size * 1.3);
    cairo_set_source_rgba(cr_.get(), kInk.red, kInk.green, kInk.blue, 0.8);
    cairo_fill(cr_.get());
  }
  SetColour(cr_.get(), colour);
  cairo_move_to(cr_.get(), left, place.y);
  cairo_show_text(cr_.get(), text.c_str());
}

void Picture::TextUpwards(const std::string& text, cv::Point2d place, double size, Colour colour) {
  cairo_save(cr_.get());
  cairo_translate(cr_.get(), place.x, place.y);
  cairo_rotate(cr_.get(), -CV_PI / 2);
  Text(text, {0, 0}, size, colour, Align::kCentre);
  cairo_restore(cr_.get());
}

std::string Picture::Png() const {
  std::string file;
  cairo_surface_flush(surface_.get());
  const auto append = [](void* out, const unsigned char* data, unsigned int length) {
    static_cast<std::string*>(out)->append(reinterpret_cast<const char*>(data), length);
    return CAIRO_STATUS_SUCCESS;
  };
  if (cairo_surface_write_to_png_stream(surface_.get(), append, &file) != CAIRO_STATUS_SUCCESS) {
    throw Failure(kInternalFault, "the picture can't be encoded");
  }
  return file;
}

void DrawPlot(Picture& picture, const Plot& plot, const cv::Rect2d& area) {
  constexpr double kText = 12;
  const cv::Rect2d frame(area.x + 52, area.y + (plot.second_x_label.empty() ? 28 : 58), area.width - 68,
                         area.height - (plot.second_x_label.empty() ? 72 : 102));
  const auto place = [&](cv::Point2d value) {
    const double y = std::clamp(value.y, plot.y_min, plot.y_max);
    return cv::Point2d(frame.x + value.x / plot.x_max * frame.width,
                       frame.y + frame.height * (1 - (y - plot.y_min) / (plot.y_max - plot.y_min)));
  };
  picture.Text(plot.title, {area.x + area.width / 2, area.y + 16}, kText + 2, kInk, Align::kCentre);

  const double x_step = TickStep(plot.x_max, 4);
  for (int i = 0; i * x_step <= plot.x_max * (1 + 1e-9); ++i) {
    const double x = i * x_step;
    const cv::Point2d foot = place({x, plot.y_min});
    picture.Line({foot, {foot.x, frame.y}}, kFaint, 0.5);
    picture.Text(TickText(x, x_step), {foot.x, foot.y + 16}, kText, kInk, Align::kCentre);
    if (!plot.second_x_label.empty()) {
      picture.Text(TickText(x * plot.second_x_factor, x_step * plot.second_x_factor), {foot.x, frame.y - 6}, kText,
                   kInk, Align::kCentre);
    }
  }
  const double y_step = TickStep(plot.y_max - plot.y_min, 4);
  for (int i = 0; plot.y_min + i * y_step <= plot.y_max + y_step * 1e-9; ++i) {
    const double y = plot.y_min + i * y_step;
    const cv::Point2d left = place({0, y});
    picture.Line({left, {frame.x + frame.width, left.y}}, kFaint, 0.5);
    picture.Text(TickText(y, y_step), {frame.x - 6, left.y + 4}, kText, kInk, Align::kRight);
  }
  picture.Text(plot.x_label, {frame.x + frame.width / 2, frame.y + frame.height + 34}, kText, kInk, Align::kCentre);
  picture.Text(plot.second_x_label, {frame.x + frame.width / 2, frame.y - 24}, kText, kInk, Align::kCentre);
  picture.TextUpwards(plot.y_label, {area.x + 12, frame.y + frame.height / 2}, kText, kInk);

  for (const double y : plot.horizontal_lines) picture.Line({place({0, y}), place({plot.x_max, y})}, kInk, 1);
  const auto finite = [](const cv::Point2d& p) { return std::isfinite(p.x) && std::isfinite(p.y); };
  std::vector<cv::Point2d> line;
  for (const cv::Point2d& point : plot.curve) {
    if (!finite(point)) continue;
    if (plot.bars) picture.Line({place({point.x, plot.y_min}), place(point)}, {0.1, 0.35, 0.75}, 1);
    line.push_back(place(point));
  }
  std::vector<cv::Point2d> second_line;
  for (const cv::Point2d& point : plot.second_curve) second_line.push_back(place(point));
  if (!second_line.empty()) picture.Line(second_line, kInk, 1);
  if (!plot.bars && !line.empty()) picture.Line(line, {0.1, 0.35, 0.75}, 2);
  for (const Plot::Curve& curve : plot.more_curves) {
    std::vector<cv::Point2d> points;
    for (const cv::Point2d& point : curve.points) points.push_back(place(point));
    picture.Line(points, curve.colour, 2.5);
    for (const cv::Point2d& point : points) picture.Circle(point, 2.5, curve.colour, 2);
  }
  for (const Plot::Marker& marker : plot.markers) {
    if (!finite(marker.at) || marker.at.x > plot.x_max) continue;
    const cv::Point2d at = place(marker.at);
    picture.Line({{at.x, frame.y + frame.height}, at}, marker.colour, 1.5);
    picture.Circle(at, 4, marker.colour, 2.5);
    picture.Text(marker.text, {at.x + 8, at.y - 8}, kText + 1, kInk);
  }
  picture.Line({frame.tl(), {frame.br().x, frame.y}, frame.br(), {frame.x, frame.br().y}}, kInk, 1, true);
}
