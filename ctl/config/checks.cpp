#include "config/checks.hpp"

#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <numeric>
#include <set>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "report_format/reports.hpp"
#include "report_format/values.hpp"
#include "vorn/admin/mail.hpp"
#include "vorn/admin/reports.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/utf8.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"
#include "vorn/volume.h"

namespace ctl {
namespace {

constexpr const char* kEmptyList = "is an empty list; name something in it";

std::string in_quotes(std::string_view text) {
  return '"' + std::string(text) + '"';
}

std::string joined(const std::vector<std::string>& texts, const char* separator) {
  std::string all;
  for (const std::string& text : texts) {
    all += (all.empty() ? "" : separator) + text;
  }
  return all;
}

// Each word must select a report, as runs take the list.
std::string report_list_problem(const std::string& value) {
  bool is_empty = true;
  const std::vector<std::string> names = report_names();
  std::string_view rest = value;
  while (!rest.empty()) {
    const std::size_t end =
        std::min(rest.find_first_of(report_format::kListSeparators), rest.size());
    const std::string_view word = rest.substr(0, end);
    rest.remove_prefix(std::min(end + 1, rest.size()));
    if (word.empty()) {
      continue;
    }
    is_empty = false;
    if (std::none_of(names.begin(), names.end(), [word](const std::string& name) {
          return report_format::is_selected(name, word);
        })) {
      const std::string near = suggestion(word, names);
      return in_quotes(word) + " is no report" +
             (near.empty() ? "; there are " + joined(names, ", ") : near);
    }
  }
  return is_empty ? kEmptyList : "";
}

std::string share_list_problem(const std::string& value) {
  std::vector<std::string> names;
  for (const Share& share : read_shares()) {
    names.push_back(share.name);
  }
  for (const std::string_view word : host::comma_words(value)) {
    if (std::find(names.begin(), names.end(), word) == names.end()) {
      const std::string near = suggestion(word, names);
      return in_quotes(word) + " is no share" +
             (near.empty() ? "; add it with vornctl share add" : near);
    }
  }
  return "";
}

std::string users_problem(const std::string& value) {
  for (const std::string_view word : host::comma_words(value)) {
    // An account of a domain may be out of reach just now.
    if (word.find('/') == std::string_view::npos &&
        getpwnam(std::string(word).c_str()) == nullptr) {
      return in_quotes(word) + " is no user of this machine; correct the name";
    }
  }
  return "";
}

std::string truth_problem(const std::string& value) {
  // All but true is false to a run; only this word says that it is meant.
  return report_format::is_true(value) || report_format::is_false(value)
             ? ""
             : "is neither true nor false";
}

std::string report_dir_problem(const std::string& value) {
  if (std::string problem = admin::report_dir_problem(value); !problem.empty()) {
    return problem;
  }
  // The run makes what is missing.
  std::filesystem::path folder(value);
  struct stat status {};
  while (lstat(folder.c_str(), &status) != 0 && folder.has_relative_path()) {
    folder = folder.parent_path();
  }
  if (access(folder.c_str(), W_OK | X_OK) != 0) {
    return in_quotes(folder.string()) + " can't be written (" + std::strerror(errno) +
           "); name a folder that can";
  }
  return "";
}

std::string language_problem(const std::string& value) {
  const std::vector<std::string> languages = installed_languages();
  const auto is_installed = [&](const std::string& code) {
    return std::find(languages.begin(), languages.end(), code) != languages.end();
  };
  // A regional code falls back to its language.
  const bool known = is_installed(value) || is_installed(value.substr(0, value.find('-')));
  return known && report_format::is_language_code(value)
             ? ""
             : in_quotes(value) + " is not installed; there are " + joined(languages, ", ");
}

std::string link_base_problem(const std::string& value) {
  const std::string problem = admin::link_base_problem(value);
  return problem.empty() ? "" : problem + "; write https://server/reports";
}

std::string recipients_problem(const std::string& value) {
  for (const std::string_view word : host::comma_words(value)) {
    if (!admin::is_mail_address(word)) {
      return in_quotes(word) + " is no mail address; write name@domain";
    }
  }
  return "";
}

std::string sender_problem(const std::string& value) {
  return admin::is_mail_address(value)
             ? ""
             : in_quotes(value) + " is no mail address; write name@domain";
}

std::string minutes_problem(const std::string& value) {
  return report_format::whole_number(value) ? "" : "is no whole number of minutes; 0 is no limit";
}

std::string no_problem(const std::string& /*value*/) {
  return "";
}

std::string schedule_problem(const std::string& value) {
  return admin::is_schedule_id(value) ? ""
                                      : "is no schedule identifier (1 to 64 of A-Z a-z 0-9 _ -)";
}

constexpr const char* kTruth = "true|false";
constexpr const char* kNumber = "N";

constexpr ProfileKey kKeys[] = {
    {"report_list", "--report-list,--reports", "REPORTS", "Reports to make (default: all)", true,
     report_list_problem},
    {"share_list", "--share-list,--shares", "SHARES", "Shares to cover (default: all)", true,
     share_list_problem},
    {"language", "--language", "LANGUAGE", "Language of page and mail", false, language_problem},
    {"report_dir", "--report-dir", "FOLDER", "Folder for the reports", false, report_dir_problem},
    {"link_base", "--link-base", "URL", "URL that stands for the folder in links", false,
     link_base_problem},
    {"mail_to", "--mail-to", "ADDRESSES", "Recipients of the mail", true, recipients_problem},
    {"mail_from", "--mail-from", "ADDRESS", "Sender of the mail", false, sender_problem},
    {"smtp_url", "--smtp-url", "URL", "Mail server, smtp://host:port or smtps://host:port", false,
     admin::smtp_url_problem},
    {"smtp_user", "--smtp-user", "NAME", "User at the mail server", false, no_problem},
    {"smtp_password_file", "--smtp-password-file", "FILE", "File with that user's password", false,
     admin::password_file_problem},
    {"limit_user", "--limit-user", "USERS", "Users shown one by one in file_group", true,
     users_problem},
    {"duplicate_compare", "--duplicate-compare", kTruth, "true compares contents of duplicates",
     false, truth_problem},
    {"duplicate_compare_minutes", "--duplicate-compare-minutes", kNumber,
     "Longest comparison of contents (default: no limit)", false, minutes_problem},
    {"volume_history", "--volume-history", kTruth, "true shows history and forecast of volumes",
     false, truth_problem},
    {"keep_reports", "--keep-reports", kNumber, "Number of reports to keep (default: all)", false,
     admin::keep_reports_problem},
    {"mail_on_failure", "--mail-on-failure", kTruth, "false sends no mail of a failed run", false,
     truth_problem},
    {"metrics_file", "--metrics-file", "FILE", "File for Prometheus' node exporter, .../NAME.prom",
     false, admin::metrics_file_problem},
    {"metrics_users", "--metrics-users", kTruth, "true tells users' quotas there", false,
     truth_problem},
    {"fleet", "--fleet", kTruth, "true sends what runs find to the fleet", false, truth_problem},
    {"schedule_collect_id", nullptr, "", "Identifier of the schedule", false, schedule_problem},
};

// How many characters must be put in, left out, replaced or swapped.
std::size_t distance(std::string_view a, std::string_view b) {
  std::vector<std::size_t> above(b.size() + 1);
  std::vector<std::size_t> row(b.size() + 1);
  std::iota(row.begin(), row.end(), 0U);
  std::vector<std::size_t> two_above;
  for (std::size_t i = 1; i <= a.size(); ++i) {
    two_above = std::exchange(above, row);
    row[0] = i;
    for (std::size_t j = 1; j <= b.size(); ++j) {
      row[j] = std::min({above[j] + 1, row[j - 1] + 1,
                         above[j - 1] + static_cast<std::size_t>(a[i - 1] != b[j - 1])});
      if (i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1]) {
        row[j] = std::min(row[j], two_above[j - 2] + 1);
      }
    }
  }
  return row[b.size()];
}

// Whether `name` is the key as an option of `profile add` spells it, without the dashes before it.
bool is_option_of(const ProfileKey& key, const std::string& name) {
  const std::string options = "," + std::string(key.option == nullptr ? "" : key.option) + ",";
  return !name.empty() && options.find(",--" + name + ",") != std::string::npos;
}

std::string listed(const std::string& value) {
  const std::vector<std::string_view> words = host::comma_words(value);
  return joined({words.begin(), words.end()}, ",");
}

}  // namespace

