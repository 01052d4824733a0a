// What the mails say: that a report is ready, and the figures of it that matter most.
#ifndef VORN_HOST_MAIL_SUMMARY_HPP
#define VORN_HOST_MAIL_SUMMARY_HPP

#include <string>

#include "report_format/texts.hpp"
#include "run/report_figures.hpp"

namespace host {

using report_format::Texts;

// What a mail is about.
struct MailTopic {
  std::string profile;
  std::string host;
  std::string time;         // of the mail, for readers
  std::string link;         // to the report
  std::string report_list;  // as the profile has it
};

// A mail's subject (one line of any characters) and its body in both forms. The HTML stands alone:
// no script, nothing to load, colours of the reader's own theme.
struct MailContent {
  std::string subject;
  std::string plain;
  std::string html;
};

// Figures that are absent have no line.
MailContent report_mail(const Texts& texts, const MailTopic& topic, const ReportFigures& figures);
// Only the profile, the host and the time of `topic` count.
MailContent test_mail(const Texts& texts, const MailTopic& topic);

}  // namespace host

#endif
