// vornctl profile: what is reported, and for whom.
#include <unistd.h>

#include <algorithm>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "config/checks.hpp"
#include "config/commands.hpp"
#include "report_format/reports.hpp"
#include "schedule/removal.hpp"
#include "schedule/timers.hpp"
#include "vorn/admin/history.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

std::string titled(const std::string& profile) {
  return "profile \"" + profile + "\"";
}

// Keys that need each other. `profile` is as it shall be.
void check_together(const Section& profile) {
  if (profile.value("report_list").empty() && profile.name != "global") {
    throw Failure("report_list \"\" is an empty list; name something in it");
  }
  if (!profile.value("smtp_user").empty() && profile.value("smtp_password_file").empty()) {
    throw Failure("smtp_user needs smtp_password_file, the file with the password");
  }
}

// Each run puts its own metrics in the place of all that is there.
void check_metrics_file(const Section& profile) {
  const std::string file = profile.value("metrics_file");
  for (const Section& other : file.empty() ? std::vector<Section>{} : read_profiles()) {
    if (other.name != profile.name && other.value("metrics_file") == file) {
      throw Failure("metrics_file " + file + " is that of profile " + other.name +
                    " already; give each profile a file of its own");
    }
  }
}

// `profile` with the changes.
Section changed(Section profile, const Changes& changes) {
  for (const auto& change : changes) {
    std::erase_if(profile.entries, [&](const auto& entry) { return entry.first == change.first; });
    if (change.second) {
      profile.entries.emplace_back(change.first, *change.second);
    }
  }
  return profile;
}

// --- add ----------------------------------------------------------------------------------------

// An option for each key that has one. Their values are results, so that it can be told which of
// them were given.
void add_key_options(CLI::App& command) {
  for (const ProfileKey& key : profile_keys()) {
    if (key.option != nullptr) {
      const std::string help = key.help;
      command.add_option(key.option, help)->type_name(key.type);
    }
  }
}

// The keys whose options were given, with their values.
std::vector<std::pair<std::string, std::string>> given_keys(const CLI::App& command) {
  std::vector<std::pair<std::string, std::string>> given;
  for (const ProfileKey& key : profile_keys()) {
    const std::string option = key.option == nullptr ? "" : key.option;
    const CLI::Option* found =
        option.empty() ? nullptr : command.get_option_no_throw(option.substr(0, option.find(',')));
    if (found != nullptr && found->count() > 0) {
      given.emplace_back(key.name, found->results().back());
    }
  }
  return given;
}

struct NewProfile {
  std::string name;
  std::map<std::string, std::string, std::less<>> values{};  // by key
  std::string duplicates{};                                  // old spellings
  bool no_history = false;
};

// All reports that have something to tell: without quotas one would only log an error each time.
std::string default_reports() {
  std::string list;
  for (const std::string& name : report_names()) {
    if (name != report_format::kQuotaUsage.name || any_quotas()) {
      list += (list.empty() ? "" : ",") + name;
    }
  }
  return list;
}

void add_profile(NewProfile profile, const CLI::App& command) {
  check_profile_name(profile.name);
  if (profile_exists(profile.name)) {
    throw Failure(titled(profile.name) + " is there already; change it with vornctl profile set");
  }
  profile.values["duplicate_compare"] = profile.duplicates == "content" ? "true" : "";
  profile.values["volume_history"] = profile.no_history ? "" : "true";
  for (const auto& [key, value] : given_keys(command)) {
    // Most likely a variable of a script that wasn't set.
    if (value.empty()) {
      throw Failure(key + " \"\" is " + (profile_key(key).is_list ? "an empty list" : "empty") +
                    "; name something, or leave the option out");
    }
    profile.values[key] = value;
  }
  const bool has_default = profile.values["report_list"].empty();
  if (has_default) {
    profile.values["report_list"] = default_reports();
  }
  Changes entries;
  for (const ProfileKey& key : profile_keys()) {
    if (const std::string value = checked_value(key, profile.values[key.name]); !value.empty()) {
      entries.emplace_back(key.name, value);
    }
  }
  check_together(changed({profile.name, {}}, entries));
  check_metrics_file(changed({profile.name, {}}, entries));
  add_section(VORN_PATH_CONFIG, profile.name, entries);
  if (has_default && !any_quotas()) {
    warn("no volume has quotas, so the report quota_usage is left out");
  }
}

void describe_add(CLI::App& group) {
  CLI::App& add = *group.add_subcommand("add", "Make a profile");
  const auto profile = std::make_shared<NewProfile>();
  add.add_option("NAME", profile->name, "Name of the profile: A-Z a-z 0-9 . _ -")
      ->type_name("")
      ->required();
  add_key_options(add);
  add.add_option("--duplicates", profile->duplicates, "--duplicate-compare as it was once spelt")
      ->group(kOldSpellings)
      ->type_name("name|content")
      ->check([](const std::string& word) {
        return word == "name" || word == "content" ? "" : "write name or content";
      });
  add.add_flag("--no-history", profile->no_history, "--volume-history false, likewise")
      ->group(kOldSpellings);
  add.callback([profile, &add] { add_profile(std::move(*profile), add); });
}

// --- list and show ------------------------------------------------------------------------------

