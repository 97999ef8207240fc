#ifndef QVTESTER_CORE_FILE_GATE_H_
#define QVTESTER_CORE_FILE_GATE_H_

#include <cstdint>
#include <string>
#include <vector>

// What is let through to a decoder. OpenCV hands files that it does not know to libraries that open other files and the
// network (GDAL, GStreamer), and waits for ever on what is no file.

/// A file opened for reading, if it is a regular one: never waits, as on a FIFO.
class RegularFile {
 public:
  explicit RegularFile(const char* path);
  ~RegularFile();
  RegularFile(const RegularFile&) = delete;
  RegularFile& operator=(const RegularFile&) = delete;

  bool valid() const { return fd_ >= 0; }
  std::int64_t size() const { return size_; }
  /// The first bytes, at most so many.
  std::vector<unsigned char> Read(std::int64_t most) const;
  /// A name of the open file itself, which leads no decoder elsewhere.
  std::string Name() const { return "/proc/self/fd/" + std::to_string(fd_); }

 private:
  int fd_;
  std::int64_t size_ = 0;
};

/// Whether these are the first bytes of JPEG, JPEG 2000, PNG, BMP, TIFF, WebP, PNM, PAM, PFM, Sun raster, HDR or EXR.
bool StartsAsPicture(const std::vector<unsigned char>& bytes);

/// Why the bytes of a picture file go to no decoder, a phrase: not a picture, or no size in its header, or one of more
/// pixels than `most`. Null: they go.
const char* RefusePicture(const std::vector<unsigned char>& bytes, std::int64_t most);

/// Whether these are the first bytes of MP4, QuickTime, 3GP, Matroska, WebM, AVI, MPEG-TS, MPEG-PS or a bare H.264 or
/// H.265 stream. Playlists are not: they name other files.
bool StartsAsFilm(const std::vector<unsigned char>& bytes);

/// As many of a film's first bytes as tell what it is.
inline constexpr std::int64_t kFilmHead = 1024;

#endif  // QVTESTER_CORE_FILE_GATE_H_
