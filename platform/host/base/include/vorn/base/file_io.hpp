// Small owners and helpers around files, for code that must not follow other people's links.
#ifndef VORN_HOST_FILE_IO_HPP
#define VORN_HOST_FILE_IO_HPP

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

namespace host {

// Owns a file descriptor; -1 is none.
class Fd {
 public:
  Fd() = default;
  explicit Fd(int fd) : fd_(fd) {}
  Fd(Fd&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
  Fd& operator=(Fd&& other) noexcept {
    std::swap(fd_, other.fd_);
    return *this;
  }
  Fd(const Fd&) = delete;
  Fd& operator=(const Fd&) = delete;
  ~Fd() {
    if (fd_ >= 0) {
      close(fd_);
    }
  }

  int get() const { return fd_; }
  int release() { return std::exchange(fd_, -1); }
  explicit operator bool() const { return fd_ >= 0; }

 private:
  int fd_ = -1;
};

// Puts errno back at the end of its scope, for what must not disturb its caller's errno.
class ErrnoKeeper {
 public:
  ErrnoKeeper();
  ~ErrnoKeeper();
  ErrnoKeeper(const ErrnoKeeper&) = delete;
  ErrnoKeeper& operator=(const ErrnoKeeper&) = delete;

 private:
  int saved_;
};

// Runs `work`, whose success (0) leaves errno alone, whatever it met on its way.
template <typename Work>
int keeping_errno(Work&& work) {
  const int saved_errno = errno;
  const int result = work();
  if (result == 0) {
    errno = saved_errno;
  }
  return result;
}

// The content of the regular file `path`, links followed; nothing with errno when it can't be read,
// is something else than a regular file (EINVAL, EISDIR) or holds more than `limit` bytes (EFBIG).
// Never blocks on a pipe.
std::optional<std::string> read_file(const std::string& path, std::size_t limit);

// Opens the regular file `name` of the open folder `folder` for reading; AT_FDCWD is this
// process's. No descriptor, with errno, for something else and for a link in the last component.
// Never blocks on a pipe.
Fd open_regular(int folder, const char* name);
// The first `most` bytes of an open file, less when it is shorter; nothing with errno when it can't
// be read.
std::optional<std::string> read_start(int fd, std::size_t most);

// Writes all of `text`, or false with errno.
bool write_all(int fd, std::string_view text);

// A new file beside `path` (mode 0600) that takes its place on commit. Without a commit nothing of
// it stays and `path` is as it was.
class AtomicFile {
 public:
  // `fd()` is -1 with errno set when the file can't be made.
  explicit AtomicFile(std::string path);
  AtomicFile(const AtomicFile&) = delete;
  AtomicFile& operator=(const AtomicFile&) = delete;
  ~AtomicFile();

  int fd() const { return fd_.get(); }
  // Removes what killed processes have left of such files for `path`. Only for who keeps others
  // from writing one meanwhile.
  static void remove_leftovers(const std::string& path);

  // Flushes to disk and renames. False with errno when `path` still holds what it held.
  bool commit();

 private:
  std::string path_;
  std::string temporary_;  // empty once renamed, or when there is none
  Fd fd_;
};

// As `mkdir -p`: makes the folder `path` and those above it. False with errno.
bool make_folders(const std::string& path);

// Removes `path`, a folder with everything below it or anything else, and follows no link.
// True when it is gone (or never was); otherwise false with errno.
bool remove_tree(const std::string& path);

}  // namespace host

#endif
