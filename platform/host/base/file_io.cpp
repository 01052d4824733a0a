#include "vorn/base/file_io.hpp"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <system_error>

namespace host {
namespace {

constexpr std::size_t kRandomLetters = 6;  // as many as mkostemp puts in

Fd open_regular_with(int folder, const char* name, int flags) {
  Fd fd(openat(folder, name, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | flags));
  struct stat status {};
  if (!fd || fstat(fd.get(), &status) != 0) {
    return {};
  }
  if (!S_ISREG(status.st_mode)) {
    errno = S_ISDIR(status.st_mode) ? EISDIR : EINVAL;
    return {};
  }
  return fd;
}

}  // namespace

ErrnoKeeper::ErrnoKeeper() : saved_(errno) {}
ErrnoKeeper::~ErrnoKeeper() {
  errno = saved_;
}

std::optional<std::string> read_file(const std::string& path, std::size_t limit) {
  const Fd fd = open_regular_with(AT_FDCWD, path.c_str(), 0);
  std::optional<std::string> text = fd ? read_start(fd.get(), limit + 1) : std::nullopt;
  if (text && text->size() > limit) {
    errno = EFBIG;
    return std::nullopt;
  }
  return text;
}

Fd open_regular(int folder, const char* name) {
  return open_regular_with(folder, name, O_NOFOLLOW);
}

std::optional<std::string> read_start(int fd, std::size_t most) {
  std::string text;
  char chunk[16384];
  while (text.size() < most) {
    const ssize_t got = read(fd, chunk, std::min(sizeof chunk, most - text.size()));
    if (got == 0) {
      break;
    }
    if (got > 0) {
      text.append(chunk, static_cast<std::size_t>(got));
    } else if (errno != EINTR) {
      return std::nullopt;
    }
  }
  return text;
}

bool write_all(int fd, std::string_view text) {
  while (!text.empty()) {
    const ssize_t put = write(fd, text.data(), text.size());
    if (put >= 0) {
      text.remove_prefix(static_cast<std::size_t>(put));
    } else if (errno != EINTR) {
      return false;
    }
  }
  return true;
}

AtomicFile::AtomicFile(std::string path) : path_(std::move(path)) {
  const std::size_t slash = path_.rfind('/') + 1;  // 0 without a slash: npos wraps around
  temporary_ =
      path_.substr(0, slash) + "." + path_.substr(slash) + "." + std::string(kRandomLetters, 'X');
  fd_ = Fd(mkostemp(temporary_.data(), O_CLOEXEC));
  if (!fd_) {
    temporary_.clear();
  }
}

AtomicFile::~AtomicFile() {
  if (!temporary_.empty()) {
    const ErrnoKeeper keeper;
    unlink(temporary_.c_str());
  }
}

void AtomicFile::remove_leftovers(const std::string& path) {
  const ErrnoKeeper keeper;
  const std::size_t slash = path.rfind('/') + 1;
  const std::string beginning = "." + path.substr(slash) + ".";
  const auto is_leftover = [&](const std::string& name) {
    return name.size() == beginning.size() + kRandomLetters && name.starts_with(beginning) &&
           std::all_of(name.begin() + static_cast<std::ptrdiff_t>(beginning.size()), name.end(),
                       [](unsigned char c) { return std::isalnum(c) != 0; });
  };
  std::error_code error;
  for (std::filesystem::directory_iterator entry(slash > 0 ? path.substr(0, slash) : ".", error),
       end;
       !error && entry != end; entry.increment(error)) {
    if (is_leftover(entry->path().filename()) && entry->is_regular_file(error)) {
      unlink(entry->path().c_str());
    }
  }
}

bool AtomicFile::commit() {
  if (fsync(fd_.get()) != 0 || rename(temporary_.c_str(), path_.c_str()) != 0) {
    return false;
  }
  temporary_.clear();
  // The new content is in place whatever comes of this; it only decides what a power cut keeps.
  const ErrnoKeeper keeper;
  const std::string folder = path_.substr(0, path_.rfind('/') + 1);
  const Fd opened(open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened) {
    fsync(opened.get());
  }
  return true;
}

bool make_folders(const std::string& path) {
  const int saved_errno = errno;
  std::error_code error;
  std::filesystem::create_directories(path, error);
  errno = error ? error.value() : saved_errno;
  return !error;
}

bool remove_tree(const std::string& path) {
  const int saved_errno = errno;
  // libstdc++ walks with openat and O_NOFOLLOW, so a folder that is swapped for a link half-way
  // leads nowhere.
  std::error_code error;
  std::filesystem::remove_all(path, error);
  errno = error ? error.value() : saved_errno;
  return !error;
}

}  // namespace host
