#include "run/run_temporary.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "base/host_log.hpp"
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

bool claim(const char* path) {
  if (unlink(path) != 0 && errno != ENOENT) {
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

}  // namespace host
