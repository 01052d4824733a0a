// vornctl: administration of the reports on a host.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string_view>

#include "base/ctl.hpp"
#include "config/commands.hpp"
#include "doctor/commands.hpp"
#include "run/commands.hpp"
#include "schedule/commands.hpp"
#include "vorn/admin/messages.hpp"

namespace {

constexpr const char* kFooter =
    "Exit status: 0 fine, 1 failed, 2 wrong usage, 3 a report that lacks something. Every command "
    "is "
    "described in vornctl(8).";

// Names a word that is no command; the parser only says that one is missing.
void check_commands(const CLI::App& app, int argc, char** argv) {
  const CLI::App* group = &app;
  for (int i = 1; i < argc && *argv[i] != '-' && group->get_require_subcommand_min() > 0; ++i) {
    const auto commands = group->get_subcommands([](const CLI::App*) { return true; });
    const auto named = std::find_if(commands.begin(), commands.end(), [&](const CLI::App* command) {
      return command->check_name(argv[i]);
    });
    if (named == commands.end()) {
      throw ctl::Failure('"' + std::string(argv[i]) + "\" is no command; see vornctl --help",
                         ctl::kWrongUsage);
    }
    group = *named;
  }
}

void run(int argc, char** argv) {
  CLI::App app("Administration of vornreport: shares, profiles, runs and reports.", "vornctl");
  app.footer(kFooter);
  app.set_help_all_flag("--help-all", "Print the help of all commands and exit");
  app.require_subcommand(1);
  ctl::add_share_commands(app);
  ctl::add_profile_commands(app);
  ctl::add_run_command(app);
  ctl::add_schedule_command(app);
  ctl::add_status_command(app);
  ctl::add_reports_command(app);
  ctl::add_doctor_command(app);

  // Hidden, and asked for before anything is parsed: what it is asked about is no command yet.
  if (argc > 1 && std::string_view(argv[1]) == "complete") {
    ctl::complete(app, {argv + 2, argv + argc});
    return;
  }
  check_commands(app, argc, argv);
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) {
      app.exit(error);  // the help that was asked for
    } else {
      throw ctl::Failure(std::string(error.what()) + "; see vornctl --help", ctl::kWrongUsage);
    }
  }
}

// The exit status of a command that ran through, once all of its output is out.
int finish() {
  for (const std::string& message : admin::take_messages()) {
    ctl::warn(message);
  }
  if (std::fflush(stdout) != 0 || std::ferror(stdout) != 0) {
    ctl::warn("standard output can't be written; its end is missing");
    return ctl::kFailed;
  }
  return 0;
}

int fail(const char* message, int exit_code) {
  finish();
  if (*message != '\0') {
    ctl::warn(message);
  }
  return exit_code;
}

}  // namespace

int main(int argc, char** argv) try {
  std::setlocale(LC_CTYPE, "C.UTF-8");
  unsetenv("TZ");          // runs and cron have the system's time zone, so times are told in it
  admin::take_messages();  // from here on they are collected
  run(argc, argv);
  return finish();
} catch (const ctl::Failure& failure) {
  return fail(failure.what(), failure.exit_code());
} catch (const std::exception& error) {
  return fail(error.what(), ctl::kFailed);
}
