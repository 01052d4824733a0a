#include "vorn/admin/history.hpp"

#include <sqlite3.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <vector>

#include "base/host_log.hpp"
#include "machine/sqlite_handles.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

// An open database whose statements can fail, if it can't be opened.
host::Handle open_history(int flags = SQLITE_OPEN_READONLY) {
  constexpr int kWaitMs = 5000;
  sqlite3* opened = nullptr;
  sqlite3_open_v2(VORN_PATH_HISTORY_DB, &opened, flags, nullptr);
  host::Handle db(opened);
  sqlite3_busy_timeout(db.get(), kWaitMs);
  return db;
}

host::Statement prepare(const host::Handle& db, const char* sql) {
  sqlite3_stmt* statement = nullptr;
  sqlite3_prepare_v2(db.get(), sql, -1, &statement, nullptr);
  return host::Statement(statement);
}

// The tables whose rows belong to a profile, with the columns besides its name. A history that is
// older than one of them lacks it.
struct TableOfProfiles {
  const char* name;
  const char* columns;
};
constexpr std::array kTables{
    TableOfProfiles{"VolumeUsage", "volume, sizeUse, sizeFree, percent, sampleDate"},
    TableOfProfiles{"Snapshot", "time, valid, folders, summary, details"}};

bool has_table(const host::Handle& db, const char* name) {
  const host::Statement found =
      prepare(db, "SELECT 1 FROM sqlite_master WHERE type = 'table' AND name = ?1");
  return found && sqlite3_bind_text(found.get(), 1, name, -1, SQLITE_STATIC) == SQLITE_OK &&
         sqlite3_step(found.get()) == SQLITE_ROW;
}

bool step(const host::Handle& db, const std::string& sql, const std::vector<std::string>& names) {
  const host::Statement statement = prepare(db, sql.c_str());
  int index = 0;
  for (const std::string& name : names) {
    sqlite3_bind_text(statement.get(), ++index, name.c_str(), -1, SQLITE_TRANSIENT);
  }
  return statement && sqlite3_step(statement.get()) == SQLITE_DONE;
}

// The rows of `gone` go; those of `from`, if there is one, are its own from then on.
bool change_history(const std::string& gone, const std::string& from) {
  if (access(VORN_PATH_HISTORY_DB, F_OK) != 0 && errno == ENOENT) {
    return true;
  }
  const host::Handle db = open_history(SQLITE_OPEN_READWRITE);
  bool done = step(db, "BEGIN IMMEDIATE", {});
  for (const TableOfProfiles& table : kTables) {
    if (!done || !has_table(db, table.name)) {
      continue;
    }
    const std::string name = table.name;
    const std::string columns = table.columns;
    done = step(db, "DELETE FROM " + name + " WHERE profile = ?1", {gone}) &&
           (from.empty() || step(db,
                                 "INSERT INTO " + name + " (profile, " + columns + ") SELECT ?1, " +
                                     columns + " FROM " + name + " WHERE profile = ?2",
                                 {gone, from}));
  }
  done = done && step(db, "COMMIT", {});  // without it everything is as it was
  if (!done) {
    host::log_line(
        "the history of profile \"%s\" in %s can't be changed (%s); run this as root, "
        "or try again when no run is going on",
        gone.c_str(), VORN_PATH_HISTORY_DB, sqlite3_errmsg(db.get()));
  }
  return done;
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

bool forget_history(const std::string& profile) {
  return change_history(profile, "");
}

bool copy_history(const std::string& from, const std::string& to) {
  return change_history(to, from);
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
