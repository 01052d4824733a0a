#include "vornreport/statistics_db.hpp"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>

#include "module.hpp"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr char kCreateTable[] =
    "CREATE TABLE if not exists file_stat (id INTEGER PRIMARY KEY ASC, owner INTEGER, mtime "
    "INTEGER, size INTEGER, share STRING, path STRING, filename STRING, ext STRING);";

// Of a database that is about to be made. SQLite reads, writes and sorts by pages, and larger ones
// than usual spare calls; but merging keeps one of every sorted run in memory.
constexpr char kPageSize[] = "PRAGMA page_size=8192;";

// The database that the run's gathering has filled.
struct GatheredDatabase {
  std::string path;
  dev_t device;
  ino_t inode;
};
GatheredDatabase g_gathered;

// Somebody who reads the database for a moment must not cost a share.
constexpr int kLockWaitMs = 10'000;

// The same statement as the text of one file's, with its values apart. SQLite takes longer to read
// the text than to insert the row, and a million of them are made.
constexpr char kInsert[] =
    "INSERT INTO file_stat (owner, mtime, size, share, path, filename, ext) VALUES (?, ?, ?, ?, ?, "
    "?, ?);";

constexpr size_t kQuotedSize = 4096;
constexpr size_t kStatementSize = 8192;
using QuotedText = std::array<char, kQuotedSize>;

// `text` with its quotes doubled, as SQLite's "%q" does it, cut where the buffer ends; but never
// between the two halves of a doubled quote: the one left would end its literal early and let a
// file name speak SQL. ("%q" itself gives an empty text there.)
const char* quote(const char* text, QuotedText& buffer) {
  if (std::strchr(text, '\'') == nullptr && std::strlen(text) < buffer.size()) {
    return text;
  }
  size_t end = 0;
  for (; *text != '\0'; ++text) {
    const size_t taken = *text == '\'' ? 2 : 1;
    if (end + taken >= buffer.size()) {
      break;
    }
    buffer[end] = *text;
    buffer[end + taken - 1] = *text;
    end += taken;
  }
  buffer[end] = '\0';
  return buffer.data();
}

// The INSERT statement of one file, as snprintf would write it, cut at the same byte; put together
// by hand because a million of them are made and formatting was 5 % of the gathering.
class InsertStatement {
 public:
  const char* make(const FileInfo& info, const char* path, const char* name, const char* type) {
    end_ = text_.data();
    text("INSERT INTO file_stat (owner, mtime, size, share, path, filename, ext) VALUES (");
    number(static_cast<uint32_t>(info.pst->st_uid));
    text(", ");
    number(static_cast<uint32_t>(info.pst->st_mtime));
    text(", ");
    number(static_cast<uint64_t>(info.pst->st_size));
    text(", '");
    text(info.szShare);
    text("', '");
    text(path);
    text("', '");
    text(name);
    text("', '");
    text(type);
    text("');");
    *end_ = '\0';
    return text_.data();
  }

 private:
  size_t room() const { return static_cast<size_t>(text_.data() + text_.size() - 1 - end_); }
  void text(std::string_view piece) {
    const size_t length = std::min(piece.size(), room());
    std::memcpy(end_, piece.data(), length);
    end_ += length;
  }
  void number(uint64_t value) {
    std::array<char, 20> digits;
    const char* end = std::to_chars(digits.data(), digits.data() + digits.size(), value).ptr;
    text({digits.data(), static_cast<size_t>(end - digits.data())});
  }

  std::array<char, kStatementSize> text_;
  char* end_ = text_.data();
};

// An index may lack a name, which shows as "%q" shows it.
const char* name_of(const FileInfo& info) {
  return info.szName != nullptr ? info.szName : "(NULL)";
}
const char* type_of(const FileInfo& info) {
  return info.szType != nullptr ? info.szType : "";
}

// The connection's statement of kInsert, which it keeps; null when it can't be had.
sqlite3_stmt* insert_of(sqlite3* db) {
  sqlite3_stmt* statement = sqlite3_next_stmt(db, nullptr);
  while (statement != nullptr && std::strcmp(sqlite3_sql(statement), kInsert) != 0) {
    statement = sqlite3_next_stmt(db, statement);
  }
  if (statement == nullptr) {
    sqlite3_prepare_v3(db, kInsert, sizeof kInsert, SQLITE_PREPARE_PERSISTENT, &statement, nullptr);
  }
  return statement;
}

