// The history database, with SQLite at work and several processes at once.
#include "vorn/database.h"

#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <thread>

#include "support.hpp"

namespace {

using support::TempFolder;

constexpr const char* kSchema = VORN_TEST_SOURCE_DIR "/sql/vornreport.sql";
constexpr const char* kHistory =
    "select * from VolumeUsage where profile='global' order by sampleDate; ";
constexpr const char* kRotation =
    "delete from VolumeUsage where sampleDate in (select distinct sampleDate from VolumeUsage "
    "order by sampleDate desc limit 1000,5);";

class Database {
 public:
  explicit Database(const std::string& path, const char* schema = kSchema)
      : opened(VornQazDBOpen(&db_, path.c_str(), schema)) {}
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;
  ~Database() { VornQazDBClose(&db_); }

  // One column of every row, each with a blank behind it; "failed" when the statement did.
  std::string run(const std::string& sql, const char* column = "") {
    VORNDBResult* result = nullptr;
    VORNDBRow* row = nullptr;
    std::string text;
    if (VORNDBExecute(db_, sql.c_str(), &result) != 0) {
      return result == nullptr ? "failed" : "failed badly";
    }
    while (VORNDBFetchRow(result, &row) == 0) {
      const char* field = VORNDBFetchField(result, row, column);
      text += field == nullptr ? "null " : field + std::string(" ");
    }
    VORNDBFreeResult(result);
    return text;
  }
  VORNDB* get() { return db_; }

 private:
  VORNDB* db_ = nullptr;

