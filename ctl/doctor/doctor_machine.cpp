// What the machine around the product gives: mail server, disk space, clock.
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <set>

#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "doctor/doctor.hpp"
#include "vorn/admin/mail.hpp"
#include "vorn/admin/messages.hpp"
#include "vorn/paths.h"

namespace ctl {
// --- Mail ---------------------------------------------------------------------------------------

void check_mail(Findings& findings, const Configuration& configuration) {
  std::set<std::pair<std::string, bool>> asked;
  for (const Section& profile : configuration.profiles) {
    const std::string url = admin::mail_server_of(profile);
    const bool has_user = !profile.value("smtp_user").empty();
    if (profile.value("mail_to").empty() || !asked.insert({url, has_user}).second) {
      continue;
    }
    const std::string subject = "mail server " + url;
    if (const std::string problem = admin::mail_server_problem(profile); problem.empty()) {
      findings.ok(subject, "it answers");
    } else {
      findings.add(Level::error, subject, problem,
                   "start it, or run vornctl profile set " + profile.name + " smtp_url URL");
    }
  }
}

// --- Space --------------------------------------------------------------------------------------

namespace {

constexpr std::uint64_t kLeast = std::uint64_t{16} << 20U;  // of any run, in bytes

struct Need {
  std::string place;        // the first that lies on this file system
  std::uint64_t known = 0;  // what the last runs took
  std::uint64_t guessed = 0;
};
using Needs = std::map<dev_t, Need>;

// `folder` itself or what stands above it and exists.
std::filesystem::path existing(std::filesystem::path folder) {
  std::error_code error;
  while (folder.has_relative_path() && !std::filesystem::exists(folder, error)) {
    folder = folder.parent_path();
  }
  return folder;
}

void add_need(Needs& needs, const std::string& folder, std::uint64_t known, std::uint64_t guessed) {
  struct stat status {};
  const std::string path = existing(folder);
  if (stat(path.c_str(), &status) != 0) {
    return;
  }
  Need& need = needs[status.st_dev];
  need.place = need.place.empty() ? path : need.place;
  need.known += known;
  need.guessed += guessed;
}

// A run has one row for each file of its shares; it can't be more files than their file systems
// hold.
std::uint64_t guess_statistics(const Configuration& configuration) {
  constexpr std::uint64_t kBytesPerFile = 250;  // with a path of usual length
  std::set<unsigned long> counted;
  std::uint64_t files = 0;
  for (const Share& share : configuration.shares) {
    struct statvfs measured {};
    if (!share.path.empty() && statvfs(share.path.c_str(), &measured) == 0 &&
        counted.insert(measured.f_fsid).second) {
      files += measured.f_files - std::min(measured.f_ffree, measured.f_files);
    }
  }
  return files * kBytesPerFile;
}

Needs collect_needs(const Configuration& configuration) {
  Needs needs;
  std::uint64_t largest_page = 0;
  for (const Section& profile : configuration.profiles) {
    try {
      const std::string folder = folder_of_reports(profile);
      const auto last = newest_whole(reports_in(folder, ReportSize::measured));
      add_need(needs, folder, last ? last->size : 0, 0);
      if (last) {
        struct stat page {};
        largest_page = stat(last->page.c_str(), &page) != 0
                           ? largest_page
                           : std::max(largest_page, static_cast<std::uint64_t>(page.st_size));
      }
    } catch (const Failure& failure) {
      // The next run would end at this, too.
      admin::take_messages();
    }
  }
  add_need(needs, "/tmp", largest_page, 0);
  add_need(needs, VORN_PATH_STAT, 0, guess_statistics(configuration));
  add_need(needs, VORN_PATH_HISTORY_DB, 0, 0);
  return needs;
}

}  // namespace

void check_space(Findings& findings, const Configuration& configuration) {
  for (const auto& [device, need] : collect_needs(configuration)) {
    struct statvfs measured {};
    const std::string subject = "space of " + need.place;
    if (statvfs(need.place.c_str(), &measured) != 0) {
      findings.add(Level::error, subject, std::strerror(errno), "see to its file system");
      continue;
    }
    const std::uint64_t free = std::uint64_t{measured.f_bavail} * measured.f_frsize;
    const std::string is_free = size_text(free) + " free";
    if (free < need.known + kLeast) {
      findings.add(Level::error, subject,
                   is_free + ", the next runs need " + size_text(need.known + kLeast),
                   "free some space");
    } else if (free < need.known + need.guessed + kLeast) {
      findings.add(
          Level::warning, subject,
          is_free + ", the next runs need up to " + size_text(need.known + need.guessed + kLeast),
          "free some space");
    } else {
      findings.ok(subject, is_free);
    }
  }
}

// --- Clock --------------------------------------------------------------------------------------

void check_clock(Findings& findings) {
  constexpr int kFirstYear = 2024;
  constexpr int kLastYear = 2100;
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  const int year = local.tm_year + 1900;
  if (year >= kFirstYear && year < kLastYear) {
    findings.ok("clock", time_text(now));
  } else {
    findings.add(Level::error, "clock", "it says " + time_text(now),
                 "set it, reports are named and compared by it");
  }
  std::ifstream zone("/etc/localtime", std::ios::binary);
  char magic[4] = "";
  if (!zone) {
    findings.add(Level::warning, "time zone", "/etc/localtime is missing, so times are UTC",
                 "set it with timedatectl set-timezone");
  } else if (!zone.read(magic, sizeof magic) || std::memcmp(magic, "TZif", sizeof magic) != 0) {
    findings.add(Level::warning, "time zone", "/etc/localtime is no time zone, so times are UTC",
                 "set it with timedatectl set-timezone");
  } else {
    findings.ok("time zone", local.tm_zone);
  }
}

}  // namespace ctl
