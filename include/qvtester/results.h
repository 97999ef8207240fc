#ifndef QVTESTER_RESULTS_H_
#define QVTESTER_RESULTS_H_

// The block that GetResult hands out. The tester owns it and every array in it: read in place, never free.
// An array stays valid until its test runs again or its result is released; a released array is null, its count 0.
// A run that fails stores nothing: the figures of the last good one stand, so read them only when RunTest answered 1.

/// Rectangle in pixels, both corners inside it.
struct QVRECT {
  int left;
  int top;
  int right;
  int bottom;
};

/// Record of one of the tests 0 to 12.
struct QVPhase1Result {
  int result_;
  int image_width_;
  int image_height_;
  unsigned char* image_;
  int raw_width_;
  int raw_height_;
  float* raw_data_;
  int error_point_count_;
  QVRECT* error_points_;
};

/// Difference of two preview frames (tests 13 and 19).
struct QVPreviewResult {
  int preview_diff_cols_;
  int preview_diff_rows_;
  float* preview_diff_map_;  // rows x cols, row by row, scaled so that the largest is 1; NaN for identical frames
  float preview_diff_mean_;  // mean difference before that scaling, 0 to 1
};

/// Colour patches of a chart photo (tests 16 and 20).
struct QVCaptureResult {
  float* capture_lab_;         // triples L*, a*, b*
  float* capture_delta_e_;     // CIE 1976 differences to the standard, one a patch
  int capture_lab_count_;      // triples in capture_lab_
  int capture_delta_e_count_;  // values in capture_delta_e_
};

/// Frames of a film and the chart in them (tests 25 and 26).
struct QVVideoChartResult {
  int frames_promised_;  // by the container; 0 where it says nothing
  int frame_count_;      // decoded: entries of each array
  int frames_lost_;      // in gaps of more than 1.5 median intervals: what is missing there
  int frames_bad_;       // that could not be decoded
  double mean_rate_;     // frames per second, from the time stamps; 0 for a single frame
  double longest_gap_;   // ms between two neighbours, whether or not frames are lost there; 0 for a single frame
  int found_count_;      // frames with exactly three marks
  double* time_;         // ms from the first frame
  int* mark_count_;      // 0 to 3
  float* angle_;         // degrees, GetPatternAngle; -1 without three marks
  int* corner_row_;      // pixels, of the corner mark; -1 without three marks
  int* corner_column_;
};

/// One region of a photo of lights (tests 27 and 28).
struct QVLightRegion {
  int label_, left_, top_, width_, height_;  // pixels, but for the label
  float mean_grey_;                          // 0 to 255
  float linear_rgb_[3];                      // means of linear light, 0 to 1
  float xyz_[3];                             // of linear_rgb_, by the matrix of ConvertRGB2XYZ
  float chromaticity_[2];                    // x, y; NaN where there is no light
  float cct_;                                // kelvin, xyz2cct; 0 where there is none
  float clipped_share_;                      // of pixels with a channel at 255, 0 to 1
  float uniformity_;                         // smallest over largest mean of 8 x 8 equal blocks, 0 to 1
};

/// Regions of a photo of lights, and the dots in them (tests 27 and 28).
struct QVLightResult {
  int region_count_;
  QVLightRegion* regions_;
  int error_count_;  // entries of both arrays below
  QVRECT* error_areas_;
  int* error_pixels_;  // flagged pixels of each area
};

// NOLINTNEXTLINE(clang-analyzer-optin.performance.Padding): in the order of the tests
struct QVResultData {
  QVPhase1Result phase1_[13];

  QVPreviewResult preview_main_;  // test 13

  int af_sfr_count_;      // test 14: values in each of the three arrays
  float* af_sfr_first_;   // frequencies, in units of Nyquist (1.0 = 0.5 cycles/pixel)
  float* af_sfr_second_;  // SFR of the vertical region
  float* af_sfr_third_;   // SFR of the horizontal region
  float af_sfr_scalar1_;  // MTF50 of the vertical region, in units of Nyquist
  float af_sfr_scalar2_;  // MTF50 of the horizontal region, in units of Nyquist

  float flash_mean_;  // test 15: mean of the first channel, grey levels

  QVCaptureResult capture_main_;  // test 16

  int dust_hist_diff_main_;   // test 17: sum of absolute differences to the reference histogram, pixels
  int* dust_hist_main_;       // 256 bins, pixels
  int dust_blob_count_main_;  // 0 to 5, or -1 in fake mode

  float flash_mean_vtcam_;  // test 18: mean of the first channel, grey levels

  QVPreviewResult preview_front_;  // test 19
  QVCaptureResult capture_front_;  // test 20

  int dust_hist_diff_front_;  // test 21, as test 17
  int* dust_hist_front_;
  int dust_blob_count_front_;

  QVPreviewResult preview_video_;  // test 22

  int video_af_frame_count_;        // test 23: frames decoded, values in each of the three arrays
  int video_af_found_count_;        // frames whose chart was measured, NaN included
  int video_af_best_frame_;         // index of the sharpest by the mean of both figures; -1 without one
  double* video_af_time_;           // ms from the first frame
  float* video_af_mtf50_vertical_;  // in units of Nyquist; NaN where not measured
  float* video_af_mtf50_horizontal_;
  float video_af_best_mtf50_;    // mean of both figures, of the best frame; NaN without one
  float video_af_final_mtf50_;   // median of the last fifth of the measured frames; NaN without one
  double video_af_settle_time_;  // ms from the first frame; NaN if never

  int video_flash_frame_count_;  // test 24: frames read, values in each of the two arrays
  double* video_flash_time_;     // ms from the first frame
  float* video_flash_mean_;      // mean of the first channel, grey levels
  int video_flash_peak_frame_;   // index of the brightest
  float video_flash_peak_;       // grey levels
  float video_flash_base_;       // median of the means, grey levels
  double video_flash_width_;     // ms at half height; NaN without a pulse

  QVVideoChartResult video_record_;  // test 25
  QVVideoChartResult video_play_;    // test 26

  QVLightResult led_;        // test 27
  QVLightResult touch_led_;  // test 28

  float print_rms_;          // test 29: departure from the rebuilt print over the binary range, 0 to 1
  float print_correlation_;  // of the refined registration, -1 to 1; NaN where it did not converge
  int print_error_count_;    // entries of both arrays below
  QVRECT* print_error_areas_;
  int* print_error_pixels_;  // departing pixels of each area
};

#endif  // QVTESTER_RESULTS_H_
