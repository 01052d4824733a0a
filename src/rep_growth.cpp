#include "rep_growth.hpp"

#include <algorithm>
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
#include "report_format/reports.hpp"
#include "report_frame.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/rep_growth";
constexpr char kHeader[] = "Since\tKind\tShare\tName\tFile Count\tSize(Byte)";

using Row = std::array<std::string, report_format::kGrowth.columns>;

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

std::vector<Row> rows_of(const Growth& growth) {
  std::vector<Row> rows;
  for (const GrowthSince& since : growth) {
    for (const Change& change : greatest_changes(since)) {
      rows.push_back({since.since, word_of(change.kind), change.share, change.name,
                      std::to_string(change.files), std::to_string(change.bytes)});
    }
  }
  return rows;
}

// In the form of the reports over the statistics database.
void write_data(FILE* data, const std::vector<Row>& rows) {
  if (!rows.empty()) {
    std::fprintf(data, "<script type='text/javascript'>\nvar %s = [\n",
                 report_format::kGrowth.variable);
  }
  const char* between_rows = "";
  for (const Row& row : rows) {
    std::fputs(std::exchange(between_rows, ",\n"), data);
    const char* before = "[ '";
    for (const std::string& value : row) {
      std::fputs(std::exchange(before, ", '"), data);
      write_data_text(data, ColumnText::kEscaped, value.c_str(), kModule);
      std::fputc('\'', data);
    }
    std::fputs(" ]", data);
  }
  std::fputs(rows.empty() ? "</script>\n" : "\n];\n</script>\n", data);
}

void write_csv(FILE* csv, const std::vector<Row>& rows) {
  std::fprintf(csv, "%s\n", kHeader);
  for (const Row& row : rows) {
    const char* before = "\"";
    for (const std::string& value : row) {
      std::fputs(std::exchange(before, "\t\""), csv);
      write_csv_text(csv, ColumnText::kField, value.c_str(), kModule);
      std::fputc('"', csv);
    }
    std::fputc('\n', csv);
  }
}

int32_t write_rows(const std::vector<Row>& rows, const char* csv_dir) {
  const PathText data_path = report_data_path();
  PathText csv_path;
  csv_path.format("%s/%s.csv", csv_dir, report_format::kGrowth.name);
  FileHandle data = open_report_file(data_path.c_str(), "a", kModule, __LINE__);
  FileHandle csv =
      open_report_file(csv_path.c_str(), "a", kModule, __LINE__, LogForm::kNested, Costs::kReport);
  if (!data || !csv) {
    return -1;
  }
  write_data(data.get(), rows);
  write_csv(csv.get(), rows);
  run_facts().rows[report_format::kGrowth.name] = {rows.size(), rows.size()};
  const bool data_kept = close_report_file(std::move(data), data_path.c_str(), kModule, __LINE__);
  const bool csv_kept =
      close_report_file(std::move(csv), csv_path.c_str(), kModule, __LINE__, Costs::kReport);
  if (!data_kept || !csv_kept) {
    return -1;
  }
  finish_csv(report_format::kGrowth, csv_path.c_str());
  return 0;
}

}  // namespace

int32_t growth(ReportArgs* args) {
  const char* csv_dir =
      args_are_complete(args) ? set_value(args->profile_hash, "real_path_csv") : nullptr;
  const char* report_list =
      csv_dir != nullptr ? set_value(args->profile_hash, "report_list") : nullptr;
  if (report_list == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "Bad Parameter");
    return -1;
  }
  // Without the snapshots the page and the CSV file have no rows, and the report has failed.
  std::optional<Growth> found = compare(*args, report_list);
  const int32_t result = write_rows(rows_of(found.value_or(Growth())), csv_dir);
  run_facts().growth = std::move(found);
  return run_facts().growth ? result : -1;
}

}  // namespace vornreport
