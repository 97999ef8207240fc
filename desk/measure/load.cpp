#include "desk/measure/load.h"

#include <xxhash.h>

#include <algorithm>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <opencv2/videoio.hpp>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/kept_stderr.h"
#include "desk/base/memory_file.h"
#include "desk/base/text.h"
#include "desk/measure/guarded.h"
#include "desk/measure/library_tables.h"

namespace qv {

namespace {

std::string Content(const Input& input) {
  if (input.content) return *input.content;
  if (!std::filesystem::exists(input.name)) throw Failure(kCouldNotMeasure, "no such file");
  if (std::filesystem::is_directory(input.name)) throw Failure(kCouldNotMeasure, "is a directory, not a photo");
  return ReadWholeFile(input.name, kCouldNotMeasure);
}

std::string PixelsHash(const cv::Mat& pixels) {
  if (pixels.empty()) return "";
  XXH3_state_t* const state = XXH3_createState();
  XXH3_128bits_reset(state);
  const std::size_t row_bytes = pixels.elemSize() * static_cast<std::size_t>(pixels.cols);
  const bool packed = pixels.isContinuous();
  for (int i = 0; i < (packed ? 1 : pixels.rows); ++i) {
    XXH3_128bits_update(state, pixels.ptr(i), packed ? row_bytes * static_cast<std::size_t>(pixels.rows) : row_bytes);
  }
  const XXH128_hash_t hash = XXH3_128bits_digest(state);
  XXH3_freeState(state);
  return Format("%016llx%016llx", static_cast<unsigned long long>(hash.high64),
                static_cast<unsigned long long>(hash.low64));
}

// Whether a JPEG's last scan comes to an end: the library ends a cut one itself, and a progressive one that is cut
// between two scans is then decoded, coarser, without a word. Markers are found as ITU-T T.81, annex B, has them.
bool EndsAsJpeg(const std::string& file) {
  constexpr unsigned char kEnd = 0xD9;
  constexpr unsigned char kScan = 0xDA;
  const auto at = [&](std::size_t i) { return static_cast<unsigned char>(file[i]); };
  std::size_t i = 2;
  while (i + 3 < file.size()) {
    if (at(i) != 0xFF || at(i + 1) == 0xFF) {
      ++i;  // fill, or what decoders skip with a complaint
      continue;
    }
    const unsigned char marker = at(i + 1);
    if (marker == kEnd) return true;
    i += 2 + std::size_t{at(i + 2)} * 256 + at(i + 3);
    if (marker != kScan) continue;
    // The scan's own bytes: an 0xFF of theirs is followed by 0, or by the mark of a restart.
    i = std::min(file.find('\xFF', i), file.size());
    while (i + 1 < file.size() && (at(i + 1) == 0 || (at(i + 1) & 0xF8) == 0xD0)) {
      i = std::min(file.find('\xFF', i + 1), file.size());
    }
    if (i + 1 < file.size() && at(i + 1) == kEnd) return true;
  }
  return false;
}

// A float picture of three channels, red first; by the library's rules for what reaches a decoder.
cv::Mat ReadFloats(const std::string& path) {
  std::vector<unsigned char> bytes;
  std::string reason;
  cv::Mat picture;
  if (QVResource::ReadPicture(path.c_str(), bytes, reason)) {
    picture = QVResource::DecodePicture(bytes, reason, cv::IMREAD_UNCHANGED);
  }
  if (picture.empty()) throw Failure(kCouldNotMeasure, "not a picture that can be decoded");
  if (picture.depth() != CV_32F) {
    throw Failure(kCouldNotMeasure,
                  "not a float picture; dots are looked for in .exr, .hdr, .pfm and 32-bit float .tif files");
  }
  const int channels = picture.channels();
  cv::cvtColor(picture, picture,
               channels == 1   ? cv::COLOR_GRAY2RGB
               : channels == 4 ? cv::COLOR_BGRA2RGB
                               : cv::COLOR_BGR2RGB);
  return picture;
}

int TakeFloats(QVTester& tester, QV_RESOURCE_INDEX slot, cv::Mat floats) {
  if (floats.type() != CV_32FC3) throw Failure(kCouldNotMeasure, "not a picture of three floats a pixel");
  if (!floats.isContinuous()) floats = floats.clone();
  return Guarded("SetHDRResource",
                 [&] { return tester.SetHDRResource(slot, floats.cols, floats.rows, false, floats.ptr<float>()); });
}

// As SetResource(path) does with what it has read.
int TakePicture(QVTester& tester, QV_RESOURCE_INDEX slot, const cv::Mat& picture) {
  auto resource = std::make_unique<QVResource>();
  const int code = Guarded("SetResource", [&] { return resource->SetImage(picture); });
  if (code != QV_SUCCESS) return code;
  tester.resources_[slot] = std::move(resource);
  if (slot == QV_RESOURCE_FRONT_CHART_STANDARD) tester.ref_patch_values_0_set_ = false;
  if (slot == QV_RESOURCE_CHART_STANDARD) tester.ref_patch_values_1_set_ = false;
  return QV_SUCCESS;
}

// A preview frame as a phone's camera delivers it.
int TakeFrame(QVTester& tester, QV_RESOURCE_INDEX slot, cv::Size size, std::string& content) {
  const std::size_t bytes = std::size_t{3} * static_cast<std::size_t>(size.area()) / 2;
  if (content.size() != bytes) {
    throw Failure(kCouldNotMeasure, Format("%zu bytes are no NV21 frame of %d x %d, which has %zu", content.size(),
                                           size.width, size.height, bytes));
  }
  return Guarded("SetResource", [&] { return tester.SetResource(slot, size.width, size.height, content.data()); });
}

// The library speaks of the path that it was given; people know the input's name.
void NameInput(std::vector<LogLine>& lines, std::size_t first, const std::string& path, const std::string& name) {
  for (std::size_t i = first; i < lines.size(); ++i) {
    const std::size_t at = lines[i].text.find(path);
    if (at != std::string::npos) lines[i].text.replace(at, path.size(), name);
  }
}

// Why the library refused a file, as its last line says after the name; nothing where it says no more than that.
std::string ReasonOf(const std::vector<LogLine>& lines, std::size_t first, const std::string& name) {
  if (lines.size() == first) return "";
  const std::string& line = lines.back().text;
  const std::string before = "] " + name + ": ";
  const std::size_t at = line.find(before);
  const std::string reason = at == std::string::npos ? "" : line.substr(at + before.size());
  if (reason == "not an image that can be decoded" || reason.rfind("not a video", 0) == 0) return "";
  return reason.find("too many pixels") == std::string::npos
             ? reason
             : reason + Format(": over %g megapixels, which --most-megapixels before the command raises",
                               static_cast<double>(QVResource::most_pixels_) / 1e6);
}

class Loader {
 public:
  Loader(QVTester& tester, const Spec& spec, const Request& request, Record& record, LogCollector& log)
      : tester_(tester), spec_(spec), request_(request), record_(record), log_(log) {}

