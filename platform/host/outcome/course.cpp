#include "outcome/course.hpp"

#include <sys/stat.h>

#include <algorithm>

#include "base/host_log.hpp"
#include "config/config_file.hpp"
#include "config/config_lines.hpp"
#include "schedule/jobs.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace host {

std::optional<Course>& course() {
  static std::optional<Course> instance;
  return instance;
}

report_format::RunStatus stored_status(const std::string& profile) {
  constexpr std::size_t kLargest = 4096;
  const ErrnoKeeper keeper;
  const std::string path = VORN_PATH_STATUS "/" + profile;
  const auto text = read_file(path, kLargest);
  auto status = text ? report_format::status_of(*text) : report_format::RunStatus{};
  struct stat file {};
  if (text && status.started == 0 && stat(path.c_str(), &file) == 0) {
    status.started = file.st_mtime;  // of a version that didn't note it
  }
  return status;
}

void begin_course(const std::string& profile) {
  course() = Course{profile, std::time(nullptr), stored_status(profile)};
}

EarlierRuns earlier_runs(const Course& course) {
  EarlierRuns earlier;
  const report_format::RunStatus& before = course.before;
  if (report_format::was_cut(before) && course.profile != "global") {
    earlier.unfinished = before.started;
  }
  earlier.missed =
      overdue_since(course.profile, std::max(before.report_started, earlier.unfinished),
                    course.started)
          .value_or(0);
  return earlier;
}

VLIBCSzHash readable_settings(const std::string& profile) {
  const ErrnoKeeper keeper;
  VLIBCSzHash settings(0);
  const LogSink sink = redirect_log([](const char*) {});  // all that is wrong has been said
  const std::string text = read_config(VORN_PATH_CONFIG).value_or("");
  redirect_log(sink);
  bool is_here = false;
  for (const ConfigLine& line : parse_lines(text)) {
    if (line.kind == LineKind::header) {
      is_here = line.name == profile;
    } else if (is_here && line.kind == LineKind::entry && settings.find(line.name) == nullptr) {
      settings.set(line.name, line.value);
    }
  }
  return settings;
}

}  // namespace host
