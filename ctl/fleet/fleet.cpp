// vornctl fleet: one report over many servers.
#include "vorn/admin/fleet.hpp"

#include <CLI/CLI.hpp>
#include <chrono>
#include <ctime>
#include <filesystem>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/child.hpp"
#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "config/checks.hpp"
#include "fleet/commands.hpp"
#include "report_format/facts_file.hpp"
#include "report_format/reports.hpp"
#include "report_format/values.hpp"
#include "run/run_log.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

using Json = nlohmann::ordered_json;

constexpr char kProgram[] = "/usr/vorn/bin/vornfleet";
constexpr std::string_view kRemark = "vornfleet: ";

// --- set ----------------------------------------------------------------------------------------

struct Setting {
  const char* key;
  const char* option;
  const char* type;
  const char* help;
};
constexpr Setting kSettings[] = {
    {"url", "--url", "URLS", "The engine's nodes, comma-separated: http://host:8123/"},
    {"database", "--database", "NAME", "Database in the engine (default: vornreport)"},
    {"cluster", "--cluster", "NAME", "Cluster of the engine's remote_servers"},
    {"user", "--user", "NAME", "User of the engine"},
    {"password_file", "--password-file", "FILE", "File with the user's password in its first line"},
    {"insecure", "--insecure", "true|false",
     "true: a password may go over plain http to another machine"},
    {"server", "--server", "NAME", "This server's name in the fleet (default: its host name)"},
};

void set(const CLI::App& command) {
  Changes changes;
  for (const Setting& setting : kSettings) {
    if (const CLI::Option* option = command.get_option(setting.option); option->count() > 0) {
      const auto value = option->as<std::string>();
      changes.emplace_back(setting.key, value.empty() ? std::nullopt : std::optional(value));
    }
  }
  if (changes.empty()) {
    throw Failure("nothing to set; see vornctl fleet set --help", kWrongUsage);
  }
  if (!admin::set_fleet(changes)) {
    throw host_failure(VORN_PATH_FLEET " can't be changed");
  }
}

// --- status -------------------------------------------------------------------------------------

std::string age_text(std::int64_t seconds) {
  constexpr std::int64_t kHour = 3600;
  constexpr std::int64_t kDay = 24 * kHour;
  return seconds >= 2 * kDay    ? std::to_string(seconds / kDay) + " days"
         : seconds >= 2 * kHour ? std::to_string(seconds / kHour) + " hours"
                                : std::to_string(std::max<std::int64_t>(seconds, 0) / 60) + " min";
}

void status(bool json) {
  const std::time_t now = std::time(nullptr);
  const auto runs = admin::fleet_runs(now);
  if (!runs) {
    throw host_failure("the fleet can't be listed");
  }
  if (json) {
    Json list = Json::array();
    for (const admin::FleetRun& run : *runs) {
      list.push_back({{"server", run.server},
                      {"profile", run.profile},
                      {"started", json_time(run.started)},
                      {"age_seconds", now - run.started},
                      {"files", run.files},
                      {"bytes", run.bytes},
                      {"overdue", run.overdue}});
    }
    print_json(list);
    return;
  }
  Table table({{"SERVER"},
               {"PROFILE"},
               {"NEWEST RUN"},
               {"AGE", Table::Align::right},
               {"FILES", Table::Align::right},
               {"SIZE", Table::Align::right},
               {"STATE"}});
  for (const admin::FleetRun& run : *runs) {
    table.add({run.server, run.profile, time_text(run.started), age_text(now - run.started),
               std::to_string(run.files), size_text(run.bytes), run.overdue ? "overdue" : "ok"});
  }
  if (table.empty()) {
    print_line(
        "the fleet has no complete run; run vornctl profile set PROFILE fleet true, then the "
        "profile");
    return;
  }
  table.print();
}

// --- report -------------------------------------------------------------------------------------

struct ReportOptions {
  std::string folder, reports, language = "en", servers;
};

std::string all_reports() {
  std::string list;
  for (const report_format::ReportFormat* format : report_format::kReports) {
    list += (list.empty() ? "" : ",") + std::string(format->name);
  }
  return list;
}

