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
  std::string date;
  std::string count;
  std::string older_than;
  bool dry_run = false;
  bool json = false;
};

// "yes", "yes, lacking 2" (incidents that it tells), or "no" (its page).
std::string complete_text(const admin::StoredReport& report,
                          const std::optional<report_format::Facts>& facts) {
  return !report.is_whole ? "no"
         : facts && !facts->incidents.empty()
             ? "yes, lacking " + std::to_string(facts->incidents.size())
             : "yes";
}

void list(const Options& options) {
  const std::string folder = folder_of_reports(read_profile(options.profile));
  const Reports reports = reports_in(folder, ReportSize::measured);
  auto array = nlohmann::ordered_json::array();
  Table table({{"DATE"}, {"SIZE", Table::Align::right}, {"COMPLETE"}, {"LEVEL"}, {"PATH"}});
  for (const admin::StoredReport& report : reports) {
    const auto facts = facts_of(report);
    array.push_back(json_of(report, facts));
    table.add({report.name, size_text(report.size), complete_text(report, facts),
               facts ? level_of(*facts) : "-", report.page});
  }
  if (options.json) {
    print_json(array);
  } else if (table.empty()) {
    warn("there are no reports in " + folder + "; make one with vornctl run " + options.profile);
  } else {
    table.print();
  }
}

// --- Opening ------------------------------------------------------------------------------------

void open_report(const Options& options) {
  constexpr const char* kOpener = "/usr/bin/xdg-open";
  const Section profile = read_profile(options.profile);
  const Reports reports = reports_in(folder_of_reports(profile), ReportSize::left_out);
  const std::string page = find_report(options.profile, reports, options.date).page;
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
  if (const auto link = admin::link_to(profile, page)) {
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
  if (removed > 0 && !options.dry_run) {
    admin::update_index(folder);
  }
  print_line(std::to_string(removed) + (removed == 1 ? " report, " : " reports, ") +
             size_text(bytes));
  if (removed < doomed.size()) {
    throw host_failure("not all of them could be removed");
  }
}

// The one report that the date names.
Reports named(const Options& options, const Reports& reports) {
  const admin::StoredReport& report = find_report(options.profile, reports, options.date);
  const auto count = std::count_if(reports.begin(), reports.end(), [&](const auto& other) {
    return other.is_whole && other.name.starts_with(options.date);
  });
  if (count > 1 && report.name != options.date) {
    throw Failure(options.date + " is the beginning of " + std::to_string(count) +
                  " reports; write more of the one that you mean");
  }
  return {report};
}

void remove_some(const Options& options) {
  if (options.date.empty() == options.older_than.empty()) {
    throw Failure("write remove DATE, or remove --older-than AGE, for instance --older-than 90d",
                  kWrongUsage);
  }
  const std::string folder = folder_of_reports(read_profile(options.profile));
  const Reports found = reports_in(folder, ReportSize::measured);
  remove(options, folder,
         options.date.empty() ? older_than(options, found) : named(options, found));
}

void keep(const Options& options) {
  const std::size_t count = parse_count(options.count);
  const std::string folder = folder_of_reports(read_profile(options.profile));
  remove(options, folder, all_but_newest(reports_in(folder, ReportSize::measured), count));
}

// The profile stands before the action.
class ReportsFormatter : public CLI::Formatter {
 public:
  std::string make_usage(const CLI::App* app, std::string name) const override {
    constexpr std::string_view kProfile = " PROFILE";
    const bool is_group = app->get_name() == "reports";
    std::string usage =
        is_group ? "\nUsage: " + name + " [ACTION]\n" : CLI::Formatter::make_usage(app, name);
    if (const std::size_t at = usage.find(kProfile); at != std::string::npos) {
      usage.erase(at, kProfile.size());
    }
    const std::string own = " reports";
    return usage.insert(usage.find(own) + own.size(), kProfile);
  }
};

CLI::App& add_action(CLI::App& group, const char* action, const char* help,
                     void (*run)(const Options&), const std::shared_ptr<Options>& options) {
  CLI::App& command = *group.add_subcommand(action, help);
  add_profile_argument(command, options->profile);
  command.callback([options, run] { run(*options); });
  return command;
}

void add_date(CLI::App& command, const std::shared_ptr<Options>& options, const char* help) {
  command.add_option("DATE", options->date, help)->type_name("");
}

}  // namespace

void add_reports_command(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("reports", "List, open, compare and remove reports");
  group.formatter(std::make_shared<ReportsFormatter>());
  group.require_subcommand(1);
  const auto options = std::make_shared<Options>();
  add_json_flag(add_action(group, "list", "Print every report", list, options), options->json);
  add_date(add_action(group, "open", "Open the newest report in a browser", open_report, options),
           options, "The newest whose name begins so");
  add_compare_command(group);
  CLI::App& remove = add_action(group, "remove", "Remove reports", remove_some, options);
  add_date(remove, options, "The one whose name begins so");
  remove.add_option("--older-than", options->older_than, "All that are older: 90d, 12w or 2y")
      ->type_name("AGE");
  CLI::App& keeping = add_action(group, "keep", "Remove all but the newest", keep, options);
  keeping.add_option("N", options->count, "How many stay")->type_name("")->required();
  for (CLI::App* command : {&remove, &keeping}) {
    command->add_flag("--dry-run", options->dry_run, "Only print what would be removed");
  }
}

}  // namespace ctl
