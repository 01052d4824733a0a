#include "index_import.hpp"

#include <unistd.h>

#include <cstdint>
#include <cstdlib>

#include "facts/tallies.hpp"
#include "module.hpp"
#include "transaction.hpp"
#include "vorn/report.h"
#include "vorn/share.h"
#include "vorn/user.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fixed_text.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

enum Column { kOwnerName, kModifyTime, kSize, kPath, kName, kExtension };

unsigned long long parse_number(const char* text) {
  return text != nullptr ? std::strtoull(text, nullptr, 10) : 0;
}

// Runs the index query; every row goes to ReportFileIndexRow.
int copy_rows(sqlite3* index, const char* share_path, FileIndexImport& import) {
  FixedText<4096> query;
  query.format(
      "select owner_name, time_modify, size, '%s/'||path, name, file_ext from file_info where "
      "is_dir=0;",
      share_path);
  VornQazSetEnv();
  char* message = nullptr;
  const int result = sqlite3_exec(index, query.c_str(), ReportFileIndexRow, &import, &message);
  const SqliteText owned(message);
  if (result != SQLITE_OK) {
    REPORT_LOG_ERR(kGatheringModule, __LINE__, "Exec sql:[%s] error: %s\n\n", query.c_str(),
                   message != nullptr ? message : "");
    return -1;
  }
  return 0;
}

}  // namespace

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
