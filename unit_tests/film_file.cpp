#include "unit_tests/film_file.h"

#include <cstdio>
#include <cstdlib>

std::string WriteFilm(const std::string& path, const std::vector<cv::Mat>& frames, const std::string& options) {
  const std::string command = "ffmpeg -nostdin -v error -y -f rawvideo -pix_fmt bgr24 -r 30 -s " +
                              std::to_string(frames[0].cols) + "x" + std::to_string(frames[0].rows) + " -i - " +
                              options + " '" + path + "'";
  // NOLINTNEXTLINE(cert-env33-c): the test's own words
  std::FILE* const pipe = popen(command.c_str(), "w");
  for (const cv::Mat& frame : frames) std::fwrite(frame.clone().data, frame.elemSize(), frame.total(), pipe);
  if (pclose(pipe) != 0) {
    std::fprintf(stderr, "could not encode: %s\n", command.c_str());
    std::abort();
  }
  return path;
}
