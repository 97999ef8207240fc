#ifndef QVTESTER_TESTER_H_
#define QVTESTER_TESTER_H_

#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "qvtester/finder_pattern.h"
#include "qvtester/indices.h"
#include "qvtester/resource.h"
#include "qvtester/results.h"

/// One record of the region lists (properties 76 and 78): left, top, width, height in pixels, and a label.
struct QVRegionRecord {
  std::int32_t fields[5];
};

/// A region list as it was set: its length stays, whatever the property that counted it is set to later.
struct QVRegionList {
  std::unique_ptr<QVRegionRecord[]> records;
  int count = 0;
};

/// How a photo is turned to set its chart upright: about the middle of a square canvas of its longer side.
struct UprightTurn {
  cv::Size canvas;
  cv::Mat map;  // 2 x 3, CV_64F, from photo to canvas
};

/// What the last search of a chart photo found, kept for whoever draws or explains a result; no test reads it back.
/// Written by every search (tests 14, 16 and 20, the sharpness measures, CheckPatternCircles); those on grey pictures
/// of the caller's own (GetFinderPoints) leave it alone.
struct FoundChart {
  bool searched = false;               // false: the photo was refused before the search, and nothing below is set
  bool of_standard = false;            // the photo was a capture test's standard image
  cv::Mat gray;                        // the picture that was searched, CV_8UC1; the next search draws over it
  int threshold = 0;                   // grey level; what is above it is light
  int candidates = 0;                  // before the best three were chosen
  std::vector<cv::Point> points;       // what GetFinderPoints answered: row in x, column in y
  std::vector<QVFinderPattern> marks;  // the same: corner, second, third where there are three. From pixel corners
  float angle_deg = -1;                // with three, in whole degrees; 315 is upright

  // Once the chart was set upright. Row in x, column in y, on the canvas.
  UprightTurn turn;  // no canvas until then
  cv::Point corner, second, third;

  // Once the sharpness measures have placed their regions: column, row, width, height on the canvas, and the pixels
  // that were measured, CV_8UC1.
  cv::Rect vertical, horizontal;
  cv::Mat vertical_pixels, horizontal_pixels;

  // Once the capture test has sampled them, as GetColorPatchRGB answers them.
  std::vector<cv::Point3i> patches;
};

/// The tester: properties, input slots, result block, and every test and measuring step as a member.
///
/// Members answer a QV_RESULT_CODE unless they say otherwise, and may throw cv::Exception; the exported functions of
/// api.h turn that into codes. Pointers must be valid here; the exported functions check them.
/// Finder points hold the ROW in x and the COLUMN in y, throughout.
class QV_API QVTester {
 public:
  QVTester();
  ~QVTester();
  QVTester(const QVTester&) = delete;
  QVTester& operator=(const QVTester&) = delete;

  // ---- Life ------------------------------------------------------------------------------------------------------

  /// Releases everything held and starts with empty slots and a zeroed result block; properties stay. Answers 1.
  int Initialize();
  /// Frees all slots and results; properties stay. Answers 1.
  int Release();

  // ---- Properties -------------------------------------------------------------------------------------------------

  /// Copies a property's value in; no range check. The histograms 87 and 88 are not copied: the tester reads them where
  /// the caller keeps them. -97 for an unknown index or a list with a negative count.
  int SetProperty(QV_PROPERTY_INDEX index, void* value);
  /// Copies a property's value out. -97 for an unknown index or a table that was never set; *out is then untouched.
  int GetProperty(QV_PROPERTY_INDEX index, void* out);

  /// Logs and stores the step number. Answers 0.
  int SetStep(int step);

  /// Log and write, or log and read, prop_binary_thr_working_.
  int setWorkingBinaryThresh(int value);
  int getWorkingBinaryThresh();

  // ---- Input slots ----------------------------------------------------------------------------------------------

