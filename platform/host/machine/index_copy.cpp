#include "machine/index_copy.hpp"

#include <sqlite3.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdint>
#include <new>
#include <optional>
#include <string_view>

#include "machine/handle_vfs.hpp"
#include "machine/sqlite_handles.hpp"
#include "vorn/paths.h"
#include "vorn/user.h"

namespace host {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kLongestName = 255;
constexpr std::chrono::minutes kLongestReading(10);

// Reading must be bounded whatever the schema says; it is parsed, into memory, before anything else
// can be asked. An ordinary one has a handful of entries of some hundred bytes.
constexpr int kLongestValue = 1 << 20;
constexpr int kLongestSchemaEntry = 10'000;
constexpr int kStepsOfSchema = 1'500;  // seven for each of its entries
constexpr int kStepsBetweenLooks = 100'000;

constexpr char kSchema[] =
    "PRAGMA journal_mode=OFF; PRAGMA synchronous=OFF; BEGIN;"
    "CREATE TABLE file_info (owner_name TEXT, time_modify INTEGER, size INTEGER, path TEXT, "
    "name TEXT, file_ext TEXT, is_dir INTEGER)";
// No index of the foreign database has a say in which rows there are.
constexpr char kSelect[] =
    "SELECT owner_name, time_modify, size, path, name, file_ext FROM file_info NOT INDEXED "
    "WHERE is_dir=0";
constexpr char kInsert[] = "INSERT INTO file_info VALUES (?1, ?2, ?3, ?4, ?5, ?6, 0)";
enum Column { kOwner, kTime, kSize, kPath, kName, kExtension };

int end_at_once(void*) {
  return 1;
}

int end_when_late(void* deadline) {
  return Clock::now() > *static_cast<const Clock::time_point*>(deadline) ? 1 : 0;
}

[[noreturn]] void refuse_database(sqlite3* db, const char* interrupted) {
  const int code = db == nullptr ? SQLITE_NOMEM : sqlite3_errcode(db);
  // The message may quote the database.
  throw IndexRefusal{
      std::string(code == SQLITE_INTERRUPT ? interrupted : sqlite3_errmsg(db)).substr(0, 200)};
}

Handle open_source(const HandleVfs& vfs) {
  sqlite3* raw = nullptr;
  const int opened = sqlite3_open_v2("index", &raw, SQLITE_OPEN_READONLY, vfs.name());
  Handle db(raw);
  if (opened != SQLITE_OK) {
    refuse_database(raw, "");
  }
  // A view or a virtual table runs whatever its maker wants; without views and modules, only a
  // table can be read.
  for (const int setting : {SQLITE_DBCONFIG_ENABLE_VIEW, SQLITE_DBCONFIG_ENABLE_TRIGGER,
                            SQLITE_DBCONFIG_TRUSTED_SCHEMA}) {
    sqlite3_db_config(raw, setting, 0, nullptr);
  }
  sqlite3_db_config(raw, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
  sqlite3_drop_modules(raw, nullptr);
  sqlite3_limit(raw, SQLITE_LIMIT_LENGTH, kLongestValue);
  sqlite3_limit(raw, SQLITE_LIMIT_SQL_LENGTH, kLongestSchemaEntry);
  sqlite3_exec(raw, "PRAGMA cell_size_check=ON", nullptr, nullptr, nullptr);
  return db;
}

Statement prepare(sqlite3* db, const char* sql) {
  sqlite3_stmt* raw = nullptr;
  sqlite3_prepare_v2(db, sql, -1, &raw, nullptr);
  return Statement(raw);
}

// The value as the import will read it; nothing for NULL.
std::optional<std::string_view> text_at(sqlite3_stmt* row, int column) {
  if (sqlite3_column_type(row, column) == SQLITE_NULL) {
    return std::nullopt;
  }
  const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(row, column));
  if (text == nullptr) {
    throw std::bad_alloc();
  }
  return std::string_view(text, static_cast<std::size_t>(sqlite3_column_bytes(row, column)));
}

bool leads_out(std::string_view path) {
  for (;;) {
    const std::size_t slash = path.find('/');
    if (path.substr(0, slash) == "..") {
      return true;
    }
    if (slash == std::string_view::npos) {
      return false;
    }
    path.remove_prefix(slash + 1);
  }
}

// Digits, of which those behind a decimal point don't count; nothing at all is 0. Others, and what
// is more than 63 bits, would be read as another number.
std::optional<std::int64_t> whole_number(std::string_view text) {
  std::int64_t value = 0;
  if (text.empty()) {
    return value;
  }
  const char* end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data(), end, value);
  const bool whole =
      rest == end ||
      (*rest == '.' && std::all_of(rest + 1, end, [](char c) { return c >= '0' && c <= '9'; }));
  return error == std::errc() && text.front() != '-' && whole ? std::optional(value) : std::nullopt;
}

// The rows of the foreign table, one by one into the new one.
class Copying {
 public:
  Copying(off_t size, sqlite3* to) : room_(2 * size), to_(to), insert_(prepare(to, kInsert)) {}

