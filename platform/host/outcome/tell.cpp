#include "outcome/tell.hpp"

#include <cstdio>
#include <string>

#include "base/host_log.hpp"
#include "mail/mail.hpp"
#include "report_format/texts.hpp"
#include "report_format/values.hpp"
#include "vorn/base/file_io.hpp"

namespace host {
namespace {

void complain(const std::string& line) {
  std::fprintf(stderr, "vornreport: %s\n",
               report_format::name_in(report_format::TextForm::plain, line).c_str());
}

std::string local_time(std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  char text[32];
  return {text, std::strftime(text, sizeof text, "%Y-%m-%d %H:%M", &local)};
}

void complain_of(const EarlierRuns& earlier, const std::string& profile) {
  const std::string whose = "profile " + profile + ": ";
  if (earlier.unfinished != 0) {
    complain(whose + "the run of " + local_time(earlier.unfinished) +
             " did not finish: it was killed, or the server went down");
  }
  if (earlier.missed != 0) {
    complain(whose + "a run was due at " + local_time(earlier.missed) +
             " and did not begin then; vornctl doctor looks at the schedule");
  }
}

bool mails_failures(const VLIBCSzHash& settings) {
  const char* value = settings.find("mail_on_failure");
  return value == nullptr || !report_format::is_false(value);
}

}  // namespace

void tell_failure(const Course& course, const VLIBCSzHash& settings) {
  const ErrnoKeeper keeper;
  const EarlierRuns earlier = earlier_runs(course);
  if (mails_failures(settings)) {
    send_failure(course.profile.c_str(), settings, earlier, lines_said(), MailLimits{});
  }
  complain_of(earlier, course.profile);
  for (const std::string& line : lines_said()) {  // why no mail went out among them
    complain(line);
  }
  complain("the run of profile " + course.profile +
           " failed; vornctl doctor says what to do, vornctl run " + course.profile +
           " tries again");
  std::fflush(stderr);
}

void tell_report(const Course& course, const report_format::Facts& facts,
                 const VLIBCSzHash& settings, const report_format::RunStatus& status) {
  if (status.mail_failed) {
    complain("profile " + course.profile +
             ": the mail of its report reached nobody; vornctl profile test-mail " +
             course.profile + " says why");
  }
  if (!status.mail_failed && wants_mail(settings)) {
    return;
  }
  complain_of(earlier_runs(course), course.profile);
  if (status.fleet_failed) {
    complain("profile " + course.profile + ": its report is missing from the fleet; vornctl run " +
             course.profile + " tries again");
  }
  for (const report_format::Incident& incident : facts.incidents) {
    complain("profile " + course.profile + ": " + incident.text);
  }
}

}  // namespace host
