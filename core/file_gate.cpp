#include "core/file_gate.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>
#include <string_view>

namespace {

using Bytes = std::vector<unsigned char>;

// Numbers in a file; beyond its end all is 0.
class Header {
 public:
  explicit Header(const Bytes& bytes) : bytes_(bytes) {}

  std::size_t size() const { return bytes_.size(); }
  std::uint64_t Big(std::uint64_t at, int count) const { return Number(at, count, true); }
  std::uint64_t Little(std::uint64_t at, int count) const { return Number(at, count, false); }
  std::uint64_t Number(std::uint64_t at, int count, bool big) const {
    if (at > size() || size() - at < static_cast<std::uint64_t>(count)) return 0;
    std::uint64_t value = 0;
    for (int i = 0; i < count; ++i)
      value = value << 8 | bytes_[at + static_cast<std::uint64_t>(big ? i : count - 1 - i)];
    return value;
  }
  bool Has(std::uint64_t at, std::string_view text) const { return Text(at, text.size()) == text; }
  std::string_view Text(std::uint64_t at, std::uint64_t most) const {
    if (at >= size()) return {};
    return {reinterpret_cast<const char*>(bytes_.data()) + at, static_cast<std::size_t>(std::min(most, size() - at))};
  }

 private:
  const Bytes& bytes_;
};

struct Size {
  std::uint64_t width = 0, height = 0;

