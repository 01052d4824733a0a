#include "vornreport/fleet_rows.hpp"

#include <unistd.h>

#include "report_format/fleet.hpp"
#include "report_format/values.hpp"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr char kModule[] = "src/fleet";

// One file of kept rows.
struct Kept {
  const char* name;
  PathText path{};
  FileHandle file{};
  uint64_t rows = 0;
};
Kept g_rows{.name = "fleet.rows"};
Kept g_members{.name = "fleet.members"};
uint64_t g_groups = 0;
bool g_is_kept = false;

// Beside the statistics database, where root alone writes and the next run clears up.
void begin(Kept& kept, const std::string& database) {
  kept.path.format("%s/%s", database.substr(0, database.rfind('/')).c_str(), kept.name);
  kept.file = open_report_file(kept.path.c_str(), "w+", kModule, __LINE__, LogForm::kNested,
                               Costs::kReport);
  unlink(kept.path.c_str());
}

void keep(Kept& kept, std::string& line) {
  if (kept.file) {
    line += '\n';
    std::fwrite(line.data(), 1, line.size(), kept.file.get());
    ++kept.rows;
  }
}

FILE* taken(const Kept& kept) {
  if (!kept.file) {
    return nullptr;
  }
  if (std::fflush(kept.file.get()) != 0 || std::ferror(kept.file.get()) != 0) {
    REPORT_LOG_ERR_NESTED(kModule, __LINE__, "write file=%s failed", kept.path.c_str());
    return nullptr;
  }
  std::rewind(kept.file.get());
  return kept.file.get();
}

}  // namespace

void begin_fleet_rows(const VLIBCSzHash* profile_hash) {
  const char* fleet = VLIBCSzHashGetValue(profile_hash, "fleet");
  const char* database = set_value(profile_hash, "real_path_stat_db");
  g_is_kept = fleet != nullptr && report_format::is_true(fleet) && database != nullptr;
  if (g_is_kept) {
    begin(g_rows, database);
    begin(g_members, database);
  }
}

bool keeps_fleet_rows() {
  return g_is_kept;
}

void keep_fleet_row(const char* report, const std::vector<std::string>& values) {
  if (!g_is_kept) {
    return;
  }
  std::string line;
  report_format::append_fleet_text(line, report);
  line += '\t' + std::to_string(g_rows.rows) + '\t' + report_format::fleet_list(values);
  keep(g_rows, line);
}

void keep_content_member(bool begins_group, const char* share, const char* path, uint64_t size,
                         int64_t mtime) {
  if (!g_is_kept) {
    return;
  }
  g_groups += begins_group ? 1 : 0;
  std::string line = std::to_string(g_groups) + '\t' + std::to_string(g_members.rows) + '\t';
  report_format::append_fleet_text(line, share);
  line += '\t';
  report_format::append_fleet_text(line, path);
  line += '\t' + std::to_string(size) + '\t' + std::to_string(mtime);
  keep(g_members, line);
}

FILE* kept_report_rows() {
  return taken(g_rows);
}

FILE* kept_content_members() {
  return taken(g_members);
}

}  // namespace vornreport
