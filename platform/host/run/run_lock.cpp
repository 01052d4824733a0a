// One run per profile at a time.
//
// The lock is a POSIX record lock on a file of its own, which is never removed. The kernel drops it
// when the process dies, and neither fork nor exec hands it on: a shell command that outlives a
// killed run doesn't block the next one. Its one trap is that closing *any* descriptor of the file
// drops the lock, so this process opens the file of a profile that it holds exactly once.
//
// The file's content is the holder's process id. It is only read by the next holder, to know which
// names in /tmp a killed run has left.
#include "run/run_lock.hpp"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <csignal>
#include <cstring>
#include <utility>

#include "base/host_log.hpp"
#include "run/run_temporary.hpp"
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

pid_t stored_pid(int fd) {
  std::array<char, 16> text{};
  const ssize_t size = pread(fd, text.data(), text.size(), 0);
  pid_t pid = 0;
  if (size > 0) {
    std::from_chars(text.data(), text.data() + size, pid);
  }
  return pid;
}

bool alive(pid_t pid) {
  return kill(pid, 0) == 0 || errno != ESRCH;
}

// Leaves this process's id for the next holder and clears up after the last one. A process id that
// is in use again belongs to somebody else's run by now, so its names stay.
void succeed_last_holder(int fd) {
  const ErrnoKeeper keeper;
  const pid_t last = stored_pid(fd);
  if (last > 0 && last != getpid() && !alive(last)) {
    remove_temporary_names(last);
  }
  const std::string id = std::to_string(getpid()) + "\n";
  if (ftruncate(fd, 0) != 0 || pwrite(fd, id.data(), id.size(), 0) < 0) {
    // The lock holds all the same; only names in /tmp may stay behind if this run is killed.
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
    succeed_last_holder(file.get());
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
