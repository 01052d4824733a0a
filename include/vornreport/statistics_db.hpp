// The statistics database of a run: one row of `file_stat` for every regular file found.
#pragma once

#include <sys/stat.h>

#include "vornreport/handles.hpp"

namespace vornreport {

// One file to be inserted. All of it belongs to the caller.
struct FileInfo {
  const char* szShare;     // required
  const char* szPath;      // full path; required
  const char* szName;      // last component
  const char* szType;      // type label; null is stored as the empty text
  const struct stat* pst;  // required; only st_uid, st_mtime and st_size are read
};

// Opens the database at `real_path_stat_db` and makes its table, both when missing. Null on
// failure, which is logged.
SqliteHandle VORNReportDBInit(const VLIBCSzHash* profile_hash);

// A further connection to the database at `path`, for another thread: set up as that of
// VORNReportDBInit, by calls of SQLite alone. Null, and nothing is logged, when that isn't
// possible.
SqliteHandle open_further(const char* path);

// Remembers the database as the one that holds the run's rows. When another file stands in its
// place later, VORNReportDBInit logs that and marks the run's data as lost.
void remember_gathered(const VLIBCSzHash* profile_hash);
// Begins anew: any file may stand at the database's place.
void forget_gathered();

// Inserts one file. 0, or -1 (logged) with nothing inserted.
int ReportDBAddFile(sqlite3* db, const FileInfo* pFileInfo);

}  // namespace vornreport
