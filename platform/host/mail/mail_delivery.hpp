// The delivery of a message to a mail server.
#ifndef VORN_HOST_MAIL_DELIVERY_HPP
#define VORN_HOST_MAIL_DELIVERY_HPP

#include <string>
#include <vector>

#include "mail/mail.hpp"

namespace host {

struct MailServer {
  std::string url;  // smtp:// or smtps://, host and port
  bool is_loopback = false;
  std::string user;  // empty: no log-in
  std::string password;
};

// Sends `mail` to each of its recipients, within `limits`. Those that the server took it for; one
// log line for each other one, or for the server when it can't be used, and errno says why.
std::vector<std::string> deliver(const char* profile, const MailServer& server,
                                 const MailText& mail, const MailLimits& limits);

}  // namespace host

#endif
