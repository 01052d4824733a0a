#include "report_frame.hpp"

#include <sqlite3.h>

#include <array>
#include <cstdlib>
#include <string>
#include <utility>

#include "facts/run_facts.hpp"
#include "vorn/report.h"
#include "vorn/user.h"
#include "vorn/volume.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statements_ahead.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

constexpr size_t kMostColumns = 8;
constexpr size_t kVolumeIdSize = 256;
using ColumnBuffer = std::array<char, 8192>;

// One row's output values, in column order.
struct RowValues {
  std::array<const char*, kMostColumns> text{};
  std::array<char, kVolumeIdSize> volume_id{};
  UserHandle owner;
};

// The identifier of the share's volume, empty (and logged) when the platform has none; null, which
// leaves the row out, when the share has no volume.
const char* share_volume(const report_row_ctx& ctx, const char* share,
                         std::array<char, kVolumeIdSize>& id) {
  const char* volume = set_value(ctx.volume_path_hash, share);
  if (volume == nullptr) {
    REPORT_LOG_ERR_NESTED(ctx.report->module, __LINE__, "get volume path failed, share=%s", share);
    record_incident("volume_unknown", share,
                    std::string("the volume of share ") + share +
                        " can't be told, so a report lacks it; see to its mount",
                    AlreadyLogged::kYes);
    return nullptr;
  }
  id[0] = '\0';
  if (VornQazVolumeGetId(volume, id.data(), id.size()) < 0 || id[0] == '\0') {
    REPORT_LOG_ERR(ctx.report->module, __LINE__, "get volume id failed, volume=%s\n", volume);
  }
  return id.data();
}

// The account name of a user id; null, which leaves the row out, when there is none (logged) or the
// user filter lacks it.
const char* owner_name(const report_row_ctx& ctx, const char* uid, UserHandle& owner) {
  VORNUser* user = nullptr;
  const auto id = static_cast<uid_t>(std::strtoul(uid, nullptr, 10));
  const int found = VORNUserGetByUID(id, &user);
  owner.reset(user);
  if (found < 0 || user == nullptr || is_unset(user->name)) {
    REPORT_LOG_ERR_NESTED(ctx.report->module, __LINE__, "get user name failed");
    return nullptr;
  }
  return VLIBCSzHashGetValue(ctx.filter_user, user->name) != nullptr ? user->name : nullptr;
}

const char* column_value(const report_row_ctx& ctx, const ReportColumn& column, const char* value,
                         RowValues& row) {
  switch (column.source) {
    case ColumnSource::kShareVolume:
      return share_volume(ctx, value, row.volume_id);
    case ColumnSource::kOwnerName:
      return owner_name(ctx, value, row.owner);
    case ColumnSource::kQuery:
      break;
  }
  return value;
}

std::span<const ReportColumn> columns_of(const report_row_ctx& ctx) {
  return ctx.fleet != nullptr ? ctx.report->fleet_columns : ctx.report->columns;
}

// False when the row is left out.
bool resolve_values(const report_row_ctx& ctx, char* const* query_values, RowValues& row) {
  size_t place = 0;
  for (const ReportColumn& column : columns_of(ctx)) {
    const char* given = query_values[column.index];
    const char* value = column_value(ctx, column, given != nullptr ? given : "", row);
    if (value == nullptr) {
      return false;
    }
    row.text[place++] = value;
  }
  return true;
}

void write_data_row(const report_row_ctx& ctx, const RowValues& row) {
  if (ctx.row_count == 0) {
    std::fprintf(ctx.data_fp, "<script type='text/javascript'>\nvar %s = [\n",
                 ctx.report->format.variable);
  } else {
    std::fputs(",\n", ctx.data_fp);
  }
  write_data_fields(
      ctx.data_fp, columns_of(ctx), [&](size_t i) { return row.text[i]; }, ctx.report->module);
}

