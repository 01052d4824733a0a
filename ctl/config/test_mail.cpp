// vornctl profile test-mail: whether a profile's mails arrive, without a run.
#include <memory>
#include <string>
#include <vector>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "config/commands.hpp"
#include "vorn/admin/mail.hpp"
#include "vorn/admin/messages.hpp"

namespace ctl {
namespace {

void send_test_mail(const std::string& name) {
  const std::vector<std::string> served = admin::send_test_mail(read_profile(name));
  for (const std::string& recipient : served) {
    print_line("sent to " + recipient);
  }
  const std::vector<std::string> problems = admin::take_messages();
  for (const std::string& problem : problems) {
    warn(problem);
  }
  if (!problems.empty() || served.empty()) {
    throw Failure("", kFailed);
  }
}

}  // namespace

void add_test_mail_command(CLI::App& profile) {
  CLI::App& command =
      *profile.add_subcommand("test-mail", "Send a test mail to a profile's recipients");
  const auto name = std::make_shared<std::string>();
  add_profile_argument(command, *name);
  command.callback([name] { send_test_mail(*name); });
}

}  // namespace ctl
