// The report mail: its text, and its delivery.
#ifndef VORN_HOST_MAIL_HPP
#define VORN_HOST_MAIL_HPP

#include <chrono>
#include <ctime>
#include <string>
#include <string_view>
#include <vector>

#include "base/text_containers.hpp"
#include "mail/mail_summary.hpp"

namespace host {

// How long delivery may take. A run is a job of the night: it waits for a slow server, not for a
// dead one.
struct MailLimits {
  std::chrono::milliseconds connect{10'000};   // until the server has greeted
  std::chrono::milliseconds transfer{60'000};  // one recipient
  std::chrono::milliseconds total{120'000};    // all of them
};

// A message and its envelope.
struct MailText {
  std::string from;
  std::vector<std::string> to;
  std::time_t time = 0;
  std::string message_id;  // without the angle brackets
  MailContent content;
};

// Whether `address` can stand in a header and in an SMTP command as it is: printable ASCII without
// blanks, quotes, angle brackets, commas and the like, one '@' with something on both sides, at
// most 254 bytes.
bool valid_address(std::string_view address);

// The host of an URL smtp://host:port or smtps://host:port; empty for any other text.
std::string mail_host(const std::string& smtp_url);

// What became of the runs of a profile before the one that a mail is about, as times; 0 is nothing.
struct EarlierRuns {
  std::time_t unfinished = 0;  // the last one began then and didn't finish
  std::time_t missed = 0;      // one was due then and never began
};

// What the mail of a report tells besides its facts, which were closed before.
struct LateNews {
  EarlierRuns earlier{};
  bool is_missing_from_fleet = false;
};

// Whether a mail of the profile has somebody to go to.
bool wants_mail(const VLIBCSzHash& hash);

// As VornQazSendReport. The mail tells the facts beside the finished page, whose path is in `hash`
// (real_path_report_final).
int send_report(const char* profile, const char* link, const VLIBCSzHash& hash,
                const LateNews& news, const MailLimits& limits);

// Sends the mail of a run that failed, with what it has said to the log, as send_report sends one.
// Those who were served.
std::vector<std::string> send_failure(const char* profile, const VLIBCSzHash& hash,
                                      const EarlierRuns& earlier,
                                      const std::vector<std::string>& log,
                                      const MailLimits& limits);

// Sends a mail that says it is a test as send_report sends one. Those who were served; one log line
// for everything that kept others from it.
std::vector<std::string> send_test_mail(const char* profile, const VLIBCSzHash& hash,
                                        const MailLimits& limits);

}  // namespace host

#endif
