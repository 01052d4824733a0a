#include "base/stored_reports.hpp"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "base/ctl.hpp"
#include "base/texts.hpp"

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

const admin::StoredReport& find_report(const std::string& profile, const Reports& reports,
                                       const std::string& date) {
  const admin::StoredReport* found = nullptr;
  for (const admin::StoredReport& report : reports) {
    if (report.is_whole && report.name.starts_with(date) &&
        (found == nullptr || found->name != date)) {
      found = &report;
    }
  }
  if (found != nullptr) {
    return *found;
  }
  throw Failure("profile " + profile + " has no complete report" +
                (date.empty() ? "" : " of " + date) + "; see vornctl reports " + profile);
}

std::optional<report_format::Facts> facts_of(const admin::StoredReport& report) {
  return report_format::read_facts(report.page.substr(0, report.page.rfind('/')));
}

const char* level_of(const report_format::Facts& facts) {
  return report_format::word_of(report_format::worst_level(facts));
}

nlohmann::ordered_json json_of(const admin::StoredReport& report,
                               const std::optional<report_format::Facts>& facts) {
  nlohmann::ordered_json json{
      {"name", report.name},  {"path", report.page},      {"made", json_time(report.made)},
      {"bytes", report.size}, {"whole", report.is_whole}, {"complete", nullptr},
      {"level", nullptr},     {"incidents", nullptr}};
  if (facts) {
    json["complete"] = facts->complete;
    json["level"] = level_of(*facts);
    json["incidents"] = report_format::to_json(*facts)["incidents"];
  }
  return json;
}

std::optional<admin::StoredReport> newest_whole(const Reports& reports) {
  const auto newest = std::find_if(reports.rbegin(), reports.rend(),
                                   [](const auto& report) { return report.is_whole; });
  return newest == reports.rend() ? std::nullopt : std::optional(*newest);
}

}  // namespace ctl
