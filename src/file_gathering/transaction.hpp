// Transactions of the gathering: one for each share.
#pragma once

#include <sqlite3.h>

namespace vornreport {

// Run "BEGIN TRANSACTION" and "COMMIT TRANSACTION". A failure is logged and nothing else: the rows
// are then in whatever transaction is open.
void begin_transaction(sqlite3* db);
void commit_transaction(sqlite3* db);

}  // namespace vornreport
