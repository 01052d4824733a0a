#include "run/report_index.hpp"

#include <fcntl.h>
#include <spawn.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>
#include <map>
#include <nlohmann/json.hpp>
#include <optional>
#include <vector>

#include "base/host_log.hpp"
#include "report_format/facts_file.hpp"
#include "run/old_reports.hpp"
#include "run/run_paths.hpp"
#include "vorn/paths.h"

namespace host {
namespace {

using Json = nlohmann::ordered_json;
using report_format::Facts;

constexpr const char* kIndex = "index.html";
constexpr const char* kLatest = "latest";
constexpr const char* kNewLatest = ".latest.new";

// --- What stands there ---------------------------------------------------------------------------

enum class Standing { nothing, ours, foreign };

Standing index_standing(const Fd& folder) {
  constexpr std::size_t kHead = 4096;
  const Fd file = open_regular(folder.get(), kIndex);
  if (!file) {
    return errno == ENOENT ? Standing::nothing : Standing::foreign;
  }
  const auto head = read_start(file.get(), kHead);
  // As the template script marks it.
  return head && head->find(R"(<meta name="generator" content="vornreport index">)") != head->npos
             ? Standing::ours
             : Standing::foreign;
}

Standing latest_standing(const Fd& folder) {
  char target[256];
  const ssize_t length = readlinkat(folder.get(), kLatest, target, sizeof target);
  if (length < 0) {
    return errno == ENOENT ? Standing::nothing : Standing::foreign;
  }
  return is_report_name({target, static_cast<std::size_t>(length)}) ? Standing::ours
                                                                    : Standing::foreign;
}

// --- The data of the page ------------------------------------------------------------------------

std::optional<Facts> facts_in(const Fd& folder, const std::string& name) {
  constexpr std::size_t kMostVolumes = 100;
  const Fd report(
      openat(folder.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  auto facts = report ? report_format::read_facts(report.get()) : std::nullopt;
  if (facts) {
    facts->volumes.resize(std::min(facts->volumes.size(), kMostVolumes));
  }
  return facts;
}

using Used = std::map<std::string, std::uint64_t>;  // by the volume's path

// What the volumes hold together, and how that of those has changed which `before` has, too.
void add_figures(Json& row, const Facts& facts, Used& before) {
  Used used;
  std::uint64_t sum = 0;
  std::optional<std::uint64_t> grown;  // modulo 2^64
  for (const report_format::VolumeFacts& volume : facts.volumes) {
    sum += volume.used;
    if (used.emplace(volume.path, volume.used).second && before.contains(volume.path)) {
      grown = grown.value_or(0) + volume.used - before[volume.path];
    }
  }
  row["level"] = report_format::word_of(report_format::worst_level(facts));
  row["complete"] = facts.complete;
  row["used"] = sum;
  if (grown) {
    row["grown"] = static_cast<std::int64_t>(*grown);
  }
  before = std::move(used);
}

// The volumes of the newest report, with a sample of each report: time, used, size.
Json volumes_of(Facts newest, const std::map<std::string, Json>& samples) {
  Facts shown;
  shown.volumes = std::move(newest.volumes);
  for (report_format::VolumeFacts& volume : shown.volumes) {
    volume.samples.clear();
    volume.filled_by.reset();
    volume.grown_by.reset();
  }
  Json volumes = report_format::to_json(shown)["volumes"];
  for (Json& volume : volumes) {
    volume["samples"] = samples.at(volume["path"].get<std::string>());
  }
  return volumes;
}

std::string data_of(const Fd& folder, const std::string& profile,
                    const std::vector<StoredReport>& reports) {
  constexpr std::size_t kMostRead = 1000;  // so that years of hourly reports don't cost minutes
  Json rows = Json::array();
  std::map<std::string, Json> samples;  // by the volume's path
  std::optional<Facts> newest;
  Used before;
  for (std::size_t i = 0; i < reports.size(); ++i) {
    const StoredReport& report = reports[i];
    Json row{{"name", report.name}, {"made", report.made}};
    if (auto facts =
            i + kMostRead < reports.size() ? std::nullopt : facts_in(folder, report.name)) {
      add_figures(row, *facts, before);
      for (const report_format::VolumeFacts& volume : facts->volumes) {
        samples[volume.path].push_back(Json::array({report.made, volume.used, volume.size}));
      }
      newest = std::move(facts);
    }
    rows.push_back(std::move(row));
  }
  Json data{{"profile", profile}, {"reports", std::move(rows)}, {"volumes", Json::array()}};
  if (newest) {
    data["host"] = newest->host;
    data["time_zone"] = newest->time_zone;
    data["language"] = newest->language;
    data["volumes"] = volumes_of(std::move(*newest), samples);
  }
  return report_format::line_of(data);
}

// --- Writing -------------------------------------------------------------------------------------

// Has the template script write the page around `data`. False with errno.
bool put_together(const std::string& data, int page) {
  const Fd input(memfd_create("reports", MFD_CLOEXEC));
  if (!input || !write_all(input.get(), data) || lseek(input.get(), 0, SEEK_SET) != 0) {
    return false;
  }
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, input.get(), STDIN_FILENO);
  posix_spawn_file_actions_adddup2(&actions, page, STDOUT_FILENO);
  posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  char script[] = VORN_PATH_TEMPLATE_SCRIPT;
  char command[] = "index";
  char* arguments[] = {script, command, nullptr};
  pid_t child = -1;
  const int failure = posix_spawn(&child, script, &actions, nullptr, arguments, environ);
  posix_spawn_file_actions_destroy(&actions);
  if (failure != 0) {
    errno = failure;
    return false;
  }
  int status = 0;
  while (waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) {
      return false;
    }
  }
  errno = EIO;  // what the script complains of is nearly always that
  return status == 0;
}

bool write_index(const Fd& folder, const std::string& data) {
  constexpr mode_t kMode = 0640;  // as the reports
  const std::string path = "/proc/self/fd/" + std::to_string(folder.get()) + "/" + kIndex;
  AtomicFile::remove_leftovers(path);
  AtomicFile file(path);
  return file.fd() >= 0 && fchmod(file.fd(), kMode) == 0 && put_together(data, file.fd()) &&
         file.commit();
}

// `newest` is empty when there is no report to lead to.
bool point_latest(const Fd& folder, const std::string& newest) {
  if (newest.empty()) {
    return unlinkat(folder.get(), kLatest, 0) == 0 || errno == ENOENT;
  }
  unlinkat(folder.get(), kNewLatest, 0);
  return symlinkat(newest.c_str(), folder.get(), kNewLatest) == 0 &&
         renameat(folder.get(), kNewLatest, folder.get(), kLatest) == 0;
}

// A run and vornctl may do this at the same time, and who has looked first must not write last. But
// readers of the folder can lock it as well, so nobody is waited for without end.
void await_turn(const Fd& folder) {
  constexpr int kTurns = 20;
  constexpr useconds_t kTurn = 100'000;
  for (int i = 0; i < kTurns && flock(folder.get(), LOCK_EX | LOCK_NB) != 0; ++i) {
    usleep(kTurn);
  }
}

void tell_foreign(const std::string& folder, const char* name) {
  log_line("%s/%s is none of vornreport's, so it stays; move it away to have one", folder.c_str(),
           name);
}

void tell_failed(const std::string& folder, const char* name, const char* why) {
  log_line("%s/%s can't be written (%s); see to the space and the installed template",
           folder.c_str(), name, why);
}

void update(const std::string& folder, const std::string& profile) {
  const Fd opened = open_report_folder(folder);
  if (!opened) {
    return;
  }
  await_turn(opened);
  std::vector<StoredReport> reports = list_reports(opened, ReportSize::left_out);
  std::erase_if(reports, [](const StoredReport& report) { return !report.is_whole; });
  if (latest_standing(opened) == Standing::foreign) {
    tell_foreign(folder, kLatest);
  } else if (!point_latest(opened, reports.empty() ? "" : reports.back().name)) {
    tell_failed(folder, kLatest, std::strerror(errno));
  }
  if (index_standing(opened) == Standing::foreign) {
    tell_foreign(folder, kIndex);
  } else if (!write_index(opened, data_of(opened, profile, reports))) {
    tell_failed(folder, kIndex, std::strerror(errno));
  }
}

}  // namespace

void update_index(const std::string& folder, const std::string& profile) noexcept {
  const ErrnoKeeper keeper;
  try {
    update(folder, profile);
  } catch (const std::exception& error) {
    tell_failed(folder, kIndex, error.what());
  }
}

void remove_index(const Fd& folder) {
  const ErrnoKeeper keeper;
  if (latest_standing(folder) == Standing::ours) {
    unlinkat(folder.get(), kLatest, 0);
  }
  if (index_standing(folder) == Standing::ours) {
    unlinkat(folder.get(), kIndex, 0);
  }
}

}  // namespace host