  void row(sqlite3_stmt* from) {
    ++row_;
    copy_owner(text_at(from, kOwner));
    copy_number(kTime, text_at(from, kTime), "time_modify");
    copy_number(kSize, text_at(from, kSize), "size");
    const std::optional<std::string_view> path = text_at(from, kPath);
    if (!path) {
      refuse("it has no path");
    }
    if (leads_out(*path)) {
      refuse(R"(its path holds "..")");
    }
    copy_text(kPath, path, "path", std::string_view::npos);
    copy_text(kName, text_at(from, kName), "name", kLongestName);
    copy_text(kExtension, text_at(from, kExtension), "file_ext", kLongestName);
    room_ -= kLeastRow;
    if (room_ < 0) {
      throw IndexRefusal{"its table gives more than the file can hold"};
    }
    if (!insert_ || sqlite3_step(insert_.get()) != SQLITE_DONE ||
        sqlite3_reset(insert_.get()) != SQLITE_OK) {
      refuse_copy(to_);
    }
  }

  [[noreturn]] static void refuse_copy(sqlite3* to) {
    throw IndexRefusal{std::string("its copy can't be written: ") + sqlite3_errmsg(to),
                       "free some space on the volume of " VORN_PATH_STAT};
  }

 private:
  static constexpr off_t kLeastRow = 16;

  [[noreturn]] void refuse(const std::string& problem) const {
    throw IndexRefusal{"file " + std::to_string(row_) + " of its table: " + problem};
  }

  void copy_owner(const std::optional<std::string_view>& owner) {
    uid_t uid = 0;
    if (!owner) {
      refuse("it has no owner_name");
    }
    copy_text(kOwner, owner, "owner_name", kLongestName);
    if (VORNUserGetUGID(owner->data(), &uid, nullptr) < 0) {
      refuse("its owner \"" + std::string(*owner) + "\" is no account");
    }
  }

  void copy_number(Column column, const std::optional<std::string_view>& text, const char* what) {
    const std::optional<std::int64_t> value = whole_number(text.value_or(""));
    if (!value) {
      refuse(std::string("its ") + what + " is no number from 0 to 2^63-1");
    }
    sqlite3_bind_int64(insert_.get(), column + 1, *value);
  }

  void copy_text(Column column, const std::optional<std::string_view>& text, const char* what,
                 std::size_t longest) {
    if (!text) {
      sqlite3_bind_null(insert_.get(), column + 1);
      return;
    }
    if (text->find('\0') != std::string_view::npos) {
      refuse(std::string("its ") + what + " holds a zero byte");
    }
    if (text->size() > longest) {
      refuse(std::string("its ") + what + " is longer than 255 bytes");
    }
    room_ -= static_cast<off_t>(text->size());
    sqlite3_bind_text(insert_.get(), column + 1, text->data(), static_cast<int>(text->size()),
                      SQLITE_STATIC);
  }

  // Bytes that the rows to come may have: pages that are in a table many times make it endless.
  // Text of UTF-16 grows by half.
  off_t room_;
  sqlite3* to_;
  Statement insert_;
  std::int64_t row_ = 0;
};

// A generated column runs functions of its maker's choice on each row.
void refuse_generated_columns(sqlite3* db) {
  const Statement columns = prepare(db, "PRAGMA table_xinfo(file_info)");
  constexpr int kColumnName = 1;
  constexpr int kHidden = 6;
  int step = SQLITE_ERROR;
  while (columns && (step = sqlite3_step(columns.get())) == SQLITE_ROW) {
    if (sqlite3_column_int(columns.get(), kHidden) != 0) {
      throw IndexRefusal{"its column " +
                         std::string(text_at(columns.get(), kColumnName).value_or("")) +
                         " is generated"};
    }
  }
  if (step != SQLITE_DONE) {
    refuse_database(db, "it has too many columns");
  }
}

Handle make_target(const std::string& path) {
  sqlite3* raw = nullptr;
  const int opened =
      sqlite3_open_v2(path.c_str(), &raw, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
  Handle db(raw);
  if (opened != SQLITE_OK || sqlite3_exec(raw, kSchema, nullptr, nullptr, nullptr) != SQLITE_OK) {
    Copying::refuse_copy(raw);
  }
  return db;
}

}  // namespace

void copy_index(int source, off_t size, const std::string& path) {
  const HandleVfs vfs(source, size);
  const Handle from = open_source(vfs);
  sqlite3_progress_handler(from.get(), kStepsOfSchema, end_at_once, nullptr);
  const Statement rows = prepare(from.get(), kSelect);
  if (!rows) {
    refuse_database(from.get(), "its schema has too many entries");
  }
  refuse_generated_columns(from.get());
  Clock::time_point deadline = Clock::now() + kLongestReading;
  sqlite3_progress_handler(from.get(), kStepsBetweenLooks, end_when_late, &deadline);
  const Handle to = make_target(path);
  Copying copying(size, to.get());
  int step = SQLITE_ROW;
  while ((step = sqlite3_step(rows.get())) == SQLITE_ROW) {
    copying.row(rows.get());
  }
  if (step != SQLITE_DONE) {
    refuse_database(from.get(), "it takes longer than ten minutes to read");
  }
  if (sqlite3_exec(to.get(), "COMMIT", nullptr, nullptr, nullptr) != SQLITE_OK) {
    Copying::refuse_copy(to.get());
  }
}

}  // namespace host
