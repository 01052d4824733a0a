// One run per profile at a time.
//
// The lock is a POSIX record lock on a file of its own, which is never removed. The kernel drops it
// when the process dies, and neither fork nor exec hands it on: a shell command that outlives a
// killed run doesn't block the next one. Its one trap is that closing *any* descriptor of the file
// drops the lock, so this process opens the file of a profile that it holds exactly once.
//
// The first line of the file is the holder's process id, for whoever asks; the second, "run", the
// process id of the last run and when it took the profile.
#include "run/run_lock.hpp"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <sstream>
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

constexpr std::size_t kLongestNote = 256;

// The line of the last run in `note`, with its end; empty when there is none.
std::string run_line_of(const std::string& note) {
  const std::size_t at = note.find("\nrun ");
  const std::size_t end = at == std::string::npos ? at : note.find('\n', at + 1);
  return end == std::string::npos ? "" : note.substr(at + 1, end - at);
}

// Leaves this process's id for whoever asks who it is.
void note_holder(int fd, TakeFor purpose) {
  const ErrnoKeeper keeper;
  const std::string id = std::to_string(getpid());
  const std::string note =
      id + "\n" +
      (purpose == TakeFor::run ? "run " + id + " " + std::to_string(std::time(nullptr)) + "\n"
                               : run_line_of(read_start(fd, kLongestNote).value_or("")));
  if (ftruncate(fd, 0) != 0 || pwrite(fd, note.data(), note.size(), 0) < 0) {
    // The lock holds all the same.
    log_line("can't note this run in %s (%s); free some space", VORN_PATH_STATUS,
             std::strerror(errno));
  }
}

}  // namespace

TakeResult take_profile(const std::string& profile, TakeFor purpose) {
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
    note_holder(file.get(), purpose);
    held() = {profile, getpid(), std::move(file)};
    return TakeResult::taken;
  }
  if (file && (errno == EACCES || errno == EAGAIN)) {
    return TakeResult::busy;
  }
  log_line("profile \"%s\" can't be locked with %s (%s); %s", profile.c_str(), path.c_str(),
           std::strerror(errno),
           errno == EACCES && geteuid() != 0 ? "run this as root" : "make the folder writable");
  return TakeResult::failed;
}

std::optional<Taken> last_taken_for_run(const std::string& profile) {
  if (holds_profile(profile)) {
    return std::nullopt;  // see held_by_other()
  }
  const auto note = read_file(lock_path(profile), kLongestNote);
  std::istringstream line(run_line_of(note.value_or("")));
  std::string word;
  Taken taken;
  return line >> word >> taken.process >> taken.time ? std::optional(taken) : std::nullopt;
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
