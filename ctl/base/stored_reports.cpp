#include "base/stored_reports.hpp"

#include <algorithm>

#include "base/ctl.hpp"

namespace ctl {

std::string folder_of_reports(const admin::Section& profile) {
  const std::optional<std::string> folder = admin::report_folder(profile);
  if (!folder) {
    throw host_failure("report_dir of profile " + profile.name + " can't be worked with");
  }
  return *folder;
}

Reports reports_in(const std::string& folder, ReportSize size) {
  std::optional<Reports> reports = admin::stored_reports(folder, size);
  if (!reports) {
    throw host_failure(folder + " can't be read");
  }
  return std::move(*reports);
}

std::optional<report_format::Facts> facts_of(const admin::StoredReport& report) {
  return report_format::read_facts(report.page.substr(0, report.page.rfind('/')));
}

std::optional<admin::StoredReport> newest_whole(const Reports& reports) {
  const auto newest = std::find_if(reports.rbegin(), reports.rend(),
                                   [](const auto& report) { return report.is_whole; });
  return newest == reports.rend() ? std::nullopt : std::optional(*newest);
}

}  // namespace ctl