  // A list as a whole: the inputs from the i-th on.
  bool LoadList(std::size_t i) {
    const QV_RESOURCE_INDEX slot = spec_.inputs[i].slot;
    std::vector<std::unique_ptr<MemoryFile>> files;
    std::vector<std::string> paths;
    for (std::size_t k = i; k < request_.inputs.size(); ++k) {
      const Input& input = request_.inputs[k];
      try {
        if (!input.picture.empty()) throw Failure(kCouldNotMeasure, "a list is read from files: give a path");
        const std::string content = Content(input);
        record_.inputs.push_back({slot, input.name, HexDigest(content, "SHA256"), ""});
        if (content.empty()) throw Failure(kCouldNotMeasure, "the file is empty");
        DoubtEnd(input.name, content);
        files.push_back(std::make_unique<MemoryFile>(content));
        paths.push_back(files.back()->path());
      } catch (const Failure& e) {
        return Refuse(input, QV_ERROR_INVALID_ARGUMENT, e.what());
      }
    }
    const KeptStderr kept;
    const std::size_t first_line = log_.lines().size();
    const int code = Guarded("SetResource", [&] { return tester_.SetResource(slot, paths); });
    Hear(kept.Lines(), first_line);
    for (std::size_t k = 0; k < paths.size(); ++k) {
      NameInput(log_.lines(), first_line, paths[k] + ":", request_.inputs[i + k].name + ":");
    }
    if (code != QV_SUCCESS) return RefuseList(i, code, first_line);
    SayComplaint(record_, "one of the " + std::to_string(paths.size()) + " pictures", said_);
    for (std::size_t k = 0; k < paths.size(); ++k) {
      const cv::Mat& held = tester_.kept_->image_list.gray[k];
      RecordedInput& entry = record_.inputs[i + k];
      entry.width = held.cols;
      entry.height = held.rows;
      entry.pixels_hash = PixelsHash(held);
    }
    return true;
  }

