// How far a run is, for whoever wants to know.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <exception>
#include <string>
#include <string_view>

#include "config/profile.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {
namespace {

constexpr mode_t kReadable = 0644;  // for anyone, whatever this process's umask

std::string progress_path(const std::string& profile) {
  return VORN_PATH_PROGRESS "/" + profile;
}

// One name for all runs of the profile, which is one at a time: nothing piles up. No profile's own
// name begins with a dot.
std::string temporary_path(const std::string& profile) {
  return VORN_PATH_PROGRESS "/." + profile + ".new";
}

Fd make_file(const std::string& path) {
  return Fd(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC,
                 kReadable));
}

bool put_progress(const std::string& profile, std::string_view text) {
  constexpr mode_t kOpenFolder = 0755;
  const std::string temporary = temporary_path(profile);
  Fd file = make_file(temporary);
  if (!file && errno == ENOENT && make_folders(VORN_PATH_PROGRESS) &&
      chmod(VORN_PATH_PROGRESS, kOpenFolder) == 0) {
    file = make_file(temporary);
  }
  if (file && fchmod(file.get(), kReadable) == 0 && write_all(file.get(), text) &&
      rename(temporary.c_str(), progress_path(profile).c_str()) == 0) {
    return true;
  }
  unlink(temporary.c_str());
  return false;
}

}  // namespace
}  // namespace host

int VornQazProgressUpdate(const char* profile, const char* text) {
  const host::ErrnoKeeper keeper;  // what the run says next is not about this
  if (!host::valid_profile(profile) || text == nullptr) {
    return -1;
  }
  try {
    return host::put_progress(profile, text) ? 0 : -1;
  } catch (const std::exception&) {
    return -1;
  }
}

void VornQazProgressEnd(const char* profile) {
  const host::ErrnoKeeper keeper;
  if (!host::valid_profile(profile)) {
    return;
  }
  try {
    unlink(host::progress_path(profile).c_str());
    unlink(host::temporary_path(profile).c_str());
  } catch (const std::exception&) {
    // It is removed with the profile's next run.
  }
}
