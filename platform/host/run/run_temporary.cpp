#include "run/run_temporary.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <random>
#include <string>

#include "base/host_log.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace host {
namespace {

using Name = std::array<char, 64>;

std::array<Name, 3> temporary_names(pid_t pid) {
  const auto id = static_cast<unsigned>(pid);
  std::array<Name, 3> names{};
  std::snprintf(names[0].data(), names[0].size(), VORN_TMP_DATA_FORMAT, id);
  std::snprintf(names[1].data(), names[1].size(), VORN_TMP_BODY_FORMAT, id);
  std::snprintf(names[2].data(), names[2].size(), VORN_TMP_CMD_FORMAT, id);
  return names;
}

// Anybody may have made a folder there, which isn't ours to remove. False with errno.
bool move_aside(const char* path) {
  std::random_device random;
  for (;;) {
    const std::string aside = std::string(path) + ".aside-" + std::to_string(random());
    if (renameat2(AT_FDCWD, path, AT_FDCWD, aside.c_str(), RENAME_NOREPLACE) == 0) {
      log_line("%s was a folder in the way of this run; it is %s now", path, aside.c_str());
      return true;
    }
    if (errno != EEXIST) {
      return false;
    }
  }
}

bool is_alive(pid_t pid) {
  return kill(pid, 0) == 0 || errno != ESRCH;
}

bool claim(const char* path) {
  if (unlink(path) != 0 && errno != ENOENT && (errno != EISDIR || !move_aside(path))) {
    log_line("%s is in the way and can't be removed (%s); remove it by hand", path,
             std::strerror(errno));
    return false;
  }
  const Fd made(open(path, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!made) {
    log_line("%s can't be made (%s); make room in /tmp", path, std::strerror(errno));
    return false;
  }
  return true;
}

}  // namespace

bool claim_temporary_names() {
  struct stat folder {};
  if (stat("/tmp", &folder) != 0) {
    log_line("/tmp can't be examined (%s)", std::strerror(errno));
    return false;
  }
  if ((folder.st_mode & (S_IWGRP | S_IWOTH)) != 0 && (folder.st_mode & S_ISVTX) == 0) {
    log_line(
        "/tmp is writable by others without the sticky bit, so nothing in it is safe; run "
        "chmod 1777 /tmp");
    errno = EPERM;
    return false;
  }
  const int saved_errno = errno;
  for (const Name& name : temporary_names(getpid())) {
    if (!claim(name.data())) {
      remove_temporary_names(getpid());
      return false;
    }
  }
  errno = saved_errno;
  return true;
}

void remove_temporary_names(pid_t pid) {
  const ErrnoKeeper keeper;
  for (const Name& name : temporary_names(pid)) {
    unlink(name.data());
  }
}

void remove_dead_names() {
  const ErrnoKeeper keeper;
  const Fd folder(open("/tmp", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  for (const std::string& name : entries_of(folder)) {
    // A number that is in use again belongs to somebody else's run by now, so its names stay.
    pid_t pid = 0;
    const char* number = name.data() + name.rfind('.') + 1;
    std::from_chars(number, name.data() + name.size(), pid);
    const auto names = temporary_names(pid);
    struct stat status {};
    if (pid > 0 && !is_alive(pid) &&
        std::any_of(names.begin(), names.end(),
                    [&](const Name& own) { return own.data() == "/tmp/" + name; }) &&
        fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
        S_ISREG(status.st_mode) && status.st_uid == geteuid()) {
      unlinkat(folder.get(), name.c_str(), 0);
    }
  }
}

}  // namespace host
