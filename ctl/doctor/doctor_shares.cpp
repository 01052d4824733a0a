// What reports read: the shares' folders and the quotas.
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "base/ctl.hpp"
#include "config/checks.hpp"
#include "config/share_state.hpp"
#include "doctor/doctor.hpp"
#include "report_format/reports.hpp"

namespace ctl {
void check_shares(Findings& findings, const Configuration& configuration) {
  ShareStates seen;
  for (const Share& share : configuration.shares) {
    if (share.path.empty()) {
      continue;  // has its finding
    }
    const std::string subject = "share " + share.name;
    ShareState state = state_of(share);
    if (!state.problem.empty()) {
      findings.add(Level::error, subject, state.problem);
    } else {
      findings.ok(subject, share.path);
    }
    for (const std::string& other : overlapping(share.name, state, seen)) {
      findings.add(Level::warning, subject, overlap_warning(other, share.name));
    }
    seen.emplace_back(share.name, std::move(state));
    if (!share.file_index.empty() && access(share.file_index.c_str(), R_OK) != 0) {
      findings.add(Level::warning, subject,
                   "its file index " + share.file_index + " can't be read (" +
                       std::strerror(errno) + "), so it is walked",
                   "run vornctl share set " + shell_word(share.name) + " --file-index DATABASE");
    }
  }
}

namespace {

// Without quotas the report quota_usage of `profile` is an error in the log each time.
void check_quotas(Findings& findings, const Section& profile) {
  std::string others;
  for (const std::string& name : report_names()) {
    if (name != report_format::kQuotaUsage.name &&
        report_format::is_selected(name, profile.value("report_list"))) {
      others += (others.empty() ? "" : ",") + name;
    }
  }
  if (!any_quotas()) {
    findings.add(Level::warning, "quotas",
                 "no volume has any, so the report quota_usage of profile " + profile.name +
                     " comes to nothing",
                 "turn quotas on, or run vornctl profile set " + profile.name + " report_list " +
                     (others.empty() ? "REPORTS" : others));
  }
}

}  // namespace

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
    check_quotas(findings, *profile);
  } else {
    findings.add(Level::error, "quota tool",
                 std::string(kTool) + ", which the report quota_usage of profile " + profile->name +
                     " needs, can't be run (" + std::strerror(errno) + ")",
                 "install the package quota");
  }
}

}  // namespace ctl
