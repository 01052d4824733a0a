// Databases that outlive a run.
#include "vorn/database.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/host_log.hpp"
#include "machine/sqlite_handles.hpp"
#include "vorn/base/file_io.hpp"

// Rows are read as a whole when the statement runs: a statement that is under way holds a lock that
// keeps writers out, and what a caller does between two rows may take any time.
struct VORNDBRow {
  const std::size_t* fields;  // where each column's text begins
};

struct VORNDBResult {
  std::vector<std::string> columns;
  std::string texts;                // each with its terminator
  std::vector<std::size_t> fields;  // row after row, columns.size() each
  std::size_t next = 0;             // index in `fields`
  VORNDBRow row{};
};

namespace host {
namespace {

constexpr int kLockWaitMilliseconds = 10'000;
constexpr std::size_t kLargestSchema = std::size_t{1} << 20;

}  // namespace
}  // namespace host

struct VORNDB {
  std::string path;
  host::Handle handle;
};

namespace host {
namespace {

struct Failure {
  int code;  // SQLite's
  int error;
  const char* advice;
};

constexpr const char* kBroken = "move it away, and the next run makes a new one";
constexpr const char* kLocked = "another process keeps it locked; fuser tells which";

constexpr Failure kFailures[] = {
    {SQLITE_NOTADB, EUCLEAN, kBroken},
    {SQLITE_CORRUPT, EUCLEAN, kBroken},
    {SQLITE_ERROR, EINVAL, kBroken},  // a table or column that isn't there
    {SQLITE_BUSY, EBUSY, kLocked},
    {SQLITE_LOCKED, EBUSY, kLocked},
    {SQLITE_FULL, ENOSPC, "free some space on its volume"},
    {SQLITE_READONLY, EROFS, "make it and its folder writable"},
    {SQLITE_CANTOPEN, EACCES, "make it and its folder accessible"},
    {SQLITE_NOMEM, ENOMEM, "free some memory"},
    {SQLITE_IOERR, EIO, "the kernel's log tells what is wrong with its volume"},
};

// One line for what SQLite's last call on `db` met, and errno for it.
int fail(const VORNDB& db, const char* what) {
  sqlite3* handle = db.handle.get();
  const int code = sqlite3_errcode(handle);
  const auto* failure = std::find_if(std::begin(kFailures), std::end(kFailures) - 1,
                                     [code](const Failure& known) { return known.code == code; });
  log_line("database \"%s\" %s (%s); %s", db.path.c_str(), what, sqlite3_errmsg(handle),
           failure->advice);
  errno = failure->error;
  return -1;
}

// --- Opening ------------------------------------------------------------------------------------

// `path` with the links of its folder resolved. SQLite, told to follow no link, refuses links in
// folders too, and an administrator may well have put /usr/vorn on another volume.
std::optional<std::string> in_real_folder(const std::string& path) {
  const std::size_t name = path.rfind('/') + 1;  // 0 without a slash: npos wraps around
  const std::string folder = path.substr(0, name);
  const std::unique_ptr<char, decltype(&std::free)> real(
      realpath(folder.empty() ? "." : folder.c_str(), nullptr), &std::free);
  return real ? std::optional(std::string(real.get()) + "/" + path.substr(name)) : std::nullopt;
}

// Makes `path` as an empty file when it is missing. One that exists isn't opened: the kernel drops
// a process's locks on a file when it closes any descriptor of it.
bool make_file(const std::string& path) {
  if (Fd(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0640))) {
    return true;
  }
  struct stat status {};
  if (errno != EEXIST || lstat(path.c_str(), &status) != 0) {
    return false;
  }
  errno = S_ISLNK(status.st_mode) ? ELOOP : EINVAL;
  return S_ISREG(status.st_mode);
}

// Runs `sql`, which gives no rows. False when the database has a failure to tell of.
bool run(const VORNDB& db, const char* sql) {
  return sqlite3_exec(db.handle.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK;
}

enum class Content { none, some, unreadable };

Content content_of(const VORNDB& db) {
  sqlite3_stmt* raw = nullptr;
  sqlite3_prepare_v2(db.handle.get(), "SELECT 1 FROM sqlite_schema LIMIT 1", -1, &raw, nullptr);
  const Statement statement(raw);
  switch (raw == nullptr ? SQLITE_ERROR : sqlite3_step(raw)) {
    case SQLITE_ROW:
      return Content::some;
    case SQLITE_DONE:
      return Content::none;
    default:
      return Content::unreadable;
  }
}

// All or nothing, and once: of two processes that come at the same time the second waits for the
// lock and then finds the tables; a process that dies half-way leaves a transaction that SQLite
// takes back at the next opening.
int make_tables(const VORNDB& db, const char* schema_path) {
  const std::optional<std::string> schema = read_file(schema_path, kLargestSchema);
  if (!schema) {
    log_line(
        "database \"%s\" can't be made: its schema %s can't be read (%s); install that file "
        "again",
        db.path.c_str(), schema_path, std::strerror(errno));
    return -1;
  }
  if (!run(db, "BEGIN IMMEDIATE")) {
    return fail(db, "can't be made");
  }
  if (content_of(db) == Content::none && !run(db, schema->c_str())) {
    return fail(db, "can't be made from its schema");
  }
  return run(db, "COMMIT") ? 0 : fail(db, "can't be made");
}

int open_database(VORNDB& db, const char* schema_path) {
  const std::optional<std::string> path = in_real_folder(db.path);
  if (!path || !make_file(*path)) {
    log_line("database \"%s\" can't be opened (%s); it must be a regular file in a writable folder",
             db.path.c_str(), std::strerror(errno));
    return -1;
  }
  sqlite3* handle = nullptr;
  const int opened = sqlite3_open_v2(path->c_str(), &handle,
                                     SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOFOLLOW, nullptr);
  db.handle.reset(handle);
  if (opened != SQLITE_OK) {
    return fail(db, "can't be opened");
  }
  sqlite3_busy_timeout(handle, kLockWaitMilliseconds);
  switch (content_of(db)) {
    case Content::some:
      return 0;
    case Content::none:
      return make_tables(db, schema_path);
    default:
      return fail(db, "can't be read");
  }
}

// --- Statements ---------------------------------------------------------------------------------

void add_row(sqlite3_stmt* statement, VORNDBResult& result) {
  for (int column = 0; column < static_cast<int>(result.columns.size()); ++column) {
    const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
    result.fields.push_back(result.texts.size());
    result.texts.append(text == nullptr ? "" : text).push_back('\0');
  }
}

int execute(const VORNDB& db, const char* sql, std::unique_ptr<VORNDBResult>& result) {
  sqlite3_stmt* raw = nullptr;
  const char* rest = nullptr;
  if (sqlite3_prepare_v2(db.handle.get(), sql, -1, &raw, &rest) != SQLITE_OK) {
    return fail(db, "can't run a statement");
  }
  const Statement statement(raw);
  if (rest[std::strspn(rest, "; \t\r\n")] != '\0') {
    log_line("database \"%s\": a statement is followed by another one; neither was run",
             db.path.c_str());
    errno = EINVAL;
    return -1;
  }
  if (raw == nullptr) {
    return 0;  // blanks or a comment
  }
  const int columns = sqlite3_column_count(raw);
  result = columns > 0 ? std::make_unique<VORNDBResult>() : nullptr;
  for (int column = 0; column < columns; ++column) {
    result->columns.emplace_back(sqlite3_column_name(raw, column));
  }
  int step = SQLITE_OK;
  while ((step = sqlite3_step(raw)) == SQLITE_ROW) {
    add_row(raw, *result);
  }
  return step == SQLITE_DONE ? 0 : fail(db, "can't run a statement");
}

}  // namespace
}  // namespace host