  /// Loads a file: an image into 14-33, a video into 34-35. -97 for another slot or a file that is missing or
  /// unreadable.
  int SetResource(QV_RESOURCE_INDEX index, char* path);
  /// Copies height x width pixels of three 16-bit values into one of the slots 14-35, as they come.
  int SetResource(QV_RESOURCE_INDEX index, int width, int height, unsigned short* data);
  /// Converts an NV21 preview frame to CV_8UC4 (BGRA), into any slot.
  /// @throws cv::Exception for an odd width or height.
  int SetResource(QV_RESOURCE_INDEX index, int width, int height, void* data);
  /// Slot 36 only: reads image files as grey (median of 5 x 5), registers each onto the first, binarises it at its own
  /// mean and takes the lot apart into principal components, into the kept image list. All or nothing.
  /// -97 for another slot, an empty list or a file that is missing or unreadable; -90 when one can't be registered.
  int SetResource(QV_RESOURCE_INDEX index, std::vector<std::string> paths);
  /// Image i of the list, rebuilt from its first principal components (property 80 when the list was set says how
  /// many): rows x cols of the first image, CV_32F. @throws cv::Exception for an image that the list does not hold.
  cv::Mat RebuildListImage(int i);
  /// Inert: answers 1.
  int SetResource(QV_RESOURCE_INDEX index, int width, int height, bool flag, unsigned short* first,
                  unsigned short* second, unsigned short* third, unsigned short* fourth);
  /// Copies height x width pixels of three floats into one of the slots 0-13.
  int SetHDRResource(QV_RESOURCE_INDEX index, int width, int height, bool flag, float* data);
  /// Empties one of the slots 0-13; -97 for any other.
  int ReleaseImage(QV_RESOURCE_INDEX index);
  /// Inert: answer 1.
  int GetLDRImage(QV_RESOURCE_INDEX index, int* width, int* height, unsigned char** data);
  int SaveHDRImage(QV_RESOURCE_INDEX index, char* path);

  // ---- Run, results -----------------------------------------------------------------------------------------------

  /// Validates the slots, logs, and runs the test's routine, whose code it answers.
  int RunTest(QV_TEST_INDEX test, bool fake_mode);
  /// 1 when every slot that the test needs is loaded, -98 when one is not, -97 for a test that can't be run.
  int ValidateTest(QV_TEST_INDEX test);
  int GetResult(QVResultData** out);
  /// Frees the arrays that the test left; -97 outside 0 to 29.
  int ReleaseTestResult(QV_TEST_INDEX test);
  /// Frees slots and result of one of the tests 0-12; -97 for test 3 and any other.
  int ReleaseDataForTest(QV_TEST_INDEX test);

  /// Store into a record of the tests 0-12, which takes over the array (from new[]) and frees the one before. Answer 1.
  int SetResult(QVPhase1Result* r, int code);
  int SetResultImage(QVPhase1Result* r, int width, int height, unsigned char* image);
  int SetResultRawData(QVPhase1Result* r, int width, int height, float* data);
  int SetResultErrorPoint(QVPhase1Result* r, QVRECT* points, int count);

  // ---- Tests, in the order of their numbers ------------------------------------------------------------------------

  /// Tests 13 (main camera) and 19 (front): difference of two preview frames, into the preview_ fields.
  /// Frames of different sizes are logged, and nothing is stored.
  void TestCameraPreview(bool front);
  /// Test 14: the SFR of the chart photo in slot 17, into the af_sfr_ fields. The code of GetSFRFromImage; only 1
  /// stores.
  int TestCameraAutofocus();
  /// Tests 15 and 18: mean of the first channel of the photo in slot 16, or 23. Answer 1.
  int TestCameraFlash();
  int TestCameraFlashVT();
  /// Tests 16 (main camera) and 20 (front): L*a*b* of the chart's colour patches in slot 17 or 24, and their CIE 1976
  /// difference to those of the standard image in slot 18 or 25, which is measured once in the tester's life.
  /// @return 1; -91 when either photo does not show three finder marks, -87 when fewer than 15 patches were measured,
  ///         -98 when the slot is empty. Only 1 stores.
  int TestCameraCapture(bool front);
  /// Tests 17 (main camera) and 21 (front): dark blobs in a photo of a plain, evenly lit target, and its grey-level
  /// histogram beside the reference (properties 88 and 87). With fake_mode the blobs are left out. Answers 1.
  int TestLensDust(bool front, bool fake_mode);
  /// Tests 27 and 28: light, colour and dots of the photo in slot 30 or 31, into led_ or touch_led_, over each region
  /// of property 76 or 78 (the first 75 or 77 of them), or over the whole photo without a list. Dots: DetectDot on the
  /// grey levels of each region by itself (threshold 53, radius 55), merged within the distance of property 59 over the
  /// whole photo; areas under 60 pixels are dropped. Over 20,000 separate spots are noise: logged, and not merged.
  /// @return 1, or -98 when the slot is empty. @throws cv::Exception for a photo of another depth than 8 bits, and for
  ///         a region that does not lie inside it.
  int TestLEDLight();
  int TestTouchPanelLED();
  /// Test 29: the print in slot 32 against those of the list in slot 36, into the print_ fields and print_map_. The
  /// photo (grey, median of 5 x 5) is registered onto the list's first picture (GetUnwarpedImage, RefineUnwarp), made
  /// black and white about its mean and rebuilt from the list's mean and first principal components (property 80);
  /// where it departs by more than half the range, after an opening of 3 x 3, is an error area, merged and dropped as
  /// in test 27. What the photo does not show is not judged.
  /// @return 1; -90 when it can't be registered, -98 when slot 32 is empty. @throws cv::Exception for another depth
  /// than
  ///         8 bits, and when slot 36 holds no list.
  int TestTouchPanelPrint();

