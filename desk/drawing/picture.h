#ifndef QVTESTER_DESK_DRAWING_PICTURE_H_
#define QVTESTER_DESK_DRAWING_PICTURE_H_

#include <cairo.h>

#include <memory>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

namespace qv {

// A picture for a person to look at: lines and text, drawn with cairo.

struct Colour {
  double red, green, blue;
};
inline constexpr Colour kInk = {0.12, 0.12, 0.14};
inline constexpr Colour kFaint = {0.72, 0.72, 0.74};
inline constexpr Colour kGood = {0.0, 0.75, 0.85};      // cyan
inline constexpr Colour kDoubtful = {0.95, 0.80, 0.0};  // yellow
inline constexpr Colour kPoor = {0.90, 0.10, 0.10};     // red

/// Where a photo's pixels lie on a picture: pixel centres at whole numbers.
struct PhotoPlace {
  cv::Point2d origin;
  double scale;
  cv::Point2d operator()(cv::Point2d p) const { return origin + (p + cv::Point2d(0.5, 0.5)) * scale; }
};

enum class Align { kLeft, kCentre, kRight };

class Picture {
 public:
  Picture(int width, int height);

  /// Puts a picture (8 bits; 1, 3 or 4 channels) with its top left corner there, scaled.
  PhotoPlace PlacePhoto(const cv::Mat& image, cv::Point2d origin, double scale);
  void Line(const std::vector<cv::Point2d>& points, Colour colour, double width, bool closed = false);
  void FillRectangle(const cv::Rect2d& rectangle, Colour colour);
  void Circle(cv::Point2d centre, double radius, Colour colour, double width);
  /// The baseline starts, is centred or ends at the place. Backed text stays readable on a photo.
  void Text(const std::string& text, cv::Point2d place, double size, Colour colour, Align align = Align::kLeft,
            bool backed = false);
  /// As Text, reading upwards.
  void TextUpwards(const std::string& text, cv::Point2d place, double size, Colour colour);
  /// The picture as a PNG file's content; throws Failure when anything before could not be drawn.
  std::string Png() const;

  int width() const { return cairo_image_surface_get_width(surface_.get()); }
  int height() const { return cairo_image_surface_get_height(surface_.get()); }

 private:
  std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> surface_;
  std::unique_ptr<cairo_t, void (*)(cairo_t*)> cr_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_PICTURE_H_
