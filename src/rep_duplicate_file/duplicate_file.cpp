#include "rep_duplicate_file/duplicate_file.hpp"

#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>

#include "content_groups.hpp"
#include "facts/duplicate_tally.hpp"
#include "facts/run_facts.hpp"
#include "fleet_content.hpp"
#include "module.hpp"
#include "report_format/reports.hpp"
#include "report_format/values.hpp"
#include "report_frame.hpp"
#include "vorn/list.h"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"

namespace vornreport {
namespace {

enum Column { kShare, kPath, kSize, kModifyTime, kName };
enum class Match { kUndecided = -1, kNameAndSize = 0, kContent = 1 };

// What the row writer knows from row to row. It lives as long as the process.
struct Grouping {
  Match match = Match::kUndecided;
  int32_t number = 0;  // of the group; by content: of the row in its size bucket
  std::string size;    // of the row that last began a group or bucket, 127 bytes at most
  std::string name;
};
Grouping g_grouping;
// What the report that is being made has found; only by name and size, where groups arrive row by
// row.
std::optional<DuplicateTally> g_tally;

constexpr size_t kLongestSize = 127;
constexpr size_t kLongestName = 4095;

const char* text_of(char* const* values, Column column) {
  return values[column] != nullptr ? values[column] : "";
}

std::string_view cut(const char* text, size_t longest) {
  return std::string_view(text).substr(0, longest);
}

bool compares_content(const VLIBCSzHash* profile_hash) {
  const char* value = VLIBCSzHashGetValue(profile_hash, "duplicate_compare");
  return value != nullptr && report_format::is_true(value);
}

void decide_match(const VLIBCSzHash* profile_hash) {
  if (g_grouping.match != Match::kUndecided) {
    return;
  }
  if (compares_content(profile_hash)) {
    g_grouping.match = Match::kContent;
    report_trace(kDuplicateModule, __LINE__, "run full match\n");
  } else {
    g_grouping.match = Match::kNameAndSize;
    report_trace(kDuplicateModule, __LINE__, "run partial match\n");
  }
}

// Content mode: rows are collected until the size changes.
void collect_row(const report_row_ctx& ctx, char* const* values) {
  const std::string_view size = cut(text_of(values, kSize), kLongestSize);
  if (size != g_grouping.size) {
    if (!g_grouping.size.empty() && handle_size_bucket(ctx.profile_hash, ctx.dup_group_list,
                                                       ctx.dup_list, GroupsAre::kContinued) < 0) {
      REPORT_LOG_ERR(kDuplicateModule, __LINE__, "handle candidate error\n");
    }
    g_grouping.number = 0;
    g_grouping.size = size;
  }
  ++g_grouping.number;
  const char* share_folder = VLIBCSzHashGetValue(ctx.share_path_hash, text_of(values, kShare));
  if (add_candidate(ctx.dup_list, values, g_grouping.number, share_folder) < 0) {
    REPORT_LOG_ERR(kDuplicateModule, __LINE__, "add candidate error\n");
  }
}

// The group that the rows before made.
void end_group() {
  if (g_tally) {
    g_tally->end_group(std::strtoull(g_grouping.size.c_str(), nullptr, 10));
  }
}

// Name-and-size mode: the query's order puts the members of a group one after another.
void number_row(char* const* values) {
  const std::string_view size = cut(text_of(values, kSize), kLongestSize);
  const std::string_view name = cut(text_of(values, kName), kLongestName);
  if (g_grouping.size != size || g_grouping.name != name) {
    end_group();
    g_grouping.size = size;
    g_grouping.name = name;
    ++g_grouping.number;
  }
}

bool within(uint64_t limit) {
  return limit == 0 || static_cast<uint64_t>(g_grouping.number) <= limit;
}

// The group's number, then columns of the query in their order.
constexpr ReportColumn kColumns[] = {raw_column(0), field_column(0), path_column(1),
                                     field_column(2), time_column(3)};

// The shares of a fleet have names that others give.
constexpr ReportColumn kFleetColumns[] = {raw_column(0), path_column(0), path_column(1),
                                          field_column(2), time_column(3)};

auto texts_of(char* const* values) {
  return [values, number = std::to_string(g_grouping.number)](size_t place) {
    return place == 0 ? number.c_str() : text_of(values, static_cast<Column>(place - 1));
  };
}

void write_data_row(const report_row_ctx& ctx, char* const* values) {
  if (ctx.row_count == 0) {
    std::fprintf(ctx.data_fp,
                 "<script type='text/javascript'>\nvar vornDuplicateHashMatch = 0;\nvar %s = [\n",
                 ctx.report->format.variable);
  } else {
    std::fputs(",\n", ctx.data_fp);
  }
  ctx.fleet == nullptr
      ? write_data_fields(ctx.data_fp, kColumns, texts_of(values), kDuplicateModule)
      : write_data_fields(ctx.data_fp, kFleetColumns, texts_of(values), kDuplicateModule);
}

int duplicate_row_writer(void* context, int /*columns*/, char** values, char** names) noexcept {
  auto* ctx = static_cast<report_row_ctx*>(context);
  if (ctx == nullptr || ctx->data_fp == nullptr || ctx->csv_fp == nullptr || values == nullptr ||
      names == nullptr || ctx->profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  if (ctx->share_path_hash != nullptr) {
    VornQazImportSharePathHash(ctx->share_path_hash, ctx->data_fp);
  }
  decide_match(ctx->profile_hash);
  if (g_grouping.match == Match::kContent) {
    collect_row(*ctx, values);
    return 0;
  }
  number_row(values);
  if (g_tally && ctx->fleet != nullptr) {
    // Where it lies none but its server can look.
    g_tally->file(nullptr, (text_of(values, kShare) + std::string(text_of(values, kPath))).c_str());
  } else if (g_tally) {
    g_tally->file(VLIBCSzHashGetValue(ctx->share_path_hash, text_of(values, kShare)),
                  text_of(values, kPath));
  }
  if (within(ctx->js_limit)) {
    write_data_row(*ctx, values);
    ++ctx->shown_count;
  }
  if (within(ctx->csv_limit)) {
    write_csv_fields(ctx->csv_fp, kColumns, texts_of(values), kDuplicateModule);
  }
  ++ctx->row_count;
  return 0;
}

constexpr char kHeader[] = "Duplicate Group\tShare\tFile\tSize(Byte)\tModify Time";

constexpr StatisticsReport kByNameAndSize{
    .format = report_format::kDuplicateFile,
    .module = kDuplicateModule,
    .sql =
        "select share,path,size,mtime,filename from file_stat except select "
        "share,path,size,mtime,filename from file_stat group by filename,size having "
        "count(id)=1 order by size desc,filename;",
    .csv_header = kHeader,
    .share_paths = SharePaths::kImported,
    .columns = {},
    .row_writer = duplicate_row_writer,
    // Names are compared by a hash, so that the pairs of a billion files fit into memory.
    .fleet_sql =
        "select concat(server, ':', share), path, size, mtime, filename from file where {runs} and "
        "(size, sipHash64(filename, filename_number)) global in "
        "(select size, sipHash64(filename, filename_number) from file where {runs} "
        "group by size, sipHash64(filename, filename_number) having count() > 1) "
        "order by size desc, filename_number, filename, server, share, path, mtime",
};

constexpr StatisticsReport kBySize{
    .format = report_format::kDuplicateFile,
    .module = kDuplicateModule,
    .sql =
        "select share,path,size,mtime,filename from file_stat except select "
        "share,path,size,mtime,filename from file_stat group by size having count(id)=1 order "
        "by size desc;",
    .csv_header = kHeader,
    .share_paths = SharePaths::kImported,
    .columns = {},
    .row_writer = duplicate_row_writer,
};

int32_t report_by_name_and_size(ReportArgs& args) {
  g_tally.emplace(/*by_content=*/false);
  const int32_t result = duplicate_file_db(&args);
  end_group();
  if (result < 0) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "duplicate_file_db failed");
  } else {
    run_facts().duplicates = g_tally->facts();
  }
  g_tally.reset();
  return result < 0 ? -1 : 0;
}

int32_t report_by_content(ReportArgs& args) {
  begin_content_groups(args.profile_hash);
  args.embedded = 1;  // header, closing tag and CSV finishing belong to the group writers
  if (duplicate_file2_db(&args) < 0) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "duplicate_file_db failed");
    abandon_content_groups();
    return -1;
  }
  if (handle_size_bucket(args.profile_hash, args.dup_group_list, args.dup_list) < 0) {
    REPORT_LOG_ERR(kDuplicateModule, __LINE__, "handle candidate error\n");
  }
  // Both lists are empty now: these only close the block and finish the CSV file.
  write_data_groups(*args.dup_group_list, kMostDataGroups, GroupsAre::kComplete);
  write_csv_groups(args.profile_hash, *args.dup_group_list, GroupsAre::kComplete);
  end_content_groups();
  return 0;
}

}  // namespace

int32_t duplicate_file_db(ReportArgs* args) {
  return run_statistics_report(kByNameAndSize, args);
}

int32_t duplicate_file2_db(ReportArgs* args) {
  return run_statistics_report(kBySize, args);
}

const char* duplicate_file_statement(const VLIBCSzHash* profile_hash) {
  return (compares_content(profile_hash) ? kBySize : kByNameAndSize).sql;
}

int32_t duplicate_file(ReportArgs* args) {
  if (args == nullptr || args->profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kDuplicateModule, __LINE__, "bad parameter");
    return -1;
  }
  QAZLLNode* candidates = nullptr;
  QAZLLNode* groups = nullptr;
  args->dup_list = &candidates;
  args->dup_group_list = &groups;
  const bool by_content = compares_content(args->profile_hash);
  const int32_t result = !by_content              ? report_by_name_and_size(*args)
                         : args->fleet != nullptr ? report_fleet_content(*args)
                                                  : report_by_content(*args);
  release_bucket(&groups, &candidates);
  args->dup_list = nullptr;
  args->dup_group_list = nullptr;
  return result;
}

}  // namespace vornreport
