// Statements over the statistics database that begin before a report asks for their rows.
//
// Nearly all of a report's time is its statement's sorting, and a statement sorts on one core. So
// the statements of a run's reports work on threads and connections of their own, while the reports
// go on one after another and take their rows from there.
#pragma once

#include <sqlite3.h>

#include <memory>
#include <span>

namespace vornreport {

// One at a time in a process, and all of it belongs to one thread, which isn't one of its own.
class StatementsAhead {
 public:
  // Begins `statements` over the database at `path`, in the order in which they will be asked for;
  // one that is passed over is given up. `longest`, one of them or null, begins before all others.
  // Their texts outlive the object. Without a path nothing is begun. Says nothing: one that can't
  // be begun is run when it is asked for.
  StatementsAhead(const char* path, std::span<const char* const> statements,
                  const char* longest = nullptr);
  // Stops what nobody has asked for, and waits for the end of all threads.
  ~StatementsAhead();
  StatementsAhead(const StatementsAhead&) = delete;
  StatementsAhead& operator=(const StatementsAhead&) = delete;

  class Work;

 private:
  std::unique_ptr<Work> work_;
};

// As sqlite3_exec: results, messages (freed by sqlite3_free), rows and their order, what a callback
// may do. A statement that was begun ahead hands its rows over, once; every other runs on `db`.
int run_statement(sqlite3* db, const char* sql, sqlite3_callback row, void* context,
                  char** message);

}  // namespace vornreport
