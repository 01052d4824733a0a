// vornctl profile test-mail: whether a profile's mails arrive, without a run.
#include <memory>
#include <string>
#include <vector>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/text_containers.hpp"
#include "mail/mail.hpp"
#include "vorn/config.h"
#include "vorn/paths.h"

namespace ctl {
namespace {

void send_test_mail(const std::string& name) {
  if (!profile_exists(name)) {
    throw Failure("there is no profile \"" + name + "\"; see: vornctl profile list");
  }
  VLIBCSzHash section(0);
  VLIBCSzHash* filled = &section;
  if (VLIBCFileGetSection(VORN_PATH_CONFIG, name.c_str(), &filled) < 0) {
    throw host_failure("profile \"" + name + "\" can't be read");
  }
  const std::vector<std::string> served =
      host::send_test_mail(name.c_str(), section, host::MailLimits{});
  for (const std::string& recipient : served) {
    print_line("sent to " + recipient);
  }
  const std::vector<std::string> problems = take_host_messages();
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
