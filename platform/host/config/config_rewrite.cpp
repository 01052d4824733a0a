// Replacing a configuration file: one writer at a time, and never half a file.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <thread>

#include "base/host_log.hpp"
#include "config/config_file.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/text.h"

namespace host {
namespace {

int fail(int code, int line) {
  VLIBCErrSetEx(code, "platform/host/config/config_rewrite.cpp", line);
  return -1;
}

const char* remedy(int error) {
  return error == EACCES || error == EPERM ? "; do this as root" : "";
}

std::string resolved(const char* file) {
  const std::unique_ptr<char, decltype(&std::free)> real(realpath(file, nullptr), &std::free);
  return real ? real.get() : file;
}

Fd open_lock(const std::string& file, std::string& path) {
  const std::size_t slash = file.rfind('/') + 1;
  path = file.substr(0, slash) + "." + file.substr(slash) + ".lock";
  return Fd(open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600));
}

// Taken beside the file, because the file itself is replaced; never removed, because a writer that
// waits on a removed lock file would not keep out one that made it anew.
Fd lock_beside(const std::string& file) {
  constexpr std::chrono::milliseconds kPause{20};
  constexpr std::chrono::seconds kLongestWait{10};
  std::string path;
  Fd lock = open_lock(file, path);
  if (!lock) {
    log_line("%s can't be changed: lock file %s can't be opened (%s)%s", file.c_str(), path.c_str(),
             std::strerror(errno), remedy(errno));
    fail(VLIBC_ERR_FILE_IO, __LINE__);
    return lock;
  }
  const auto deadline = std::chrono::steady_clock::now() + kLongestWait;
  while (flock(lock.get(), LOCK_EX | LOCK_NB) != 0) {
    if (errno != EWOULDBLOCK || std::chrono::steady_clock::now() >= deadline) {
      log_line("%s is being changed by another process (lock file %s); it is unchanged, try again",
               file.c_str(), path.c_str());
      fail(VLIBC_ERR_LOCK_BUSY, __LINE__);
      return {};
    }
    std::this_thread::sleep_for(kPause);
  }
  return lock;
}

// Whether the file holds `text`; a disk can take bytes without keeping them.
bool reads_back(int fd, std::string_view text) {
  std::array<char, 16384> chunk{};
  off_t offset = 0;
  for (;;) {
    const ssize_t got = pread(fd, chunk.data(), chunk.size(), offset);
    if (got < 0 || !text.starts_with(std::string_view(chunk.data(), static_cast<size_t>(got)))) {
      errno = got < 0 ? errno : EIO;
      return false;
    }
    if (got == 0) {
      errno = text.empty() ? errno : EIO;
      return text.empty();
    }
    text.remove_prefix(static_cast<std::size_t>(got));
    offset += got;
  }
}

bool replace(const std::string& file, std::string_view text) {
  struct stat before {};
  AtomicFile target(file);
  if (lstat(file.c_str(), &before) != 0 || target.fd() < 0 ||
      fchown(target.fd(), before.st_uid, before.st_gid) != 0 ||
      fchmod(target.fd(), before.st_mode & 07777U) != 0 || !write_all(target.fd(), text) ||
      !reads_back(target.fd(), text) || !target.commit()) {
    log_line("%s is unchanged: it can't be replaced (%s)%s", file.c_str(), std::strerror(errno),
             remedy(errno));
    return false;
  }
  return true;
}

}  // namespace

void remove_unfinished_rewrites(const char* file) {
  const ErrnoKeeper keeper;
  const std::string target = resolved(file);
  std::string path;
  const Fd lock = open_lock(target, path);
  if (lock && flock(lock.get(), LOCK_EX | LOCK_NB) == 0) {
    AtomicFile::remove_leftovers(target);
  }
}

int rewrite_config(const char* file, const TextChange& change) {
  const int saved_errno = errno;
  // An administrator's link to the file stays; what it leads to is what gets replaced.
  const std::string target = resolved(file);
  const Fd lock = lock_beside(target);
  if (!lock) {
    return -1;
  }
  const std::optional<std::string> text = read_config(target.c_str());
  if (!text) {
    return fail(VLIBC_ERR_FILE_IO, __LINE__);
  }
  const std::optional<std::string> new_text = change(*text);
  if (!new_text) {
    return -1;
  }
  if (*new_text != *text && !replace(target, *new_text)) {
    return fail(VLIBC_ERR_FILE_IO, __LINE__);
  }
  errno = saved_errno;  // waiting for the lock has left its own
  return 0;
}

}  // namespace host
