#include "listed_report.hpp"

#include <algorithm>
#include <cstdio>
#include <utility>

#include "facts/run_facts.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/fleet_rows.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

size_t within(uint64_t limit, size_t rows) {
  return limit == 0 ? rows : static_cast<size_t>(std::min<uint64_t>(limit, rows));
}

// As report_row_writer() writes them.
// `are_foreign`: other servers have sent the rows, so that all of their texts are escaped.
void write_block(FILE* data, const ListedReport& report, std::span<const ListedRow> rows,
                 bool are_foreign) {
  if (!rows.empty()) {
    std::fprintf(data, "<script type='text/javascript'>\nvar %s = [\n", report.format.variable);
  }
  std::vector<ListedColumn> columns(report.columns.begin(), report.columns.end());
  for (ListedColumn& column : columns) {
    column.data_text = are_foreign ? ColumnText::kEscaped : column.data_text;
  }
  const char* row_before = "";
  for (const ListedRow& row : rows) {
    std::fputs(row_before, data);
    row_before = ",\n";
    write_data_fields(
        data, columns, [&](size_t i) { return row[i].c_str(); }, report.module);
  }
  std::fputs(rows.empty() ? "</script>\n" : "\n];\n</script>\n", data);
}

void write_csv(FILE* csv, const ListedReport& report, std::span<const ListedRow> rows) {
  std::fprintf(csv, "%s\n", report.csv_header);
  for (const ListedRow& row : rows) {
    write_csv_fields(
        csv, report.columns, [&](size_t i) { return row[i].c_str(); }, report.module);
  }
}

int add_row(void* context, int columns, char** values, char** /*names*/) noexcept {
  ListedRow row;
  for (int i = 0; i < columns; ++i) {
    row.emplace_back(values[i] != nullptr ? values[i] : "");
  }
  static_cast<std::vector<ListedRow>*>(context)->push_back(std::move(row));
  return 0;
}

}  // namespace

int32_t run_listed_report(const ListedReport& report, const ReportArgs* args,
                          const std::vector<ListedRow>& rows) {
  const char* csv_dir = args != nullptr && args->profile_hash != nullptr
                            ? set_value(args->profile_hash, "real_path_csv")
                            : nullptr;
  if (csv_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(report.module, __LINE__, "get csv dir failed");
    return -1;
  }
  for (const ListedRow& row : rows) {
    keep_fleet_row(report.format.name, row);
  }
  const size_t shown = within(report.format.page_limit, rows.size());
  const std::span<const ListedRow> all(rows);
  const PathText data_path = report_data_path();
  FileHandle data = open_report_file(data_path.c_str(), "a", report.module, __LINE__);
  PathText csv_path;
  csv_path.format("%s/%s.csv", csv_dir, report.format.name);
  FileHandle csv = open_report_file(csv_path.c_str(), "a", report.module, __LINE__,
                                    LogForm::kNested, Costs::kReport);
  if (!data || !csv) {
    return -1;
  }
  write_block(data.get(), report, all.first(shown), args->fleet != nullptr);
  write_csv(csv.get(), report, all.first(within(report.format.csv_limit, rows.size())));
  run_facts().rows[report.format.name] = {rows.size(), shown};
  const bool data_kept =
      close_report_file(std::move(data), data_path.c_str(), report.module, __LINE__);
  const bool csv_kept =
      close_report_file(std::move(csv), csv_path.c_str(), report.module, __LINE__, Costs::kReport);
  if (!data_kept || !csv_kept) {
    return -1;
  }
  finish_csv(report.format, csv_path.c_str());
  return 0;
}

int32_t run_fleet_report(const ListedReport& report, const ReportArgs* args) {
  std::vector<ListedRow> rows;
  const bool found = run_over_fleet(*args->fleet, report.fleet_sql, add_row, &rows, report.module);
  const int32_t result = run_listed_report(report, args, rows);
  return found ? result : -1;
}

}  // namespace vornreport