// Whether a file's values stand in the text of its statement just as they are: nothing is doubled,
// cut or read as another number.
bool stand_as_they_are(const FileInfo& info) {
  size_t room = kStatementSize / 2;
  for (const char* text : {info.szShare, info.szPath, name_of(info), type_of(info)}) {
    const size_t length = std::strlen(text);
    if (length >= room || std::string_view(text, length).find('\'') != std::string_view::npos) {
      return false;
    }
    room -= length;
  }
  return info.pst->st_size >= 0;
}

// Inserts a file without a text of its own: SQLite's result. Nothing where it needs its text; what
// that brings counts too when the result is a failure of this one row.
std::optional<int> insert_values(sqlite3* db, const FileInfo& info) {
  sqlite3_stmt* insert = stand_as_they_are(info) ? insert_of(db) : nullptr;
  if (insert == nullptr) {
    return std::nullopt;
  }
  sqlite3_bind_int64(insert, 1, static_cast<uint32_t>(info.pst->st_uid));
  sqlite3_bind_int64(insert, 2, static_cast<uint32_t>(info.pst->st_mtime));
  sqlite3_bind_int64(insert, 3, info.pst->st_size);
  int column = 4;
  for (const char* text : {info.szShare, info.szPath, name_of(info), type_of(info)}) {
    sqlite3_bind_text(insert, column++, text, -1, SQLITE_STATIC);
  }
  sqlite3_step(insert);
  return sqlite3_reset(insert);
}

// The first argument that must not be null and is, as the text of its check; null when all are set.
const char* missing_argument(const sqlite3* db, const FileInfo* info) {
  if (db == nullptr) {
    return "((void *)0) != db";
  }
  if (info == nullptr) {
    return "((void *)0) != pFileInfo";
  }
  if (info->szShare == nullptr) {
    return "((void *)0) != pFileInfo->szShare";
  }
  if (info->szPath == nullptr) {
    return "((void *)0) != pFileInfo->szPath";
  }
  if (info->pst == nullptr) {
    return "NULL != pFileInfo->pst";
  }
  return nullptr;
}

void make_if_missing(const char* path) {
  const int before = errno;
  if (access(path, F_OK) != 0) {
    errno = before;
    VLIBCFileTouch(path);
  }
}

// A database that was removed and made anew in the middle of a run (a clean of all profiles does
// that) has lost its rows, and reports over it would look like those of empty shares.
void check_gathered_database(const char* path) {
  struct stat status {};
  if (g_gathered.path != path || stat(path, &status) != 0) {
    return;
  }
  if (g_gathered.device != status.st_dev || g_gathered.inode != status.st_ino) {
    REPORT_LOG_ERR(kGatheringModule, __LINE__, "database=%s was removed during the run\n", path);
    mark_report_data_lost();
  }
}

// SQLite's own sum() fails a whole query when sparse files of exbibytes exceed 64 bits. This one
// stays at the greatest number; of no number at all it is NULL, as SQLite's.
struct Sum {
  sqlite3_int64 value;
  bool has_values;
};

void add_to_sum(sqlite3_context* context, int /*count*/, sqlite3_value** values) {
  auto* sum = static_cast<Sum*>(sqlite3_aggregate_context(context, sizeof(Sum)));
  if (sum == nullptr) {
    sqlite3_result_error_nomem(context);
    return;
  }
  if (sqlite3_value_type(values[0]) == SQLITE_NULL) {
    return;
  }
  sum->has_values = true;
  const sqlite3_int64 value = sqlite3_value_int64(values[0]);
  if (__builtin_add_overflow(sum->value, value, &sum->value)) {
    sum->value = value < 0 ? INT64_MIN : INT64_MAX;
  }
}

void end_sum(sqlite3_context* context) {
  const auto* sum = static_cast<const Sum*>(sqlite3_aggregate_context(context, 0));
  if (sum != nullptr && sum->has_values) {
    sqlite3_result_int64(context, sum->value);
  } else {
    sqlite3_result_null(context);
  }
}

int define_sum(sqlite3* db) {
  return sqlite3_create_function_v2(db, "sum", 1, SQLITE_UTF8 | SQLITE_DETERMINISTIC, nullptr,
                                    nullptr, add_to_sum, end_sum, nullptr);
}

void log_exec_failure(const char* sql, const char* message) {
  REPORT_LOG_ERR(kGatheringModule, __LINE__, "Exec sql:[%s] error: %s\n\n", sql,
                 message != nullptr ? message : "");
}

}  // namespace

