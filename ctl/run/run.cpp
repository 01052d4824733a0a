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
#include <memory>
#include <string>

#include "base/child.hpp"
#include "base/ctl.hpp"
#include "base/text_containers.hpp"
#include "report_format/run_state.hpp"
#include "run/old_reports.hpp"
#include "run/profile_state.hpp"
#include "run/run_log.hpp"
#include "run/run_watch.hpp"
#include "schedule/schedules.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/registry.hpp"

namespace ctl {
namespace {

using Clock = std::chrono::steady_clock;

struct Options {
  std::string profile;
  bool data = false;
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

  const bool is_terminal_ = isatty(STDERR_FILENO) == 1;
  const Clock::time_point start_ = Clock::now();
  std::string shown_;
};

// --- Starting -----------------------------------------------------------------------------------

int count_reports(const std::string& report_list) {
  int count = 0;
  for (const auto& entry : vornreport::report_registry()) {
    count += vornreport::is_selected(entry, report_list.c_str()) ? 1 : 0;
  }
  return count;
}

[[noreturn]] void fail_as_running(const std::string& profile) {
  const pid_t pid = running_process(profile);
  throw Failure("profile " + profile + " is running already" +
                (pid > 0 ? " (process " + std::to_string(pid) + ")" : "") +
                "; wait for it, vornctl status shows when it is done");
}

void check_start(const Options& options, const Section& profile) {
  if (geteuid() != 0) {
    throw Failure("a run reads what belongs to other users; run this as root");
  }
  if (profile.name == "global" && !options.data) {
    throw Failure("\"global\" stands for the whole server and has no report; add --data",
                  kWrongUsage);
  }
  if (count_reports(profile.value("report_list")) == 0) {
    throw Failure("profile " + profile.name + " selects no report; set its key report_list");
  }
  if (run_state(profile.name) == RunState::running) {
    fail_as_running(profile.name);
  }
}

// --- Watching -----------------------------------------------------------------------------------

// Until the run has ended; a signal to this process is passed on to it as SIGTERM, which makes it
// clear up and end.
void watch(Child& child, RunWatch& run) {
  constexpr std::chrono::milliseconds kWait{200};
  constexpr std::chrono::seconds kCountEvery{1};
  ProgressLine line;
  Clock::time_point counted = Clock::now();
  bool told = false;
  while (!child.has_ended()) {
    run.take_output(child.read_output(kWait));
    if (g_signal != 0 && !told) {
      child.send_signal(SIGTERM);
      told = true;
    }
    if (Clock::now() - counted >= kCountEvery) {
      run.count_files();
      counted = Clock::now();
    }
    line.show(told ? "ending the run" : run.progress());
  }
  std::string output;
  while (!(output = child.read_output(std::chrono::milliseconds(0))).empty()) {
    run.take_output(output);
  }
}

// SIGTERM ends a run at once. What it leaves is what the next run would clear up; here it is done
// at once, and the status says how the run ended.
void clear_up(const Section& profile, bool is_report) {
  if (!is_report || VornQazProfileRunning(profile.name.c_str()) != 0) {
    return;
  }
  VLIBCSzHash hash(profile.entries.size());
  for (const auto& [key, value] : profile.entries) {
    hash.set(key, value);
  }
  VornQazReportCleanTmp(profile.name.c_str(), &hash);
  VornQazStatusUpdate(profile.name.c_str(), report_format::kFail);
}

// --- The outcome --------------------------------------------------------------------------------

// "global" keeps its status from before a collection to after it, so the history tells.
bool has_collected(const Section& profile, std::time_t start) {
  if (profile.name == "global" ||
      profile.value("report_list").find("volume_usage") != std::string::npos) {
    return samples_since(profile.name, start) > 0;
  }
  return run_state(profile.name) == RunState::succeeded;
}

[[noreturn]] void fail_with_log(const std::string& what, const RunLog& log, const Child& child,
                                const RunWatch& run) {
  std::vector<std::string> said = log.messages(child.pid());
  if (said.empty()) {
    said.assign(run.complaints().begin(), run.complaints().end());
  }
  for (const std::string& line : said) {
    warn(line);
  }
  throw Failure(what + "; see " + log.command() + ", and vornctl doctor");
}

std::vector<host::StoredReport> reports_of(const Section& profile) {
  return reports_in(report_folder(profile), host::ReportSize::left_out);
}

// The page that isn't among the reports `before`; empty when there is none. After the clock was set
// back it isn't the last one.
std::string new_page(const Section& profile, const std::vector<host::StoredReport>& before) {
  for (const host::StoredReport& report : reports_of(profile)) {
    const bool is_new = std::none_of(before.begin(), before.end(),
                                     [&](const auto& known) { return known.name == report.name; });
    if (is_new && report.is_whole) {
      return report_folder(profile) + "/" + report.name + "/report.html";
    }
  }
  return "";
}

void run(const Options& options) {
  const Section profile = read_profile(options.profile);
  check_start(options, profile);
  const auto before = options.data ? std::vector<host::StoredReport>{} : reports_of(profile);
  const std::time_t start = std::time(nullptr);
  const RunLog log;
  const SignalsNoted noted;
  RunWatch watched(profile.name, count_reports(profile.value("report_list")));
  Child child({kProgram, option_of(options.data ? JobKind::data : JobKind::report), profile.name});
  watch(child, watched);
  if (watched.was_skipped()) {
    fail_as_running(profile.name);
  }
  if (child.exit_status() != 0) {
    clear_up(profile, !options.data);
    if (g_signal != 0) {
      throw Failure("the run of profile " + profile.name +
                    " was ended; what it had begun is removed");
    }
    fail_with_log("the run of profile " + profile.name + " was ended from outside", log, child,
                  watched);
  }
  if (options.data) {
    if (!has_collected(profile, start)) {
      fail_with_log("collecting data for profile " + profile.name + " failed", log, child, watched);
    }
    return;
  }
  const std::string page = new_page(profile, before);
  if (run_state(profile.name) != RunState::succeeded || page.empty()) {
    fail_with_log("the run of profile " + profile.name + " failed", log, child, watched);
  }
  print_line(page);
}

}  // namespace

void add_run_command(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* command = app.add_subcommand("run", "Make a report now and watch it");
  add_profile_argument(*command, options->profile);
  command->add_flag("--data", options->data, "Only collect what accumulates over time");
  command->callback([options] { run(*options); });
}

}  // namespace ctl
