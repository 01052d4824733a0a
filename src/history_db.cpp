#include "history_db.hpp"

#include "vorn/paths.h"
#include "vornreport/error_log.hpp"

namespace vornreport {

DbHandle open_history(const char* module, int line) {
  VORNDB* db = nullptr;
  const int opened = VornQazDBOpen(&db, VORN_PATH_HISTORY_DB, VORN_PATH_HISTORY_SCHEMA);
  DbHandle handle(db);
  if (opened < 0) {
    REPORT_LOG_ERR(module, line, "Failed to open qaz DB\n");
    return nullptr;
  }
  return handle;
}

bool execute(VORNDB* db, const char* sql, ResultHandle& result) {
  VORNDBResult* rows = nullptr;
  const int executed = VORNDBExecute(db, sql, &rows);
  result.reset(rows);
  return executed != -1;
}

const char* field(VORNDBResult* result, VORNDBRow* row, const char* column) {
  const char* text = VORNDBFetchField(result, row, column);
  return text != nullptr ? text : "";
}

}  // namespace vornreport
