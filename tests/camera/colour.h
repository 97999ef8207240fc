#ifndef QVTESTER_TESTS_CAMERA_COLOUR_H_
#define QVTESTER_TESTS_CAMERA_COLOUR_H_

#include <array>

/// Linear sRGB to CIE XYZ (D65), white at Y = 1. Single precision.
inline std::array<float, 3> LinearToXyz(float red, float green, float blue) {
  return {0.4124f * red + 0.3576f * green + 0.1805f * blue, 0.2126f * red + 0.7152f * green + 0.0722f * blue,
          0.0193f * red + 0.1192f * green + 0.9505f * blue};
}

#endif  // QVTESTER_TESTS_CAMERA_COLOUR_H_
