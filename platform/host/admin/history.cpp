#include "vorn/admin/history.hpp"

#include <sqlite3.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

struct CloseDb {
  void operator()(sqlite3* db) const { sqlite3_close(db); }
};
struct Finalize {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using DbPtr = std::unique_ptr<sqlite3, CloseDb>;
using StatementPtr = std::unique_ptr<sqlite3_stmt, Finalize>;

// An open database whose statements can fail, if it can't be opened.
DbPtr open_history() {
  constexpr int kWaitMs = 5000;
  sqlite3* opened = nullptr;
  sqlite3_open_v2(VORN_PATH_HISTORY_DB, &opened, SQLITE_OPEN_READONLY, nullptr);
  DbPtr db(opened);
  sqlite3_busy_timeout(db.get(), kWaitMs);
  return db;
}

StatementPtr prepare(const DbPtr& db, const char* sql) {
  sqlite3_stmt* statement = nullptr;
  sqlite3_prepare_v2(db.get(), sql, -1, &statement, nullptr);
  return StatementPtr(statement);
}

}  // namespace

int samples_since(const std::string& profile, std::time_t start) {
  const DbPtr db = open_history();
  const StatementPtr statement = prepare(db,
                                         "SELECT count(*) FROM VolumeUsage WHERE profile = ?1 AND "
                                         "CAST(sampleDate AS INTEGER) >= ?2");
  if (!statement) {
    return 0;
  }
  sqlite3_bind_text(statement.get(), 1, profile.c_str(), -1, SQLITE_TRANSIENT);
  sqlite3_bind_int64(statement.get(), 2, start);
  return sqlite3_step(statement.get()) == SQLITE_ROW ? sqlite3_column_int(statement.get(), 0) : 0;
}

std::string history_problem() {
  if (access(VORN_PATH_HISTORY_DB, F_OK) != 0) {
    return "";
  }
  const DbPtr db = open_history();
  const StatementPtr check = prepare(db, "PRAGMA quick_check(1)");
  if (!check || sqlite3_step(check.get()) != SQLITE_ROW) {
    return std::string("is broken: ") + sqlite3_errmsg(db.get());
  }
  const auto* verdict = reinterpret_cast<const char*>(sqlite3_column_text(check.get(), 0));
  const std::string text = verdict == nullptr ? "" : verdict;
  return text == "ok" ? "" : "is broken: " + text;
}

std::string schema_problem() {
  constexpr std::size_t kLargestSchema = 1U << 20U;
  const auto schema = host::read_file(VORN_PATH_HISTORY_SCHEMA, kLargestSchema);
  if (!schema) {
    return std::string("can't be read (") + std::strerror(errno) + ")";
  }
  sqlite3* opened = nullptr;
  sqlite3_open(":memory:", &opened);
  const DbPtr db(opened);
  return sqlite3_exec(db.get(), schema->c_str(), nullptr, nullptr, nullptr) == SQLITE_OK
             ? ""
             : std::string("is broken: ") + sqlite3_errmsg(db.get());
}

}  // namespace admin
