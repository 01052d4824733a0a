// vornctl log: what the last run of a profile has said to the system log.
#include <memory>
#include <string>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/texts.hpp"
#include "run/commands.hpp"
#include "run/run_log.hpp"

namespace ctl {
namespace {

void show_log(const std::string& name) {
  read_profile(name);  // says so when there is none
  const auto trace = admin::last_trace(name);
  if (!trace) {
    throw Failure("profile " + name + " has not run yet; start it with vornctl run " + name);
  }
  const RunLines found = lines_of_run(*trace);
  if (!found.is_read) {
    throw Failure("there is no system log that can be read; install systemd's journal or rsyslog");
  }
  for (const std::string& line : found.lines) {
    print_line(line);
  }
  if (found.lines.empty()) {
    warn("the run of " + time_text(trace->started) + " has said nothing to the system log");
  }
}

}  // namespace

void add_log_command(CLI::App& app) {
  const auto name = std::make_shared<std::string>();
  CLI::App& command =
      *app.add_subcommand("log", "Print what the last run has said to the system log");
  add_profile_argument(command, *name);
  command.callback([name] { show_log(*name); });
}

}  // namespace ctl