  // The larger where a header gives two: decoders differ in which they take.
  void Widen(std::uint64_t other_width, std::uint64_t other_height) {
    width = std::max(width, other_width);
    height = std::max(height, other_height);
  }
};

Size SizeOfPng(const Header& h) { return {h.Big(16, 4), h.Big(20, 4)}; }
Size SizeOfSunRaster(const Header& h) { return {h.Big(4, 4), h.Big(8, 4)}; }

Size SizeOfBmp(const Header& h) {
  if (h.Little(14, 4) == 12) return {h.Little(18, 2), h.Little(20, 2)};
  const auto rows = static_cast<std::int32_t>(h.Little(22, 4));  // below 0: from the top
  return {h.Little(18, 4), static_cast<std::uint64_t>(std::abs(static_cast<std::int64_t>(rows)))};
}

// The first frame header; the segments before it are skipped as libjpeg does.
Size SizeOfJpeg(const Header& h) {
  for (std::uint64_t at = 2; at + 9 < h.size();) {
    if (h.Big(at, 1) != 0xFF || h.Big(at + 1, 1) == 0xFF || h.Big(at + 1, 1) == 0) {
      ++at;
      continue;
    }
    const std::uint64_t marker = h.Big(at + 1, 1);
    const bool table = marker == 0xC4 || marker == 0xC8 || marker == 0xCC;
    if (marker >= 0xC0 && marker <= 0xCF && !table) return {h.Big(at + 7, 2), h.Big(at + 5, 2)};
    if (marker == 0xDA || marker == 0xD9) break;
    const bool alone = marker == 0x01 || (marker >= 0xD0 && marker <= 0xD8);
    at += 2 + (alone ? 0 : h.Big(at + 2, 2));
  }
  return {};
}

// The first directory, of a classic or a big file.
Size SizeOfTiff(const Header& h) {
  const bool big_endian = h.Has(0, "M");
  const bool wide = h.Number(2, 2, big_endian) == 43;
  const std::uint64_t directory = wide ? h.Number(8, 8, big_endian) : h.Number(4, 4, big_endian);
  const std::uint64_t entries = h.Number(directory, wide ? 8 : 2, big_endian);
  const std::uint64_t first = directory + (wide ? 8 : 2);
  const int length = wide ? 20 : 12;
  Size size;
  for (std::uint64_t i = 0; i < entries && first + i * length < h.size(); ++i) {
    const std::uint64_t at = first + i * length;
    const std::uint64_t tag = h.Number(at, 2, big_endian);
    if (tag != 256 && tag != 257) continue;
    constexpr std::array<int, 18> kBytes = {0, 1, 0, 2, 4, 0, 1, 0, 2, 4, 0, 0, 0, 0, 0, 0, 8, 8};  // of whole numbers
    const std::uint64_t type = h.Number(at + 2, 2, big_endian);
    const int bytes = type < kBytes.size() ? kBytes[type] : 0;
    const std::uint64_t value = h.Number(at + (wide ? 12 : 8), bytes, big_endian);
    size.Widen(tag == 256 ? value : 0, tag == 257 ? value : 0);
  }
  return size;
}

Size SizeOfWebP(const Header& h) {
  if (h.Has(12, "VP8X")) return {h.Little(24, 3) + 1, h.Little(27, 3) + 1};
  if (h.Has(12, "VP8L")) return {(h.Little(21, 4) & 0x3FFF) + 1, (h.Little(21, 4) >> 14 & 0x3FFF) + 1};
  return {h.Little(26, 2) & 0x3FFF, h.Little(28, 2) & 0x3FFF};
}

bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

// The words of a text header; what stands from # to the line's end is a comment.
std::vector<std::string_view> Words(std::string_view text, std::size_t most) {
  std::vector<std::string_view> words;
  for (std::size_t at = 0; at < text.size() && words.size() < most;) {
    if (text[at] == '#') {
      at = std::min(text.find('\n', at), text.size());
    } else if (IsSpace(text[at])) {
      ++at;
    } else {
      std::size_t end = at;
      while (end < text.size() && !IsSpace(text[end]) && text[end] != '#') ++end;
      words.push_back(text.substr(at, end - at));
      at = end;
    }
  }
  return words;
}

std::uint64_t Count(std::string_view word) {
  std::uint64_t value = 0;
  for (const char c : word) {
    if (c < '0' || c > '9' || value > UINT32_MAX) return 0;
    value = 10 * value + static_cast<std::uint64_t>(c - '0');
  }
  return value;
}

constexpr std::uint64_t kTextHeader = 1 << 16;

Size SizeOfPnm(const Header& h) {
  const auto words = Words(h.Text(2, kTextHeader), 2);
  return words.size() == 2 ? Size{Count(words[0]), Count(words[1])} : Size();
}

Size SizeOfPam(const Header& h) {
  Size size;
  const auto words = Words(h.Text(2, kTextHeader), 64);
  for (std::size_t i = 0; i + 1 < words.size() && words[i] != "ENDHDR"; ++i) {
    if (words[i] == "WIDTH") size.Widen(Count(words[i + 1]), 0);
    if (words[i] == "HEIGHT") size.Widen(0, Count(words[i + 1]));
  }
  return size;
}

Size SizeOfHdr(const Header& h) {
  const std::string_view text = h.Text(0, kTextHeader);
  Size size;
  for (std::size_t at = text.find("-Y "); at != std::string_view::npos; at = text.find("-Y ", at + 1)) {
    const auto words = Words(text.substr(at, 64), 4);
    if (words.size() == 4 && words[2] == "+X") size.Widen(Count(words[3]), Count(words[1]));
  }
  return size;
}

// Attributes follow one another: name, type, length, value.
Size SizeOfExr(const Header& h) {
  Size size;
  for (std::uint64_t at = 8; at < h.size() && h.Big(at, 1) != 0;) {
    const std::string_view name = h.Text(at, 256).substr(0, h.Text(at, 256).find('\0'));
    at += name.size() + 1;
    const std::string_view type = h.Text(at, 256).substr(0, h.Text(at, 256).find('\0'));
    at += type.size() + 1;
    if (name == "dataWindow") {
      const auto place = [&](int i) { return static_cast<std::int32_t>(h.Little(at + 4 + 4 * i, 4)); };
      const auto span = [&](int i) { return std::int64_t{place(i + 2)} - place(i) + 1; };
      if (span(0) > 0 && span(1) > 0)
        size.Widen(static_cast<std::uint64_t>(span(0)), static_cast<std::uint64_t>(span(1)));
    }
    at += 4 + h.Little(at, 4);
  }
  return size;
}

// Of the codestream, which the decoder goes by; in a box of its own where the file has boxes.
Size SizeOfJpeg2000(const Header& h) {
  std::uint64_t at = 0;
  while (!h.Has(at, "\xFF\x4F\xFF\x51")) {
    const std::uint64_t length = h.Big(at, 4) == 1 ? h.Big(at + 8, 8) : h.Big(at, 4);
    if (h.Has(at + 4, "jp2c")) {
      at += h.Big(at, 4) == 1 ? 16 : 8;
      if (!h.Has(at, "\xFF\x4F\xFF\x51")) return {};
    } else {
      if (length < 8 || length > h.size() - at) return {};
      at += length;
      if (at >= h.size()) return {};
    }
  }
  const auto span = [&](int i) {
    const std::uint64_t end = h.Big(at + 8 + 4 * i, 4);
    return end - std::min(end, h.Big(at + 16 + 4 * i, 4));
  };
  return {span(0), span(1)};
}

using namespace std::string_view_literals;

struct Format {
  std::string_view magic;
  Size (*size)(const Header&);
};

constexpr Format kFormats[] = {
    {"\xFF\xD8\xFF"sv, SizeOfJpeg},
    {"\0\0\0\x0CjP  \r\n\x87\n"sv, SizeOfJpeg2000},
    {"\xFF\x4F\xFF\x51"sv, SizeOfJpeg2000},
    {"\x89PNG\r\n\x1A\n"sv, SizeOfPng},
    {"BM"sv, SizeOfBmp},
    {"II*\0"sv, SizeOfTiff},
    {"MM\0*"sv, SizeOfTiff},
    {"II+\0"sv, SizeOfTiff},
    {"MM\0+"sv, SizeOfTiff},
    {"RIFF"sv, SizeOfWebP},
    {"P1"sv, SizeOfPnm},
    {"P2"sv, SizeOfPnm},
    {"P3"sv, SizeOfPnm},
    {"P4"sv, SizeOfPnm},
    {"P5"sv, SizeOfPnm},
    {"P6"sv, SizeOfPnm},
    {"P7"sv, SizeOfPam},
    {"PF"sv, SizeOfPnm},
    {"Pf"sv, SizeOfPnm},
    {"\x59\xA6\x6A\x95"sv, SizeOfSunRaster},
    {"#?RADIANCE"sv, SizeOfHdr},
    {"#?RGBE"sv, SizeOfHdr},
    {"\x76\x2F\x31\x01"sv, SizeOfExr},
};

const Format* FormatOf(const Header& h) {
  // Two places where OpenCV looks for what it gives to GDAL and to DICOM's library.
  if (h.Has(140, "DTED") || h.Has(128, "DICM")) return nullptr;
  for (const Format& format : kFormats) {
    if (!h.Has(0, format.magic)) continue;
    if (format.size == SizeOfWebP && !h.Has(8, "WEBP")) return nullptr;
    if (format.magic[0] == 'P' && (h.size() < 3 || !IsSpace(h.Text(2, 1)[0]))) return nullptr;
    return &format;
  }
  return nullptr;
}

bool StartsAsStream(const Header& h) {
  const std::uint64_t code = h.Big(0, 4) == 1 ? 4 : h.Big(0, 3) == 1 ? 3 : 0;
  if (code == 0) return false;
  const std::uint64_t unit = h.Big(code, 1);
  if (unit == 0xBA) return true;  // a pack of an MPEG programme stream
  if ((unit & 0x80) != 0) return false;
  const std::uint64_t h264 = unit & 31;
  const std::uint64_t h265 = unit >> 1;
  return (h264 >= 6 && h264 <= 9) || (h265 >= 32 && h265 <= 35) || h265 == 39;
}

}  // namespace

