#ifndef QVTESTER_LCD_H_
#define QVTESTER_LCD_H_

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "qvtester/indices.h"
#include "qvtester/results.h"

/// What the display was told to show.
enum QV_LCD_PATTERN : int {
  QV_LCD_CONTROL = 0,  // red, green, blue and white bars of equal width, in that order
  QV_LCD_GREEN = 1,
  QV_LCD_BLACK = 2,
  QV_LCD_WHITE = 3,
  QV_LCD_RESULT = 4,  // a green tick field or a red cross field
};

/// Levels are stored ones, 0 to 255; those of a 16-bit photo are divided by 257.
struct QVLcdResult {
  int verdict_ = 0;       // 1 or 0
  std::string reason_;    // a sentence: what was seen, and what was expected where that differs
  float sums_[3] = {};    // mean red, green, blue of the screen
  float shares_[3] = {};  // of each in their total; 0 where there is no light
  float ratio_ = 0;       // width to height, as aspect_ratio_
  float levels_[9] = {};  // mean grey at 3 x 3 points, row by row from the upper left
  float uniformity_ = 0;  // smallest over largest of them; 0 where there is no light
  int error_count_ = 0;
  std::vector<QVRECT> error_areas_;  // dots, in pixels of the straightened screen, last row and column inside
};

/// A display in a photo: where it is, and whether it shows the pattern that it was told to show.
///
/// Photos are rows x cols of 8 or 16 bits with 1, 3 (blue, green, red, as OpenCV decodes them) or 4 channels, the
/// fourth of no account. Every call answers 1; -91 when no screen is seen; -95 for an empty photo or another type; -97
/// for an argument out of range; -99 when memory runs out. Nothing is thrown, and a call that fails changes nothing.
class QV_API QVTester_LCD {
 public:
  /// Finds the largest convex quadrilateral that is brighter than what lies around it on all four sides, or darker
  /// within a brighter surround; a bright one that fills most of a dark one is a screen in its bezel, and is taken. Its
  /// surround must be in the photo. Levels are those of the brightest channel at each place. Corners: lines fitted to
  /// the places of the edges, as sharp as the photo allows; where the level is a bent measure of light (a photo file's
  /// transfer, clipping), the edge's own profile tells how far, and it is unbent first.
  int FindScreen(cv::Mat photo);

  /// Cuts the screen out and straightens it to size, of the photo's type; the screen's edges become the picture's.
  int Straighten(cv::Mat photo, cv::Size size, cv::Mat& screen);

  /// Judges by the means of the colour channels inside the screen, relative to one another and to the full range, and
  /// by the ratio of its sides. Dots and levels are measured beside that and change no verdict, unless the last two
  /// thresholds below say so. A photo turned by 90, 180 or 270 degrees gets the same verdict, but for the order of the
  /// control bars, which is read as seen, from the left or from the top.
  /// Dots are looked for by DetectDot in each colour channel, bar by bar in the control pattern; not in a result field.
  int JudgePattern(cv::Mat photo, QV_LCD_PATTERN pattern, QVLcdResult* result);

  // What was found last: clockwise from the upper left as seen, in pixels (a pixel's centre is a whole number).
  std::vector<cv::Point2f> corners_;
  // Width to height: mean lengths of the upper and lower, of the left and right side, foreshortened as they are.
  float aspect_ratio_ = 0;

  // With a camera on a stand: Straighten and JudgePattern take corners_, once found, as they are. So is a black screen
  // judged in the dark, by the corners of a white one. FindScreen always looks.
  bool keep_corners_ = false;

  // The straightened screen of the last JudgePattern: as long as its sides in the photo are in the mean.
  cv::Size screen_size_;

  // What is called a screen.
  float min_screen_area_ = 0.02f;  // share of the photo
  float min_edge_contrast_ = 8;    // levels, across each side

  // What a verdict needs. Means are shares of the full range, shares are of the three channels' total.
  float expected_ratio_ = 16.0f / 9.0f;  // either way round
  float ratio_tolerance_ = 0.2f;         // relative
  float min_white_level_ = 0.4f;         // each channel
  float white_share_tolerance_ = 0.06f;  // departure of each share from a third
  float min_colour_level_ = 0.25f;       // the channel that shows
  float min_colour_share_ = 0.5f;        // its share
  float max_black_level_ = 0.25f;        // each channel; sRGB stores ambient light of 4 % of white's at 0.22
  float min_field_excess_ = 0.02f;       // result: mean excess of green, or red, over the other two
  float field_ratio_ = 3;                // and how many times the excess of the other colour it must be
  float margin_ = 0.02f;                 // of the shorter side: left out of all figures along the rim and between bars

  // What is called a dot.
  float dot_threshold_ = 0.25f;  // relative to the local mean, and never less than six times the noise
  float dot_floor_ = 0.5f;       // of the full range: darker means count as this much
  int dot_radius_ = 10;          // of the window, pixels
  int dot_distance_ = 4;         // between dots of one area, pixels
  int min_dot_pixels_ = 1;       // smaller areas are dropped

  // Off as they stand: a verdict of 1 then needs no more than the above.
  float min_uniformity_ = 0;  // of white and green screens
  int max_error_count_ = -1;  // below 0: any number

 private:
  int Locate(const cv::Mat& photo, bool anew, bool dark_first, std::vector<cv::Point2f>& corners) const;
};

#endif  // QVTESTER_LCD_H_