void write_csv_row(const report_row_ctx& ctx, const RowValues& row) {
  write_csv_fields(
      ctx.csv_fp, columns_of(ctx), [&](size_t i) { return row.text[i]; }, ctx.report->module);
}

bool has_volume_column(const StatisticsReport& report) {
  for (const ReportColumn& column : report.columns) {
    if (column.source == ColumnSource::kShareVolume) {
      return true;
    }
  }
  return false;
}

bool within(uint64_t limit, uint64_t ordinal) {
  return limit == 0 || ordinal < limit;
}

// The files of one report. Those still open at an early return are closed by their owners.
struct ReportFiles {
  PathText data_path = report_data_path();
  FileHandle data;
  PathText csv_path;
  FileHandle csv;
};

bool open_files(const StatisticsReport& report, const ReportArgs& args, ReportFiles& files) {
  files.data = open_report_file(files.data_path.c_str(), "a", report.module, __LINE__);
  if (!files.data) {
    return false;
  }
  const char* csv_dir = set_value(args.profile_hash, "real_path_csv");
  if (csv_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(report.module, __LINE__, "get csv dir failed");
    return false;
  }
  files.csv_path.format("%s/%s.csv", csv_dir, report.format.name);
  files.csv = open_report_file(files.csv_path.c_str(), "a", report.module, __LINE__,
                               LogForm::kNested, Costs::kReport);
  return files.csv != nullptr;
}

report_row_ctx make_context(const StatisticsReport& report, const ReportArgs& args,
                            const ReportFiles& files) {
  report_row_ctx ctx{};
  ctx.data_fp = files.data.get();
  ctx.csv_fp = files.csv.get();
  ctx.js_limit = report.format.page_limit;
  ctx.csv_limit = report.format.csv_limit;
  ctx.filter_user = args.user_hash;
  ctx.volume_path_hash = args.volume_hash;
  ctx.share_path_hash = args.share_hash;
  ctx.profile_hash = args.profile_hash;
  ctx.dup_list = args.dup_list;
  ctx.dup_group_list = args.dup_group_list;
  ctx.report = &report;
  ctx.fleet = args.fleet;
  return ctx;
}

// Runs the query over the statistics database. False, logged, when it failed.
bool run_query(const StatisticsReport& report, sqlite3* db, report_row_ctx& ctx) {
  VornQazSetEnv();
  char* message = nullptr;
  const int result = run_statement(db, report.sql, report.row_writer, &ctx, &message);
  if (result == SQLITE_OK) {
    return true;
  }
  const SqliteText owned(message);
  REPORT_LOG_ERR(report.module, __LINE__, "Exec sql:[%s] error: %s\n\n", report.sql,
                 message != nullptr ? message : "");
  if (is_storage_failure(result)) {
    mark_report_data_lost();
  }
  return false;
}

// Runs the query and closes the block. 0 or -1.
int32_t write_rows(const StatisticsReport& report, sqlite3* db, report_row_ctx& ctx,
                   bool is_embedded) {
  if (ctx.fleet != nullptr
          ? !run_over_fleet(*ctx.fleet, report.fleet_sql, report.row_writer, &ctx, report.module)
          : !run_query(report, db, ctx)) {
    return -1;
  }
  if (ctx.row_count != 0) {
    std::fputs("\n];\n", ctx.data_fp);
  }
  if (!is_embedded) {
    std::fputs("</script>\n", ctx.data_fp);
  }
  return 0;
}

// `seconds` as local time; null, logged, when it has none.
const char* local_time(const char* seconds, std::array<char, 128>& buffer, const char* module) {
  if (VornQazTimeConvert(seconds, buffer.data(), buffer.size()) < 0 || buffer[0] == '\0') {
    REPORT_LOG_ERR(module, __LINE__, "translate time format error, time=%s\n", seconds);
    return nullptr;
  }
  return buffer.data();
}

}  // namespace

bool args_are_complete(const ReportArgs* args) {
  return args != nullptr && !is_unset(args->profile) && args->profile_hash != nullptr &&
         args->user_hash != nullptr && args->volume_hash != nullptr && args->share_hash != nullptr;
}

