#include "run/old_reports.hpp"

#include <fcntl.h>
#include <fts.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <tuple>
#include <utility>

#include "base/host_log.hpp"
#include "base/text_containers.hpp"
#include "report_format/facts_file.hpp"
#include "report_format/reports.hpp"
#include "report_format/values.hpp"
#include "run/page.hpp"
#include "run/run_paths.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace host {
namespace {

struct CloseFts {
  void operator()(FTS* walk) const { fts_close(walk); }
};

// The name's local time, and its number within one second (1 for the first, which has none in its
// name).
struct Stamp {
  std::time_t time;
  int number;
};

std::optional<Stamp> stamp_of(std::string_view name) {
  constexpr std::string_view kForm = "dddd-dd-dd_dd-dd-dd";
  constexpr int kFirstYear = 1900;
  if (name.size() < kForm.size()) {
    return std::nullopt;
  }
  for (std::size_t i = 0; i < kForm.size(); ++i) {
    if (kForm[i] == 'd' ? name[i] < '0' || name[i] > '9' : name[i] != kForm[i]) {
      return std::nullopt;
    }
  }
  const auto part = [name](std::size_t at, std::size_t length) {
    return report_format::whole_number(name.substr(at, length)).value_or(0);
  };
  std::tm time{};
  time.tm_year = part(0, 4) - kFirstYear;
  time.tm_mon = part(5, 2) - 1;
  time.tm_mday = part(8, 2);
  time.tm_hour = part(11, 2);
  time.tm_min = part(14, 2);
  time.tm_sec = part(17, 2);
  time.tm_isdst = -1;
  std::tm day = time;  // in UTC, which leaves out no hour, as the zone that the name is of did not
  timegm(&day);
  if (time.tm_mon != day.tm_mon || time.tm_mday != day.tm_mday) {
    return std::nullopt;  // the 31st of June
  }
  Stamp stamp{std::mktime(&time), 1};
  name.remove_prefix(kForm.size());
  if (!name.empty()) {
    stamp.number =
        name.front() == '-' ? report_format::whole_number(name.substr(1)).value_or(0) : 0;
  }
  return stamp.number > 0 ? std::optional(stamp) : std::nullopt;
}

// A path that leads through the open folder, whatever its name stands for by now.
std::string path_below(const Fd& folder, const std::string& name) {
  return "/proc/self/fd/" + std::to_string(folder.get()) + "/" + name;
}

Fd open_report(const Fd& folder, const std::string& name) {
  return Fd(openat(folder.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

bool is_whole_report(const Fd& report) {
  return report && page_is_complete_at(report.get(), report_format::kPageFile);
}

unsigned long long size_on_disk(const Fd& folder, const std::string& name) {
  constexpr unsigned long long kBlock = 512;
  std::string path = path_below(folder, name);
  char* paths[] = {path.data(), nullptr};
  const std::unique_ptr<FTS, CloseFts> walk(
      fts_open(paths, FTS_PHYSICAL | FTS_NOCHDIR | FTS_XDEV, nullptr));
  unsigned long long size = 0;
  while (const FTSENT* entry = walk ? fts_read(walk.get()) : nullptr) {
    if (entry->fts_info == FTS_D || entry->fts_info == FTS_F) {
      size += static_cast<unsigned long long>(entry->fts_statp->st_blocks) * kBlock;
    }
  }
  return size;
}

// What a report is ordered by, and it.
struct Dated {
  StoredReport report;
  int number;
  // No run of a right clock is a day ahead. It was before those that the right clock dated, so that
  // it doesn't count as the newest for years.
  bool is_ahead;

  bool operator<(const Dated& other) const {
    constexpr std::size_t kStampLength = 19;
    return std::tuple(!is_ahead, report.made, report.name.substr(0, kStampLength), number) <
           std::tuple(!other.is_ahead, other.report.made, other.report.name.substr(0, kStampLength),
                      other.number);
  }
};

bool remove_from(const Fd& folder, const std::string& path, const std::string& name) {
  if (!stamp_of(name) || !is_whole_report(open_report(folder, name))) {
    log_line("%s/%s is no finished report, so it isn't removed; look into it", path.c_str(),
             name.c_str());
    errno = EINVAL;
    return false;
  }
  const std::string removed = unfinished_name(name);
  if (renameat(folder.get(), name.c_str(), folder.get(), removed.c_str()) == 0 &&
      remove_tree(path_below(folder, removed))) {
    return true;
  }
  log_line("old report %s/%s can't be removed (%s); remove it by hand", path.c_str(), name.c_str(),
           std::strerror(errno));
  return false;
}

}  // namespace

bool is_report_name(std::string_view name) {
  return stamp_of(name).has_value();
}

std::vector<StoredReport> list_reports(const Fd& folder, ReportSize size) {
  constexpr std::time_t kDay = 86400;
  const std::time_t latest = std::time(nullptr) + kDay;
  std::vector<Dated> found;
  for (std::string& name : entries_of(folder)) {
    const std::optional<Stamp> stamp = stamp_of(name);
    struct stat status {};
    if (!stamp || fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0 ||
        !S_ISDIR(status.st_mode)) {
      continue;
    }
    const Fd opened = open_report(folder, name);
    const std::time_t made =
        (opened ? report_format::read_started(opened.get()) : std::nullopt).value_or(stamp->time);
    StoredReport report{std::move(name), made, is_whole_report(opened), 0};
    if (size == ReportSize::measured) {
      report.size = size_on_disk(folder, report.name);
    }
    found.push_back({std::move(report), stamp->number, made > latest});
  }
  std::sort(found.begin(), found.end());
  std::vector<StoredReport> reports;
  reports.reserve(found.size());
  for (Dated& dated : found) {
    reports.push_back(std::move(dated.report));
  }
  return reports;
}

std::optional<std::vector<StoredReport>> stored_reports(const std::string& folder,
                                                        ReportSize size) {
  const ErrnoKeeper keeper;
  const Fd opened = open_report_folder(folder);
  if (!opened) {
    return errno == ENOENT ? std::optional(std::vector<StoredReport>{}) : std::nullopt;
  }
  return list_reports(opened, size);
}

bool remove_report(const std::string& folder, const std::string& name) {
  const Fd opened = open_report_folder(folder);
  if (!opened && errno == ENOENT) {
    log_line("%s/%s is no finished report: there is no such folder", folder.c_str(), name.c_str());
  }
  return opened && remove_from(opened, folder, name);
}

std::size_t reports_to_keep(const char* profile, const VLIBCSzHash& hash) {
  const char* value = hash.find("keep_reports");
  if (value == nullptr || *value == '\0') {
    return 0;
  }
  const int number = report_format::whole_number(value).value_or(0);
  if (number < 1) {
    log_line(
        "profile \"%s\": keep_reports \"%.80s\" is no number from 1 on, so all reports are kept; "
        "run vornctl profile set %s keep_reports N",
        profile, value, profile);
  }
  return static_cast<std::size_t>(std::max(number, 0));
}

void remove_old_reports(const std::string& folder, std::size_t keep, std::string_view newest) {
  const ErrnoKeeper keeper;
  const Fd opened = open_report_folder(folder);
  if (!opened) {
    return;
  }
  std::vector<StoredReport> reports = list_reports(opened, ReportSize::left_out);
  std::erase_if(reports, [](const StoredReport& report) { return !report.is_whole; });
  std::size_t excess = reports.size() - std::min(keep, reports.size());
  for (const StoredReport& report : reports) {
    // After the clock was set back a little the newest isn't the last one.
    if (excess > 0 && report.name != newest) {
      --excess;
      remove_from(opened, folder, report.name);
    }
  }
}

}  // namespace host
