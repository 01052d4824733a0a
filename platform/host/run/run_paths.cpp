// The paths of a profile, and the preparation of its report run.
#include "run/run_paths.hpp"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <exception>
#include <memory>
#include <string_view>

#include "base/host_log.hpp"
#include "base/incident.hpp"
#include "base/scratch.hpp"
#include "base/silence.hpp"
#include "base/text_containers.hpp"
#include "base/trusted_folder.hpp"
#include "config/config_file.hpp"
#include "config/profile.hpp"
#include "config/shares.hpp"
#include "report_format/reports.hpp"
#include "run/old_reports.hpp"
#include "run/run_lock.hpp"
#include "run/run_temporary.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {
namespace {

constexpr std::size_t kLongestReportDir = 1024;
constexpr std::string_view kUnfinished = ".partial";

struct CloseDir {
  void operator()(DIR* dir) const { closedir(dir); }
};

// --- The profile's own folder -------------------------------------------------------------------

// One line when the folder can't be used; an absent one is silent.
Fd tell_unusable(const std::string& folder, TrustedFolder opened) {
  if (!opened.problem.empty()) {
    const ErrnoKeeper keeper;
    log_line("report folder %s can't be used: %s", folder.c_str(), opened.problem.c_str());
  }
  return std::move(opened.folder);
}

// --- The run's own folder -----------------------------------------------------------------------

std::string local_time_name() {
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  char name[32];
  return {name, std::strftime(name, sizeof name, "%Y-%m-%d_%H-%M-%S", &local)};
}

ReportRun run_named(const std::string& profile, const std::string& folder,
                    const std::string& name) {
  return {.profile = profile,
          .unfinished = folder + "/" + unfinished_name(name),
          .finished = folder + "/" + name,
          .page = folder + "/" + name + "/report.html"};
}

bool name_exists(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0;
}

// --- Preparing a report run ---------------------------------------------------------------------

// An incident for each share that the profile selects and that can't be used: one whose section is
// wrong, and, with a line, each name that share.conf lacks, most likely a typing error.
void warn_of_unknown_shares(const char* profile, const VLIBCSzHash& hash) {
  const char* list = hash.find("share_list");
  const auto words = comma_words(list == nullptr ? "" : list);
  for (const std::string& name : words.empty() ? shares_left_out() : std::vector<std::string>{}) {
    tell_incident("share_missing", name,
                  "share " + name +
                      " is left out, since its section in " VORN_PATH_SHARES
                      " can't be used; the log says why");
  }
  for (const std::string_view word : words) {
    const std::string name(word);
    const std::vector<Share>* shares = all_shares();
    if (shares != nullptr && std::none_of(shares->begin(), shares->end(),
                                          [&](const Share& s) { return s.name == name; })) {
      log_line(R"(profile "%s": share_list names "%s", which is no share of %s; correct the name)",
               profile, name.c_str(), VORN_PATH_SHARES);
      tell_incident("share_missing", name,
                    "share_list names " + name + ", which is no share; correct the name");
    }
  }
}

// Removes what killed processes have left: the reports that a run of the profile has begun, and
// files that were about to take another's place. Nothing here is fatal: the new run's names are
// unused ones.
void remove_leftovers(const std::string& profile, const std::string& folder) {
  AtomicFile::remove_leftovers(VORN_PATH_STATUS "/" + profile);
  remove_unfinished_rewrites(VORN_PATH_CONFIG);
  remove_unfinished_rewrites(VORN_PATH_SHARES);
  remove_dead_names();
  for (const std::string& left : unfinished_reports(folder).value_or(std::vector<std::string>{})) {
    if (!remove_tree(left)) {
      log_line("unfinished report %s can't be removed (%s); remove it by hand", left.c_str(),
               std::strerror(errno));
    }
  }
}

// The statistics database is reached by path, by the program and by SQLite, so it gets a folder
// that is new and this user's alone.
bool make_statistics_folder(const std::string& profile) {
  const std::string folder = VORN_PATH_STAT "/" + profile;
  if (!remove_statistics(profile) || !make_folders(VORN_PATH_STAT) ||
      mkdir(folder.c_str(), 0700) != 0) {
    return false;
  }
  set_scratch_folder(folder);
  return true;
}

bool prepare(const ReportRun& run) {
  if (!claim_temporary_names()) {
    return false;
  }
  // Not more: a default access control list of the folder above would be given it.
  constexpr mode_t kMode = 0750;
  if (mkdir(run.unfinished.c_str(), kMode) == 0 &&
      mkdir((run.unfinished + "/csv").c_str(), kMode) == 0 && make_statistics_folder(run.profile)) {
    return true;
  }
  log_line("profile \"%s\": the folders of a run, %s and %s, can't be made (%s); free some space",
           run.profile.c_str(), run.unfinished.c_str(), VORN_PATH_STAT, std::strerror(errno));
  const ErrnoKeeper keeper;
  remove_tree(run.unfinished);
  remove_temporary_names(getpid());
  return false;
}

// Without any share the report would be empty, and look like a good one. Every later look at the
// shares is at those that are read here.
bool has_shares_to_report(const VLIBCSzHash& hash) {
  const std::vector<Share>* shares = read_shares();
  if (shares == nullptr) {
    return false;
  }
  const char* list = hash.find("report_list");
  const auto& reports = report_format::kReports;
  const bool needs_shares =
      list != nullptr && std::any_of(reports.begin(), reports.end(), [list](const auto* report) {
        return report->of_files && report_format::is_selected(report->name, list);
      });
  if (needs_shares && shares->empty()) {
    log_line("%s holds no share that can be used; add one with vornctl share add NAME FOLDER",
             VORN_PATH_SHARES);
    errno = ENOENT;
    return false;
  }
  return true;
}

std::optional<ReportRun> begin_report_run(const char* profile, const VLIBCSzHash& hash,
                                          const std::string& folder) {
  if (!holds_profile(profile)) {
    log_line(R"(profile "%s" is not held by this process, so it can't run it)", profile);
    errno = ENOLCK;
    return std::nullopt;
  }
  if (is_silent(folder)) {
    log_line("report folder %s doesn't answer; see to the server or daemon behind its mount",
             folder.c_str());
    return std::nullopt;
  }
  if (!has_shares_to_report(hash) || !tell_unusable(folder, open_trusted(folder, Missing::made))) {
    return std::nullopt;
  }
  remove_leftovers(profile, folder);
  ReportRun run = unused_run(profile, folder);
  if (!prepare(run)) {
    return std::nullopt;
  }
  warn_of_unknown_shares(profile, hash);
  const char* report_list = hash.find("report_list");
  run.report_list = report_list == nullptr ? "" : report_list;
  run.keep = reports_to_keep(profile, hash);
  run.settings = hash;
  return run;
}

int init_paths(const char* profile, VLIBCSzHash& hash, bool for_report) {
  const std::optional<std::string> dir = report_dir(profile, hash);
  if (!dir) {
    return -1;
  }
  const std::string folder = *dir + "/" + profile;
  ReportRun run;
  if (for_report) {
    report_run() = begin_report_run(profile, hash, folder);
    if (!report_run()) {
      return -1;
    }
    run = *report_run();
  } else {
    run = unused_run(profile, folder);
  }
  hash.set("real_path_base", VORN_PATH_STAT);
  hash.set("real_path_stat_db", statistics_path(profile));
  hash.set("real_path_template", folder + "/template");
  hash.set("real_path_date", run.unfinished);
  hash.set("real_path_date_final", run.finished);
  hash.set("real_path_report_final", run.page);
  hash.set("real_path_csv", run.unfinished + "/csv");
  return 0;
}

}  // namespace

