#include "index_import.hpp"

#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "facts/tallies.hpp"
#include "module.hpp"
#include "transaction.hpp"
#include "vorn/report.h"
#include "vorn/share.h"
#include "vorn/user.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

enum Column { kOwnerName, kModifyTime, kSize, kPath, kName, kExtension };

unsigned long long parse_number(const char* text) {
  return text != nullptr ? std::strtoull(text, nullptr, 10) : 0;
}

// Runs a statement, which is logged when it fails. SQLite's result.
int run_logged(sqlite3* db, const char* sql, int (*row)(void*, int, char**, char**),
               void* context) {
  VornQazSetEnv();
  char* message = nullptr;
  const int result = sqlite3_exec(db, sql, row, context, &message);
  const SqliteText owned(message);
  if (result != SQLITE_OK) {
    REPORT_LOG_ERR(kGatheringModule, __LINE__, "Exec sql:[%s] error: %s\n\n", sql,
                   message != nullptr ? message : "");
  }
  return result;
}

// Runs the index query; every row goes to ReportFileIndexRow.
int copy_rows(sqlite3* index, const char* share_path, FileIndexImport& import) {
  FixedText<4096> query;
  query.format(
      "select owner_name, time_modify, size, '%s/'||path, name, file_ext from file_info where "
      "is_dir=0;",
      share_path);
  return run_logged(index, query.c_str(), ReportFileIndexRow, &import) == SQLITE_OK ? 0 : -1;
}

// Folders from files that pass in the order of their paths, where all that lie below one folder
// stand together.
class FoldersOfPaths {
 public:
  explicit FoldersOfPaths(size_t top_length) : top_length_(top_length) {
    tallies().folders().enter(".", 0);
  }
  ~FoldersOfPaths() {
    for (size_t left = inside_.size() + 1; left > 0; --left) {
      tallies().folders().leave();
    }
  }
  FoldersOfPaths(const FoldersOfPaths&) = delete;
  FoldersOfPaths& operator=(const FoldersOfPaths&) = delete;

  void file(std::string_view path, uint64_t size, uint32_t changed) {
    path.remove_prefix(std::min(top_length_, path.size()));
    size_t depth = 0;
    for (size_t end = 0; (end = path.find('/')) != std::string_view::npos; ++depth) {
      go_into(path.substr(0, end), depth);
      path.remove_prefix(end + 1);
    }
    go_up(depth);
    tallies().folders().file(size, changed);
  }

 private:
  void go_into(std::string_view name, size_t depth) {
    if (depth < inside_.size() && inside_[depth] == name) {
      return;
    }
    go_up(depth);
    inside_.emplace_back(name);
    tallies().folders().enter(name, 0);
  }
  void go_up(size_t depth) {
    while (inside_.size() > depth) {
      inside_.pop_back();
      tallies().folders().leave();
    }
  }

  size_t top_length_;
  std::vector<std::string> inside_;
};

}  // namespace

void count_index_folders(const char* share, const char* share_path, sqlite3* db) {
  const std::string sql = std::string("select path,size,mtime from file_stat where share='") +
                          share + "' order by path;";
  const std::string top(share_path);
  FoldersOfPaths folders(top.size() + (top.ends_with('/') ? 0 : 1));
  const auto add = [](void* context, int /*columns*/, char** values, char** /*names*/) noexcept {
    if (values[0] != nullptr) {
      static_cast<FoldersOfPaths*>(context)->file(values[0], parse_number(values[1]),
                                                  static_cast<uint32_t>(parse_number(values[2])));
    }
    return 0;
  };
  if (is_storage_failure(run_logged(db, sql.c_str(), add, &folders))) {
    mark_report_data_lost();
  }
}

int ReportFileIndexRow(void* context, int /*columns*/, char** values, char** names) noexcept {
  const auto* import = static_cast<const FileIndexImport*>(context);
  if (import == nullptr || values == nullptr || names == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "bad parameter");
    return -1;
  }
  if (import->db == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "no db");
    return -1;
  }
  struct stat status {};
  if (values[kOwnerName] == nullptr ||
      VORNUserGetUGID(values[kOwnerName], &status.st_uid, nullptr) < 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "cannot get uid");
    return -1;
  }
  status.st_mtime = static_cast<uint32_t>(parse_number(values[kModifyTime]));
  status.st_size = static_cast<off_t>(parse_number(values[kSize]));
  const char* extension = values[kExtension];
  const FileInfo info{import->szShare, values[kPath], values[kName],
                      type_label(import->pshFileType, extension != nullptr ? extension : ""),
                      &status};
  if (ReportDBAddFile(import->db, &info) < 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "add db failed");
    return -1;
  }
  tallies().file(info, RowSource::kIndex);
  return 0;
}

int ReportFileIndexImport(const char* szShareName, const char* szSharePath, sqlite3* db,
                          const VLIBCSzHash* pshFileType) {
  if (is_unset(szShareName) || is_unset(szSharePath) || db == nullptr || pshFileType == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "bad parameter");
    return -1;
  }
  PathText path;
  if (VORNShareFileIndexDBPathGet(szShareName, path.data(), PathText::size()) < 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "get file index path failed, share=%s",
                          szShareName);
    return -1;
  }
  if (access(path.c_str(), F_OK) != 0) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "access file index failed, share=%s",
                          szShareName);
    return -1;
  }
  sqlite3* raw = nullptr;
  const int opened = sqlite3_open(path.c_str(), &raw);
  const SqliteHandle index(raw);
  if (opened != SQLITE_OK || raw == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Can't open database: %s\n",
                          sqlite3_errmsg(raw));
    return -1;
  }
  begin_transaction(db);
  FileIndexImport import{szShareName, db, pshFileType};
  if (copy_rows(raw, szSharePath, import) < 0) {
    // The transaction stays open: the walk that follows commits these rows with its own.
    return -1;
  }
  commit_transaction(db);
  return 0;
}

}  // namespace vornreport
