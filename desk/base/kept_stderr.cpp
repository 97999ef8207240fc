#include "desk/base/kept_stderr.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <iostream>
#include <sstream>

namespace qv {

namespace {

std::mutex stderr_mutex;

}  // namespace

KeptStderr::KeptStderr() : lock_(stderr_mutex), kept_(memfd_create("stderr", MFD_CLOEXEC)) {
  if (kept_ < 0) return;
  std::cerr.flush();
  saved_ = fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 0);
  dup2(kept_, STDERR_FILENO);
}

KeptStderr::~KeptStderr() {
  if (kept_ < 0) return;
  std::cerr.flush();
  if (saved_ < 0) {
    close(STDERR_FILENO);  // as it was
  } else {
    dup2(saved_, STDERR_FILENO);
    close(saved_);
  }
  close(kept_);
}

std::vector<std::string> KeptStderr::Lines() const {
  std::vector<std::string> lines;
  if (kept_ < 0) return lines;
  std::cerr.flush();
  std::string text(static_cast<std::size_t>(lseek(kept_, 0, SEEK_END)), '\0');
  const ssize_t got = pread(kept_, text.data(), text.size(), 0);
  text.resize(static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) {
    if (!line.empty()) lines.push_back(line);
  }
  return lines;
}

}  // namespace qv