  // Films are read from their start at each run, frame by frame, so that memory does not grow with them. -98 when the
  // slot is empty, -95 with a log line when it holds no film or no frame: tests/video/film.h.
  /// Test 22: as test 13, of the frames in slots 28 and 29, into preview_video_. Answers 1, or -98.
  int TestVideoPreview();
  /// Test 23: GetMTFFromImage on every frame of the film in slot 34, into the video_af_ fields.
  /// @return 1, or -91 when no frame could be measured. Only 1 stores.
  int TestVideoAutofocus();
  /// Test 24: brightness of each frame of slot 34 and the pulse in it, into the video_flash_ fields. Property 89 limits
  /// the frames read; 0 or less means all. Answers 1.
  int TestVideoFlash();
  /// Tests 25 and 26: frames, time stamps and the chart's marks in the film of slot 35, or 34.
  /// @return 1 when the chart was seen in at least one frame, else -91. Both store.
  int TestVideoRecord();
  int TestVideoPlay();

  // Checks outside the numbered tests.
  /// GetSFRFromImage on the photo in slot 17, for the MTF50 values alone; -98 when the slot is empty.
  int CheckMTF(float* mtf50Vertical, float* mtf50Horizontal);
  /// Looks for the chart's three finder marks in the preview frame of slot 17 and publishes their number, places and
  /// the chart's centre as system properties, for cam_id 0 (main) and 2 (second rear camera).
  /// @return 1 when exactly three were found, else 0; -98 when the slot is empty.
  int CheckPatternCircles(int cam_id);
  /// Writes an NV21 preview frame as JPEG, three frame numbers to a file. A failed write is silent.
  /// @throws cv::Exception for a size that NV21 can't have.
  void SavePreview(void* data, int frame, int width, int height);

  // ---- Chart: finder marks --------------------------------------------------------------------------------------

  /// Centres of the chart's finder marks (dark:light:dark:light:dark as 1:1:3:1:1 across the centre).
  ///
  /// @param image  rows x cols, CV_8UC1; 0 is dark, anything else light.
  /// @return at most three points, row in x, column in y; fewer when fewer candidates were confirmed.
  /// @throws cv::Exception (StsUnsupportedFormat) for another depth or more channels.
  /// Row scan with three cross-checks, after the finder search of QR codes (ISO/IEC 18004); where and why ours
  /// differs: chart/QVTester_Finder.cpp.
  std::vector<cv::Point> GetFinderPoints(cv::Mat image);
  /// Looks for the finder marks of a chart photo and keeps what it finds: grey picture, light above the threshold,
  /// search, marks in their order. `name` is the measure that logs the threshold; null: none does.
  /// @throws cv::Exception for a photo without three or four channels, or (StsUnsupportedFormat) of other than 8 bits.
  FoundChart& FindChart(cv::Mat photo, int threshold, const char* name = nullptr);

  // Steps of the search, on its state below. Counts are the five run lengths dark, light, dark, light, dark.
  bool foundPatternCross(int* stateCount);
  bool handlePossibleCenter(cv::Mat image, int* stateCount, int i, int j);
  float centerFromEnd(int* stateCount, int end);
  float crossCheckVertical(cv::Mat image, int startI, int centerJ, int maxCount, int rowStateCountTotal);
  float crossCheckHorizontal(cv::Mat image, int startJ, int centerI, int maxCount, int rowStateCountTotal);
  bool crossCheckDiagonal(cv::Mat image, int startI, int centerJ, int maxCount, int rowStateCountTotal);
  int findRowSkip();
  bool haveMultiplyConfirmedCenters();
  std::vector<cv::Point> selectBestPatterns();
  /// Zeroes crossCheckStateCount.
  void getCrossCheckStateCount();