SqliteHandle VORNReportDBInit(const VLIBCSzHash* profile_hash) {
  if (profile_hash == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "bad parameter");
    return nullptr;
  }
  const char* path = set_value(profile_hash, "real_path_stat_db");
  if (path == nullptr) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "get stat db path failed");
    return nullptr;
  }
  make_if_missing(path);
  VornQazSetEnv();
  sqlite3* raw = nullptr;
  const int opened = sqlite3_open(path, &raw);
  SqliteHandle db(raw);  // there is a handle to close even when the open failed
  if (opened != SQLITE_OK) {
    REPORT_LOG_ERR_NESTED(kGatheringModule, __LINE__, "Can't open database: %s\n",
                          sqlite3_errmsg(raw));
    if (is_storage_failure(opened)) {
      mark_report_data_lost();
    }
    return nullptr;
  }
  sqlite3_busy_timeout(raw, kLockWaitMs);
  if (define_sum(raw) != SQLITE_OK) {
    mark_report_data_lost();
    return nullptr;
  }
  check_gathered_database(path);
  VornQazSetEnv();
  // Only a saving of time, and no news of a database that can't be written: what follows tells.
  static_cast<void>(sqlite3_exec(raw, kPageSize, nullptr, nullptr, nullptr));
  char* message = nullptr;
  if (const int made = sqlite3_exec(raw, kCreateTable, nullptr, nullptr, &message);
      made != SQLITE_OK) {
    const SqliteText owned(message);
    log_exec_failure(kCreateTable, message);
    if (is_storage_failure(made)) {
      mark_report_data_lost();
    }
    return nullptr;
  }
  return db;
}

SqliteHandle open_further(const char* path) {
  // Statements pass the rows once, so pages that were read are of no use; memory is for sorting.
  constexpr char kFewPages[] = "PRAGMA cache_size=-256;";
  sqlite3* raw = nullptr;
  // Writable, to roll back what a failed transaction has left; but it makes no file.
  const int opened = sqlite3_open_v2(path, &raw, SQLITE_OPEN_READWRITE, nullptr);
  SqliteHandle db(raw);
  if (opened != SQLITE_OK || sqlite3_busy_timeout(raw, kLockWaitMs) != SQLITE_OK ||
      define_sum(raw) != SQLITE_OK ||
      sqlite3_exec(raw, kFewPages, nullptr, nullptr, nullptr) != SQLITE_OK ||
      sqlite3_exec(raw, kCreateTable, nullptr, nullptr, nullptr) != SQLITE_OK) {
    return nullptr;
  }
  return db;
}

void forget_gathered() {
  g_gathered = {};
}

void remember_gathered(const VLIBCSzHash* profile_hash) {
  const char* path = set_value(profile_hash, "real_path_stat_db");
  struct stat status {};
  if (path != nullptr && stat(path, &status) == 0) {
    g_gathered = {path, status.st_dev, status.st_ino};
  }
}

int ReportDBAddFile(sqlite3* db, const FileInfo* pFileInfo) {
  if (const char* condition = missing_argument(db, pFileInfo); condition != nullptr) {
    report_invalid_argument(kGatheringModule, __LINE__, condition);
    return -1;
  }
  VornQazSetEnv();
  const std::optional<int> inserted = insert_values(db, *pFileInfo);
  if (inserted == SQLITE_OK) {
    return 0;
  }
  static QuotedText path_buffer;
  static QuotedText name_buffer;
  static QuotedText type_buffer;
  static InsertStatement statement;
  const char* path = quote(pFileInfo->szPath, path_buffer);
  const char* name = quote(name_of(*pFileInfo), name_buffer);
  const char* type = quote(type_of(*pFileInfo), type_buffer);
  // One longer than its buffer is cut inside a literal, and SQLite refuses it.
  const char* sql = statement.make(*pFileInfo, path, name, type);
  char* message = nullptr;
  // Without memory or room SQLite rolls the whole transaction back. What came now would go in
  // alone, and all before it would be missing from a report that looks complete.
  const bool is_over = inserted && is_storage_failure(*inserted);
  const int result = is_over ? *inserted : sqlite3_exec(db, sql, nullptr, nullptr, &message);
  if (result == SQLITE_OK) {
    return 0;
  }
  const SqliteText owned(message);
  log_exec_failure(sql, message != nullptr ? message : sqlite3_errstr(result));
  if (is_storage_failure(result)) {
    mark_report_data_lost();
  }
  return -1;
}

}  // namespace vornreport
