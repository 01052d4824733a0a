// The course of a run: taking its profile, clearing up after it, and its end.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/host_log.hpp"
#include "base/scratch.hpp"
#include "base/text_containers.hpp"
#include "config/profile.hpp"
#include "outcome/course.hpp"
#include "outcome/metrics.hpp"
#include "outcome/run_outcome.hpp"
#include "outcome/tell.hpp"
#include "report_format/facts_file.hpp"
#include "report_format/reports.hpp"
#include "report_format/run_state.hpp"
#include "run/old_reports.hpp"
#include "run/page.hpp"
#include "run/report_index.hpp"
#include "run/run_lock.hpp"
#include "run/run_paths.hpp"
#include "run/run_temporary.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace host {
namespace {

using report_format::RunStatus;

bool store_status(const std::string& profile, const RunStatus& status) {
  const int saved_errno = errno;
  const std::string path = VORN_PATH_STATUS "/" + profile;
  AtomicFile file(path);
  // Monitoring that isn't root reads it, whatever this process's umask.
  if (file.fd() >= 0 && fchmod(file.fd(), 0644) == 0 && write_all(file.fd(), status_text(status)) &&
      file.commit()) {
    errno = saved_errno;
    return true;
  }
  log_line(R"(status "%s" of profile "%s" can't be stored in %s (%s))", status.word.c_str(),
           profile.c_str(), path.c_str(), std::strerror(errno));
  return false;
}

// As store_status(), for the first word of a run: where it can't be stored, that of the run before
// must not stand for this one.
bool store_first_status(const std::string& profile, const RunStatus& status) {
  const bool is_stored = store_status(profile, status);
  if (!is_stored) {
    const ErrnoKeeper keeper;
    unlink((VORN_PATH_STATUS "/" + profile).c_str());
  }
  return is_stored;
}

// When a report isn't whole, nothing may look like one: what stands at the finished name takes its
// unfinished name back first, so that a removal which is cut short leaves something that the next
// run recognises.
void take_back(const ReportRun& run) {
  const ErrnoKeeper keeper;
  rename(run.finished.c_str(), run.unfinished.c_str());
  if (!remove_tree(run.unfinished)) {
    log_line("unfinished report %s can't be removed (%s); remove it by hand",
             run.unfinished.c_str(), std::strerror(errno));
  }
}

std::string name_of(const ReportRun& run) {
  return run.finished.substr(run.finished.rfind('/') + 1);
}

// As fsync(). A file system that knows no such thing for folders says so, which is no failure.
bool bring_to_disk(int fd) {
  return fsync(fd) == 0 || errno == EINVAL || errno == ENOSYS || errno == EOPNOTSUPP;
}

// Whether the report is on the disk: its page, its facts, and the names that lead to them. What is
// only in memory when "success" is stored could be gone after a power cut, and the word not.
bool is_durable(const ReportRun& run) {
  for (const std::string& path : {run.page, run.finished + "/" + report_format::kFactsFile,
                                  run.finished, run.finished.substr(0, run.finished.rfind('/'))}) {
    const Fd opened(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    if (!opened || !bring_to_disk(opened.get())) {
      log_line("profile \"%s\": %s can't be brought to the disk (%s); see to its volume",
               run.profile.c_str(), path.c_str(), std::strerror(errno));
      return false;
    }
  }
  return true;
}

struct Outcome {
  RunStatus status;                           // without times
  std::optional<report_format::Facts> facts;  // of the report, if there is one
};

// What is to be stored of a report run that ends as `word` says. The page with its facts is its
// product: without them there is no success, and no report.
Outcome outcome_of(const ReportRun& run, std::string_view word) {
  const ErrnoKeeper keeper;
  const bool is_whole = page_is_whole(run.page.c_str(), run.report_list);
  auto facts = is_whole ? report_format::read_facts(run.finished) : std::nullopt;
  if (word == report_format::kSuccess && facts && is_durable(run)) {
    const int incidents = static_cast<int>(facts->incidents.size());
    return {{std::string(word), name_of(run), incidents, run.mail_failed, run.fleet_failed},
            std::move(facts)};
  }
  if (word == report_format::kSuccess && !facts) {
    log_line(
        "profile \"%s\": report page %s is missing or lacks a part, so the run counts as failed; "
        "check the messages above and the free space",
        run.profile.c_str(), run.page.c_str());
  }
  if (!is_whole || word == report_format::kSuccess) {
    take_back(run);
  }
  return {{.word = report_format::kFail}, std::nullopt};
}

// The times of a run that has come to `status`, with those of the runs before it.
void add_times(const std::string& profile, bool is_report, RunStatus& status) {
  const RunStatus stored = stored_status(profile);
  const bool is_first = status.word == report_format::kCollecting;
  const auto& own = course();
  const bool is_own = own && own->profile == profile;
  status.started = is_own ? own->started : stored.started;
  status.ended = is_first ? 0 : std::time(nullptr);
  status.report_started = is_report ? status.started : stored.report_started;
  status.succeeded = status.report.empty() ? stored.succeeded : status.ended;
}

// The facts of the newest report that is whole, for a run that made none.
std::optional<report_format::Facts> newest_facts(const std::string& profile,
                                                 const VLIBCSzHash& settings) {
  const auto dir = report_dir(profile.c_str(), settings);
  const std::string folder = dir ? *dir + "/" + profile : "";
  const auto reports = dir ? stored_reports(folder, ReportSize::left_out) : std::nullopt;
  if (!reports) {
    return std::nullopt;
  }
  const auto newest = std::find_if(reports->rbegin(), reports->rend(),
                                   [](const StoredReport& report) { return report.is_whole; });
  return newest == reports->rend() ? std::nullopt
                                   : report_format::read_facts(folder + "/" + newest->name);
}

// Once in the life of the process, and only by the one that has made the run.
void tell_end(const std::string& profile, const Outcome& outcome,
              const std::optional<ReportRun>& ended) {
  if (!course() || course()->profile != profile || std::exchange(course()->is_told, true)) {
    return;
  }
  const ErrnoKeeper keeper;
  const VLIBCSzHash settings = ended ? ended->settings : readable_settings(profile);
  const bool has_failed = outcome.status.word == report_format::kFail;
  if ((ended || has_failed) && settings.find("metrics_file") != nullptr) {
    write_metrics(profile, settings, outcome.status,
                  outcome.facts ? outcome.facts : newest_facts(profile, settings));
  }
  if (has_failed) {
    tell_failure(*course(), settings);
  } else if (outcome.facts) {
    tell_report(*course(), *outcome.facts, settings, outcome.status);
  }
}

// The database beside it is the program's to remove, which may have it open still.
void forget_index_copy() {
  if (!scratch_folder().empty()) {
    const ErrnoKeeper keeper;
    unlink((scratch_folder() + "/" VORN_INDEX_COPY).c_str());
    set_scratch_folder("");
  }
}

// As VornQazStatusUpdate.
int update_status(const std::string& profile, std::string_view word) {
  using report_format::kCollecting;
  if (word != kCollecting && word != report_format::kSuccess && word != report_format::kFail) {
    log_line(R"(profile "%s": "%.80s" is no status word)", profile.c_str(),
             std::string(word).c_str());
    errno = EINVAL;
    return -1;
  }
  if (!holds_profile(profile)) {
    if (word == report_format::kFail) {
      tell_end(profile, {{.word = std::string(word)}, {}}, {});
    }
    errno = ENOLCK;  // taking it has failed, and said so
    return -1;
  }
  std::optional<ReportRun> ended;
  if (word != kCollecting && report_run() && report_run()->profile == profile) {
    ended.swap(report_run());
    forget_index_copy();
  }
  Outcome outcome = ended ? outcome_of(*ended, word) : Outcome{{.word = std::string(word)}, {}};
  RunStatus& status = outcome.status;
  add_times(profile, ended || word == report_format::kFail, status);
  if (word == kCollecting) {
    return store_first_status(profile, status) ? 0 : -1;
  }
  const bool is_stored = store_status(profile, status);
  tell_end(profile, outcome, ended);
  if (!is_stored) {
    return -1;
  }
  if (!status.report.empty()) {
    const std::string folder = ended->finished.substr(0, ended->finished.rfind('/'));
    if (ended->keep > 0) {
      remove_old_reports(folder, ended->keep, status.report);
    }
    update_index(folder, profile);
  }
  return status.word == word ? 0 : 1;
}

// Only the holder removes what runs have begun, so this takes the profile when nobody has it.
int clean(const std::string& profile, const VLIBCSzHash* hash) {
  remove_temporary_names(getpid());
  int result = 0;
  std::vector<std::string> unfinished;
  if (hash != nullptr) {
    const std::optional<std::string> dir = report_dir(profile.c_str(), *hash);
    const auto found = dir ? unfinished_reports(*dir + "/" + profile) : std::nullopt;
    result = found ? 0 : -1;
    unfinished = found.value_or(std::vector<std::string>{});
  }
  if (!holds_profile(profile) && take_profile(profile) != TakeResult::taken) {
    return result;
  }
  for (const std::string& path : unfinished) {
    if (!remove_tree(path)) {
      log_line("unfinished report %s can't be removed (%s); remove it by hand", path.c_str(),
               std::strerror(errno));
      result = -1;
    }
  }
  remove_statistics(profile);
  VornQazProgressEnd(profile.c_str());
  return result;
}

}  // namespace

bool end_report(const ReportRun& run, bool is_made) {
  return outcome_of(run, is_made ? report_format::kSuccess : report_format::kFail).status.word ==
         report_format::kSuccess;
}

}  // namespace host