  // ---- Chart: geometry ------------------------------------------------------------------------------------------

  /// The mark at the chart's right angle: opposite the longest side of the first three points.
  cv::Point GetCornerPoint(std::vector<cv::Point> points);
  /// Corner, then the mark to its right and the one below it, as seen on the upright chart.
  void SortPatternPoints(std::vector<cv::Point> points, cv::Point& corner, cv::Point& second, cv::Point& third);
  /// The chart's angle in whole degrees, 0 to 359; 315 is upright; -1 unless there are exactly three points.
  float GetPatternAngle(std::vector<cv::Point> points);
  /// Turns the image upright about the middle of a square canvas of its longer side, uncovered pixels 0, and carries
  /// the three points along.
  void NormalizePatternImage(cv::Mat image, std::vector<cv::Point>& points, cv::Mat& normalized);

  /// Registers a picture onto a reference and resamples it into the reference's frame and size.
  ///
  /// @param reference, image  8 bits; one channel, or colour that is weighed to grey for the search.
  /// @param[out] unwarped     as image, of the reference's size; edge pixels repeat where the image does not reach.
  /// @return 1, or -90 when fewer than three good matches exist (unwarped is not touched).
  /// @throws cv::Exception for an empty picture or another depth.
  /// SURF (Bay et al. 2006), FLANN, and the affine map of the three best matches: chart/QVTester_Unwarp.cpp.
  int GetUnwarpedImage(cv::Mat reference, cv::Mat image, cv::Mat& unwarped);
  /// Refines an affine map to a fraction of a pixel where it is right to some ten pixels: enhanced correlation
  /// (Evangelidis, Psarakis 2008; cv::findTransformECC), from coarse pictures to fine ones of at most two megapixels.
  ///
  /// @param reference, image  CV_8UC1.
  /// @param[in,out] map       2 x 3, CV_64F: reference coordinates to image coordinates; left as it is where the search
  ///                          does not converge.
  /// @return the correlation of the two where both are seen, up to 1; NaN where the search does not converge.
  float RefineUnwarp(cv::Mat reference, cv::Mat image, cv::Mat& map);
  /// The good matches of the last registration that succeeded, drawn (CV_8UC3) when asked for; empty before the first.
  const cv::Mat& DrawUnwarpMatches();

  // ---- Sharpness ------------------------------------------------------------------------------------------------

  /// Spatial frequency response of one region with one straight, slightly slanted edge.
  ///
  /// @param roi         rows x cols, one channel, grey levels; at least 5 pixels across the edge.
  /// @param[out] freq   npix/2 + 1 values are appended, in units of Nyquist (1.0 = 0.5 cycles/pixel); npix is the
  ///                    region's smaller side.
  /// @param[out] sfr    as many responses, 1 at zero frequency.
  /// @param[out] mtf50  frequency of response 0.5, in units of Nyquist; NaN or infinity where the curve gives none.
  /// @return true, always.
  /// @throws cv::Exception for a region that is too small or of several channels.
  /// Slanted edge after ISO 12233; where and why ours differs: sharpness/QVTester_MTF.cpp.
  bool CalculateSFR(cv::Mat roi, std::vector<float>& freq, std::vector<float>& sfr, float& mtf50);
  /// As CalculateSFR, for the MTF50 alone. Answers 1.
  int CalculateMTF(cv::Mat roi, float& mtf50);