int VornQazDBOpen(VORNDB** db, const char* path, const char* schema_path) try {
  if (db != nullptr) {
    *db = nullptr;
  }
  if (db == nullptr || path == nullptr || schema_path == nullptr) {
    errno = EINVAL;
    return -1;
  }
  auto made = std::make_unique<VORNDB>();
  made->path = path;
  // SQLite looks for files that needn't exist.
  if (host::keeping_errno([&] { return host::open_database(*made, schema_path); }) != 0) {
    return -1;
  }
  *db = made.release();
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazDBClose(VORNDB** db) {
  if (db == nullptr || *db == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const host::ErrnoKeeper keeper;
  delete std::exchange(*db, nullptr);
  return 0;
}

int VORNDBExecute(VORNDB* db, const char* sql, VORNDBResult** result) try {
  if (result != nullptr) {
    *result = nullptr;
  }
  if (db == nullptr || sql == nullptr) {
    errno = EINVAL;
    return -1;
  }
  std::unique_ptr<VORNDBResult> rows;
  if (host::keeping_errno([&] { return host::execute(*db, sql, rows); }) != 0) {
    return -1;
  }
  if (result != nullptr) {
    *result = rows.release();
  }
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VORNDBFetchRow(VORNDBResult* result, VORNDBRow** row) {
  if (result == nullptr || row == nullptr || result->next == result->fields.size()) {
    return -1;
  }
  result->row.fields = &result->fields[result->next];
  result->next += result->columns.size();
  *row = &result->row;
  return 0;
}

const char* VORNDBFetchField(VORNDBResult* result, VORNDBRow* row, const char* column) {
  if (result == nullptr || row == nullptr || column == nullptr) {
    return nullptr;
  }
  const auto found = std::find(result->columns.begin(), result->columns.end(), column);
  return found == result->columns.end()
             ? nullptr
             : &result->texts[row->fields[found - result->columns.begin()]];
}

void VORNDBFreeResult(VORNDBResult* result) {
  delete result;
}

int VORNDBEscapeStringEX(VORNDB* db, char* out, size_t size, const char* in, size_t length) {
  if (out != nullptr && size > 0) {
    *out = '\0';
  }
  // A zero byte would end the statement that the text goes into.
  if (db == nullptr || out == nullptr || size == 0 || in == nullptr ||
      std::memchr(in, '\0', length) != nullptr) {
    errno = EINVAL;
    return 0;
  }
  const auto quotes = static_cast<std::size_t>(std::count(in, in + length, '\''));
  if (length + quotes >= size) {
    errno = ENOBUFS;
    return 0;
  }
  for (const char* c = in; c != in + length; ++c) {
    if (*c == '\'') {
      *out++ = '\'';
    }
    *out++ = *c;
  }
  *out = '\0';
  return 1;
}