nlohmann::ordered_json as_json(const Section& profile) {
  nlohmann::ordered_json json{{"name", profile.name}};
  for (const auto& [key, value] : profile.entries) {
    json[key] = json_value(key, value);
  }
  return json;
}

void list_profiles(bool json) {
  const std::vector<std::string> all = report_names();
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  Table table({{"PROFILE"}, {"SHARES"}, {"MAIL TO"}, {"REPORTS"}});
  for (const Section& profile : read_profiles()) {
    list.push_back(as_json(profile));
    const std::string reports = profile.value("report_list", "none");
    const bool has_all = std::all_of(all.begin(), all.end(), [&](const std::string& name) {
      return report_format::is_selected(name, reports);
    });
    table.add({profile.name, profile.value("share_list", "all"), profile.value("mail_to", "-"),
               has_all ? "all" : reports});
  }
  if (json) {
    print_json(list);
  } else if (table.empty()) {
    warn("there are no profiles; add one with vornctl profile add NAME");
  } else {
    table.print();
  }
}

void show_profile(const std::string& name, bool json) {
  const Section profile = read_profile(name);
  if (json) {
    print_json(as_json(profile));
    return;
  }
  Table table({{"KEY"}, {"VALUE"}});
  for (const auto& [key, value] : profile.entries) {
    table.add({key, value});
  }
  table.print();
}

void describe_list_and_show(CLI::App& group) {
  const auto json = std::make_shared<bool>();
  const auto name = std::make_shared<std::string>();
  CLI::App& list = *group.add_subcommand("list", "Print every profile");
  add_json_flag(list, *json);
  list.callback([json] { list_profiles(*json); });
  CLI::App& show = *group.add_subcommand("show", "Print the keys of a profile");
  add_profile_argument(show, *name);
  add_json_flag(show, *json);
  show.callback([name, json] { show_profile(*name, *json); });
}

// --- set ----------------------------------------------------------------------------------------

// The changed key, with its checked value. What is no key of a profile can only be unset.
std::pair<std::string, std::optional<std::string>> checked_change(const Section& profile,
                                                                  const std::string& name,
                                                                  const std::string& value) {
  if (value.empty() && profile.find(name) != nullptr) {
    return {name, std::nullopt};
  }
  const ProfileKey& key = profile_key(name);
  const std::string checked = checked_value(key, value);
  return {key.name, checked.empty() ? std::nullopt : std::optional(checked)};
}

void set_keys(const std::string& name, const CLI::App& command) {
  auto pairs = pairs_of(command);
  for (auto& given : given_keys(command)) {
    pairs.push_back(std::move(given));
  }
  if (pairs.empty()) {
    throw Failure("say what to change: KEY VALUE, or an option", kWrongUsage);
  }
  // The whole server's section may be missing; it is made then.
  const bool is_new = name == "global" && !profile_exists(name);
  const Section profile = is_new ? Section{name, {}} : read_profile(name);
  Changes changes;
  for (const auto& [key, value] : pairs) {
    changes.push_back(checked_change(profile, key, value));
  }
  const Section made = changed(profile, changes);
  check_together(made);
  check_metrics_file(made);
  is_new ? add_section(VORN_PATH_CONFIG, name, changes)
         : change_section(VORN_PATH_CONFIG, name, changes);
  refresh_services(made);
}

void describe_set(CLI::App& group) {
  CLI::App* set = group.add_subcommand("set", "Change keys of a profile; an empty value unsets");
  const auto name = std::make_shared<std::string>();
  add_profile_argument(*set, *name);
  add_pairs(*set);
  add_key_options(*set);
  set->callback([set, name] { set_keys(*name, *set); });
}

// --- remove -------------------------------------------------------------------------------------

void remove_profile(const std::string& name, bool reports_too) {
  check_profile_name(name);
  const Section profile = read_profile(name);
  const std::string folder = folder_of_reports(profile);
  hold_profile(name);
  remove_schedule(profile);
  admin::forget_runs(profile);  // what can't be removed has a message
  if (reports_too && !admin::remove_all_reports(folder)) {
    throw host_failure(folder + " can't be emptied");
  }
  remove_section(VORN_PATH_CONFIG, name);
  if (!admin::forget_history(name)) {
    throw host_failure("the history of " + titled(name) + " stays");
  }
  warn_of_jobs(name);
  if (!reports_too && access(folder.c_str(), F_OK) == 0) {
    warn("the reports of " + titled(name) + " stay in " + folder);
  }
}

void describe_remove(CLI::App& group) {
  CLI::App& remove =
      *group.add_subcommand("remove", "Remove a profile with its history and schedule");
  const auto name = std::make_shared<std::string>();
  const auto reports_too = std::make_shared<bool>();
  add_profile_argument(remove, *name);
  remove.add_flag("--reports-too", *reports_too, "Remove its finished reports as well");
  remove.callback([name, reports_too] { remove_profile(*name, *reports_too); });
}

}  // namespace

void add_profile_commands(CLI::App& app) {
  CLI::App& group = *app.add_subcommand("profile", "What is reported, and for whom");
  group.require_subcommand(1);
  describe_add(group);
  describe_list_and_show(group);
  describe_set(group);
  add_profile_moves(group);
  describe_remove(group);
  add_test_mail_command(group);
}

}  // namespace ctl