  // Steps of the response. Columns are n x 1, rows 1 x n, all CV_32F.
  /// The region with its edge running down the rows: transposed when it has fewer rows than columns, else shared.
  cv::Mat ConvertToVertical(cv::Mat roi);
  /// Derivative kernels of 2 and 3 taps, signed so that the edge's peak is positive. The caller frees both (delete[]).
  void CalculateFilterValue(cv::Mat* roi, float** fil1, float** fil2);
  /// Hamming window of length n about mid.
  cv::Mat GetAHammingWindow(int n, float mid);
  /// Derivative along each row; out becomes nlin x npix.
  void GetFirstDerivative(cv::Mat src, int nlin, int npix, float* fil, int nfil, cv::Mat& out);
  /// Centre of gravity of a column, as a row index; NaN or infinity when its sum is 0.
  float GetCentroid(cv::Mat x);
  /// The column moved so that row `center` comes to the middle; rows moved in are 0.
  cv::Mat GetShiftedArray(cv::Mat x, int center);
  /// Least-squares polynomial; dst is (order + 1) x 1, lowest power first.
  /// @throws cv::Exception (StsAssert) for shapes that don't fit.
  void polyfit(const cv::Mat& src_x, const cv::Mat& src_y, cv::Mat& dst, int order);
  /// Line through edge positions, one a row: column = offset + slope * row. True, always.
  bool FindEdge(cv::Mat loc, int nlin, float* slope, float* offset);
  /// Edge spread: the region's pixels projected along the edge into npix * fac bins. `loc` is not used.
  cv::Mat ProjectData(cv::Mat bb, float slope, float loc, int fac);

  /// Sharpness of a chart photo: the SFR of its two slanted-edge regions.
  ///
  /// @param image               rows x cols, CV_8UC3 or CV_8UC4, the whole chart in view.
  /// @param[out] freq           npix/2 + 1 values from 0, in units of Nyquist (1.0 = 0.5 cycles/pixel). Pass it empty.
  /// @param[out] sfrVertical    as many responses, 1 at zero frequency; sfrHorizontal likewise.
  /// @param[out] mtf50Vertical  frequency of response 0.5, in units of Nyquist; NaN or infinity where the curve gives
  ///                            none; mtf50Horizontal likewise.
  /// @return 1, or -91 when the chart does not show exactly three finder marks (no output is touched).
  /// @throws cv::Exception when a region reaches outside the straightened chart, or the depth is not 8 bits.
  /// Slanted edge after ISO 12233; where and why ours differs: sharpness/QVTester_MTF.cpp.
  int GetSFRFromImage(cv::Mat image, std::vector<float>& freq, std::vector<float>& sfrVertical,
                      std::vector<float>& sfrHorizontal, float& mtf50Vertical, float& mtf50Horizontal);
  /// As GetSFRFromImage, for the MTF50 values alone, with the chart's geometry in the log.
  int GetMTFFromImage(cv::Mat image, float& mtf50Vertical, float& mtf50Horizontal);

  // ---- Camera steps
  // ----------------------------------------------------------------------------------------------------

  /// Publishes the points and the middle of the longest side of the closed polygon that they make. 0, always.
  int GetImageCenter(std::vector<cv::Point>& points, int cam_id);

  /// Mean colour of the patches around an upright chart: six along the top, six along the bottom, six down the left,
  /// six down the right; fewer when a patch reaches outside. x, y, z are red, green, blue, 0 to 255, truncated.
  std::vector<cv::Point3i> GetColorPatchRGB(cv::Mat image, std::vector<cv::Point> finder_points);

  /// Finds dark blobs in a grey photo (CV_8UC1) and publishes the places of the first five outside the corners.
  /// Sees discs of 4 to 16 pixels where the mean grey level is above 130: tests/camera/QVTester_LensDust.cpp.
  /// @return the number of places published.
  int detectBlob(cv::Mat& gray);
  /// False in the four corner squares of 20 pixels, where the fixture's marks are.
  bool isValidLocation(int width, int height, cv::Point2f p);
  /// Appends a place to, or clears, the system property "t82.vi<index>_mung_loc".
  void save_mung_location(cv::Point2f p, int index);
  void remove_mung_location(int index);
  /// Draws the fixture's frame, the outermost pixels of the width x height picture, in this value.
  void draw_guide_line(cv::Mat& image, int width, int height, int value);
  /// Counts pixels darker than half the photo's mean in two regions of a grey photo (CV_8UC1), whatever their shape or
  /// size. @return their number in both regions together. @throws cv::Exception for a region outside the photo.
  int detectMung(cv::Mat gray, cv::Rect roi1, cv::Rect roi2);
  /// The blobs of the last detectBlob, drawn in blue onto the picture that they were found in (CV_8UC3); drawn when
  /// asked for, and empty before the first.
  const cv::Mat& DrawBlobs();

  // ---- Colour ---------------------------------------------------------------------------------------------------

