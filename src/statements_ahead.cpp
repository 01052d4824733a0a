#include "vornreport/statements_ahead.hpp"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <optional>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "signals_blocked.hpp"
#include "vorn/report.h"
#include "vornreport/handles.hpp"
#include "vornreport/statistics_db.hpp"

namespace vornreport {
namespace {

// Two, because each holds a sorter's run, and the pages of what it sorts, in memory: with more of
// them a machine of many cores would need more than a small one has.
constexpr size_t kThreads = 2;
// The longest statement is what all others end up waiting for: SQLite sorts a run of its rows on a
// further thread while it collects the next.
constexpr char kSortBeside[] = "PRAGMA threads=1;";
// Bytes of rows that are handed over at once. A statement ahead holds two such batches at most,
// then it waits; large enough for the ten thousand rows of most reports.
constexpr size_t kBatchBytes = size_t{512} * 1024;

// Rows, one after another. Of malloc, since on a thread `new` must not come to the handler that
// ends a run without memory.
class Batch {
 public:
  // Room for one more row; null when there is no memory for it.
  char* extend(size_t bytes) {
    if (capacity_ - size_ < bytes) {
      const size_t wanted = std::max({size_ + bytes, 2 * capacity_, kSmallest});
      auto* grown = static_cast<char*>(std::realloc(bytes_.get(), wanted));
      if (grown == nullptr) {
        return nullptr;
      }
      static_cast<void>(bytes_.release());
      bytes_.reset(grown);
      capacity_ = wanted;
    }
    size_ += bytes;
    return bytes_.get() + size_ - bytes;
  }
  char* begin() { return bytes_.get(); }
  const char* end() const { return bytes_.get() + size_; }
  size_t size() const { return size_; }
  bool empty() const { return size_ == 0; }
  void clear() { size_ = 0; }

 private:
  static constexpr size_t kSmallest = size_t{16} * 1024;
  std::unique_ptr<char, ReleaseWith<&std::free>> bytes_;
  size_t size_ = 0;
  size_t capacity_ = 0;
};

// Before each row of a batch. Its texts follow, each with its terminator, behind the table of their
// lengths with it; 0 for null.
struct RowHead {
  uint32_t columns;
  int32_t error;  // errno as the work on this row has left it, 0 when it was left alone
};
using Length = uint32_t;

// False when there is no memory.
bool append_row(Batch& batch, int columns, char* const* texts, int error) {
  const auto count = static_cast<size_t>(columns);
  size_t bytes = sizeof(RowHead) + count * sizeof(Length);
  for (size_t i = 0; i < count; ++i) {
    bytes += texts[i] != nullptr ? std::strlen(texts[i]) + 1 : 0;
  }
  char* at = batch.extend(bytes);
  if (at == nullptr) {
    return false;
  }
  const RowHead head{static_cast<uint32_t>(columns), error};
  std::memcpy(at, &head, sizeof head);
  char* lengths = at + sizeof head;
  char* text = lengths + count * sizeof(Length);
  for (size_t i = 0; i < count; ++i) {
    const auto length = static_cast<Length>(texts[i] != nullptr ? std::strlen(texts[i]) + 1 : 0);
    std::memcpy(lengths + i * sizeof length, &length, sizeof length);
    if (length != 0) {
      std::memcpy(text, texts[i], length);
      text += length;
    }
  }
  return true;
}

// Points `texts` at the texts of the row at `at`; the place behind it.
char* read_row(char* at, RowHead& head, std::vector<char*>& texts) {
  std::memcpy(&head, at, sizeof head);
  const char* lengths = at + sizeof head;
  char* text = at + sizeof head + head.columns * sizeof(Length);
  texts.resize(head.columns);
  for (size_t i = 0; i < head.columns; ++i) {
    Length length = 0;
    std::memcpy(&length, lengths + i * sizeof length, sizeof length);
    texts[i] = length != 0 ? text : nullptr;
    text += length;
  }
  return text;
}

// In their order; kLeft: it couldn't be begun, which is left to whoever asks for it.
enum class State : uint8_t { kWaiting, kInWork, kEnded, kLeft };

struct Statement {
  const char* sql;
  StatementsAhead::Work* work;
  State state = State::kWaiting;
  bool asked = false;                 // for its rows, or for those of a later one
  std::atomic<bool> dropped = false;  // nobody wants its rows any more
  // Its thread's, until a batch is ready or it has ended.
  Batch names;  // a row of them, before the first row
  Batch filling;
  Batch ready;  // between the two; a third is being read meanwhile
  // Once it has ended.
  int result = SQLITE_OK;
  SqliteText message;
  int error = 0;