// All that the program prints, line by line; the last one tells the page's path.
std::vector<std::string> output_of(Child& child) {
  std::string text;
  while (!child.has_ended()) {
    text += child.read_output(std::chrono::milliseconds(200));
  }
  for (std::string rest; !(rest = child.read_output(std::chrono::milliseconds(0))).empty();) {
    text += rest;
  }
  std::vector<std::string> lines;
  for (std::string_view rest = text; !rest.empty();) {
    const std::string_view line = rest.substr(0, rest.find_first_of("\r\n"));
    if (!line.empty()) {
      lines.emplace_back(line);
    }
    rest.remove_prefix(std::min(line.size() + 1, rest.size()));
  }
  return lines;
}

// A report of a fleet belongs to no profile, so it isn't put among the reports of one.
void check_folder(const std::string& folder) {
  std::error_code no_such;
  for (const Section& profile : read_profiles()) {
    if (std::filesystem::equivalent(folder, folder_of_reports(profile), no_such)) {
      throw Failure(folder + " holds the reports of profile " + profile.name +
                    "; choose another folder");
    }
  }
}

void report(const ReportOptions& options) {
  if (!options.reports.empty()) {
    checked_value(profile_key("report_list"), options.reports);
  }
  check_folder(options.folder);
  if (!report_format::is_language_code(options.language)) {
    throw Failure("\"" + options.language + "\" is no language code", kWrongUsage);
  }
  const RunLog log;
  Child child({kProgram, options.folder, options.reports.empty() ? all_reports() : options.reports,
               options.language, options.servers});
  const std::vector<std::string> lines = output_of(child);
  if (child.exit_status() != 0 || lines.empty()) {
    for (const std::string& line : log.messages(child.pid())) {
      warn(line);
    }
    for (const std::string& line : lines) {
      if (line.starts_with(kRemark)) {
        warn(line.substr(kRemark.size()));
      }
    }
    throw Failure("the report over the fleet failed");
  }
  const std::string& page = lines.back();
  static_cast<void>(admin::fleet_runs(std::time(nullptr)));  // which drops what is replaced
  print_line(page);
  const auto facts = report_format::read_facts(page.substr(0, page.rfind('/')));
  for (const auto& incident : facts ? facts->incidents : std::vector<report_format::Incident>{}) {
    warn(incident.text);
  }
  if (!facts || !facts->incidents.empty()) {
    throw Failure("", kWithIncidents);
  }
}

}  // namespace

void add_fleet_commands(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("fleet", "One report over many servers");
  group.require_subcommand(1);

  CLI::App* set_command = group.add_subcommand("set", "Say where the fleet's engine is");
  for (const Setting& setting : kSettings) {
    set_command->add_option(setting.option, setting.help)->type_name(setting.type)->expected(1);
  }
  set_command->callback([set_command] { set(*set_command); });

  group.add_subcommand("init", "Make the tables in the engine; harmless when repeated")
      ->callback([] {
        if (!admin::init_fleet()) {
          throw host_failure("the fleet's tables can't be made");
        }
      });

  const auto json = std::make_shared<bool>();
  CLI::App* status_command =
      group.add_subcommand("status", "Print every server with its newest run");
  add_json_flag(*status_command, *json);
  status_command->callback([json] { status(*json); });

  const auto options = std::make_shared<ReportOptions>();
  CLI::App* report_command = group.add_subcommand("report", "Make a report over the fleet");
  report_command->add_option("FOLDER", options->folder, "Folder that the report goes into")
      ->type_name("")
      ->required();
  report_command
      ->add_option("--reports", options->reports, "Comma-separated reports (default: all)")
      ->type_name("REPORTS");
  report_command->add_option("--language", options->language, "Language of the page")
      ->type_name("LANGUAGE");
  report_command
      ->add_option("--servers", options->servers, "Comma-separated servers (default: all)")
      ->type_name("SERVERS");
  report_command->callback([options] { report(*options); });

  const auto forgotten = std::make_shared<std::pair<std::string, std::string>>();
  CLI::App* forget_command = group.add_subcommand("forget", "Remove a server's rows");
  forget_command->add_option("SERVER", forgotten->first, "Name of the server in the fleet")
      ->type_name("")
      ->required();
  forget_command->add_option("PROFILE", forgotten->second, "Only what this profile has sent")
      ->type_name("");
  forget_command->callback([forgotten] {
    if (!admin::forget_server(forgotten->first, forgotten->second)) {
      throw host_failure("the rows of " + forgotten->first + " can't be removed");
    }
  });
}

}  // namespace ctl