  /// Transfer function of sRGB (IEC 61966-2-1): an 8-bit value to linear, 0 to 1.
  float GetLinearRGB(int v);
  /// sRGB to CIE XYZ (D65), white at Y = 1.
  void ConvertRGB2XYZ(int r, int g, int b, float& X, float& Y, float& Z);
  /// Companion function f(t) of L*a*b* (CIE 15).
  float GetFValue(float t);
  /// CIE L*a*b* relative to an implicit white of (1, 1, 1): the white point that is passed is not used.
  void ConvertXYZ2LAB(float X, float Y, float Z, float Xw, float Yw, float Zw, float& L, float& a, float& b);
  /// prop_color_matrix_ times each of rows x cols RGB triples. The caller frees the result (free); null when memory is
  /// exhausted.
  float* rgb2xyz(float* rgb, int rows, int cols);
  /// Correlated colour temperature in kelvin of each of rows x cols XYZ triples, 0 where there is none. The caller
  /// frees the result (free); null when memory is exhausted.
  float* xyz2cct(float* xyz, int rows, int cols);

  // ---- LED and touch-panel tests ----------------------------------------------------------------------------------

  /// Flags pixels of a high-dynamic-range capture whose value departs from their local mean by more than a fraction.
  ///
  /// @param data       height x width pixels of three floats, rows packed; channel 0 is read.
  /// @param threshold  relative deviation, 0.1 for 10 %; a pixel beyond it is flagged.
  /// @param radius     the mean is taken over 2 radius + 1 pixels a side, shifted inward near an edge.
  /// @param[out] mask  height x width bytes; 1 is set at flagged pixels, nothing else is written.
  /// The mean comes from a summed-area table in single precision (Crow 1984), whose rounding is part of the result: on
  /// 12 megapixels it alone flags pixels of a uniform picture at small radii. A picture smaller than the window is
  /// logged and flags nothing.
  void DetectDot(float* data, int height, int width, float threshold, int radius, unsigned char* mask);
  /// Channel 0 of a float picture of several channels, stretched from its least and largest value to 0 and 255,
  /// CV_8UC1. @throws cv::Exception for an empty picture.
  cv::Mat HDR2UCHAR(cv::Mat& hdr);
  /// Merges rectangles of defective pixels that lie within a distance, until no two do.
  ///
  /// @param distance               pixels; each rectangle grows by half of it (by all of a distance of 1 or less).
  /// @param width, height          of the image, which bounds the overlap.
  /// @param[in,out] areas          as many entries as rectangles; then each one's index in the pass before the last.
  /// @param[in,out] counts         flagged pixels a rectangle; null, or pointing to null, counts from 0.
  /// @param[in,out] topLeft        column and row, inside; bottomRight likewise.
  /// The arrays come from malloc: those given are freed, new ones handed back. Fewer than two rectangles are left as
  /// they are.
  /// @return number of areas.
  int ErrorAreaClustering(int distance, int width, int height, std::vector<int>* areas, int** counts,
                          cv::Point** topLeft, cv::Point** bottomRight);

  // ---- State ----------------------------------------------------------------------------------------------------

  static constexpr int kSlotCount = 37;
  std::array<std::unique_ptr<QVResource>, kSlotCount> resources_;  // null: the slot is empty
  std::unique_ptr<QVResultData> results_;                          // from Initialize to Release
  int step_ = 0;
  int hdr_width_ = -1;  // of the last HDR buffer that was loaded, like the two below
  int hdr_height_ = -1;
  bool hdr_flag_ = false;

  // Search for finder marks; each GetFinderPoints starts anew.
  bool hasSkipped = false;
  int startSize = 0;  // candidates before the best three were chosen
  std::vector<QVFinderPattern> possibleCenters;
  int crossCheckStateCount[5] = {};

  // What the last runs found and may be looked at, and the work images: behind a pointer, so that they don't change the
  // size of the class.

  // The list of slot 36, each picture of the first one's size where not said otherwise.
  struct ImageList {
    std::vector<cv::Mat> gray;        // as read and smoothed, CV_8UC1, each of its own size
    std::vector<cv::Mat> registered;  // onto the first, CV_8UC1
    cv::Mat combined;                 // mean of the registered pictures, CV_8UC1
    cv::Mat matrix;                   // images x pixels, CV_32F: 0 or 255
    cv::Mat mean;                     // 1 x pixels, CV_32F
    cv::Mat eigenvectors;             // components x pixels, CV_32F
    cv::Mat eigenvalues;              // components x 1, CV_32F
    cv::Mat projection;               // images x components, CV_32F
    int components = 0;               // that a rebuild uses: 1 to the number of images
  };

