#ifndef QVTESTER_DESK_SIMULATION_PHOTO_FILE_H_
#define QVTESTER_DESK_SIMULATION_PHOTO_FILE_H_

#include <opencv2/core.hpp>
#include <string>

namespace qv {

struct PhotoFile {
  std::string path;  // "-" is standard output
  int bits = 8;
  int jpeg_quality = 95;
  std::string chroma = "420";  // of a JPEG: "420", "422" or "444"
};

/// The photo as the content of such a file; floats as .exr, .tif or .pfm, a preview frame as .nv21. Throws Failure
/// (wrong usage) for a kind of file that can't hold it.
std::string EncodePhoto(const cv::Mat& photo, const PhotoFile& file);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_PHOTO_FILE_H_
