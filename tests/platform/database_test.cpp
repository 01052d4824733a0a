// The history database, with SQLite at work and several processes at once.
#include "vorn/database.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "support.hpp"

namespace {

using support::TempFolder;

constexpr const char* kSchema = VORN_TEST_SOURCE_DIR "/sql/vornreport.sql";

class Database {
 public:
  explicit Database(const std::string& path) : opened(VornQazDBOpen(&db_, path.c_str(), kSchema)) {}
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;
  ~Database() { VornQazDBClose(&db_); }

  // Column "a" of every row, each with a blank behind it; "failed" when the statement did.
  std::string run(const std::string& sql) {
    VORNDBResult* result = nullptr;
    VORNDBRow* row = nullptr;
    std::string text;
    if (VORNDBExecute(db_, sql.c_str(), &result) != 0) {
      return "failed";
    }
    while (VORNDBFetchRow(result, &row) == 0) {
      text += VORNDBFetchField(result, row, "a") + std::string(" ");
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

constexpr const char* kInsertion =
    "INSERT INTO VolumeUsage (profile, volume, sizeUse, sizeFree, percent, sampleDate) VALUES "
    "('global', '/v', '1', '2', '3', '100'); ";

TEST(HistoryDatabase, LosesNothingOfProcessesAtOnce) {
  const TempFolder folder;
  const std::string path = folder.path("history.db");
  std::vector<pid_t> children(4);
  for (pid_t& child : children) {
    child = support::fork_child([&] {  // the first to come make the tables
      for (int row = 0; row < 20; ++row) {
        Database db(path);
        if (db.opened != 0 || !db.run(kInsertion).empty()) {
          return 1;
        }
      }
      return 0;
    });
  }
  for (const pid_t child : children) {
    EXPECT_EQ(0, support::wait_child(child));
  }
  EXPECT_EQ("80 ", Database(path).run("SELECT count(*) AS a FROM VolumeUsage"));
  EXPECT_EQ("", support::syslog_text());
}

TEST(HistoryDatabase, SaysWhatToDoAboutAnUnusableFile) {
  const TempFolder folder;
  const auto at = [&](const char* name) { return folder.path(name); };
  { Database(at("good")).run(kInsertion); }
  const std::string good = support::read_file(at("good"));
  support::write_file(at("garbage"), std::string(8192, 'g'));
  support::write_file(at("cut"), good.substr(0, 4096));
  support::write_file(at("damaged"), good.substr(0, 4096) + std::string(good.size() - 4096, 'd'));
  std::filesystem::create_symlink(at("target"), at("link"));
  const std::tuple<const char*, bool, const char*> cases[] = {
      {"garbage", false, "can't be read (file is not a database); move it away"},
      {"cut", false, "can't be read (database disk image is malformed); move it away"},
      {"damaged", true, "(database disk image is malformed); move it away"},  // when it is used
      {"link", false, "it must be a regular file"}};
  for (const auto& [file, opens, said] : cases) {
    Database db(at(file));
    EXPECT_EQ(opens ? 0 : -1, db.opened) << file;
    if (opens) {
      EXPECT_EQ("failed", db.run("SELECT volume AS a FROM VolumeUsage"));
    }
    const std::string log = support::syslog_text();
    EXPECT_NE(std::string::npos, log.find(said)) << log;
    EXPECT_EQ(std::string::npos, log.find('\n')) << log;
  }
  EXPECT_FALSE(support::exists(at("target")));
}

TEST(SqlEscaping, DoublesQuotesOrFails) {
  const TempFolder folder;
  Database db(folder.path("history.db"));
  for (const std::string text : {"", "it's", "'''", "\xff%_\\", "x'); DROP TABLE y; --"}) {
    char out[64];
    ASSERT_NE(0, VORNDBEscapeStringEX(db.get(), out, sizeof out, text.data(), text.size()));
    EXPECT_EQ(text + " ", db.run("SELECT '" + std::string(out) + "' AS a"));
    const std::size_t needed = std::string(out).size() + 1;
    EXPECT_NE(0, VORNDBEscapeStringEX(db.get(), out, needed, text.data(), text.size())) << text;
    EXPECT_EQ(0, VORNDBEscapeStringEX(db.get(), out, needed - 1, text.data(), text.size())) << text;
  }
}

}  // namespace
