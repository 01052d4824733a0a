#include "transaction.hpp"

#include "module.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/handles.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {

void begin_transaction(sqlite3* db) {
  VornQazSetEnv();
  char* message = nullptr;
  sqlite3_exec(db, "BEGIN TRANSACTION", nullptr, nullptr, &message);
  const SqliteText owned(message);
  if (message != nullptr) {
    REPORT_LOG_ERR(kGatheringModule, __LINE__, "begin TRANSACTION failed, msg=%s\n", message);
  }
}

void commit_transaction(sqlite3* db) {
  VornQazSetEnv();
  char* message = nullptr;
  const int result = sqlite3_exec(db, "COMMIT TRANSACTION", nullptr, nullptr, &message);
  const SqliteText owned(message);
  if (message != nullptr) {
    REPORT_LOG_ERR(kGatheringModule, __LINE__, "COMMIT TRANSACTION failed, msg=%s\n", message);
  }
  if (is_storage_failure(result)) {
    mark_report_data_lost();
  }
}

}  // namespace vornreport
