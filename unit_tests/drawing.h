#ifndef QVTESTER_UNIT_TESTS_DRAWING_H_
#define QVTESTER_UNIT_TESTS_DRAWING_H_

#include <array>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

// Pictures with known content.

/// One finder mark of seven modules, axis-parallel, its top left pixel at (row, column); dark is 0.
void DrawMark(cv::Mat& image, int row, int column, int module, int dark = 0, int light = 255);

/// A white CV_8UC1 canvas with marks of `module` pixels at these top left corners, (row, column) each.
cv::Mat DrawMarks(cv::Size size, int module, const std::vector<cv::Point>& corners);

struct ChartView {
  int marks = 3;        // 2 leaves out the one at the top right
  double turn_deg = 0;  // counter-clockwise about the middle
  double scale = 0.1;   // pixels per chart unit
  cv::Size size = {1000, 1000};
  double blur_px = 0.8;
};

/// Photo of the sharpness chart, CV_8UC3: marks and slanted edges, the chart's middle in the photo's.
cv::Mat DrawChart(const ChartView& view = {});
/// Where the marks' centres lie, pixel centres at whole numbers: corner, second, third as (column, row).
std::vector<cv::Point2d> MarkCentres(const ChartView& view);

struct EdgeView {
  int rows = 400, cols = 120;
  double slope = 0.0875;  // columns per row
  double sigma_px = 1.0;  // Gaussian blur, before the pixel's own aperture
  double dark = 40, light = 200;
  bool dark_left = true;
  double place = 0;  // of the edge's middle, from the region's, columns
};

/// A region with one slanted edge, each pixel the mean of the blurred edge over its square. CV_32F, not rounded.
cv::Mat DrawEdge(const EdgeView& view);

struct EdgePhoto {
  cv::Size size = {300, 300};
  cv::Point2d through = {150, 150};  // a point of the edge, column and row
  double normal_deg = 5;             // from the columns' direction towards the rows': that way it gets lighter
  double sigma_px = 1.0;
  double dark = 47, light = 235;
  double bow_px = 0;            // how far the edge's middle stands out against its ends, at the photo's sides
  double fall = 0;              // share by which light falls across the photo, side to side
  double fall_towards_deg = 0;  // from the columns' direction towards the rows'
};

/// How far an edge of this blur has risen, 0 to 1, in a square pixel whose middle lies so far from it.
double EdgeRise(double distance, double sigma_px, double normal_deg);

/// One edge at any turn, each pixel the exact integral of the blurred edge over its square. CV_32F, not rounded.
cv::Mat DrawEdgePhoto(const EdgePhoto& view);

/// Levels, CV_32F, of light on the same scale (0 to 255) as a camera encodes it (IEC 61966-2-1); not rounded.
cv::Mat EncodeSrgb(const cv::Mat& light);

/// A textured scene with few repeats, CV_8UC1: polygons of all greys, blurred a little unless blur_px is 0.
cv::Mat DrawScene(unsigned seed, cv::Size size = {680, 520}, int polygons = 500, double blur_px = 1);

/// Corners of a rectangle in order, its longer side turned by turn_deg from the rows' direction of counting (down),
/// clockwise as seen.
std::array<cv::Point2d, 4> TurnedRectangle(cv::Point2d middle, double length, double width, double turn_deg);

/// A new directory below the system's one for temporary files; removed with all it holds when it goes.
class TemporaryFolder {
 public:
  TemporaryFolder();
  ~TemporaryFolder();
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;
  std::string Path(const std::string& name) const { return path_ + "/" + name; }
  /// Writes a file of this content and answers its path.
  std::string Write(const std::string& name, const std::string& content) const;
  /// Writes an image file and answers its path.
  std::string Write(const std::string& name, const cv::Mat& image) const;

 private:
  std::string path_;
};

std::string ReadFile(const std::string& path);

#endif  // QVTESTER_UNIT_TESTS_DRAWING_H_
