// Whether a profile's mails go out.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "vorn/admin/configuration.hpp"

namespace admin {

// Sends a mail that says it is a test to the profile's recipients, as a run sends its mail. Those
// who were served; a message for everything that kept others from it.
std::vector<std::string> send_test_mail(const Section& profile);

// The URL of the server that takes the profile's mail.
std::string mail_server_of(const Section& profile);
// Connects to that server and waits for its greeting, as a run does before it sends. What is wrong,
// or nothing when it answers.
std::string mail_server_problem(const Section& profile);

// --- Settings -----------------------------------------------------------------------------------

// Whether `text` is an address that a mail can be sent to or come from.
bool is_mail_address(std::string_view text);
// What is wrong with a value, as the end of a sentence that begins with it, or nothing.
std::string smtp_url_problem(const std::string& value);
std::string password_file_problem(const std::string& value);

}  // namespace admin
