// What the targets share. Each defines fuzz::one() and ends the process when something that must
// hold doesn't.
#pragma once

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

namespace fuzz {

// One input, which may be any bytes.
void one(std::string_view input);

inline void require(bool holds, const char* what) {
  if (!holds) {
    std::fprintf(stderr, "this must hold: %s\n", what);
    std::abort();
  }
}

// Takes the first line off `text`.
inline std::string take_line(std::string_view& text) {
  std::string line(text.substr(0, text.find('\n')));
  text.remove_prefix(std::min(line.size() + 1, text.size()));
  return line;
}

// A file that holds `text`, for what takes a path.
class MemoryFile {
 public:
  explicit MemoryFile(std::string_view text)
      : fd_(memfd_create("input", MFD_CLOEXEC)), path_("/proc/self/fd/" + std::to_string(fd_)) {
    require(write(fd_, text.data(), text.size()) == static_cast<ssize_t>(text.size()), "memory");
  }
  ~MemoryFile() { close(fd_); }
  MemoryFile(const MemoryFile&) = delete;
  MemoryFile& operator=(const MemoryFile&) = delete;
  const char* path() const { return path_.c_str(); }

 private:
  int fd_;
  std::string path_;
};

}  // namespace fuzz