void finish_csv(const report_format::ReportFormat& format, const char* path) {
  if (VornQazCsvFile(path) < 0) {
    tell_failed_report(format.name);
  }
}

void write_data_text(FILE* data, ColumnText text, const char* value, const char* module) {
  static ColumnBuffer escaped;
  if (text == ColumnText::kEscaped) {
    if (VornQazEscChar(value, escaped.data(), escaped.size(), '\'') < 0) {
      REPORT_LOG_ERR(module, __LINE__, "escape file failed, file=%s\n", escaped.data());
      return;
    }
    value = escaped.data();
  }
  std::fputs(value, data);
}

void write_csv_text(FILE* csv, ColumnText text, const char* value, const char* module) {
  static ColumnBuffer field;
  std::array<char, 128> time{};
  if (text == ColumnText::kTime) {
    value = local_time(value, time, module);
  } else if (text == ColumnText::kField &&
             VornQazFormatCsvString(value, field.data(), field.size()) >= 0) {
    value = field.data();
  }
  if (value != nullptr) {
    std::fputs(value, csv);
  }
}

int report_row_writer(void* context, int /*columns*/, char** values, char** names) noexcept {
  auto* ctx = static_cast<report_row_ctx*>(context);
  if (ctx == nullptr || ctx->data_fp == nullptr || ctx->csv_fp == nullptr || values == nullptr ||
      names == nullptr || (ctx->volume_path_hash == nullptr && has_volume_column(*ctx->report))) {
    const char* module = ctx != nullptr ? ctx->report->module : "src/report_frame";
    REPORT_LOG_ERR_NESTED(module, __LINE__, "bad parameter");
    return -1;
  }
  if (ctx->share_path_hash != nullptr && ctx->report->share_paths == SharePaths::kImported) {
    VornQazImportSharePathHash(ctx->share_path_hash, ctx->data_fp);
  }
  RowValues row;
  if (!resolve_values(*ctx, values, row)) {
    return 0;
  }
  if (within(ctx->js_limit, ctx->row_count)) {
    write_data_row(*ctx, row);
    ++ctx->shown_count;
  }
  if (within(ctx->csv_limit, ctx->row_count)) {
    write_csv_row(*ctx, row);
  }
  ++ctx->row_count;
  return 0;
}

int32_t run_statistics_report(const StatisticsReport& report, const ReportArgs* args) {
  if (!args_are_complete(args)) {
    REPORT_LOG_ERR_NESTED(report.module, __LINE__, "Bad Parameter");
    return -1;
  }
  SqliteHandle db = args->fleet != nullptr ? nullptr : VORNReportDBInit(args->profile_hash);
  if (!db && args->fleet == nullptr) {
    REPORT_LOG_ERR_NESTED(report.module, __LINE__, "open db failed");
    return -1;
  }
  ReportFiles files;
  int32_t result = -1;
  const bool is_embedded = args->embedded != 0;
  if (open_files(report, *args, files)) {
    report_row_ctx ctx = make_context(report, *args, files);
    if (!is_embedded) {
      std::fprintf(files.csv.get(), "%s\n", report.csv_header);
    }
    result = write_rows(report, db.get(), ctx, is_embedded);
    if (!is_embedded) {
      run_facts().rows[report.format.name] = {ctx.row_count, ctx.shown_count};
    }
  }
  db.reset();
  const bool data_kept =
      close_report_file(std::move(files.data), files.data_path.c_str(), report.module, __LINE__);
  const bool csv_kept = close_report_file(std::move(files.csv), files.csv_path.c_str(),
                                          report.module, __LINE__, Costs::kReport);
  std::fflush(nullptr);
  if (!data_kept || !csv_kept) {
    return -1;
  }
  if (result == 0 && !is_embedded) {
    finish_csv(report.format, files.csv_path.c_str());
  }
  return result;
}

}  // namespace vornreport
