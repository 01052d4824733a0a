// What reports read: the shares' folders and the quotas.
#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>

#include "doctor/doctor.hpp"
#include "report_format/reports.hpp"

namespace ctl {
namespace {

constexpr std::chrono::seconds kFolderLimit{10};

// What is wrong with the folder of a share and what to do; empty when a run can read it.
std::string folder_problem(const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) {
    return path + " can't be found (" + std::strerror(errno) + "); mount it or correct its path";
  }
  if (!S_ISDIR(status.st_mode)) {
    return path + " is no folder; correct its path";
  }
  const auto close = [](DIR* dir) { closedir(dir); };
  const std::unique_ptr<DIR, decltype(close)> dir(opendir(path.c_str()));
  if (!dir || (errno = 0, readdir(dir.get()) == nullptr && errno != 0)) {
    return path + " can't be read (" + std::strerror(errno) + "); see to its file system";
  }
  return {};
}

// Whether runs walk what lies there; asked for after the folder has answered.
std::string kind_problem(const Share& share) {
  const auto found = admin::file_system_of(share.path);
  if (!found || found->is_walked) {
    return {};
  }
  if (found->is_remote) {
    return share.network ? ""
                         : share.path + " is a network file system (" + found->type +
                               "), which is left out; write network = yes into its section";
  }
  return share.path + " is on a file system that is not walked (" + found->type +
         "); give the folder of one that is";
}

}  // namespace

void check_shares(Findings& findings, const Configuration& configuration) {
  for (const Share& share : configuration.shares) {
    if (share.path.empty()) {
      continue;  // has its finding
    }
    const std::string subject = "share " + share.name;
    const auto answer = answer_within(kFolderLimit, [&] {
      const std::string problem = folder_problem(share.path);
      return problem.empty() ? kind_problem(share) : problem;
    });
    if (!answer) {
      findings.add(Level::error, subject, share.path + " does not answer",
                   "see to the server that it is mounted from");
    } else if (!answer->empty()) {
      findings.add(Level::error, subject, *answer);
    } else {
      findings.ok(subject, share.path);
    }
    if (!share.file_index.empty() && access(share.file_index.c_str(), R_OK) != 0) {
      findings.add(Level::warning, subject,
                   "its file index " + share.file_index + " can't be read (" +
                       std::strerror(errno) + "), so it is walked",
                   "correct file_index");
    }
  }
}

void check_quota_tool(Findings& findings, const Configuration& configuration) {
  constexpr const char* kTool = "/sbin/repquota";
  const auto wants = [](const Section& profile) {
    return report_format::is_selected(report_format::kQuotaUsage.name,
                                      profile.value("report_list"));
  };
  const auto profile =
      std::find_if(configuration.profiles.begin(), configuration.profiles.end(), wants);
  if (profile == configuration.profiles.end()) {
    return;
  }
  if (access(kTool, X_OK) == 0) {
    findings.ok("quota tool", kTool);
  } else {
    findings.add(Level::error, "quota tool",
                 std::string(kTool) + ", which the report quota_usage of profile " + profile->name +
                     " needs, can't be run (" + std::strerror(errno) + ")",
                 "install the package quota");
  }
}

}  // namespace ctl
