// vornctl run: a run in the foreground.
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <string_view>

#include "base/child.hpp"
#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "report_format/reports.hpp"
#include "run/commands.hpp"
#include "run/run_log.hpp"
#include "run/run_watch.hpp"
#include "schedule/jobs.hpp"
#include "vorn/admin/history.hpp"
#include "vorn/admin/runs.hpp"

namespace ctl {
namespace {

using Clock = std::chrono::steady_clock;
using Json = nlohmann::ordered_json;

struct Options {
  std::string profile;
  bool data = false;
  bool all = false;
  bool json = false;
};

volatile sig_atomic_t g_signal = 0;

// Ctrl-C and its kin, noted as long as one of these lives; before, they end the process.
class SignalsNoted {
 public:
  SignalsNoted() {
    struct sigaction action {};
    action.sa_handler = [](int signal) { g_signal = signal; };
    for (std::size_t i = 0; i < kSignals.size(); ++i) {
      sigaction(kSignals[i], &action, &before_[i]);
    }
  }
  ~SignalsNoted() {
    for (std::size_t i = 0; i < kSignals.size(); ++i) {
      sigaction(kSignals[i], &before_[i], nullptr);
    }
  }
  SignalsNoted(const SignalsNoted&) = delete;
  SignalsNoted& operator=(const SignalsNoted&) = delete;

 private:
  static constexpr std::array kSignals{SIGINT, SIGTERM, SIGHUP};
  std::array<struct sigaction, kSignals.size()> before_{};
};

// A line at the bottom of the terminal that is written over; nothing where there is no terminal.
class ProgressLine {
 public:
  ~ProgressLine() { clear(); }
  void show(const std::string& text) {
    if (!is_terminal_) {
      return;
    }
    const auto seconds =
        std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - start_).count();
    char clock[32];
    std::snprintf(clock, sizeof clock, ", %lld:%02lld", static_cast<long long>(seconds / 60),
                  static_cast<long long>(seconds % 60));
    winsize size{};
    const bool known = ioctl(STDERR_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0;
    std::string line = fitting(printable(text) + clock, known ? size.ws_col : 80U);
    if (line != shown_) {
      std::fprintf(stderr, "\r\x1b[K%s", line.c_str());
      shown_ = std::move(line);
    }
  }
  void clear() {
    if (!std::exchange(shown_, {}).empty()) {
      std::fputs("\r\x1b[K", stderr);
    }
  }

 private:
  // Cut where it would break into a second line, which couldn't be written over.
  static std::string fitting(std::string text, std::size_t columns) {
    while (!text.empty() && display_width(text) >= columns) {
      do {
        text.pop_back();
      } while (!text.empty() && (static_cast<unsigned char>(text.back()) & 0xC0U) == 0x80U);
    }
    return text;
  }

  // One that can write over what stands there.
  static bool is_capable_terminal() {
    const char* term = std::getenv("TERM");
    return isatty(STDERR_FILENO) == 1 && term != nullptr && *term != '\0' &&
           std::string_view(term) != "dumb";
  }

