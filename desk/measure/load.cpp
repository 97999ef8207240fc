#include "desk/measure/load.h"

#include <xxhash.h>

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
        files.push_back(std::make_unique<MemoryFile>(content));
        paths.push_back(files.back()->path());
      } catch (const Failure& e) {
        return Refuse(input, QV_ERROR_INVALID_ARGUMENT, e.what());
      }
    }
    const KeptStderr kept;
    const std::size_t first_line = log_.lines().size();
    const int code = Guarded("SetResource", [&] { return tester_.SetResource(slot, paths); });
    for (std::size_t k = 0; k < paths.size(); ++k) {
      NameInput(log_.lines(), first_line, paths[k] + ":", request_.inputs[i + k].name + ":");
    }
    const std::vector<std::string> chatter = kept.Lines();
    record_.chatter.insert(record_.chatter.end(), chatter.begin(), chatter.end());
    if (code != QV_SUCCESS) return RefuseList(i, code, first_line);
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
    record_.phase.code = code;
    record_.remarks = {{Remark::kMiss, "refused_input", input.name + ": " + why}};
    return false;
  }

  // The library's line names the file.
  bool RefuseList(std::size_t i, int code, std::size_t first_line) {
    if (log_.lines().size() == first_line) return Refuse(request_.inputs[i], code, FindCode(code).meaning);
    const std::string& line = log_.lines().back().text;
    const std::size_t end = line.find("] ");
    record_.phase.code = code;
    record_.remarks = {{Remark::kMiss, "refused_input", end == std::string::npos ? line : line.substr(end + 2)}};
    return false;
  }

  int Take(const Input& input, QV_RESOURCE_INDEX slot) {
    said_.clear();
    if (!input.picture.empty()) {
      record_.inputs.push_back({slot, input.name, "", ""});
      return KindOfSlot(slot) == SlotKind::kHdr ? TakeFloats(tester_, slot, input.picture)
                                                : TakePicture(tester_, slot, input.picture);
    }
    if (KindOfSlot(slot) == SlotKind::kVideo) return TakeFilm(input, slot);
    std::string content = Content(input);
    record_.inputs.push_back({slot, input.name, HexDigest(content, "SHA256"), ""});
    if (content.empty()) throw Failure(kCouldNotMeasure, "the file is empty");
    if (!RawSize().empty()) return TakeFrame(tester_, slot, RawSize(), content);
    return TakeFile(input.name, slot, content);
  }

  // A film stays in its file: the test reads it there, frame by frame.
  int TakeFilm(const Input& input, QV_RESOURCE_INDEX slot) {
    if (!input.is_path()) throw Failure(kCouldNotMeasure, "a film is read from its file: give a path");
    record_.inputs.push_back({slot, input.name, HexDigest(Content(input), "SHA256"), ""});
    const KeptStderr kept;
    std::string path = input.name;
    const int code = Guarded("SetResource", [&] { return tester_.SetResource(slot, path.data()); });
    const std::vector<std::string> chatter = kept.Lines();
    if (code != QV_SUCCESS && !chatter.empty()) said_ = "the decoder says \"" + chatter.front() + "\"";
    record_.chatter.insert(record_.chatter.end(), chatter.begin(), chatter.end());
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
    NameInput(log_.lines(), first_line, path, name);
    const std::vector<std::string> chatter = kept.Lines();
    if (!chatter.empty()) said_ = "the decoder says \"" + chatter.front() + "\"";
    record_.chatter.insert(record_.chatter.end(), chatter.begin(), chatter.end());
    return code;
  }

  bool TakeOver(const Input& input, int code, QV_RESOURCE_INDEX slot) {
    if (code == QV_ERROR_INVALID_ARGUMENT) {
      const bool frame = LowerExtension(input.name) == ".nv21";
      const char* const wanted = KindOfSlot(slot) == SlotKind::kVideo ? "film" : "picture";
      return Refuse(input, code,
                    Format("not a %s that can be decoded", wanted) + (said_.empty() ? "" : "; " + said_) +
                        (frame ? "; a raw frame needs its size: --raw WxH, where the command takes it" : ""));
    }
    if (code != QV_SUCCESS) return Refuse(input, code, FindCode(code).meaning);
    if (!said_.empty()) {
      record_.Say(Remark::kWarning, "decoder_complaint", input.name + ": " + said_ + "; is the file cut?");
    }
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
  std::string said_;
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
