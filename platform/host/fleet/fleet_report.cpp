// The folders of a report over the fleet, which belongs to no profile.
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <exception>
#include <optional>
#include <string>

#include "base/host_log.hpp"
#include "base/silence.hpp"
#include "base/text_containers.hpp"
#include "base/trusted_folder.hpp"
#include "outcome/run_outcome.hpp"
#include "run/report_index.hpp"
#include "run/run_paths.hpp"
#include "run/run_temporary.hpp"
#include "vorn/fleet.h"
#include "vorn/paths.h"

namespace host {
namespace {

constexpr char kName[] = "fleet";  // in messages and on the page
constexpr char kPageParts[] = "/template";

// Locked while a report is being made there.
Fd& folder_in_use() {
  static Fd folder;
  return folder;
}

bool open_folder(const std::string& folder) {
  if (const char* problem = report_dir_error(folder); problem != nullptr) {
    log_line("report folder %.1100s %s", folder.c_str(), problem);
    return false;
  }
  if (is_silent(folder)) {
    log_line("report folder %s doesn't answer; see to its mount", folder.c_str());
    return false;
  }
  TrustedFolder opened = open_trusted(folder, Missing::made);
  if (!opened.folder) {
    log_line("report folder %s can't be used: %s", folder.c_str(), opened.problem.c_str());
    return false;
  }
  if (flock(opened.folder.get(), LOCK_EX | LOCK_NB) != 0) {
    log_line("another report is being made in %s; wait for it", folder.c_str());
    return false;
  }
  folder_in_use() = std::move(opened.folder);
  return true;
}

bool begin(std::string folder, VLIBCSzHash& hash) {
  folder.erase(folder.find_last_not_of('/') + 1);
  if (!open_folder(folder)) {
    return false;
  }
  for (const std::string& left : unfinished_reports(folder).value_or(std::vector<std::string>{})) {
    remove_tree(left);  // what stays of it is in nobody's way
  }
  remove_dead_names();
  ReportRun run = unused_run(kName, folder);
  const char* list = hash.find("report_list");
  run.report_list = list == nullptr ? "" : list;
  constexpr mode_t kMode = 0750;
  if (!claim_temporary_names()) {
    return false;
  }
  if (mkdir(run.unfinished.c_str(), kMode) != 0 ||
      mkdir((run.unfinished + "/csv").c_str(), kMode) != 0) {
    log_line("%s can't be made (%s); free some space", run.unfinished.c_str(),
             std::strerror(errno));
    remove_temporary_names(getpid());
    return false;
  }
  // FOLDER may be anybody's, so nothing beside the report is touched.
  hash.set("real_path_template", run.unfinished + kPageParts);
  hash.set("real_path_date", run.unfinished);
  hash.set("real_path_date_final", run.finished);
  hash.set("real_path_report_final", run.page);
  hash.set("real_path_csv", run.unfinished + "/csv");
  report_run() = std::move(run);
  setenv("VORN_PROFILE", kName, 1);  // for the page's template script
  return true;
}

int end(bool is_made) {
  if (!report_run()) {
    return -1;
  }
  remove_temporary_names(getpid());
  const bool is_clear = remove_tree(report_run()->unfinished + kPageParts) &&
                        remove_tree(report_run()->finished + kPageParts);
  const bool is_whole = end_report(*report_run(), is_made && is_clear);
  const std::string folder = report_run()->finished.substr(0, report_run()->finished.rfind('/'));
  report_run().reset();
  folder_in_use() = Fd();  // the list has a turn of its own
  if (is_whole) {
    update_index(folder, kName);
  }
  return is_whole ? 0 : -1;
}

}  // namespace
}  // namespace host

int VORNFleetReportBegin(const char* folder, VLIBCSzHash** hash) {
  if (folder == nullptr || hash == nullptr || *hash == nullptr) {
    return -1;
  }
  try {
    return host::begin(folder, **hash) ? 0 : -1;
  } catch (const std::exception&) {
    return -1;
  }
}

int VORNFleetReportEnd(int is_made) {
  try {
    return host::end(is_made != 0);
  } catch (const std::exception&) {
    return -1;
  }
}