  const bool is_terminal_ = is_capable_terminal();
  const Clock::time_point start_ = Clock::now();
  std::string shown_;
};

// --- Starting -----------------------------------------------------------------------------------

int count_reports(const std::string& report_list) {
  const auto& all = report_format::kReports;
  return static_cast<int>(std::count_if(all.begin(), all.end(), [&](const auto* report) {
    return report_format::is_selected(report->name, report_list);
  }));
}

[[noreturn]] void fail_as_running(const std::string& profile) {
  const pid_t pid = admin::last_run(profile).process;
  throw Failure("profile " + profile + " is running already" +
                (pid > 0 ? " (process " + std::to_string(pid) + ")" : "") +
                "; wait for it, vornctl status shows when it is done");
}

void check_start(const Options& options, const Section& profile) {
  if (profile.name == "global" && !options.data) {
    throw Failure("\"global\" stands for the whole server and has no report; add --data",
                  kWrongUsage);
  }
  if (count_reports(profile.value("report_list")) == 0) {
    throw Failure("profile " + profile.name + " selects no report; run vornctl profile set " +
                  profile.name + " report_list REPORTS");
  }
  if (!options.data) {
    // Where the report couldn't go, hours of counting would be for nothing.
    reports_in(folder_of_reports(profile), ReportSize::left_out);
  }
  if (admin::last_run(profile.name).state == admin::RunState::running) {
    fail_as_running(profile.name);
  }
}

// --- Watching -----------------------------------------------------------------------------------

// Until the run has ended; a signal to this process is passed on to it as SIGTERM, which makes it
// clear up and end.
void watch(Child& child, const std::string& profile, RunOutput& output) {
  constexpr std::chrono::milliseconds kWait{200};
  ProgressLine line;
  bool told = false;
  while (!child.has_ended()) {
    output.take(child.read_output(kWait));
    if (g_signal != 0 && !told) {
      child.send_signal(SIGTERM);
      told = true;
    }
    line.show(told ? "ending the run" : progress_line(profile, admin::read_progress(profile)));
  }
  std::string rest;
  while (!(rest = child.read_output(std::chrono::milliseconds(0))).empty()) {
    output.take(rest);
  }
}

// SIGTERM ends a run at once. What it leaves is what the next run would clear up; here it is done
// at once, and the status says how the run ended.
void clear_up(const Section& profile, bool is_report) {
  if (is_report && admin::hold_profile(profile.name) == admin::Hold::taken) {
    admin::end_killed_run(profile);  // what it can't remove has a message
  }
}

// --- The outcome --------------------------------------------------------------------------------

bool has_succeeded(const Section& profile) {
  return admin::last_run(profile.name).state == admin::RunState::succeeded;
}

// "global" keeps its status from before a collection to after it, so the history tells.
bool has_collected(const Section& profile, std::time_t start) {
  if (profile.name == "global" ||
      report_format::is_selected(report_format::kVolumeUsage.name, profile.value("report_list"))) {
    return admin::samples_since(profile.name, start) > 0;
  }
  return has_succeeded(profile);
}

// `what` is of the run of `profile`.
[[noreturn]] void fail_with_log(const std::string& profile, const std::string& what,
                                const RunLog& log, const Child& child, const RunOutput& output) {
  std::vector<std::string> said = log.messages(child.pid());
  if (said.empty()) {
    said.assign(output.complaints().begin(), output.complaints().end());
  }
  for (const std::string& line : said) {
    warn(line);
  }
  throw Failure(what + "; see vornctl log " + profile + ", and vornctl doctor");
}

// Prints the page of the report, and what it lacks to standard error.
void show_report(const Options& options, const Section& profile,
                 const report_format::RunStatus& status, Json& told) {
  const std::string folder = folder_of_reports(profile);
  const Reports reports = reports_in(folder, ReportSize::measured);
  const auto report = std::find_if(reports.begin(), reports.end(), [&](const auto& stored) {
    return stored.name == status.report;
  });
  const auto facts = report == reports.end() ? std::nullopt : facts_of(*report);
  if (!facts) {
    throw Failure(folder + "/" + status.report + "/" + report_format::kFactsFile +
                  " can't be read; run vornctl doctor");
  }
  told["report"] = json_of(*report, facts);
  told["mail_failed"] = status.mail_failed;
  told["fleet_failed"] = status.fleet_failed;
  if (!options.json) {
    print_line(report->page);
  }
  for (const report_format::Incident& incident : facts->incidents) {
    warn(incident.text);
  }
  if (status.mail_failed) {
    warn(unsent_mail(profile.name));
  }
  if (status.fleet_failed) {
    warn(missing_from_fleet(profile.name));
  }
  if (!facts->incidents.empty() || status.mail_failed || status.fleet_failed) {
    throw Failure("", kWithIncidents);
  }
}

void run_profile(const Options& options, const Section& profile, Json& told) {
  check_start(options, profile);
  const std::string before = admin::last_run(profile.name).status.report;
  const std::time_t start = std::time(nullptr);
  const RunLog log;
  const SignalsNoted noted;
  RunOutput output(profile.name);
  Child child({kProgram, option_of(options.data ? JobKind::data : JobKind::report), profile.name});
  watch(child, profile.name, output);
  if (output.was_skipped()) {
    fail_as_running(profile.name);
  }
  if (child.exit_status() != 0) {
    clear_up(profile, !options.data);
    if (g_signal != 0) {
      throw Failure("the run of profile " + profile.name +
                    " was ended; what it had begun is removed");
    }
    fail_with_log(profile.name, "the run of profile " + profile.name + " was ended from outside",
                  log, child, output);
  }
  if (options.data) {
    if (!has_collected(profile, start)) {
      fail_with_log(profile.name, "collecting data for profile " + profile.name + " failed", log,
                    child, output);
    }
    return;
  }
  const admin::LastRun last = admin::last_run(profile.name);
  if (last.state != admin::RunState::succeeded || last.status.report.empty() ||
      last.status.report == before) {
    fail_with_log(profile.name, "the run of profile " + profile.name + " failed", log, child,
                  output);
  }
  show_report(options, profile, last.status, told);
}

// The exit status, and in `list` what there is to tell.
int run_and_tell(const Options& options, const Section& profile, Json& list) {
  Json told{{"profile", profile.name}, {"kind", options.data ? "data" : "report"},
            {"status", "success"},     {"report", nullptr},
            {"mail_failed", false},    {"fleet_failed", false},
            {"error", nullptr}};
  int exit_status = 0;
  try {
    run_profile(options, profile, told);
  } catch (const Failure& failure) {
    exit_status = failure.exit_code();
    if (*failure.what() != '\0') {
      warn(failure.what());
      told["error"] = failure.what();
    }
    if (exit_status != kWithIncidents) {
      told["status"] = "fail";
    }
  }
  list.push_back(std::move(told));
  return exit_status;
}

// One after another, in the order of the file; one that fails keeps none from its turn.
void run(const Options& options) {
  if (options.all != options.profile.empty()) {
    throw Failure("name one profile, or give --all", kWrongUsage);
  }
  const std::vector<Section> profiles =
      options.all ? read_profiles() : std::vector{read_profile(options.profile)};
  Json list = Json::array();
  int worst = 0;
  for (const Section& profile : profiles) {
    const int exit_status = run_and_tell(options, profile, list);
    if (exit_status != 0 && (worst == 0 || worst == kWithIncidents)) {
      worst = exit_status;  // that something is lacking is the least of them
    }
    if (g_signal != 0) {
      break;
    }
  }
  if (options.json) {
    print_json(options.all ? list : list.front());
  } else if (profiles.empty()) {
    warn("there are no profiles; add one with vornctl profile add NAME");
  }
  if (worst != 0) {
    throw Failure("", worst);
  }
}

}  // namespace

void add_run_command(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* command = app.add_subcommand("run", "Make a report now and watch it");
  add_profile_argument(*command, options->profile)->required(false);
  command->add_flag("--data", options->data, "Only collect what accumulates over time");
  command->add_flag("--all", options->all, "Run every profile, one after another");
  add_json_flag(*command, options->json);
  command->callback([options] { run(*options); });
}

}  // namespace ctl