  bool Load(std::size_t i) {
    const Input& input = request_.inputs[i];
    try {
      return TakeOver(input, Take(input, spec_.inputs[i].slot), spec_.inputs[i].slot);
    } catch (const Failure& e) {
      return Refuse(input, QV_ERROR_INVALID_ARGUMENT, e.what());
    }
  }

 private:
  cv::Size RawSize() const {
    return request_.parameters.contains("raw") ? SizeOf(request_.parameters["raw"].get<std::string>()) : cv::Size();
  }

  bool Refuse(const Input& input, int code, const std::string& why) {
    const std::string name = input.name + ": ";
    record_.phase.code = code;
    record_.remarks = {
        Remark(Remark::kMiss, "refused_input", why.compare(0, name.size(), name) == 0 ? why : name + why)};
    return false;
  }

  // What was said of inputs from the log's line `first` on. The library's own lines, where they are shown, are among it
  // and no decoder's.
  void Hear(const std::vector<std::string>& chatter, std::size_t first) {
    for (const std::string& line : chatter) {
      const auto is_line = [&](const LogLine& own) { return own.text == line; };
      if (std::none_of(log_.lines().begin() + static_cast<std::ptrdiff_t>(first), log_.lines().end(), is_line)) {
        said_.push_back(line);
      }
      record_.chatter.push_back(line);
    }
  }

  void DoubtEnd(const std::string& name, const std::string& content) {
    if (content.compare(0, 3, "\xFF\xD8\xFF") != 0 || EndsAsJpeg(content)) return;
    record_.Say(Doubt::kDecoderComplaint, name + ": the file ends before its picture does; it was cut");
  }

  // The library's line names the file.
  bool RefuseList(std::size_t i, int code, std::size_t first_line) {
    if (log_.lines().size() == first_line) return Refuse(request_.inputs[i], code, FindCode(code).meaning);
    const std::string& line = log_.lines().back().text;
    const std::size_t end = line.find("] ");
    record_.phase.code = code;
    record_.remarks = {Remark(Remark::kMiss, "refused_input", end == std::string::npos ? line : line.substr(end + 2))};
    return false;
  }

  int Take(const Input& input, QV_RESOURCE_INDEX slot) {
    said_.clear();
    reason_.clear();
    if (!input.picture.empty()) {
      record_.inputs.push_back({slot, input.name, "", ""});
      return KindOfSlot(slot) == SlotKind::kHdr ? TakeFloats(tester_, slot, input.picture)
                                                : TakePicture(tester_, slot, input.picture);
    }
    if (KindOfSlot(slot) == SlotKind::kVideo) return TakeFilm(input, slot);
    std::string content = Content(input);
    record_.inputs.push_back({slot, input.name, HexDigest(content, "SHA256"), ""});
    record_.inputs.back().codec = StepsOf(content);
    if (content.empty()) throw Failure(kCouldNotMeasure, "the file is empty");
    if (!RawSize().empty()) return TakeFrame(tester_, slot, RawSize(), content);
    return TakeFile(input.name, slot, content);
  }

  // A film stays in its file: the test reads it there, frame by frame.
  int TakeFilm(const Input& input, QV_RESOURCE_INDEX slot) {
    if (!input.is_path()) throw Failure(kCouldNotMeasure, "a film is read from its file: give a path");
    record_.inputs.push_back({slot, input.name, HexDigest(Content(input), "SHA256"), ""});
    const KeptStderr kept;
    const std::size_t first_line = log_.lines().size();
    std::string path = input.name;
    const int code = Guarded("SetResource", [&] { return tester_.SetResource(slot, path.data()); });
    const std::vector<std::string> chatter = kept.Lines();
    record_.chatter.insert(record_.chatter.end(), chatter.begin(), chatter.end());
    if (code != QV_SUCCESS) {
      said_ = chatter;
      reason_ = ReasonOf(log_.lines(), first_line, input.name);
    }
    return code;
  }

