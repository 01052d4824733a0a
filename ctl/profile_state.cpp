#include "profile_state.hpp"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iomanip>
#include <sstream>

#include "ctl.hpp"
#include "file_io.hpp"
#include "run_lock.hpp"
#include "run_paths.hpp"
#include "text_containers.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

constexpr std::size_t kLargestStatus = 4096;
constexpr std::size_t kLargestCsv = 1U << 20U;

std::string local_text(const char* format, std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  std::ostringstream text;
  text << std::put_time(&local, format);
  return text.str();
}

// The field of a CSV line that ends at `end`, its quotes taken off; `end` moves before it. Read
// from the back, because the first field is a mount path, which may hold anything.
std::string last_field(const std::string& line, std::size_t& end) {
  const std::size_t close = end == 0 ? std::string::npos : line.rfind('"', end - 1);
  const std::size_t open =
      close == std::string::npos || close == 0 ? std::string::npos : line.rfind('"', close - 1);
  if (open == std::string::npos) {
    end = 0;
    return {};
  }
  end = open;
  return line.substr(open + 1, close - open - 1);
}

std::optional<FullestVolume> read_volume(const std::string& line) {
  FullestVolume volume;
  std::size_t end = line.size();
  volume.days = last_field(line, end);
  volume.percent = last_field(line, end);
  last_field(line, end);  // the size
  const std::size_t open = line.find('"');
  const std::size_t close = end == 0 ? 0 : line.rfind('"', end - 1);
  if (!volume.percent.ends_with('%') || open == std::string::npos || open >= close) {
    return std::nullopt;
  }
  volume.volume = line.substr(open + 1, close - open - 1);
  volume.percent.pop_back();
  // Also what stands for "no estimate": the history was not asked for, or shows no growth.
  if (volume.days == "-" || volume.days == "0") {
    volume.days.clear();
  }
  return volume;
}

}  // namespace

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
  for (auto report = reports.rbegin(); report != reports.rend(); ++report) {
    if (report->is_whole) {
      return *report;
    }
  }
  return std::nullopt;
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
  return word == "collect_data" ? RunState::ended_early : RunState::failed;
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

std::optional<FullestVolume> fullest_volume(const std::string& folder) {
  const auto text = host::read_file(folder + "/csv/volume_usage.csv", kLargestCsv);
  std::optional<FullestVolume> fullest;
  const auto used = [](const FullestVolume& volume) {
    return std::strtod(volume.percent.c_str(), nullptr);
  };
  for (std::size_t start = 0; text && start < text->size();) {
    const std::size_t end = std::min(text->find('\n', start), text->size());
    const auto volume = read_volume(text->substr(start, end - start));
    if (volume && (!fullest || used(*volume) > used(*fullest))) {
      fullest = volume;
    }
    start = end + 1;
  }
  return fullest;
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
