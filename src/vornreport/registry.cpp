// How to add a report:
//   1. Write src/rep_<name>.cpp: a StatisticsReport record and its report function (or, for one
//      that doesn't read the statistics database, a report function of its own).
//   2. Add its line to kRegistry below, at the place it shall have on the page.
//   3. Add its section to the page: one entry in the table of reportUI/template/report.js, and
//      its texts in reportUI/template/lang/.
#include "vornreport/registry.hpp"

#include <array>
#include <cstring>
#include <string_view>

#include "rep_duplicate_file/duplicate_file.hpp"
#include "rep_file_group.hpp"
#include "rep_file_owner.hpp"
#include "rep_large_file.hpp"
#include "rep_modify_time.hpp"
#include "rep_quota_usage.hpp"
#include "rep_share_list.hpp"
#include "rep_volume_usage.hpp"

namespace vornreport {
namespace {

constexpr std::array<ReportEntry, 9> kRegistry{{
    {"quota_usage", ReportSource::kSystem, quota_usage, nullptr},
    {"file_owner", ReportSource::kStatistics, file_owner_db, nullptr},
    {"volume_usage", ReportSource::kSystem, volume_usage, volume_usage_collect_data},
    {"share_list", ReportSource::kStatistics, share_list_db, nullptr},
    {"file_group", ReportSource::kStatistics, file_group_db, nullptr},
    {"duplicate_file", ReportSource::kStatistics, duplicate_file, nullptr},
    {"large_file", ReportSource::kStatistics, large_file_db, nullptr},
    {"least_modify", ReportSource::kStatistics, least_modify_db, nullptr},
    {"most_modify", ReportSource::kStatistics, most_modify_db, nullptr},
}};

// Selection looks for a name anywhere in the list, so a name inside another would be selected with
// it.
constexpr bool names_stand_apart() {
  for (const ReportEntry& outer : kRegistry) {
    for (const ReportEntry& inner : kRegistry) {
      const std::string_view name(inner.name);
      if (name.empty() ||
          (&outer != &inner && std::string_view(outer.name).find(name) != std::string_view::npos)) {
        return false;
      }
    }
  }
  return true;
}
static_assert(names_stand_apart());

}  // namespace

std::span<const ReportEntry> report_registry() {
  return kRegistry;
}

bool is_selected(const ReportEntry& entry, const char* report_list) {
  return std::strstr(report_list, entry.name) != nullptr;
}

}  // namespace vornreport
