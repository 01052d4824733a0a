#include "rep_growth.hpp"

#include <array>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "db_snapshots.hpp"
#include "facts/growth_facts.hpp"
#include "facts/owner_names.hpp"
#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "listed_report.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

constexpr std::array kColumns{kName, kName, kName, kName, kName, kName};
// Of each since and kind the greatest of all servers, in the order of greatest_changes().
constexpr char kOverFleet[] =
    "select value[1], value[2], concat(server, ':', value[3]), value[4], value[5], value[6] "
    "from (select server, profile, position, value, "
    "indexOf(['last', 'week', 'month'], value[1]) as since, "
    "indexOf(['share', 'owner', 'type', 'folder'], replaceOne(value[2], '_at_least', '')) "
    "as kind, abs(toInt64OrZero(value[6])) as bytes, abs(toInt64OrZero(value[5])) as files "
    "from report_row where {runs} and report = 'growth' "
    "order by since, kind, bytes desc, files desc, server, profile, position "
    "limit 200 by since, kind) "
    "order by since, kind, bytes desc, files desc, server, profile, position";
constexpr ListedReport kReport{.format = report_format::kGrowth,
                               .module = "src/rep_growth",
                               .csv_header = "Since\tKind\tShare\tName\tFile Count\tSize(Byte)",
                               .columns = kColumns,
                               .fleet_sql = kOverFleet};

// An account may have gone, or been left out of the profile, since the set was made.
void forget_owners(Snapshot& set, const VLIBCSzHash* users) {
  for (SnapshotShare& share : set.shares) {
    for (SnapshotPart& part : share.parts) {
      std::erase_if(part.owners, [&](const auto& owner) {
        return !run_facts().may_tell(owner.first) ||
               VLIBCSzHashGetValue(users, owner.first.c_str()) == nullptr;
      });
    }
  }
}

void add_since(Growth& growth, const char* since, std::optional<int64_t> time, const Snapshot& now,
               const ReportArgs& args) {
  if (!time) {
    return;
  }
  if (!growth.empty() && growth.back().time == *time) {  // as of a report that runs once a week
    growth.push_back({since, *time, growth.back().changes});
    return;
  }
  if (std::optional<Snapshot> then = SnapshotRead(args.profile, *time)) {
    forget_owners(*then, args.user_hash);
    growth.push_back({since, *time, changes_between(*then, now)});
  }
}

// Nothing when the snapshots can't be read.
std::optional<Growth> compare(const ReportArgs& args, const char* report_list) {
  const auto times = SnapshotTimes(args.profile);
  if (!times) {
    return std::nullopt;
  }
  if (report_format::is_selected(report_format::kFileOwner.name, report_list)) {
    note_owner_names(args.user_hash);
  }
  const Snapshot now = take_snapshot(run_facts(), tallies(), report_list);
  const GrowthBases bases = growth_bases(*times, now.time);
  Growth growth;
  add_since(growth, "last", bases.last, now, args);
  add_since(growth, "week", bases.week, now, args);
  add_since(growth, "month", bases.month, now, args);
  return growth;
}

std::vector<ListedRow> rows_of(const Growth& growth) {
  std::vector<ListedRow> rows;
  for (const GrowthSince& since : growth) {
    for (const Change& change : greatest_changes(since)) {
      rows.push_back({since.since, word_of(change.kind), change.share, change.name,
                      std::to_string(change.files), std::to_string(change.bytes)});
    }
  }
  return rows;
}

}  // namespace

int32_t growth(ReportArgs* args) {
  if (args != nullptr && args->fleet != nullptr) {
    return run_fleet_report(kReport, args);
  }
  const char* report_list =
      args_are_complete(args) ? set_value(args->profile_hash, "report_list") : nullptr;
  if (report_list == nullptr) {
    REPORT_LOG_ERR_NESTED(kReport.module, __LINE__, "Bad Parameter");
    return -1;
  }
  // Without the snapshots the page and the CSV file have no rows, and the report has failed.
  std::optional<Growth> found = compare(*args, report_list);
  const int32_t result = run_listed_report(kReport, args, rows_of(found.value_or(Growth())));
  run_facts().growth = std::move(found);
  return run_facts().growth ? result : -1;
}

}  // namespace vornreport
