// One run per profile at a time.
//
// The lock is a POSIX record lock on a file of its own, which is never removed. The kernel drops it
// when the process dies, and neither fork nor exec hands it on: a shell command that outlives a
// killed run doesn't block the next one. Its one trap is that closing *any* descriptor of the file
// drops the lock, so this process opens the file of a profile that it holds exactly once.
//
// The file's content is the holder's process id, for whoever asks.
#include "run/run_lock.hpp"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "base/host_log.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace host {
namespace {

struct Held {
  std::string profile;
  pid_t owner = 0;  // a forked child inherits this record but not the lock
  Fd file;
};

Held& held() {
  static Held instance;
  return instance;
}

std::string lock_path(const std::string& profile) {
  return VORN_PATH_STATUS "/." + profile + ".lock";
}

struct flock whole_file() {
  struct flock range {};
  range.l_type = F_WRLCK;
  range.l_whence = SEEK_SET;
  return range;
}

// Leaves this process's id for whoever asks who it is.
void note_holder(int fd) {
  const ErrnoKeeper keeper;
  const std::string id = std::to_string(getpid()) + "\n";
  if (ftruncate(fd, 0) != 0 || pwrite(fd, id.data(), id.size(), 0) < 0) {
    // The lock holds all the same.
    log_line("can't note this run in %s (%s); free some space", VORN_PATH_STATUS,
             std::strerror(errno));
  }
}

}  // namespace

TakeResult take_profile(const std::string& profile) {
  if (holds_profile(profile)) {
    return TakeResult::taken;
  }
  const std::string path = lock_path(profile);
  Fd file;
  if (make_folders(VORN_PATH_STATUS)) {
    file = Fd(open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600));
  }
  struct flock range = whole_file();
  if (file && fcntl(file.get(), F_SETLK, &range) == 0) {
    note_holder(file.get());
    held() = {profile, getpid(), std::move(file)};
    return TakeResult::taken;
  }
  if (file && (errno == EACCES || errno == EAGAIN)) {
    return TakeResult::busy;
  }
  log_line("profile \"%s\" can't be locked with %s (%s); make the folder writable", profile.c_str(),
           path.c_str(), std::strerror(errno));
  return TakeResult::failed;
}

bool holds_profile(const std::string& profile) {
  return held().file && held().profile == profile && held().owner == getpid();
}

bool held_by_other(const std::string& profile) {
  if (holds_profile(profile)) {
    return false;  // opening and closing the file here would drop the lock
  }
  const ErrnoKeeper keeper;
  const Fd file(open(lock_path(profile).c_str(), O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct flock range = whole_file();
  return file && fcntl(file.get(), F_GETLK, &range) == 0 && range.l_type != F_UNLCK;
}

}  // namespace host