  Statement(const char* text, StatementsAhead::Work* owner) : sql(text), work(owner) {}
};

}  // namespace

class StatementsAhead::Work {
 public:
  Work(const char* path, std::span<const char* const> statements, const char* longest);
  ~Work();
  Work(const Work&) = delete;
  Work& operator=(const Work&) = delete;

  // The first such statement that nobody has asked for. Null: run it without threads.
  Statement* ask_for(const char* sql);
  // Hands all rows over. No result when it turned out that it couldn't be begun.
  std::optional<int> hand_over(Statement& statement, sqlite3_callback row, void* context,
                               SqliteText& message);
  // Waits until what is filled can be passed on. False when nobody wants it.
  bool pass_on(Statement& statement);

 private:
  void run_all();
  void run(Statement& statement);
  Statement* next();
  bool receive(Statement& statement, Batch& rows);
  void drop(Statement& statement);  // with the mutex held

  const std::string path_;
  std::vector<std::unique_ptr<Statement>> statements_;
  Statement* longest_ = nullptr;  // begins first; null when none does
  std::mutex mutex_;              // of all state, and of the batches that are ready
  std::condition_variable changed_;
  std::vector<std::thread> threads_;
};

namespace {

StatementsAhead::Work* g_work = nullptr;

// Callbacks of SQLite, on a statement's thread.

int store_row(void* context, int columns, char** values, char** names) noexcept {
  auto& statement = *static_cast<Statement*>(context);
  const int error = std::exchange(errno, 0);
  if ((statement.names.empty() && !append_row(statement.names, columns, names, 0)) ||
      !append_row(statement.filling, columns, values, error)) {
    statement.result = SQLITE_NOMEM;
    return -1;
  }
  if (statement.filling.size() >= kBatchBytes && !statement.work->pass_on(statement)) {
    return -1;
  }
  errno = 0;
  return 0;
}

int stop_when_dropped(void* context) noexcept {
  return static_cast<const Statement*>(context)->dropped ? 1 : 0;
}

SqliteText error_text(int result) {
  return SqliteText(sqlite3_mprintf("%s", sqlite3_errstr(result)));
}

}  // namespace

StatementsAhead::Work::Work(const char* path, std::span<const char* const> statements,
                            const char* longest)
    : path_(path) {
  for (const char* sql : statements) {
    statements_.push_back(std::make_unique<Statement>(sql, this));
    if (sql == longest) {
      longest_ = statements_.back().get();
    }
  }
  threads_.reserve(kThreads);
  const SignalsBlocked blocked;
  const std::lock_guard lock(mutex_);  // no thread begins before it is known how many there are
  try {
    while (threads_.size() < std::min(kThreads, statements_.size())) {
      threads_.emplace_back([this] { run_all(); });
    }
  } catch (const std::system_error&) {
    // Fewer threads; without any, all statements stay with those who ask for them.
  }
  if (threads_.size() < kThreads) {
    longest_ = nullptr;  // it would wait to be asked for, and hold up those asked for before it
  }
}

StatementsAhead::Work::~Work() {
  {
    const std::lock_guard lock(mutex_);
    for (const auto& statement : statements_) {
      drop(*statement);
    }
  }
  for (std::thread& thread : threads_) {
    thread.join();
  }
}

void StatementsAhead::Work::drop(Statement& statement) {
  statement.asked = true;
  statement.dropped = true;
  changed_.notify_all();
}

Statement* StatementsAhead::Work::next() {
  const auto can_begin = [](const Statement& statement) {
    return statement.state == State::kWaiting && !statement.dropped;
  };
  const std::lock_guard lock(mutex_);
  Statement* chosen = longest_ != nullptr && can_begin(*longest_) ? longest_ : nullptr;
  for (size_t i = 0; chosen == nullptr && i < statements_.size(); ++i) {
    chosen = can_begin(*statements_[i]) ? statements_[i].get() : nullptr;
  }
  if (chosen != nullptr) {
    chosen->state = State::kInWork;
  }
  return chosen;
}

void StatementsAhead::Work::run_all() {
  while (Statement* statement = next()) {
    run(*statement);
  }
}

void StatementsAhead::Work::run(Statement& statement) {
  SqliteHandle db = open_further(path_.c_str());
  const bool is_open = db != nullptr;
  if (is_open) {
    constexpr int kStepsBetweenLooks = 10'000;
    sqlite3_progress_handler(db.get(), kStepsBetweenLooks, stop_when_dropped, &statement);
    if (&statement == longest_) {
      // Whether it takes effect or not, the rows are the same.
      static_cast<void>(sqlite3_exec(db.get(), kSortBeside, nullptr, nullptr, nullptr));
    }
    char* message = nullptr;
    errno = 0;
    const int result = sqlite3_exec(db.get(), statement.sql, store_row, &statement, &message);
    statement.error = errno;
    statement.message.reset(message);
    if (statement.result == SQLITE_OK) {
      statement.result = result;
    } else {
      statement.message = error_text(statement.result);
    }
    db.reset();
  }
  {
    const std::lock_guard lock(mutex_);
    statement.state = is_open ? State::kEnded : State::kLeft;
  }
  changed_.notify_all();
}

bool StatementsAhead::Work::pass_on(Statement& statement) {
  {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return statement.ready.empty() || statement.dropped; });
    if (statement.dropped) {
      return false;
    }
    std::swap(statement.filling, statement.ready);
  }
  changed_.notify_all();
  return true;
}

