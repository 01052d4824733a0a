#include "vorn/admin/history.hpp"

#include <sqlite3.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "machine/sqlite_handles.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

// An open database whose statements can fail, if it can't be opened.
host::Handle open_history() {
  constexpr int kWaitMs = 5000;
  sqlite3* opened = nullptr;
  sqlite3_open_v2(VORN_PATH_HISTORY_DB, &opened, SQLITE_OPEN_READONLY, nullptr);
  host::Handle db(opened);
  sqlite3_busy_timeout(db.get(), kWaitMs);
  return db;
}

host::Statement prepare(const host::Handle& db, const char* sql) {
  sqlite3_stmt* statement = nullptr;
  sqlite3_prepare_v2(db.get(), sql, -1, &statement, nullptr);
  return host::Statement(statement);
}

}  // namespace

int samples_since(const std::string& profile, std::time_t start) {
  const host::Handle db = open_history();
  const host::Statement statement =
      prepare(db,
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
  const host::Handle db = open_history();
  const host::Statement check = prepare(db, "PRAGMA quick_check(1)");
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
  const host::Handle db(opened);
  return sqlite3_exec(db.get(), schema->c_str(), nullptr, nullptr, nullptr) == SQLITE_OK
             ? ""
             : std::string("is broken: ") + sqlite3_errmsg(db.get());
}

}  // namespace admin
