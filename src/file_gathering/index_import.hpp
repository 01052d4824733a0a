// Gathering from a share's file index instead of its folders.
#pragma once

#include <sqlite3.h>

#include "vorn/text.h"

namespace vornreport {

// Copies every file of the share's index database (table `file_info`) into the statistics database,
// in one transaction. 0 when the whole index was copied; -1 otherwise, logged. After a failure in
// the middle the transaction is still open, with the rows that were read before it.
int ReportFileIndexImport(const char* szShareName, const char* szSharePath, sqlite3* db,
                          const VLIBCSzHash* pshFileType);

// Counts the folders of an imported share (facts/folder_totals.hpp): its rows are read back in the
// order of their paths. A failure is logged and an incident.
void count_index_folders(const char* share, const char* share_path, sqlite3* db);

// What the row callback works with.
struct FileIndexImport {
  const char* szShare;
  sqlite3* db;
  const VLIBCSzHash* pshFileType;
};

// The sqlite3_exec callback for one index row: owner name, modification time, size, path, name,
// extension. 0 to go on, -1 to stop the query.
int ReportFileIndexRow(void* context, int columns, char** values, char** names) noexcept;

}  // namespace vornreport
