#ifndef QVTESTER_DESK_DRAWING_PICTURE_H_
#define QVTESTER_DESK_DRAWING_PICTURE_H_

#include <cairo.h>

#include <memory>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/drawing/palette.h"

namespace qv {

// A picture for a person to look at: lines and text, drawn with cairo.

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
  /// On a photo: edged, so that it shows on any ground.
  void Line(const std::vector<cv::Point2d>& points, Tone tone, double width, bool closed = false);
  void Circle(cv::Point2d centre, double radius, Tone tone, double width);
  /// On paper.
  void Line(const std::vector<cv::Point2d>& points, Colour colour, double width, bool closed = false,
            Dash dash = Dash::kSolid);
  void Circle(cv::Point2d centre, double radius, Colour colour, double width);
  void FillRectangle(const cv::Rect2d& rectangle, Colour colour);
  /// The baseline starts, is centred or ends at the place. On paper, or backed by a label: for a photo.
  void Text(const std::string& text, cv::Point2d place, double size, Tone tone, Align align = Align::kLeft,
            bool backed = false);
  /// White on the tone's own colour; answers where it ends.
  double Badge(const std::string& text, cv::Point2d place, double size, Tone tone);
  /// As Text, reading upwards.
  void TextUpwards(const std::string& text, cv::Point2d place, double size, Tone tone);
  /// The picture as a PNG file's content; throws Failure when anything before could not be drawn.
  std::string Png() const;

  /// All that was written on it, in that order.
  struct Words {
    std::string text;
    Tone tone;
  };
  const std::vector<Words>& words() const { return words_; }

  int width() const { return cairo_image_surface_get_width(surface_.get()); }
  int height() const { return cairo_image_surface_get_height(surface_.get()); }

 private:
  std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> surface_;
  std::unique_ptr<cairo_t, void (*)(cairo_t*)> cr_;
  std::vector<Words> words_;
};

/// Width of a text of this size.
double WidthOf(const std::string& text, double size);

/// The text in lines no wider than this; cut between words.
std::vector<std::string> Wrapped(const std::string& text, double size, double width);

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_PICTURE_H_
