#ifndef QVTESTER_TESTS_CAMERA_LENS_DUST_H_
#define QVTESTER_TESTS_CAMERA_LENS_DUST_H_

// What the dust tests count and where.

inline constexpr int kGreyLevels = 256;  // bins of the histogram
inline constexpr int kCornerPx = 20;     // side of the corner squares that hold the fixture's marks
inline constexpr int kMostPlaces = 5;    // blobs that are counted

#endif  // QVTESTER_TESTS_CAMERA_LENS_DUST_H_