std::string text_problem(std::string_view text) {
  if (text != host::trimmed(text)) {
    return "begins or ends with a blank, which the file would not keep";
  }
  for (std::string_view rest = text; !rest.empty();) {
    const host::Utf8Char found = host::utf8_at(rest);
    if (found.length == 0) {
      return "is not UTF-8";
    }
    if (host::is_control(found.code)) {
      return "holds a line break or another control character";
    }
    rest.remove_prefix(found.length);
  }
  return "";
}

std::string share_name_problem(std::string_view name) {
  if (std::string problem = admin::share_name_problem(name); !problem.empty()) {
    return problem;
  }
  if (name.find_first_of("[]") != std::string_view::npos) {
    return "it holds a bracket";
  }
  if (name.front() == '#' || name.front() == ';') {
    return "it begins with a comment sign";
  }
  const std::string problem = text_problem(name);
  return problem.empty() ? "" : "it " + problem;
}

std::string share_path_problem(const std::string& path) {
  if (std::string problem = admin::share_path_problem(path); !problem.empty()) {
    return problem;
  }
  if (const std::string problem = text_problem(path); !problem.empty()) {
    return "its path " + problem + "; rename the folder or bind-mount it elsewhere";
  }
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) {
    return "its path can't be found (" + std::string(std::strerror(errno)) + ")";
  }
  return S_ISDIR(status.st_mode) ? "" : "its path is no folder";
}

