#include "base/profile_state.hpp"

#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <iomanip>
#include <memory>
#include <sstream>

#include "base/ctl.hpp"
#include "base/text_containers.hpp"
#include "run/run_lock.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

constexpr std::size_t kLargestStatus = 4096;

struct CloseDb {
  void operator()(sqlite3* db) const { sqlite3_close(db); }
};

std::string local_text(const char* format, std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  std::ostringstream text;
  text << std::put_time(&local, format);
  return text.str();
}

}  // namespace

int samples_since(const std::string& profile, std::time_t start) {
  constexpr int kWaitMs = 5000;
  sqlite3* opened = nullptr;
  const int result = sqlite3_open_v2(VORN_PATH_HISTORY_DB, &opened, SQLITE_OPEN_READONLY, nullptr);
  const std::unique_ptr<sqlite3, CloseDb> db(opened);
  sqlite3_stmt* statement = nullptr;
  sqlite3_busy_timeout(db.get(), kWaitMs);
  if (result != SQLITE_OK ||
      sqlite3_prepare_v2(db.get(),
                         "SELECT count(*) FROM VolumeUsage WHERE profile = ?1 AND "
                         "CAST(sampleDate AS INTEGER) >= ?2",
                         -1, &statement, nullptr) != SQLITE_OK) {
    return 0;
  }
  sqlite3_bind_text(statement, 1, profile.c_str(), -1, SQLITE_TRANSIENT);
  sqlite3_bind_int64(statement, 2, start);
  const int count = sqlite3_step(statement) == SQLITE_ROW ? sqlite3_column_int(statement, 0) : 0;
  sqlite3_finalize(statement);
  return count;
}

std::string report_folder(const Section& profile) {
  VLIBCSzHash hash(profile.entries.size());
  for (const auto& [key, value] : profile.entries) {
    hash.set(key, value);
  }
  const std::optional<std::string> dir = host::report_dir(profile.name.c_str(), hash);
  if (!dir) {
    throw host_failure("report_dir of profile " + profile.name + " can't be worked with");
  }
  return *dir + "/" + profile.name;
}

std::vector<host::StoredReport> reports_in(const std::string& folder, host::ReportSize size) {
  auto reports = host::stored_reports(folder, size);
  if (!reports) {
    throw host_failure(folder + " can't be read");
  }
  return std::move(*reports);
}

std::optional<host::StoredReport> newest_whole(const std::vector<host::StoredReport>& reports) {
  const auto newest =
      std::find_if(reports.rbegin(), reports.rend(),
                   [](const host::StoredReport& report) { return report.is_whole; });
  return newest == reports.rend() ? std::nullopt : std::optional(*newest);
}

RunState run_state(const std::string& profile) {
  if (host::held_by_other(profile)) {
    return RunState::running;
  }
  const auto text = host::read_file(VORN_PATH_STATUS "/" + profile, kLargestStatus);
  if (!text) {
    return errno == ENOENT ? RunState::never_ran : RunState::unknown;
  }
  const std::string word = text->substr(0, text->find('\n'));
  if (word == "success") {
    return RunState::succeeded;
  }
  if (word != "collect_data") {
    return RunState::failed;
  }
  // "global" keeps this word when all went well.
  struct stat status {};
  const bool has_collected = profile == "global" &&
                             stat((VORN_PATH_STATUS "/" + profile).c_str(), &status) == 0 &&
                             samples_since(profile, status.st_mtime) > 0;
  return has_collected ? RunState::succeeded : RunState::ended_early;
}

const char* word_for(RunState state) {
  switch (state) {
    case RunState::never_ran:
      return "never ran";
    case RunState::running:
      return "running";
    case RunState::succeeded:
      return "success";
    case RunState::failed:
      return "fail";
    case RunState::ended_early:
      return "ended early";
    case RunState::unknown:
      break;
  }
  return "unknown";
}

pid_t running_process(const std::string& profile) {
  if (!host::held_by_other(profile)) {
    return 0;
  }
  const auto text = host::read_file(VORN_PATH_STATUS "/." + profile + ".lock", kLargestStatus);
  pid_t pid = 0;
  if (text) {
    std::from_chars(text->data(), text->data() + text->size(), pid);
  }
  return pid;
}

std::string size_text(std::uint64_t bytes) {
  constexpr std::array kUnits{"B", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  constexpr double kStep = 1024;
  auto value = static_cast<double>(bytes);
  std::size_t unit = 0;
  // What would be rounded to 1024 is 1 of the next unit.
  for (; value >= kStep - 0.05 && unit + 1 < kUnits.size(); ++unit) {
    value /= kStep;
  }
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%.*f %s", unit == 0 ? 0 : 1, value, kUnits[unit]);
  return text.data();
}

std::string time_text(std::time_t time) {
  return local_text("%Y-%m-%d %H:%M", time);
}

std::string json_time(std::time_t time) {
  return local_text("%Y-%m-%dT%H:%M:%S%z", time);
}

}  // namespace ctl