RegularFile::RegularFile(const char* path) : fd_(open(path, O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC)) {
  struct stat status = {};
  if (fd_ >= 0 && fstat(fd_, &status) == 0 && S_ISREG(status.st_mode)) {
    size_ = status.st_size;
    return;
  }
  if (fd_ >= 0) close(fd_);
  fd_ = -1;
}

RegularFile::~RegularFile() {
  if (fd_ >= 0) close(fd_);
}

std::vector<unsigned char> RegularFile::Read(std::int64_t most) const {
  Bytes bytes(static_cast<std::size_t>(std::min(most, size_)));
  std::size_t done = 0;
  while (done < bytes.size()) {
    const ssize_t count = pread(fd_, bytes.data() + done, bytes.size() - done, static_cast<off_t>(done));
    if (count <= 0) break;
    done += static_cast<std::size_t>(count);
  }
  bytes.resize(done);
  return bytes;
}

bool StartsAsPicture(const Bytes& bytes) { return FormatOf(Header(bytes)) != nullptr; }

const char* RefusePicture(const Bytes& bytes, std::int64_t most) {
  const Header header(bytes);
  const Format* const format = FormatOf(header);
  if (format == nullptr) return "not an image that can be decoded";
  const Size size = format->size(header);
  if (size.width == 0 || size.height == 0) return "not an image that can be decoded: no size in its header";
  const auto limit = static_cast<std::uint64_t>(std::max<std::int64_t>(most, 0));
  const bool fits = size.width <= limit && size.height <= limit / size.width;
  return fits ? nullptr : "an image of too many pixels";
}

bool StartsAsFilm(const Bytes& bytes) {
  const Header h(bytes);
  // XML whose first comment hides a film's mark is a manifest to FFmpeg, which opens what it names.
  if (h.Has(0, "<!") || h.Has(0, "<?")) return false;
  if (StartsAsStream(h) || h.Has(0, "\x1A\x45\xDF\xA3") || (h.Has(0, "RIFF") && h.Has(8, "AVI "))) return true;
  for (const char* box : {"ftyp", "moov", "mdat", "free", "wide", "skip", "pnot"}) {
    if (h.Has(4, box)) return true;
  }
  // Packets of 188 bytes, or of 192 that begin with a time.
  const auto packets = [&](std::uint64_t first, std::uint64_t length) {
    return h.Has(first, "G") && h.Has(first + length, "G") && h.Has(first + 2 * length, "G");
  };
  return packets(0, 188) || packets(4, 192);
}
