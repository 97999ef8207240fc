#ifndef QVTESTER_UNIT_TESTS_FILM_FILE_H_
#define QVTESTER_UNIT_TESTS_FILM_FILE_H_

#include <opencv2/core.hpp>
#include <string>
#include <vector>

inline const std::string kLossless = "-c:v ffv1 -pix_fmt bgr0";  // pixels come back as they were; for .mkv and .avi
inline const std::string kH264 = "-c:v libx264 -pix_fmt yuv420p";

/// Encodes CV_8UC3 frames of one size with the program ffmpeg, at 30 frames/s unless the options say otherwise, and
/// answers the path. `options` are ffmpeg's for the output: codec, filters, container.
std::string WriteFilm(const std::string& path, const std::vector<cv::Mat>& frames,
                      const std::string& options = kLossless);

#endif  // QVTESTER_UNIT_TESTS_FILM_FILE_H_
