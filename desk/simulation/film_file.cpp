// Films are encoded by the program ffmpeg: it reads raw frames, and stamps them by a filter.

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/simulation/film.h"

namespace qv {

namespace {

// A program that reads what it is given; one that ends early is no signal to us.
class Encoder {
 public:
  explicit Encoder(std::vector<std::string> words) : former_(std::signal(SIGPIPE, SIG_IGN)) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) throw Failure(kInternalFault, "no pipe to ffmpeg can be made");
    to_ = ends[1];
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, ends[0], STDIN_FILENO);
    std::vector<char*> arguments;
    for (std::string& word : words) arguments.push_back(word.data());
    arguments.push_back(nullptr);
    started_ = posix_spawnp(&child_, arguments[0], &actions, nullptr, arguments.data(), environ) == 0;
    posix_spawn_file_actions_destroy(&actions);
    close(ends[0]);
  }
  ~Encoder() {
    Finish();
    std::signal(SIGPIPE, former_);
  }
  Encoder(const Encoder&) = delete;
  Encoder& operator=(const Encoder&) = delete;

  bool started() const { return started_; }

  bool Write(const cv::Mat& frame) const {
    const uchar* at = frame.data;
    std::size_t left = frame.total() * frame.elemSize();
    while (left > 0) {
      const ssize_t written = write(to_, at, left);
      if (written < 0 && errno == EINTR) continue;
      if (written <= 0) return false;
      at += written;
      left -= static_cast<std::size_t>(written);
    }
    return true;
  }

  /// Waits for the end; true when it went well.
  bool Finish() {
    if (to_ < 0) return ended_well_;
    close(to_);
    to_ = -1;
    int status = 1;
    while (started_ && waitpid(child_, &status, 0) < 0 && errno == EINTR) {}
    return ended_well_ = started_ && WIFEXITED(status) && WEXITSTATUS(status) == 0;
  }

 private:
  void (*former_)(int);
  int to_ = -1;
  pid_t child_ = 0;
  bool started_ = false;
  bool ended_well_ = false;
};

// Times as TimeMs has them; the frames that were lost are taken out again, so that theirs are missing.
std::string StampFilter(const FilmStyle& style) {
  std::string filter = Format("settb=1/90000,setpts='(N+%.17g*sin(1.7*N))/%.17g/TB'", style.jitter, style.rate);
  if (style.lost.empty()) return filter;
  filter += ",select='1";
  for (const int lost : style.lost) filter += Format("*not(eq(n,%d))", lost);
  return filter + "'";
}

std::vector<std::string> Words(const cv::Mat& frame, const FilmStyle& style, const std::string& output) {
  std::vector<std::string> words;
  std::istringstream raw(
      Format("ffmpeg -nostdin -v error -f rawvideo -pix_fmt bgr24 -video_size %dx%d -framerate %.17g", frame.cols,
             frame.rows, style.rate));
  for (std::string word; raw >> word;) words.push_back(word);
  words.insert(words.end(), {"-i", "pipe:0", "-vf", StampFilter(style)});
  std::istringstream coded(
      "-fps_mode passthrough -enc_time_base 1:90000 -c:v libx264 -threads 4 -preset veryfast -crf 10 "
      "-sws_flags accurate_rnd+full_chroma_int -pix_fmt yuv420p");
  for (std::string word; coded >> word;) words.push_back(word);
  words.push_back(output);
  return words;
}

}  // namespace

std::string EncodeFilm(const Film& film, const FilmStyle& style, const std::string& path) {
  const std::string extension = LowerExtension(path);
  if (extension != ".mp4" && extension != ".mkv" && extension != ".mov") {
    throw Failure(kWrongUsage, path + ": a film is written as .mp4, .mkv or .mov");
  }
  cv::Mat frame = film.frame(film.kept[0]);
  if (frame.cols % 2 != 0 || frame.rows % 2 != 0) {
    throw Failure(kWrongUsage, "--size: a film needs an even width and height");
  }
  ScratchFolder scratch;
  const std::string output = scratch.path() + "/film" + extension;
  Encoder encoder(Words(frame, style, output));
  if (!encoder.started()) throw Failure(kCouldNotMeasure, "films are encoded by ffmpeg, which is not installed");
  bool taken = true;
  std::size_t next = 0;
  for (int number = 0; number < style.frames && taken;
       ++number) {  // a lost one is taken out again: any picture will do
    if (next < film.kept.size() && film.kept[next] == number) {
      if (next++ > 0) frame = film.frame(number);
    }
    taken = encoder.Write(frame);
  }
  if (!encoder.Finish() || !taken) throw Failure(kInternalFault, path + ": ffmpeg could not encode the film");
  return ReadWholeFile(output, kInternalFault);
}

}  // namespace qv
