// The mail of a finished report, which tells of the runs before it, too.
#include <cerrno>

#include "base/text_containers.hpp"
#include "config/profile.hpp"
#include "mail/mail.hpp"
#include "outcome/course.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

int VornQazSendReport(const char* profile, const char* link, const VLIBCSzHash* hash) try {
  if (link == nullptr || hash == nullptr || !host::valid_profile(profile)) {
    errno = EINVAL;
    return -1;
  }
  return host::keeping_errno([&] {
    const auto& course = host::course();
    const host::EarlierRuns earlier =
        course && course->profile == profile ? host::earlier_runs(*course) : host::EarlierRuns{};
    const bool is_missing = host::report_run() && host::report_run()->fleet_failed;
    return host::send_report(profile, link, *hash, {earlier, is_missing}, host::MailLimits{});
  });
} catch (...) {
  errno = ENOMEM;
  return -1;
}
