#include <turbojpeg.h>

#include <memory>

#include "platform/jpeg.h"

namespace platform {

cv::Mat DecodeSoundJpeg(const std::vector<unsigned char>& file) {
  const std::unique_ptr<void, decltype(&tjDestroy)> decoder(tjInitDecompress(), &tjDestroy);
  int width = 0;
  int height = 0;
  int sampling = 0;
  int colours = 0;
  if (!decoder ||
      tjDecompressHeader3(decoder.get(), file.data(), file.size(), &width, &height, &sampling, &colours) != 0 ||
      colours != TJCS_YCbCr) {
    return {};
  }
  cv::Mat pixels(height, width, CV_8UC3);
  const bool sound = tjDecompress2(decoder.get(), file.data(), file.size(), pixels.data, width,
                                   static_cast<int>(pixels.step), height, TJPF_BGR, TJFLAG_STOPONWARNING) == 0;
  return sound ? pixels : cv::Mat();
}

}  // namespace platform
