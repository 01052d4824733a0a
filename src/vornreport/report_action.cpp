#include <malloc.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "actions.hpp"
#include "facts/owner_names.hpp"
#include "facts/progress.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "file_gathering/file_gathering.hpp"
#include "fleet/ship.hpp"
#include "module.hpp"
#include "out_of_memory.hpp"
#include "profile.hpp"
#include "report_format/reports.hpp"
#include "shell.hpp"
#include "sigterm.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vorn/volume.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fleet_rows.hpp"
#include "vornreport/registry.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statements_ahead.hpp"

namespace vornreport {
namespace {

// What every report of a run looks things up in.
struct LookUps {
  HashHandle users;
  HashHandle volumes;
  HashHandle shares;
};

// Those selected of the given source, or all of them, can't be what they should be.
void tell_failed_reports(const char* report_list, std::optional<ReportSource> source = {}) {
  for (const ReportEntry& entry : report_registry()) {
    if (is_selected(entry, report_list) && (!source || entry.source == *source)) {
      tell_failed_report(entry.name);
    }
  }
}

void gather_when_needed(const char* profile, const VLIBCSzHash* profile_hash,
                        const char* report_list) {
  for (const ReportEntry& entry : report_registry()) {
    if (entry.source == ReportSource::kStatistics && is_selected(entry, report_list)) {
      if (file_gathering(profile, profile_hash) < 0) {
        tell_failed_reports(report_list, ReportSource::kStatistics);  // they see empty shares
      }
      return;
    }
  }
}

// One line for each word of the list that selects nothing: most likely a typing error.
void log_unknown_reports(const char* report_list) {
  constexpr std::string_view kSeparators = ", \t;";
  std::string_view rest(report_list);
  while (!rest.empty()) {
    const std::string word(rest.substr(0, rest.find_first_of(kSeparators)));
    rest.remove_prefix(std::min(word.size() + 1, rest.size()));
    const auto entries = report_registry();
    if (!word.empty() && std::none_of(entries.begin(), entries.end(), [&](const auto& entry) {
          return is_selected(entry, word.c_str());
        })) {
      REPORT_LOG_ERR(kDriverModule, __LINE__, "report_list names no report with %s\n",
                     word.c_str());
    }
  }
}

bool load_volumes_and_shares(LookUps& look_ups) {
  if (with_address(look_ups.volumes, VornQazGetVolumePathHash) < 0 || !look_ups.volumes) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 259, "Failed to get volume path info");
    return false;
  }
  look_ups.shares.reset(VLIBCSzHashAlloc(kPlatformSlots));
  if (!look_ups.shares) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 262, "malloc hash failed");
    return false;
  }
  if (with_address(look_ups.shares, VornQazGetSharePathHash) < 0 || !look_ups.shares) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 266, "Failed to get share path info");
    return false;
  }
  return true;
}

// What the selected reports are going to ask the statistics database.
struct Statements {
  std::vector<const char*> in_order;
  const char* longest = nullptr;  // takes as long as all others together
};

Statements statements_of(const VLIBCSzHash* profile_hash, const char* report_list) {
  Statements statements;
  for (const ReportEntry& entry : report_registry()) {
    if (entry.statement == nullptr || !is_selected(entry, report_list)) {
      continue;
    }
    statements.in_order.push_back(entry.statement(profile_hash));
    if (std::string_view(entry.name) == report_format::kDuplicateFile.name) {
      statements.longest = statements.in_order.back();
    }
  }
  return statements;
}

// The number of reports run minus one.
int run_selected_reports(const char* profile, const VLIBCSzHash* profile_hash,
                         const char* report_list, const LookUps& look_ups) {
  const Statements statements = statements_of(profile_hash, report_list);
  const StatementsAhead ahead(set_value(profile_hash, "real_path_stat_db"), statements.in_order,
                              statements.longest);
  int result = -1;
  for (const ReportEntry& entry : report_registry()) {
    if (!is_selected(entry, report_list)) {
      continue;
    }
    ++result;
    ReportArgs args{profile,
                    profile_hash,
                    look_ups.users.get(),
                    look_ups.volumes.get(),
                    look_ups.shares.get(),
                    nullptr,
                    nullptr,
                    0};
    report_trace(kDriverModule, 280, "##### inject report=%s\n\n", entry.name);
    progress_report(entry.name);
    run_report(entry, args);
  }
  return result;
}

