// What every report over the statistics database shares: one query, streamed row by row into a
// block of the report data file and into a CSV file.
//
// A report is a StatisticsReport record; the frame runs it. In the data file a report with rows is
//
//   <script type='text/javascript'>
//   var <variable> = [
//   [ 'column 0', 'column 1', ... ],
//   [ ... ]
//   ];
//   </script>
//
// and one without rows is a lone "</script>". In the CSV file it is the header line and then, for
// each row, every column in double quotes, separated by tabs.
#pragma once

#include <cstdint>
#include <cstdio>
#include <span>
#include <utility>

#include "report_format/reports.hpp"
#include "vorn/text.h"
#include "vornreport/report_args.hpp"

namespace vornreport {

// Where the value of an output column comes from.
enum class ColumnSource : uint8_t {
  kQuery,        // the query's column `index`
  kShareVolume,  // identifier of the volume that holds the share named in query column `index`;
                 // a share without a volume has no row
  kOwnerName,  // account name of the user id in query column `index`; an owner without account, or
               // outside the user filter, has no row
};

// How a value is written.
enum class ColumnText : uint8_t {
  kRaw,      // as it is
  kEscaped,  // data file: escaped for a single-quoted string; empty, and logged, when that fails
  kField,    // CSV: formatted for a quoted field; raw when that fails
  kTime,     // CSV: seconds since the epoch as local time; empty, and logged, when that fails
};

struct ReportColumn {
  ColumnSource source;
  int index;
  ColumnText data_text;
  ColumnText csv_text;
};

// The usual columns: the first is written as it is, a path is escaped for the page, the rest is
// formatted for the CSV only.
constexpr ReportColumn raw_column(int index) {
  return {ColumnSource::kQuery, index, ColumnText::kRaw, ColumnText::kRaw};
}
constexpr ReportColumn path_column(int index) {
  return {ColumnSource::kQuery, index, ColumnText::kEscaped, ColumnText::kField};
}
constexpr ReportColumn field_column(int index) {
  return {ColumnSource::kQuery, index, ColumnText::kRaw, ColumnText::kField};
}
constexpr ReportColumn time_column(int index) {
  return {ColumnSource::kQuery, index, ColumnText::kRaw, ColumnText::kTime};
}
constexpr ReportColumn owner_column(int index) {
  return {ColumnSource::kOwnerName, index, ColumnText::kRaw, ColumnText::kRaw};
}
constexpr ReportColumn share_volume_column(int index) {
  return {ColumnSource::kShareVolume, index, ColumnText::kRaw, ColumnText::kRaw};
}

// Whether the folders of all shares are written to the page before the first row.
enum class SharePaths : uint8_t { kLeftOut, kImported };

// An sqlite3_exec callback over a report_row_ctx. 0 to go on, -1 to stop the query.
using RowWriter = int (*)(void* context, int columns, char** values, char** names);

// The row writer of every report that doesn't bring its own.
int report_row_writer(void* context, int columns, char** values, char** names) noexcept;

// One report.
struct StatisticsReport {
  const report_format::ReportFormat& format;  // name, variable, limits
  const char* module;                         // in log lines
  const char* sql;
  const char* csv_header;  // without line feed
  SharePaths share_paths;
  std::span<const ReportColumn> columns;
  RowWriter row_writer = report_row_writer;
  // The same over a fleet (vornreport/fleet_source.hpp). What names come from there are other
  // people's, so all of them are escaped.
  const char* fleet_sql = nullptr;
  std::span<const ReportColumn> fleet_columns = {};
};

// The context of a row writer, which SQLite hands through.
struct report_row_ctx {
  FILE* data_fp;
  FILE* csv_fp;
  uint64_t js_limit;   // rows whose ordinal, from 0, is at or above it stay out of the data file
  uint64_t csv_limit;  // the same for the CSV file
  uint64_t row_count;  // rows seen so far
  const char* section_user;
  const VLIBCSzHash* filter_user;
  const VLIBCSzHash* volume_path_hash;
  const VLIBCSzHash* share_path_hash;
  const VLIBCSzHash* profile_hash;
  QAZLLNode** dup_list;
  QAZLLNode** dup_group_list;
  const StatisticsReport* report;  // the record whose rows are written
  uint64_t shown_count;            // rows written to the data file
  const FleetSource* fleet;        // where they come from, for a report over a fleet
};

// Runs one report. 0; -1 on failure, which is logged: what was written by then stays, and the CSV
// file is not finished.
int32_t run_statistics_report(const StatisticsReport& report, const ReportArgs* args);

// The argument check that every report begins with.
bool args_are_complete(const ReportArgs* args);

// Finishes the CSV file of a report. All rows are there when that fails, but programs may read them
// wrong; it is told as a failure of the report.
void finish_csv(const report_format::ReportFormat& format, const char* path);

// Writes `value` as a path of the page (ColumnText::kEscaped) or as a field of the CSV file
// (kField, kTime, kRaw), without quotes around it.
void write_data_text(FILE* data, ColumnText text, const char* value, const char* module);
void write_csv_text(FILE* csv, ColumnText text, const char* value, const char* module);

// Writes one row of the block, or a line of the CSV file: `text_of(place)` is what stands in the
// column at that place of `columns`, whose `data_text` or `csv_text` says how it is written.
template <typename Columns, typename TextOf>
void write_data_fields(FILE* data, const Columns& columns, TextOf&& text_of, const char* module) {
  const char* before = "[ '";
  size_t place = 0;
  for (const auto& column : columns) {
    std::fputs(std::exchange(before, ", '"), data);
    write_data_text(data, column.data_text, text_of(place++), module);
    std::fputc('\'', data);
  }
  std::fputs(" ]", data);
}
template <typename Columns, typename TextOf>
void write_csv_fields(FILE* csv, const Columns& columns, TextOf&& text_of, const char* module) {
  const char* before = "\"";
  size_t place = 0;
  for (const auto& column : columns) {
    std::fputs(std::exchange(before, "\t\""), csv);
    write_csv_text(csv, column.csv_text, text_of(place++), module);
    std::fputc('"', csv);
  }
  std::fputc('\n', csv);
}

}  // namespace vornreport
