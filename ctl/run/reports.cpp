// vornctl reports: the finished reports of a profile.
#include <spawn.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cstdlib>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "run/commands.hpp"
#include "vorn/admin/runs.hpp"

namespace ctl {
namespace {

struct Options {
  std::string profile;
  std::string action = "list";
  std::string argument;
  std::string older_than;
  bool dry_run = false;
  bool json = false;
};

// The worst that a report says of what it has seen.
const char* level_of(const report_format::Facts& facts) {
  return report_format::word_of(facts.attention.empty() ? report_format::Level::kOk
                                                        : facts.attention.front().level);
}

// "yes", "yes, lacking 2" (incidents that it tells), or "no" (its page).
std::string complete_text(const admin::StoredReport& report,
                          const std::optional<report_format::Facts>& facts) {
  return !report.is_whole ? "no"
         : facts && !facts->incidents.empty()
             ? "yes, lacking " + std::to_string(facts->incidents.size())
             : "yes";
}

void list_as_json(const Reports& reports) {
  auto array = nlohmann::ordered_json::array();
  for (const admin::StoredReport& report : reports) {
    nlohmann::ordered_json entry{{"name", report.name},  {"made", json_time(report.made)},
                                 {"bytes", report.size}, {"complete", report.is_whole},
                                 {"level", nullptr},     {"incidents", nullptr},
                                 {"path", report.page}};
    if (const auto facts = facts_of(report)) {
      entry["level"] = level_of(*facts);
      entry["incidents"] = facts->incidents.size();
    }
    array.push_back(std::move(entry));
  }
  print_json(array);
}

void list(const Options& options, const std::string& folder, const Reports& reports) {
  if (options.json) {
    list_as_json(reports);
    return;
  }
  Table table({{"DATE"}, {"SIZE", Table::Align::right}, {"COMPLETE"}, {"LEVEL"}, {"PATH"}});
  for (const admin::StoredReport& report : reports) {
    const auto facts = facts_of(report);
    table.add({report.name, size_text(report.size), complete_text(report, facts),
               facts ? level_of(*facts) : "-", report.page});
  }
  if (table.empty()) {
    print_line("profile " + options.profile + " has no reports in " + folder);
  } else {
    table.print();
  }
}

// --- Opening ------------------------------------------------------------------------------------

// The newest whole report whose name begins with `date`.
const admin::StoredReport& find_report(const Options& options, const Reports& reports) {
  const auto found =
      std::find_if(reports.rbegin(), reports.rend(), [&](const admin::StoredReport& report) {
        return report.is_whole && report.name.starts_with(options.argument);
      });
  if (found != reports.rend()) {
    return *found;
  }
  throw Failure("profile " + options.profile + " has no complete report" +
                (options.argument.empty() ? "" : " of " + options.argument) +
                "; see vornctl reports " + options.profile);
}

void open_report(const Options& options, const Reports& reports) {
  constexpr const char* kOpener = "/usr/bin/xdg-open";
  const std::string page = find_report(options, reports).page;
  const bool has_display =
      std::getenv("DISPLAY") != nullptr || std::getenv("WAYLAND_DISPLAY") != nullptr;
  if (has_display && access(kOpener, X_OK) == 0) {
    // A browser may stay in the foreground, so nobody waits for it.
    std::array<char*, 3> argv{const_cast<char*>(kOpener), const_cast<char*>(page.c_str()), nullptr};
    pid_t pid = 0;
    if (posix_spawn(&pid, kOpener, nullptr, nullptr, argv.data(), environ) == 0) {
      return;
    }
  }
  print_line(page);
  if (const auto link = admin::link_to(read_profile(options.profile), page)) {
    print_line(*link);
  }
}

// --- Removing -----------------------------------------------------------------------------------

// "90d", "12w" or "2y".
std::chrono::hours parse_age(const std::string& text) {
  constexpr int kMost = 36500;
  constexpr std::chrono::hours kDay{24};
  int count = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
  const std::string unit(end, text.data() + text.size());
  const int days = unit == "d" ? 1 : unit == "w" ? 7 : unit == "y" ? 365 : 0;
  if (error != std::errc{} || days == 0 || count < 1 || count > kMost) {
    throw Failure("--older-than \"" + text + "\" is no age; write 90d, 12w or 2y", kWrongUsage);
  }
  return count * days * kDay;
}

std::size_t parse_count(const std::string& text) {
  std::size_t count = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
  if (error != std::errc{} || end != text.data() + text.size() || count < 1) {
    throw Failure("keep needs a number from 1 on: how many of the newest reports stay",
                  kWrongUsage);
  }
  return count;
}

// The whole reports, oldest first, without the `keep` newest.
Reports all_but_newest(Reports reports, std::size_t keep) {
  std::erase_if(reports, [](const admin::StoredReport& report) { return !report.is_whole; });
  reports.resize(reports.size() - std::min(keep, reports.size()));
  return reports;
}

Reports older_than(const Options& options, Reports reports) {
  const std::time_t limit =
      std::time(nullptr) - std::chrono::seconds(parse_age(options.older_than)).count();
  // A run that is going on may be about to mail the link to the newest.
  const bool running = admin::last_run(options.profile).state == admin::RunState::running;
  reports = all_but_newest(std::move(reports), running ? 1 : 0);
  std::erase_if(reports,
                [limit](const admin::StoredReport& report) { return report.made >= limit; });
  return reports;
}

void remove(const Options& options, const std::string& folder, const Reports& doomed) {
  std::uint64_t bytes = 0;
  std::size_t removed = 0;
  for (const admin::StoredReport& report : doomed) {
    if (!options.dry_run && !admin::remove_report(folder, report.name)) {
      continue;  // a message says why
    }
    print_line((options.dry_run ? "would remove " : "removed ") + folder + "/" + report.name);
    bytes += report.size;
    ++removed;
  }
  print_line(std::to_string(removed) + (removed == 1 ? " report, " : " reports, ") +
             size_text(bytes));
  if (removed < doomed.size()) {
    throw host_failure("not all of them could be removed");
  }
}

void reports(const Options& options) {
  if (options.json && options.action != "list") {
    throw Failure("--json goes with the list only", kWrongUsage);
  }
  if (options.older_than.empty() != (options.action != "remove")) {
    throw Failure("write remove --older-than AGE, for instance remove --older-than 90d",
                  kWrongUsage);
  }
  if (!options.argument.empty() && options.action != "open" && options.action != "keep") {
    throw Failure("\"" + options.argument + "\" means nothing to " + options.action +
                      "; only open and keep take a word",
                  kWrongUsage);
  }
  const std::size_t keep = options.action == "keep" ? parse_count(options.argument) : 0;
  const std::string folder = folder_of_reports(read_profile(options.profile));
  const Reports found =
      reports_in(folder, options.action == "open" ? ReportSize::left_out : ReportSize::measured);
  if (options.action == "open") {
    open_report(options, found);
  } else if (options.action == "remove") {
    remove(options, folder, older_than(options, found));
  } else if (options.action == "keep") {
    remove(options, folder, all_but_newest(found, keep));
  } else {
    list(options, folder, found);
  }
}

}  // namespace

void add_reports_command(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* command = app.add_subcommand("reports", "List, open and remove finished reports");
  add_profile_argument(*command, options->profile);
  command->add_option("ACTION", options->action, "list, open [DATE], remove or keep N")
      ->type_name("")
      ->check(CLI::IsMember({"list", "open", "remove", "keep"}));
  command->add_option("ARGUMENT", options->argument, "For open and keep")->type_name("");
  command->add_option("--older-than", options->older_than, "With remove: 90d, 12w or 2y")
      ->type_name("AGE");
  command->add_flag("--dry-run", options->dry_run, "Only say what would be removed");
  add_json_flag(*command, options->json);
  command->callback([options] { reports(*options); });
}

}  // namespace ctl
