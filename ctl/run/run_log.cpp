#include "run/run_log.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <ctime>
#include <fstream>
#include <optional>
#include <string_view>
#include <thread>

#include "base/ask_program.hpp"
#include "vorn/base/file_io.hpp"

namespace ctl {
namespace {

constexpr const char* kJournalctl = "/usr/bin/journalctl";
constexpr std::array kLogFiles{"/var/log/syslog", "/var/log/messages"};
constexpr std::string_view kTag = " vornreport: ";
constexpr std::size_t kKept = 5;
constexpr int kTries = 10;
constexpr std::chrono::milliseconds kPause{100};

std::vector<std::string> lines_of(std::string_view text) {
  std::vector<std::string> lines;
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t end = std::min(text.find('\n', start), text.size());
    if (end > start) {
      lines.emplace_back(text.substr(start, end - start));
    }
    start = end + 1;
  }
  return lines;
}

std::string journal_of(pid_t pid) {
  constexpr std::chrono::seconds kLimit{5};
  const auto read = ask_program({kJournalctl, "--quiet", "--no-pager", "--output=cat", "--lines=5",
                                 "_PID=" + std::to_string(pid)},
                                kLimit);
  return read && read->status == 0 ? read->out : "";
}

bool has_journal() {
  return access("/run/systemd/journal/socket", F_OK) == 0 && access(kJournalctl, X_OK) == 0;
}

// The time that a line of a log file begins with: "2026-11-21T06:00:00.123+01:00", or "Nov 21
// 06:00:00", which is of this year unless that would be ahead.
std::optional<std::time_t> time_of(const std::string& line, std::time_t now) {
  constexpr std::time_t kDay = 86400;
  std::tm read{};
  if (const char* end = strptime(line.c_str(), "%Y-%m-%dT%H:%M:%S", &read)) {
    while (*end == '.' || (*end >= '0' && *end <= '9')) {
      ++end;
    }
    std::tm zone{};
    return strptime(end, "%z", &zone) == nullptr ? std::optional<std::time_t>()
                                                 : timegm(&read) - zone.tm_gmtoff;
  }
  std::tm local{};
  localtime_r(&now, &local);
  for (const int year : {local.tm_year, local.tm_year - 1}) {
    read = {};
    if (strptime(line.c_str(), "%b %d %H:%M:%S", &read) == nullptr) {
      return std::nullopt;
    }
    read.tm_year = year;
    read.tm_isdst = -1;
    if (const std::time_t time = mktime(&read); time <= now + kDay) {
      return time;
    }
  }
  return std::nullopt;
}

// Those of the time between, each included.
RunLines lines_between(std::time_t start, std::time_t end) {
  RunLines found;
  const std::time_t now = std::time(nullptr);
  for (const char* file : kLogFiles) {
    for (const char* rotated : {".1", ""}) {
      std::ifstream stream(std::string(file) + rotated);
      found.is_read = found.is_read || stream.is_open();
      for (std::string line; std::getline(stream, line);) {
        const bool is_ours = line.find(kTag) != std::string::npos;
        const auto time = is_ours ? time_of(line, now) : std::nullopt;
        if (time && *time >= start && *time <= end) {
          found.lines.push_back(line);
        }
      }
    }
  }
  return found;
}

std::string text_behind(const std::string& file, off_t start) {
  constexpr std::size_t kLongest = 1U << 20U;
  const host::Fd fd(open(file.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  std::string text(kLongest, '\0');
  const ssize_t got = fd ? pread(fd.get(), text.data(), text.size(), start) : 0;
  text.resize(static_cast<std::size_t>(std::max<ssize_t>(got, 0)));
  return text;
}

}  // namespace

RunLines lines_of_run(const admin::RunTrace& trace) {
  if (!has_journal()) {
    constexpr std::time_t kLastWords = 2;  // what it says once its status is written
    return lines_between(trace.started,
                         trace.ended ? *trace.ended + kLastWords : std::time(nullptr));
  }
  // Of a timer's run the journal has standard error as well, which says the same again.
  const auto read = ask_program({kJournalctl, "--quiet", "--no-pager", "--output=short-iso",
                                 "--since=@" + std::to_string(trace.started), "_TRANSPORT=syslog",
                                 "_PID=" + std::to_string(trace.process)});
  return {read && read->status == 0, lines_of(read ? read->out : "")};
}

RunLog::RunLog() : is_journal_(has_journal()) {
  struct stat status {};
  for (const char* file : kLogFiles) {
    if (file_.empty() && stat(file, &status) == 0 && S_ISREG(status.st_mode)) {
      file_ = file;
      end_ = status.st_size;
    }
  }
}

std::vector<std::string> RunLog::messages(pid_t pid) const {
  std::vector<std::string> found;
  for (int i = 0; i < kTries && found.empty() && (is_journal_ || !file_.empty()); ++i) {
    std::this_thread::sleep_for(kPause);
    if (is_journal_) {
      found = lines_of(journal_of(pid));
      continue;
    }
    for (const std::string& line : lines_of(text_behind(file_, end_))) {
      if (const std::size_t tag = line.find(kTag); tag != std::string::npos) {
        found.push_back(line.substr(tag + kTag.size()));
      }
    }
  }
  found.erase(found.begin(), found.end() - static_cast<long>(std::min(found.size(), kKept)));
  return found;
}

}  // namespace ctl
