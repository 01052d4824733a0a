// The history database, which all profiles share: opened for one operation and closed again.
#pragma once

#include <memory>

#include "vorn/database.h"
#include "vornreport/handles.hpp"

namespace vornreport {

struct CloseDb {
  void operator()(VORNDB* db) const { VornQazDBClose(&db); }
};
using DbHandle = std::unique_ptr<VORNDB, CloseDb>;
using ResultHandle = std::unique_ptr<VORNDBResult, ReleaseWith<&VORNDBFreeResult>>;

// Null, logged at `module` and `line`, when it can't be opened.
DbHandle open_history(const char* module, int line);

// False on failure, which the platform has logged.
bool execute(VORNDB* db, const char* sql, ResultHandle& result);

// The column's text; "" for one that isn't there.
const char* field(VORNDBResult* result, VORNDBRow* row, const char* column);

}  // namespace vornreport
