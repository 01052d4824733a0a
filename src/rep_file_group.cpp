// The block is an object of sections, keyed by "vornAll" and the users' names, without quotes:
//
//   <script type='text/javascript'>
//   var vornFileGroupTableData = {
//   vornAll : [
//   [ 'type', 'share', 123 ],
//   [ ... ]]
//   ,
//   ann : [
//   [ 'type', 'share', 45 ]
//   ]
//
//   }</script>
//
// The limit of 100 rows is shared by all sections. Rows beyond it are counted but not written, so a
// section that lies beyond it whole has its closing bracket and no opening.
#include "rep_file_group.hpp"

#include <sqlite3.h>

#include <array>
#include <optional>
#include <string>
#include <utility>

#include "facts/run_facts.hpp"
#include "report_frame.hpp"
#include "vorn/report.h"
#include "vorn/user.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statements_ahead.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/rep_file_group";
constexpr char kOfAllFiles[] = "select ext,share,sum(size) from file_stat group by ext, share;";

constexpr char kOverFleet[] =
    "select ext, concat(server, ':', share), {sum} from file where {runs} "
    "group by ext, server, share order by ext, server, share";

// The section of the last row written, for the life of the process; none for all files.
std::optional<std::string> g_previous_user;

// A new section's key, or null when the row goes on with the last one's.
const char* section_key(const report_row_ctx& ctx) {
  if (!g_previous_user) {
    return ctx.row_count == 0 ? "vornAll" : ctx.section_user;
  }
  return ctx.section_user != nullptr && *g_previous_user != ctx.section_user ? ctx.section_user
                                                                             : nullptr;
}

struct GroupReport {
  SqliteHandle db;
  PathText data_path = report_data_path();
  FileHandle data;
  PathText csv_path;
  FileHandle csv;
  report_row_ctx ctx{};
};

// Opens all that the queries need and writes the CSV header. False, logged, on failure.
bool open_report(const ReportArgs& args, GroupReport& report) {
  report.ctx.fleet = args.fleet;
  report.db = args.fleet != nullptr ? nullptr : VORNReportDBInit(args.profile_hash);
  if (!report.db && args.fleet == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "open db failed");
    return false;
  }
  report.data = open_report_file(report.data_path.c_str(), "a", kModule, __LINE__);
  if (!report.data) {
    return false;
  }
  const char* csv_dir = set_value(args.profile_hash, "real_path_csv");
  if (csv_dir == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "get csv dir failed");
    return false;
  }
  report.csv_path.format("%s/%s.csv", csv_dir, report_format::kFileGroup.name);
  report.csv = open_report_file(report.csv_path.c_str(), "w+", kModule, __LINE__, LogForm::kNested,
                                Costs::kReport);
  if (!report.csv) {
    return false;
  }
  std::fputs("Group, Share, Size\n", report.csv.get());
  report.ctx.data_fp = report.data.get();
  report.ctx.csv_fp = report.csv.get();
  report.ctx.js_limit = report_format::kFileGroup.page_limit;
  report.ctx.csv_limit = report_format::kFileGroup.csv_limit;
  report.ctx.profile_hash = args.profile_hash;
  return true;
}

// A row whose names are other people's.
int write_fleet_row(void* context, int columns, char** values, char** names) noexcept {
  std::array<std::array<char, 1024>, 2> escaped{};
  std::array<char*, 3> row{escaped[0].data(), escaped[1].data(), nullptr};
  if (columns != static_cast<int>(row.size())) {
    return -1;
  }
  for (size_t i = 0; i < escaped.size(); ++i) {
    if (values[i] == nullptr ||
        VornQazEscChar(values[i], escaped[i].data(), escaped[i].size(), '\'') < 0) {
      return -1;
    }
  }
  row.back() = values[escaped.size()];
  return FileGroupRowWriter(context, columns, row.data(), names);
}

bool run_query(GroupReport& report, const char* sql) {
  report_trace(kModule, __LINE__, "exec sql=%s\n", sql);
  VornQazSetEnv();
  char* message = nullptr;
  const int result = run_statement(report.db.get(), sql, FileGroupRowWriter, &report.ctx, &message);
  const SqliteText owned(message);
  if (result == SQLITE_OK) {
    return true;
  }
  REPORT_LOG_ERR(kModule, __LINE__, "Exec sql:[%s] error: %s\n\n", sql,
                 message != nullptr ? message : "");
  if (is_storage_failure(result)) {
    mark_report_data_lost();
  }
  return false;
}

