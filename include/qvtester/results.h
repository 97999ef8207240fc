#ifndef QVTESTER_RESULTS_H_
#define QVTESTER_RESULTS_H_

// The block that GetResult hands out. The tester owns it and every array in it: read in place, never free.
// An array stays valid until its test runs again or its result is released; a released array is null, its count 0.

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
};

#endif  // QVTESTER_RESULTS_H_