Statement* StatementsAhead::Work::ask_for(const char* sql) {
  const std::lock_guard lock(mutex_);
  const auto asked_for =
      std::find_if(statements_.begin(), statements_.end(), [&](const auto& statement) {
        return !statement->asked && std::strcmp(statement->sql, sql) == 0;
      });
  if (threads_.empty() || asked_for == statements_.end()) {
    return nullptr;
  }
  // Those before it were passed over: their reports failed before they asked. They must not hold
  // the threads, which work in this order.
  std::for_each(statements_.begin(), asked_for, [&](const auto& earlier) { drop(*earlier); });
  (*asked_for)->asked = true;
  return asked_for->get();
}

// Waits for the next rows, and takes them in place of those in `rows`. False when there are none.
bool StatementsAhead::Work::receive(Statement& statement, Batch& rows) {
  rows.clear();
  {
    std::unique_lock lock(mutex_);
    changed_.wait(lock,
                  [&] { return !statement.ready.empty() || statement.state >= State::kEnded; });
    std::swap(rows, statement.ready.empty() ? statement.filling : statement.ready);
  }
  changed_.notify_all();
  return !rows.empty();
}

std::optional<int> StatementsAhead::Work::hand_over(Statement& statement, sqlite3_callback row,
                                                    void* context, SqliteText& message) {
  Batch rows;
  std::vector<char*> names;
  std::vector<char*> values;
  RowHead head{};
  while (receive(statement, rows)) {
    read_row(statement.names.begin(), head, names);
    for (char* at = rows.begin(); at != rows.end();) {
      at = read_row(at, head, values);
      if (head.error != 0) {
        errno = head.error;
      }
      if (row(context, static_cast<int>(head.columns), values.data(), names.data()) != 0) {
        const std::lock_guard lock(mutex_);
        drop(statement);
        message = error_text(SQLITE_ABORT);
        return SQLITE_ABORT;
      }
    }
  }
  if (statement.state == State::kLeft) {
    return std::nullopt;
  }
  if (statement.error != 0) {
    errno = statement.error;
  }
  statement.filling = {};
  statement.ready = {};
  message = std::move(statement.message);
  return statement.result;
}

StatementsAhead::StatementsAhead(const char* path, std::span<const char* const> statements,
                                 const char* longest) {
  if (path != nullptr && !statements.empty()) {
    VornQazSetEnv();  // before a thread uses what it prepares
    work_ = std::make_unique<Work>(path, statements, longest);
    g_work = work_.get();
  }
}

StatementsAhead::~StatementsAhead() {
  g_work = nullptr;
}

int run_statement(sqlite3* db, const char* sql, sqlite3_callback row, void* context,
                  char** message) {
  if (Statement* begun = g_work != nullptr ? g_work->ask_for(sql) : nullptr; begun != nullptr) {
    SqliteText said;
    if (const auto result = g_work->hand_over(*begun, row, context, said)) {
      *message = said.release();
      return *result;
    }
  }
  return sqlite3_exec(db, sql, row, context, message);
}

}  // namespace vornreport
