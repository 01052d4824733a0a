// Owners of SQLite's handles.
#ifndef VORN_HOST_SQLITE_HANDLES_HPP
#define VORN_HOST_SQLITE_HANDLES_HPP

#include <sqlite3.h>

#include <memory>

namespace host {

struct CloseDatabase {
  void operator()(sqlite3* handle) const { sqlite3_close(handle); }
};
struct FinalizeStatement {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Handle = std::unique_ptr<sqlite3, CloseDatabase>;
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

}  // namespace host

#endif