 public:
  const int opened;
};

std::string insertion(const std::string& date, const std::string& volume = "/v") {
  return "INSERT INTO VolumeUsage (profile, volume, sizeUse, sizeFree, percent, sampleDate) VALUES "
         "('global', '" +
         volume + "', '1', '2', '3', '" + date + "'); ";
}

TEST(HistoryDatabase, IsMadeOnceAndKeepsItsRows) {
  const TempFolder folder;
  const std::string path = folder.path("history.db");
  errno = EXDEV;
  for (const char* date : {"200", "100"}) {
    Database db(path);
    ASSERT_EQ(0, db.opened);
    EXPECT_EQ("", db.run(insertion(date)));
  }
  EXPECT_EQ(EXDEV, errno);
  struct stat status {};
  ASSERT_EQ(0, stat(path.c_str(), &status));
  EXPECT_EQ(0640U, status.st_mode & 0777U);

  Database db(path);
  EXPECT_EQ("100 200 ", db.run(kHistory, "sampleDate"));
  EXPECT_EQ("null null ", db.run(kHistory, "nosuch"));
  EXPECT_EQ(" x ", db.run("SELECT NULL AS a UNION ALL SELECT 'x' AS a", "a"));
  EXPECT_EQ("/v /v ", db.run(std::string(kHistory) + " ; \n", "volume"));
  EXPECT_EQ("", db.run("-- nothing"));
  EXPECT_EQ("", support::syslog_text());
  EXPECT_EQ("failed", db.run(insertion("300") + "DELETE FROM VolumeUsage"));
  EXPECT_EQ("100 200 ", db.run(kHistory, "sampleDate"));
  EXPECT_EQ(1U, support::syslog_lines().size());
}

TEST(HistoryDatabase, HasIndexesForWhatTheProgramAsks) {
  const TempFolder folder;
  Database db(folder.path("history.db"));
  for (const char* sql : {kHistory, kRotation}) {
    const std::string plan = db.run(std::string("EXPLAIN QUERY PLAN ") + sql, "detail");
    EXPECT_NE(std::string::npos, plan.find("USING")) << plan;
    EXPECT_EQ(std::string::npos, plan.find("TEMP B-TREE FOR ORDER")) << plan;
    EXPECT_EQ(std::string::npos, plan.find("TEMP B-TREE FOR DISTINCT")) << plan;
  }
}

TEST(HistoryDatabase, LosesNothingOfProcessesAtOnce) {
  const TempFolder folder;
  const std::string path = folder.path("history.db");
  constexpr int kProcesses = 4;
  constexpr int kRows = 20;
  std::vector<pid_t> children;
  for (int process = 0; process < kProcesses; ++process) {
    children.push_back(support::fork_child([&] {  // the first to come make the tables
      for (int row = 0; row < kRows; ++row) {
        Database db(path);
        if (db.opened != 0 || !db.run(insertion(std::to_string(row))).empty()) {
          return 1;
        }
      }
      return 0;
    }));
  }
  for (const pid_t child : children) {
    EXPECT_EQ(0, support::wait_child(child));
  }
  EXPECT_EQ("80 ", Database(path).run("SELECT count(*) AS n FROM VolumeUsage", "n"));
  EXPECT_EQ("", support::syslog_text());
}

TEST(HistoryDatabase, IsWholeAfterAKillWhileItWasMade) {
  const TempFolder folder;
  const std::string path = folder.path("history.db");
  support::write_file(folder.path("endless.sql"),
                      "CREATE TABLE Half (x);"
                      "WITH RECURSIVE c(n) AS (SELECT 1 UNION ALL SELECT n + 1 FROM c)"
                      "SELECT count(*) FROM c;");
  const pid_t child = support::fork_child(
      [&] { return Database(path, folder.path("endless.sql").c_str()).opened; });
  while (!support::exists(path + "-journal")) {
    std::this_thread::yield();
  }
  kill(child, SIGKILL);
  EXPECT_EQ(-SIGKILL, support::wait_child(child));

  Database db(path);
  ASSERT_EQ(0, db.opened);
  EXPECT_EQ("VolumeUsage ", db.run("SELECT name FROM sqlite_schema WHERE type='table'", "name"));
}

TEST(HistoryDatabase, ReadRowsHoldNoLock) {
  const TempFolder folder;
  const std::string path = folder.path("history.db");
  Database db(path);
  db.run(insertion("100"));
  db.run(insertion("200"));
  VORNDBResult* result = nullptr;
  VORNDBRow* row = nullptr;
  ASSERT_EQ(0, VORNDBExecute(db.get(), kHistory, &result));
  ASSERT_EQ(0, VORNDBFetchRow(result, &row));
  EXPECT_EQ(0, support::wait_child(support::fork_child([&] {
              sqlite3* other = nullptr;  // with no patience
              return sqlite3_open(path.c_str(), &other) != SQLITE_OK ||
                     sqlite3_exec(other, kRotation, nullptr, nullptr, nullptr) != SQLITE_OK;
            })));
  VORNDBFreeResult(result);
  VORNDBFreeResult(nullptr);
}

TEST(HistoryDatabase, SaysWhatToDoAboutAnUnusableFile) {
  const TempFolder folder;
  const auto at = [&](const char* name) { return folder.path(name); };
  { Database(at("good")).run(insertion("100")); }
  support::write_file(at("garbage"), std::string(8192, 'g'));
  const std::string good = support::read_file(at("good"));
  support::write_file(at("cut"), good.substr(0, 4096));
  std::string damaged = good;
  damaged.replace(4096, good.size() - 4096, good.size() - 4096, 'd');
  support::write_file(at("damaged"), damaged);
  support::write_file(at("foreign.sql"), "CREATE TABLE Other (x);");
  { const Database foreign(at("foreign"), at("foreign.sql").c_str()); }
  support::write_file(at("bad.sql"), "CREATE TABLE First (x); CREATE nonsense;");
  std::filesystem::create_symlink(at("target"), at("link"));
  std::filesystem::create_directory(at("folder"));

  struct Case {
    const char* file;
    std::string schema;
    bool opens;  // and then its statements fail
    const char* said;
  };
  const Case cases[] = {
      {"garbage", kSchema, false, "can't be read (file is not a database); move it away"},
      {"cut", kSchema, false, "can't be read (database disk image is malformed); move it away"},
      {"damaged", kSchema, true, "(database disk image is malformed); move it away"},
      {"foreign", kSchema, true, "(no such table: VolumeUsage); move it away"},
      {"link", kSchema, false, "(Too many levels of symbolic links); it must be a regular file"},
      {"folder", kSchema, false, "(Invalid argument); it must be a regular file"},
      {"no/such", kSchema, false, "(No such file or directory); it must be"},
      {"new", "/no/such.sql", false, "its schema /no/such.sql can't be read"},
      {"new", at("bad.sql"), false, "can't be made from its schema"},
  };
  for (const auto& [file, schema, opens, said] : cases) {
    support::syslog_lines();
    Database db(at(file), schema.c_str());
    EXPECT_EQ(opens ? 0 : -1, db.opened) << file;
    EXPECT_EQ(opens, db.get() != nullptr) << file;
    if (opens) {
      EXPECT_EQ("failed", db.run(kHistory)) << file;
      EXPECT_NE(0, errno);
    }
    const auto lines = support::syslog_lines();
    ASSERT_EQ(1U, lines.size()) << file;
    EXPECT_NE(std::string::npos, lines[0].find(said)) << lines[0];
    EXPECT_NE(std::string::npos, lines[0].find(at(file))) << lines[0];
  }
  EXPECT_FALSE(support::exists(at("target")));
  EXPECT_EQ(0, Database(at("new")).opened) << "what failed has left nothing";
  EXPECT_EQ("", Database(at("new")).run(kHistory));

  std::filesystem::create_directory_symlink(folder.path(), at("volume"));
  EXPECT_EQ(0, Database(at("volume/good")).opened) << "folders may be links";
}

TEST(SqlEscaping, DoublesQuotesOrFails) {
  const TempFolder folder;
  Database db(folder.path("history.db"));
  for (const std::string text : {"", "plain", "it's", "'''", "\xff%_\\", "x'); DROP TABLE y; --"}) {
    char out[64];
    ASSERT_NE(0, VORNDBEscapeStringEX(db.get(), out, sizeof out, text.data(), text.size()));
    EXPECT_EQ(text + " ", db.run("SELECT '" + std::string(out) + "' AS a", "a"));
    const std::size_t needed = std::string(out).size() + 1;
    EXPECT_NE(0, VORNDBEscapeStringEX(db.get(), out, needed, text.data(), text.size())) << text;
    EXPECT_EQ(0, VORNDBEscapeStringEX(db.get(), out, needed - 1, text.data(), text.size())) << text;
    EXPECT_TRUE(needed == 1 || *out == '\0');
  }
  char out[8];
  EXPECT_NE(0, VORNDBEscapeStringEX(db.get(), out, sizeof out, "abcdef", 3));
  EXPECT_STREQ("abc", out);
  EXPECT_EQ(0, VORNDBEscapeStringEX(db.get(), out, sizeof out, "a\0b", 3));
  EXPECT_EQ(0, VORNDBEscapeStringEX(nullptr, out, sizeof out, "a", 1));
}

TEST(HistoryDatabase, RefusesMissingArguments) {
  VORNDB* db = nullptr;
  EXPECT_EQ(-1, VornQazDBOpen(nullptr, "x", "x"));
  EXPECT_EQ(-1, VornQazDBOpen(&db, nullptr, "x"));
  EXPECT_EQ(-1, VornQazDBClose(&db));
  EXPECT_EQ(-1, VORNDBExecute(db, "SELECT 1", nullptr));
  EXPECT_EQ(-1, VORNDBFetchRow(nullptr, nullptr));
  EXPECT_EQ(nullptr, VORNDBFetchField(nullptr, nullptr, "a"));
}

}  // namespace