// One user's section. A name without account is logged and skipped.
bool write_user(GroupReport& report, const char* name, uint64_t& last_count) {
  VORNUser* user = nullptr;
  const int found = VORNUserGet(name, &user);
  const UserHandle owned(user);
  if (found < 0 || user == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "user get failed, user=%s\n", name);
    return true;
  }
  report.ctx.section_user = name;
  FixedText<4096> sql;
  sql.format("select ext,share,sum(size) from file_stat where owner='%u' group by ext, share;",
             static_cast<unsigned>(user->uid));
  if (!run_query(report, sql.c_str())) {
    return false;
  }
  if (report.ctx.row_count > last_count) {
    std::fputs("\n]\n", report.ctx.data_fp);
    last_count = report.ctx.row_count;
  }
  return true;
}

bool write_users(GroupReport& report, const char* limit_user) {
  ListHandle users(VLIBCSzListAlloc(kPlatformSlots));
  if (!users) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "malloc list failed");
    return false;
  }
  const int pieces =
      with_address(users, [&](VLIBCSzList** list) { return VLIBCStrTok(limit_user, ",", list); });
  if (pieces < 0) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "token user list failed, list=%s", limit_user);
    return false;
  }
  uint64_t last_count = report.ctx.row_count;
  const int count = VLIBCSzListCount(users.get());
  for (int i = 0; i < count; ++i) {
    const char* name = VLIBCSzListGet(users.get(), i);
    if (!is_unset(name) && !write_user(report, name, last_count)) {
      return false;
    }
  }
  return true;
}

bool write_sections(GroupReport& report, const VLIBCSzHash* profile_hash) {
  const FleetSource* fleet = report.ctx.fleet;
  if (fleet != nullptr ? !run_over_fleet(*fleet, kOverFleet, write_fleet_row, &report.ctx, kModule)
                       : !run_query(report, kOfAllFiles)) {
    return false;
  }
  if (report.ctx.row_count != 0) {
    report_trace(kModule, __LINE__, "print end\n");
    std::fputs("]\n", report.ctx.data_fp);
  }
  const char* limit_user = fleet == nullptr ? set_value(profile_hash, "limit_user") : nullptr;
  if (limit_user != nullptr && !write_users(report, limit_user)) {
    return false;
  }
  std::fputs("\n}</script>\n", report.ctx.data_fp);
  run_facts().rows[report_format::kFileGroup.name] = {report.ctx.row_count, report.ctx.shown_count};
  return true;
}

}  // namespace

int FileGroupRowWriter(void* context, int /*columns*/, char** values, char** /*names*/) noexcept {
  auto* ctx = static_cast<report_row_ctx*>(context);
  if (ctx == nullptr || ctx->data_fp == nullptr || ctx->csv_fp == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "bad parameter\n");
    return -1;
  }
  if (ctx->js_limit != 0 && ctx->row_count >= ctx->js_limit) {
    ++ctx->row_count;
    return 0;
  }
  std::fputs(ctx->row_count == 0
                 ? "<script type='text/javascript'>\nvar vornFileGroupTableData = {\n"
                 : ",\n",
             ctx->data_fp);
  if (const char* key = section_key(*ctx); key != nullptr) {
    std::fprintf(ctx->data_fp, "%s : [\n", key);
  }
  const auto text = [&](int column) { return values[column] != nullptr ? values[column] : ""; };
  std::fprintf(ctx->data_fp, "[ '%s', '%s', %s ]", text(0), text(1), text(2));
  if (ctx->section_user != nullptr) {
    g_previous_user = ctx->section_user;
  } else {
    g_previous_user.reset();
  }
  std::fflush(ctx->data_fp);
  ++ctx->shown_count;
  ++ctx->row_count;
  return 0;
}

const char* file_group_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kOfAllFiles;
}

int32_t file_group_db(ReportArgs* args) {
  if (args == nullptr) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "Bad Parameter");
    return -1;
  }
  if (is_unset(args->profile) || args->profile_hash == nullptr || args->user_hash == nullptr) {
    REPORT_LOG_ERR(kModule, __LINE__, "Bad Parameter\n");
    return -1;
  }
  GroupReport report;
  bool done = open_report(*args, report) && write_sections(report, args->profile_hash);
  done = close_report_file(std::move(report.data), report.data_path.c_str(), kModule, __LINE__) &&
         done;
  done = close_report_file(std::move(report.csv), report.csv_path.c_str(), kModule, __LINE__,
                           Costs::kReport) &&
         done;
  std::fflush(nullptr);
  if (done) {
    finish_csv(report_format::kFileGroup, report.csv_path.c_str());
  }
  return done ? 0 : -1;
}

}  // namespace vornreport