Fd open_report_folder(const std::string& folder) {
  return tell_unusable(folder, open_trusted(folder, Missing::refused));
}

std::string report_dir_problem(const std::string& dir) {
  const ErrnoKeeper keeper;
  // As the folder above one; no profile's reports have this name.
  return open_trusted(dir + "/global", Missing::refused).problem;
}

const char* report_dir_error(std::string_view dir) {
  if (!dir.starts_with('/')) {
    return "is not absolute";
  }
  if (dir.size() > kLongestReportDir) {
    return "is longer than 1024 bytes";
  }
  if (std::any_of(dir.begin(), dir.end(), [](char c) {
        return c == '\'' || static_cast<unsigned char>(c) < ' ' || c == '\x7f';
      })) {
    return "holds a single quote or a control character";
  }
  if ((std::string(dir) + "/").find("/../") != std::string::npos) {
    return R"(holds "..")";
  }
  return nullptr;
}

std::optional<std::string> report_dir(const char* profile, const VLIBCSzHash& hash) {
  const char* value = hash.find("report_dir");
  std::string dir = value == nullptr || *value == '\0' ? VORN_PATH_REPORTS : value;
  if (const char* problem = report_dir_error(dir); problem != nullptr) {
    log_line(
        R"(profile "%s": report_dir "%.1100s" %s; run vornctl profile set %s report_dir FOLDER)",
        profile, dir.c_str(), problem, profile);
    errno = EINVAL;
    return std::nullopt;
  }
  dir.erase(dir.find_last_not_of('/') + 1);
  return dir;
}