int VornQazProfileRunning(const char* profile) {
  if (!host::valid_profile(profile)) {
    return 0;
  }
  try {
    const host::TakeResult taken = host::take_profile(profile);
    if (taken != host::TakeResult::busy) {
      host::begin_course(profile);
    }
    if (taken == host::TakeResult::failed) {
      const host::ErrnoKeeper keeper;
      host::store_first_status(profile, {.word = report_format::kFail});  // it comes to nothing
    }
    return taken == host::TakeResult::busy ? 1 : 0;
  } catch (const std::exception&) {
    return 1;  // without a lock nothing may run
  }
}

int VornQazStatusUpdate(const char* profile, const char* status) {
  if (!host::valid_profile(profile) || status == nullptr) {
    return -1;
  }
  try {
    return host::update_status(profile, status);
  } catch (const std::exception&) {
    return -1;
  }
}

void VornQazDataFailed(const char* profile) try {
  if (profile == nullptr || !host::course() || host::course()->profile != profile) {
    return;
  }
  if (host::course()->profile != "global" && host::holds_profile(profile)) {
    host::RunStatus status = host::stored_status(profile);
    status.ended = std::time(nullptr);
    host::store_status(profile, status);
  }
  host::tell_failure(*host::course(), host::readable_settings(profile));
} catch (const std::exception&) {
  // The log has what failed.
}

void VornQazStatusFleetFailed(void) {
  if (host::report_run()) {
    host::report_run()->fleet_failed = true;
  }
}

void VornQazStatusMailFailed(void) {
  if (host::report_run()) {
    host::report_run()->mail_failed = true;
  }
}

int VornQazReportCleanTmp(const char* profile, const VLIBCSzHash* hash) {
  if (!host::valid_profile(profile)) {
    return -1;
  }
  try {
    return host::clean(profile, hash);
  } catch (const std::exception&) {
    return -1;
  }
}