  int TakeFile(const std::string& name, QV_RESOURCE_INDEX slot, const std::string& content) {
    const MemoryFile file(content);
    const KeptStderr kept;
    const std::size_t first_line = log_.lines().size();
    std::string path = file.path();
    const int code = KindOfSlot(slot) == SlotKind::kHdr
                         ? TakeFloats(tester_, slot, ReadFloats(path))
                         : Guarded("SetResource", [&] { return tester_.SetResource(slot, path.data()); });
    Hear(kept.Lines(), first_line);
    NameInput(log_.lines(), first_line, path, name);
    if (code != QV_SUCCESS) reason_ = ReasonOf(log_.lines(), first_line, name);
    if (said_.empty()) DoubtEnd(name, content);
    return code;
  }

  bool TakeOver(const Input& input, int code, QV_RESOURCE_INDEX slot) {
    if (code == QV_ERROR_INVALID_ARGUMENT) {
      const bool frame = LowerExtension(input.name) == ".nv21";
      const char* const wanted = KindOfSlot(slot) == SlotKind::kVideo ? "film" : "picture";
      return Refuse(input, code,
                    (reason_.empty() ? Format("not a %s that can be decoded", wanted) : reason_) +
                        (said_.empty() ? "" : "; the decoder says \"" + said_.front() + "\"") +
                        (frame ? "; a raw frame needs its size: --raw WxH, where the command takes it" : ""));
    }
    if (code != QV_SUCCESS) return Refuse(input, code, FindCode(code).meaning);
    SayComplaint(record_, input.name, said_);
    if (KindOfSlot(slot) == SlotKind::kVideo) return NoteFrameSize(slot);
    const cv::Mat held = KindOfSlot(slot) == SlotKind::kHdr ? SlotFloats(tester_, slot) : SlotPhoto(tester_, slot);
    RecordedInput& entry = record_.inputs.back();
    entry.width = held.cols;
    entry.height = held.rows;
    entry.pixels_hash = PixelsHash(held);
    return true;
  }

  bool NoteFrameSize(QV_RESOURCE_INDEX slot) {
    cv::VideoCapture film;
    tester_.resources_[slot]->GetVideo(&film);
    record_.inputs.back().width = static_cast<int>(film.get(cv::CAP_PROP_FRAME_WIDTH));
    record_.inputs.back().height = static_cast<int>(film.get(cv::CAP_PROP_FRAME_HEIGHT));
    return true;
  }

  QVTester& tester_;
  const Spec& spec_;
  const Request& request_;
  Record& record_;
  LogCollector& log_;
  std::vector<std::string> said_;  // by the decoder of the input at hand
  std::string reason_;             // why the library refused it
};

}  // namespace

bool LoadInputs(QVTester& tester, const Spec& spec, const Request& request, Record& record, LogCollector& log) {
  Loader loader(tester, spec, request, record, log);
  for (std::size_t i = 0; i < request.inputs.size(); ++i) {
    if (spec.inputs[i].list) return loader.LoadList(i);
    if (!loader.Load(i)) return false;
  }
  return true;
}

void SayComplaint(Record& record, const std::string& name, const std::vector<std::string>& lines) {
  const auto is_warning = [](const std::string& line) {
    return line.find("warning") != std::string::npos || line.find("Warning") != std::string::npos;
  };
  const auto complaint = std::find_if_not(lines.begin(), lines.end(), is_warning);
  if (complaint != lines.end()) {
    record.Say(Doubt::kDecoderComplaint,
               name + ": the decoder says \"" + *complaint + "\", and fills up what it can't read; is the file whole?");
  } else if (!lines.empty()) {
    record.Say(Remark::kWarning, "decoder_warning", name + ": the decoder says \"" + lines.front() + "\"");
  }
}

cv::Mat SlotPhoto(const QVTester& tester, QV_RESOURCE_INDEX slot) {
  cv::Mat photo;
  if (tester.resources_[slot] != nullptr) tester.resources_[slot]->GetImage(&photo);
  return photo;
}

cv::Mat SlotFloats(const QVTester& tester, QV_RESOURCE_INDEX slot) {
  if (tester.resources_[slot] == nullptr) return {};
  float* data = nullptr;
  int width = 0;
  int height = 0;
  tester.resources_[slot]->GetHDRImage(&data);
  tester.resources_[slot]->GetHDRWidth(&width);
  tester.resources_[slot]->GetHDRHeight(&height);
  return {height, width, CV_32FC3, data};
}

}  // namespace qv
