// vornctl: administration of the reports on a host.
#include <sys/stat.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <string_view>
#include <vector>

#include "base/ctl.hpp"
#include "config/commands.hpp"
#include "doctor/commands.hpp"
#include "fleet/commands.hpp"
#include "run/commands.hpp"
#include "schedule/commands.hpp"
#include "vorn/admin/messages.hpp"

namespace {

constexpr const char* kFooter =
    "Exit status: 0 fine, 1 failed, 2 wrong usage, 3 a report that lacks something. Every command "
    "is described in vornctl(8).";

using Words = std::vector<std::string>;

// "help share add" is "share add --help". The words of a command line are taken from behind.
Words parsed_words(int argc, char** argv) {
  Words words{argv + 1, argv + argc};
  if (!words.empty() && words.front() == "help") {
    words.erase(words.begin());
    words.emplace_back("--help");
  } else {
    words = ctl::in_parse_order(std::move(words));
  }
  return words;
}

// Names a word that is no command; the parser only says that one is missing.
void check_commands(const CLI::App& app, const Words& words) {
  const CLI::App* group = &app;
  for (const std::string& word : words) {
    if (word.starts_with('-') || group->get_require_subcommand_min() == 0) {
      return;
    }
    const auto commands = group->get_subcommands([](const CLI::App*) { return true; });
    const auto named = std::find_if(commands.begin(), commands.end(), [&](const CLI::App* command) {
      return command->check_name(word);
    });
    if (named == commands.end()) {
      throw ctl::Failure('"' + word + "\" is no command; see vornctl --help", ctl::kWrongUsage);
    }
    group = *named;
  }
}

// That of each command, one after another; `name` is that of the group as it is typed.
void print_all_help(const CLI::App& group, const std::string& name) {
  for (const CLI::App* command : group.get_subcommands({})) {
    if (!command->get_subcommands({}).empty()) {
      print_all_help(*command, name + " " + command->get_name());
      continue;
    }
    const std::string text = command->help(name);
    std::fputs(text.substr(0, text.rfind(kFooter)).c_str(), stdout);
  }
}

// Settings, runs and reports are root's, and what another user could see of them would mislead.
// What somebody has staged for a try is theirs.
void check_user() {
  struct stat etc {};
  const bool is_own = stat("/usr/vorn/etc", &etc) == 0 && etc.st_uid == geteuid();
  if (geteuid() != 0 && !is_own) {
    throw ctl::Failure("shares, profiles and their reports are root's to see; run this as root");
  }
}

void run(int argc, char** argv) {
  CLI::App app("Administration of vornreport: shares, profiles, runs and reports.", "vornctl");
  app.footer(kFooter);
  app.set_help_flag("-h,--help", "Print this help and exit");
  app.set_version_flag("--version", "vornctl " VORN_VERSION, "Print the version and exit");
  app.require_subcommand(1);
  app.parse_complete_callback(check_user);  // before that of any command
  ctl::add_share_commands(app);
  ctl::add_profile_commands(app);
  ctl::add_run_command(app);
  ctl::add_schedule_command(app);
  ctl::add_status_command(app);
  ctl::add_reports_command(app);
  ctl::add_log_command(app);
  ctl::add_fleet_commands(app);
  ctl::add_doctor_command(app);
  app.set_help_all_flag("--help-all", "Print the help of all commands and exit");

  // Hidden, and asked for before anything is parsed: what it is asked about is no command yet.
  if (argc > 1 && std::string_view(argv[1]) == "complete") {
    ctl::complete(app, {argv + 2, argv + argc});
    return;
  }
  Words words = parsed_words(argc, argv);
  check_commands(app, words);
  std::reverse(words.begin(), words.end());
  try {
    app.parse(std::move(words));
  } catch (const CLI::CallForAllHelp&) {
    print_all_help(app, app.get_name());
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) {
      app.exit(error);  // the help or version that was asked for
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
