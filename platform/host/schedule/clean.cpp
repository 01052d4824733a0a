// The end of a profile's schedule.
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <exception>
#include <string>

#include "base/host_log.hpp"
#include "base/text_containers.hpp"
#include "config/profile.hpp"
#include "schedule/jobs.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace host {
namespace {

int remove_cron_file(const char* profile, VLIBCSzHash& hash, const char* key) {
  const char* value = hash.find(key);
  const std::string id = value == nullptr ? "" : value;
  if (id.empty()) {
    return 0;
  }
  if (!valid_schedule_id(id)) {
    log_line(
        "profile \"%s\": %s = %.80s is no schedule identifier (1 to 64 of A-Z a-z 0-9 _ -); "
        "run vornctl profile set %s %s ''",
        profile, key, id.c_str(), profile, key);
    errno = EINVAL;
    return -1;
  }
  const int saved_errno = errno;
  const std::string path = schedule_file(id);
  struct stat status {};
  if (lstat(path.c_str(), &status) == 0) {
    if (!S_ISREG(status.st_mode) && !S_ISLNK(status.st_mode)) {
      log_line("profile \"%s\": schedule %s is no file; remove it by hand", profile, path.c_str());
      return -1;
    }
    if (unlink(path.c_str()) != 0) {
      log_line("profile \"%s\": schedule %s can't be removed (%s)", profile, path.c_str(),
               std::strerror(errno));
      return -1;
    }
  } else if (errno != ENOENT && errno != ENOTDIR) {
    log_line("profile \"%s\": schedule %s can't be examined (%s)", profile, path.c_str(),
             std::strerror(errno));
    return -1;
  }
  hash.remove(key);
  errno = saved_errno;
  return 1;
}

// Timers, which are systemd's to stop, and lines of other files.
void tell_what_is_left(const char* profile) {
  const ErrnoKeeper keeper;
  for (const Job& job : scheduled_jobs()) {
    if (job.profile == profile) {
      log_line("profile \"%s\" is still run by %s; run vornctl schedule %s --clean", profile,
               job.file.c_str(), profile);
    }
  }
}

}  // namespace
}  // namespace host

int VornQazScheduleClean(const char* profile, VLIBCSzHash** hash, const char* key) {
  if (!host::valid_profile(profile) || hash == nullptr || *hash == nullptr || key == nullptr) {
    return -1;
  }
  try {
    const int result = host::remove_cron_file(profile, **hash, key);
    host::tell_what_is_left(profile);
    return result;
  } catch (const std::exception&) {
    return -1;
  }
}
