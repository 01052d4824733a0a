// Statements that begin ahead, against the same ones run when they are asked for.
#include "vornreport/statements_ahead.hpp"

#include <csignal>
#include <filesystem>
#include <vector>

#include "report_fixture.hpp"

namespace vornreport {
namespace {

std::string rows_to(int last) {
  return "with recursive c(x) as (select 1 union all select x + 1 from c where x < " +
         std::to_string(last) + ") ";
}
const std::string kMany = rows_to(60'000) + "select x, 'a text of some length', null, '' from c";
const std::string kManyMore = rows_to(60'001) + "select x, 'a text of some length' from c";

// How many threads of this process may get a SIGTERM.
unsigned long long open_to_sigterm() {
  unsigned long long count = 0;
  for (const auto& thread : std::filesystem::directory_iterator("/proc/self/task")) {
    const std::string status = support::read_file(thread.path() / "status");
    const std::string mask = status.substr(status.find("SigBlk:") + 7, 17);
    count += (std::strtoull(mask.c_str(), nullptr, 16) >> (SIGTERM - 1) & 1) ^ 1;
  }
  return count;
}

class StatementsAheadTest : public StatisticsTest {
 protected:
  std::string path() const { return folder_.path("stat.db"); }

  // All that a caller sees of a statement; a callback stops it at its row `stop`.
  template <typename Run>
  static std::string seen(Run&& run, sqlite3* db, const std::string& sql, int stop = 0) {
    struct Seen {
      std::string text;
      int rows_left;
    } seen{"", stop};
    const auto add_row = [](void* context, int columns, char** values, char** names) {
      auto& found = *static_cast<Seen*>(context);
      found.text += std::to_string(errno) + ":";
      errno = ECHILD;
      for (int i = 0; i < columns; ++i) {
        found.text.append(names[i])
            .append("=")
            .append(values[i] ? values[i] : "(null)")
            .append(" ");
      }
      return --found.rows_left == 0 ? 7 : 0;
    };
    char* message = nullptr;
    errno = ECHILD;
    const int result = run(db, sql.c_str(), add_row, &seen, &message);
    const SqliteText owned(message);
    return seen.text + std::to_string(result) + (message != nullptr ? message : "(null)") +
           std::to_string(errno);
  }
};

// Without a database to run on, all must come from the threads.
TEST_F(StatementsAheadTest, AreSeenAsThoseRunWhenAskedFor) {
  const struct {
    std::string sql;
    int stop;
  } cases[] = {{"select 1 as a, null, '' union all select 'x', 2.5, 'y'", 0},
               {"select path from file_stat", 0},
               {"select sum(9223372036854775807) from (select 1 union all select 2)", 0},
               {"select nothing from file_stat", 0},
               {rows_to(9) + "select abs(iif(x = 5, -9223372036854775807 - 1, x)) from c", 0},
               {"select hex(zeroblob(2000000))", 0},
               {kMany, 0},
               {kManyMore, 30'000},
               {"select 3", 1}};
  std::vector<const char*> statements;
  for (const auto& c : cases) {
    statements.push_back(c.sql.c_str());
  }
  const char* longest = cases[6].sql.c_str();
  const StatementsAhead ahead(path().c_str(), statements, longest);
  for (const auto& [sql, stop] : cases) {
    const std::string expected = seen(sqlite3_exec, db_.get(), sql, stop);
    const std::string got = seen(run_statement, nullptr, sql, stop);
    EXPECT_TRUE(got == expected) << sql << "\n"
                                 << got.substr(0, 200) << "\n"
                                 << expected.substr(0, 200);
  }
}

TEST_F(StatementsAheadTest, ThosePassedOverHoldNobodyUp) {
  const std::string few = "select 1";
  const std::string expected = seen(sqlite3_exec, db_.get(), few);
  const StatementsAhead ahead(
      path().c_str(), std::vector{kMany.c_str(), kManyMore.c_str(), few.c_str(), kMany.c_str()});
  EXPECT_EQ(open_to_sigterm(), 1U) << "besides both threads, which have more than they can hold";
  EXPECT_EQ(seen(run_statement, db_.get(), "select 1 "), expected) << "nobody has begun it";
  EXPECT_EQ(seen(run_statement, nullptr, few), expected);
  EXPECT_EQ(seen(run_statement, db_.get(), few), expected) << "asked for again";
}

TEST_F(StatementsAheadTest, RunWhenAskedForIfTheyCannotBegin) {
  const StatementsAhead ahead("/nowhere/stat.db", std::vector{"select 1"});
  EXPECT_EQ(seen(run_statement, db_.get(), "select 1"), seen(sqlite3_exec, db_.get(), "select 1"));
}

}  // namespace
}  // namespace vornreport