std::string statistics_path(const std::string& profile) {
  return VORN_PATH_STAT "/" + profile + "/stat.db";
}

bool remove_statistics(const std::string& profile) {
  const ErrnoKeeper keeper;
  const std::string before = VORN_PATH_STAT "/stat.db." + profile;  // of an older version
  unlink(before.c_str());
  unlink((before + "-journal").c_str());
  const std::string folder = VORN_PATH_STAT "/" + profile;
  if (remove_tree(folder)) {
    return true;
  }
  log_line("%s can't be removed (%s); remove it by hand", folder.c_str(), std::strerror(errno));
  return false;
}

std::vector<std::string> entries_of(const Fd& folder) {
  std::vector<std::string> names;
  Fd own(folder ? openat(folder.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC) : -1);
  const std::unique_ptr<DIR, CloseDir> dir(own ? fdopendir(own.get()) : nullptr);
  if (dir) {
    own.release();  // it belongs to `dir` now
  }
  while (const dirent* entry = dir ? readdir(dir.get()) : nullptr) {
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") {
      names.emplace_back(name);
    }
  }
  return names;
}

std::string unfinished_name(const std::string& name) {
  return "." + name + std::string(kUnfinished);
}

std::optional<std::vector<std::string>> unfinished_reports(const std::string& folder) {
  const int saved_errno = errno;
  std::vector<std::string> found;
  const Fd opened = open_report_folder(folder);
  if (!opened && errno != ENOENT) {
    return std::nullopt;
  }
  for (const std::string& name : entries_of(opened)) {
    if (name.size() > kUnfinished.size() && name.starts_with('.') && name.ends_with(kUnfinished) &&
        is_report_name(std::string_view(name).substr(1, name.size() - 1 - kUnfinished.size()))) {
      found.push_back(folder);
      found.back().append("/").append(name);
    }
  }
  errno = saved_errno;
  return found;
}

ReportRun unused_run(const std::string& profile, const std::string& folder) {
  const ErrnoKeeper keeper;
  const std::string base = local_time_name();
  ReportRun run = run_named(profile, folder, base);
  for (int n = 2; name_exists(run.finished) || name_exists(run.unfinished); ++n) {
    run = run_named(profile, folder, base + "-" + std::to_string(n));
  }
  return run;
}

std::optional<ReportRun>& report_run() {
  static std::optional<ReportRun> run;
  return run;
}

}  // namespace host

int VornQazInitLocation(VLIBCSzHash** hash, int flags) {
  if (hash == nullptr || *hash == nullptr || flags != 0) {
    return -1;
  }
  const bool set = VLIBCSzHashSetValue(hash, "real_path_base", VORN_PATH_STAT) == 0 &&
                   VLIBCSzHashSetValue(hash, "real_path_stat_db", VORN_PATH_STAT "/stat.db") == 0;
  return set ? 0 : -1;
}

int VornQazInitRealPath(const char* profile, VLIBCSzHash** hash, int for_report) {
  if (!host::valid_profile(profile) || hash == nullptr || *hash == nullptr) {
    return -1;
  }
  try {
    const int result = host::init_paths(profile, **hash, for_report != 0);
    if (result == 0 && for_report != 0) {
      setenv("VORN_PROFILE", profile, 1);  // for the page's template script
    }
    return result;
  } catch (const std::exception&) {
    return -1;
  }
}
