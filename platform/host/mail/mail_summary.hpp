// What the mails say: that a report is ready, and the facts of it that matter most.
#ifndef VORN_HOST_MAIL_SUMMARY_HPP
#define VORN_HOST_MAIL_SUMMARY_HPP

#include <optional>
#include <string>
#include <vector>

#include "report_format/facts.hpp"
#include "report_format/texts.hpp"

namespace host {

// What a mail is about.
struct MailTopic {
  std::string profile;
  std::string host;
  std::string time;          // of the mail, for readers
  std::string link;          // to the report
  std::string report_list;   // as the profile has it
  std::string unfinished{};  // when the run before began, which didn't finish; else empty
  std::string missed{};      // when a run was due that never began; else empty
  bool is_missing_from_fleet = false;
};

// A mail's subject (one line of any characters) and its body in both forms. The HTML stands alone:
// no script, nothing to load, colours of the reader's own theme.
struct MailContent {
  std::string subject;
  std::string plain;
  std::string html;
};

// Subject and first line say the worst thing first: what needs attention, else what the report
// lacks. Without facts the mail says that they are missing.
MailContent report_mail(const report_format::Texts& texts, const MailTopic& topic,
                        const std::optional<report_format::Facts>& facts);
// Of a run that failed: what it said to the log, and what to do.
MailContent failure_mail(const report_format::Texts& texts, const MailTopic& topic,
                         const std::vector<std::string>& log);
// Only the profile, the host and the time of `topic` count.
MailContent test_mail(const report_format::Texts& texts, const MailTopic& topic);

}  // namespace host

#endif