  // The last registration that succeeded.
  struct Unwarp {
    cv::Mat reference, image;
    std::vector<cv::KeyPoint> reference_keypoints, image_keypoints;
    std::vector<cv::DMatch> good;
    cv::Mat matrix;  // 2 x 3, CV_64F: reference coordinates to image coordinates
    cv::Mat drawing;
  };

  // The standard image's patch colours, one set a camera.
  struct ColorStandard {
    bool is_extracted = false;
    int count = 0;                           // patches
    std::unique_ptr<float[]> standard_lab_;  // triples L*, a*, b*
    std::vector<cv::Point3i> patches;        // as GetColorPatchRGB answers them
  };

  // What the last detectBlob saw; a copy that shares it stays as it is when the next one runs.
  struct Blobs {
    cv::Mat image;  // CV_8UC1
    std::vector<cv::KeyPoint> keypoints;
    cv::Mat drawing;
  };

  struct Kept {
    FoundChart chart;
    Blobs blobs;
    Unwarp unwarp;
    ImageList image_list;
    ColorStandard standard_main, standard_front;
    // Work images: kept, since new pages cost more than what is written to them. The next test overwrites them, so
    // nothing that is handed out shares them.
    cv::Mat gray, binary;
    bool publishes = true;                      // tests write system properties; else they write none
    int published = 0;                          // system properties written; what the store refused is not counted
    const class CutPhoto* cut_photo = nullptr;  // what a search reads; null: a binary picture
    // Called after each frame of a film with the frames so far and those that the container promises (0 where it says
    // nothing); may be empty.
    std::function<void(int frames, int promised)> film_progress;
  };
  std::unique_ptr<Kept> kept_;
  cv::Mat print_map_;  // of the last test 29 that answered 1: 2 x 3, CV_64F, the list's first picture to the photo

  // Constants that no property reaches.
  float param_f0_ = 0.3909f;
  float param_f1_ = 0.7f;

  // Properties; core/property_table.h gives each its index and default.
  int prop_param_0_, prop_param_1_, prop_param_2_;
  float prop_param_6_;
  int prop_param_7_;
  float prop_param_8_, prop_param_9_, prop_param_10_;
  int prop_param_16_;
  float prop_param_17_, prop_param_18_, prop_param_19_;
  int prop_param_26_;
  float prop_param_27_, prop_param_28_, prop_param_29_, prop_param_30_, prop_param_31_;
  int prop_param_32_;
  float prop_param_33_, prop_param_34_, prop_param_35_, prop_param_36_, prop_param_37_;
  int prop_param_43_, prop_param_44_, prop_param_45_, prop_param_46_;
  float prop_param_47_, prop_param_48_, prop_param_49_, prop_param_50_, prop_param_51_;
  float prop_color_matrix_[9];
  float prop_param_53_, prop_param_54_;
  int prop_param_55_, prop_param_56_, prop_param_57_, prop_param_58_, prop_param_59_, prop_param_60_;
  float prop_param_61_;
  cv::Mat prop_camera_matrix_0_, prop_camera_matrix_1_;  // 3 x 3, CV_32F
  cv::Mat prop_dist_coeffs_0_, prop_dist_coeffs_1_;      // 5 x 1, CV_32F
  int prop_param_66_, prop_param_67_, prop_param_68_, prop_param_69_;
  float prop_param_70_;
  int prop_param_71_, prop_param_74_;
  int prop_region_count_0_, prop_region_count_1_;
  QVRegionList prop_region_list_0_, prop_region_list_1_;
  float prop_param_79_;
  int prop_param_80_, prop_param_81_, prop_param_82_, prop_param_83_, prop_param_84_, prop_param_85_, prop_param_86_;
  cv::Mat prop_table_0_, prop_table_1_;  // 1 x 256, CV_32S, over the caller's memory
  int prop_video_flash_frame_count_;
  int prop_param_90_;
  float prop_ref_patch_values_1_[72];
  float prop_ref_patch_values_0_[72];
  bool ref_patch_values_0_set_ = false;  // property 92 was set, and slot 25 not loaded since
  bool ref_patch_values_1_set_ = false;  // property 91 was set, and slot 18 not loaded since
  int prop_binary_thr_working_;
  int prop_param_94_;
};

#endif  // QVTESTER_TESTER_H_
