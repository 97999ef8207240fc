#ifndef QVTESTER_CORE_RESULT_ARRAYS_H_
#define QVTESTER_CORE_RESULT_ARRAYS_H_

#include "qvtester/results.h"

// Frees the arrays of a part of the result block, with their counts.

template <typename... T>
void FreeArrays(T*&... arrays) {
  ((delete[] arrays, arrays = nullptr), ...);
}

template <typename... T>
void Free(int& count, T*&... arrays) {
  FreeArrays(arrays...);
  count = 0;
}

inline void Free(int*& array) { FreeArrays(array); }

inline void Free(QVPhase1Result& r) {
  FreeArrays(r.image_, r.raw_data_, r.error_points_);
  r.image_width_ = r.image_height_ = r.raw_width_ = r.raw_height_ = r.error_point_count_ = 0;
}

inline void Free(QVPreviewResult& r) {
  FreeArrays(r.preview_diff_map_);
  r.preview_diff_cols_ = r.preview_diff_rows_ = 0;
}

inline void Free(QVCaptureResult& r) {
  FreeArrays(r.capture_lab_, r.capture_delta_e_);
  r.capture_lab_count_ = r.capture_delta_e_count_ = 0;
}

inline void Free(QVVideoChartResult& r) {
  FreeArrays(r.time_, r.mark_count_, r.angle_, r.corner_row_, r.corner_column_);
  r.frame_count_ = 0;
}

inline void Free(QVLightResult& r) {
  FreeArrays(r.regions_, r.error_areas_, r.error_pixels_);
  r.region_count_ = r.error_count_ = 0;
}

#endif  // QVTESTER_CORE_RESULT_ARRAYS_H_