std::span<const ProfileKey> profile_keys() {
  return kKeys;
}

const ProfileKey& profile_key(const std::string& name) {
  std::vector<std::string> names;
  for (const ProfileKey& key : kKeys) {
    if (key.name == name || is_option_of(key, name)) {
      return key;
    }
    names.emplace_back(key.name);
  }
  const std::string near = suggestion(name, names);
  throw Failure(in_quotes(name) + " is no key of a profile" +
                (near.empty() ? "; see vornreport.conf(5)" : near));
}

std::string checked_value(const ProfileKey& key, const std::string& value) {
  std::string problem = text_problem(value);
  if (problem.empty() && key.is_list && !value.empty() && listed(value).empty()) {
    problem = kEmptyList;
  }
  if (problem.empty() && !value.empty()) {
    problem = key.problem(value);
  }
  if (!problem.empty()) {
    const bool names_it = problem.front() == '"';
    throw Failure(key.name + (names_it ? ": " : ' ' + in_quotes(value) + ' ') + problem);
  }
  return key.is_list ? listed(value) : value;
}

nlohmann::ordered_json json_value(const std::string& name, const std::string& value) {
  const auto* key = std::find_if(std::begin(kKeys), std::end(kKeys),
                                 [&](const ProfileKey& known) { return known.name == name; });
  if (key == std::end(kKeys)) {
    return value;
  }
  std::vector<std::string> words;
  if (name == "report_list") {
    for (const std::string& report : report_names()) {
      if (report_format::is_selected(report, value)) {
        words.push_back(report);
      }
    }
    return words;
  }
  if (key->is_list) {
    const auto split = host::comma_words(value);
    words.assign(split.begin(), split.end());
    return words;
  }
  if (key->type == std::string_view(kTruth)) {
    return report_format::is_true(value);
  }
  const auto number = report_format::whole_number(value);
  return key->type == std::string_view(kNumber) && number ? nlohmann::ordered_json(*number)
                                                          : nlohmann::ordered_json(value);
}

std::vector<std::string> report_names() {
  std::vector<std::string> names;
  names.reserve(report_format::kReports.size());
  for (const report_format::ReportFormat* report : report_format::kReports) {
    names.emplace_back(report->name);
  }
  return names;
}

// What lies beside the dictionaries, an editor's copy for instance, is none.
std::vector<std::string> installed_languages() {
  constexpr std::size_t kLargest = 1U << 20U;
  std::set<std::string> codes;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(VORN_PATH_TEMPLATE "/lang", error)) {
    const std::filesystem::path& path = entry.path();
    const std::string code = path.stem().string();
    if (path.extension() != ".json" || !report_format::is_language_code(code)) {
      continue;
    }
    const std::string text = host::read_file(path.string(), kLargest).value_or("");
    if (nlohmann::json::parse(text, nullptr, false).is_object()) {
      codes.insert(code);
    }
  }
  return {codes.begin(), codes.end()};
}

bool any_quotas() {
  VORNMountVolInfo* volumes = VORNMountVolAllEnum(nullptr, VORN_VOLUMES_OF_QUOTA);
  bool found = false;
  for (const VORNMountVolInfo* volume = volumes; volume != nullptr; volume = volume->next) {
    found = found || VORNVolumeHasQuotas(volume->path) != 0;
  }
  VORNMountVolInfoFree(volumes);
  return found;
}

std::string suggestion(std::string_view name, const std::vector<std::string>& names) {
  const std::string* nearest = nullptr;
  std::size_t least = std::max<std::size_t>(name.size() / 3, 1) + 1;
  for (const std::string& candidate : names) {
    if (const std::size_t steps = distance(name, candidate); steps < least) {
      least = steps;
      nearest = &candidate;
    }
  }
  return nearest == nullptr ? "" : "; did you mean \"" + *nearest + "\"?";
}

}  // namespace ctl