// Steps of a loaded profile up to the published report. 0 or -1. `has_snapshot`: whether it has
// stored one by then, which goes again when the run fails.
int make_report(const char* profile, const VLIBCSzHash* profile_hash, bool& has_snapshot) {
  report_trace(kDriverModule, 357, "create report, profile name=%s\n\n", profile);
  PathText data_path;
  // What the data file holds is assembled even when a part of it failed. Lost data is another
  // matter: it never becomes a page.
  if (create_report_data(profile, profile_hash, data_path.data(), PathText::size()) < 0) {
    const char* report_list = set_value(profile_hash, "report_list");
    tell_failed_reports(report_list != nullptr ? report_list : "");
  }
  report_trace(kDriverModule, 363, "########## report.tmp=%s\n\n", data_path.c_str());
  progress_phase(report_format::Phase::kAssembling);
  malloc_trim(0);  // what the reports have left is room for the facts
  if (!report_data_lost()) {
    has_snapshot = store_snapshot(profile_hash);
    close_facts(profile_hash, data_path.c_str());
  }
  const int sections = build_report_html(profile, profile_hash, data_path.c_str());
  if (report_data_lost() || sections < 1) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 366, "create template failed");
    return -1;
  }
  if (correct_report_dir(profile, profile_hash) < 0 || report_data_lost()) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 370, "correct dir failed");
    return -1;
  }
  if (has_snapshot) {
    keep_snapshot();
  }
  progress_phase(report_format::Phase::kPublishing);
  ship_run(set_value(profile_hash, "real_path_report_final"));
  publish_report(profile, profile_hash);
  return 0;
}

// The end of a run whose profile this process holds: what is unfinished goes when it failed, and
// the outcome is stored. `profile_hash` is null when the profile couldn't be loaded. `result`, or
// -1 when the report isn't what it seemed to be.
int end_run(const char* profile, const VLIBCSzHash* profile_hash, int result) {
  if (result < 0) {
    release_memory_reserve();
    VornQazReportCleanTmp(profile, profile_hash);
    VornQazStatusUpdate(profile, "fail");
    return result;
  }
  return VornQazStatusUpdate(profile, "success") == 1 ? -1 : result;
}

}  // namespace

int create_report_data(const char* profile, const VLIBCSzHash* profile_hash, char* out_path,
                       int out_size) {
  if (is_unset(profile) || profile_hash == nullptr || out_size <= 0) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 221, "Bad Parameter");
    return -1;
  }
  const char* report_list = set_value(profile_hash, "report_list");
  if (report_list == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 226, "No report selected");
    return -1;
  }
  report_trace(kDriverModule, 229, "report list=%s\n\n", report_list);
  log_unknown_reports(report_list);
  LookUps look_ups;
  if (with_address(look_ups.users, VornQazInitFilterUser) < 0 || !look_ups.users) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 232, "init user failed");
    return -1;
  }
  std::snprintf(out_path, static_cast<size_t>(out_size), "%s", report_data_path().c_str());
  run_command(kDriverModule, 238, VORN_PATH_TEMPLATE_SCRIPT " header %s", out_path);
  std::array<char, 8> language{};
  if (VornQazImportLang(profile_hash, language.data(), language.size()) < 0 ||
      is_unset(language.data())) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 241, "Failed to setting language");
    return -1;
  }
  run_facts().language = language.data();
  run_command(kDriverModule, 244, VORN_PATH_TEMPLATE_SCRIPT " lang %s %s", out_path,
              language.data());
  gather_when_needed(profile, profile_hash, report_list);
  if (!load_volumes_and_shares(look_ups)) {
    return -1;
  }
  const int result = run_selected_reports(profile, profile_hash, report_list, look_ups);
  if (report_format::is_selected(report_format::kFileOwner.name, report_list)) {
    note_owner_names(look_ups.users.get());
  }
  ship_rows(profile_hash, {look_ups.users.get(), look_ups.volumes.get(), look_ups.shares.get()});
  return result;
}

namespace {

int count_selected(const VLIBCSzHash* profile_hash) {
  const char* report_list = set_value(profile_hash, "report_list");
  const auto entries = report_registry();
  return report_list == nullptr ? 0
                                : static_cast<int>(std::count_if(
                                      entries.begin(), entries.end(), [&](const auto& entry) {
                                        return is_selected(entry, report_list);
                                      }));
}

}  // namespace

int report_action(char** args) {
  if (args == nullptr) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 334, "Bad Parameter");
    return -1;
  }
  const char* profile = args[0];
  if (is_unset(profile)) {
    REPORT_LOG_ERR(kDriverModule, 340, "bad parameter\n");
    return -1;
  }
  if (VornQazProfileRunning(profile) != 0) {
    report_trace(kDriverModule, 345, "profile=%s is running, skip running again\n", profile);
    return 0;
  }
  const HashHandle hash = init_profile(profile, 1);
  if (!hash) {
    REPORT_LOG_ERR_NESTED(kDriverModule, 352, "init profile failed, profile=%s", profile);
    return end_run(profile, nullptr, -1);
  }
  const char* stat_db = set_value(hash.get(), "real_path_stat_db");
  remove_when_terminated(stat_db, profile);
  end_without_memory(profile, hash.get());
  begin_facts(profile, hash.get());
  begin_fleet_rows(hash.get());
  progress_begin(profile, count_selected(hash.get()));
  bool has_snapshot = false;
  const int result = end_run(profile, hash.get(), make_report(profile, hash.get(), has_snapshot));
  if (result < 0 && has_snapshot) {
    drop_snapshot();
  }
  end_without_memory(nullptr, nullptr);
  progress_end();
  if (stat_db != nullptr) {
    unlink(stat_db);
  }
  return result;
}

}  // namespace vornreport
