// What a run takes over from a share's file index.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <filesystem>

#include "config/shares.hpp"
#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vorn/share.h"

namespace fs = std::filesystem;

namespace {

// An index of `count` files of `owner`.
void make_index(const std::string& path, const std::string& owner, int count) {
  fs::remove(path);
  sqlite3* db = nullptr;
  sqlite3_open(path.c_str(), &db);
  const std::string sql =
      "CREATE TABLE file_info (owner_name, time_modify, size, path, name, file_ext, is_dir);"
      "WITH n(i) AS (VALUES (1) UNION ALL SELECT i + 1 FROM n LIMIT " +
      std::to_string(count) + ") INSERT INTO file_info SELECT '" + owner +
      "', i, i, 'path', 'name', 'ext', 0 FROM n";
  EXPECT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
  sqlite3_close(db);
}

// The number of files that an import would find for `share`; -1 when it would find no database.
int files_of(const char* share) {
  char path[4096];
  sqlite3* db = nullptr;
  int count = -1;
  if (VORNShareFileIndexDBPathGet(share, path, sizeof path) == 0 &&
      sqlite3_open_v2(path, &db, SQLITE_OPEN_READONLY, nullptr) == SQLITE_OK) {
    const auto read = [](void* to, int, char** values, char**) {
      *static_cast<int*>(to) = std::stoi(values[0]);
      return 0;
    };
    sqlite3_exec(db, "SELECT count(*) FROM file_info", read, &count, nullptr);
  }
  sqlite3_close(db);
  return count;
}

TEST(ShareIndex, IsTakenOverOnceAndForTheRunOnly) {
  const support::TempFolder folder;
  const std::string one = folder.path("one.db");
  const std::string bad = folder.path("bad.db");
  make_index(one, "root", 3);
  make_index(bad, "no-such-account", 3);
  support::write_file(VORN_PATH_SHARES, "[one]\npath = /1\nfile_index = " + one +
                                            "\n[bad]\npath = /2\nfile_index = " + bad +
                                            "\n[none]\npath = /3\n[relative]\npath = /4\n"
                                            "file_index = one.db\n");
  EXPECT_TRUE(support::passes_in_child([&] {  // since the file is read once
    host::read_shares();
    EXPECT_EQ(VORNShareFileIndexIsEnabled("bad"), 0) << "no run";
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    support::Hash hash = support::make_hash();
    VLIBCSzHash* raw = hash.get();
    EXPECT_EQ(VornQazProfileRunning("indexes"), 0);
    EXPECT_EQ(VornQazInitRealPath("indexes", &raw, 1), 0);
    EXPECT_EQ(files_of("one"), -1) << "not asked about";
    EXPECT_EQ(VORNShareFileIndexIsEnabled("one"), 1);
    // Whatever its owner puts there now comes too late.
    make_index(one, "no-such-account", 5);
    EXPECT_EQ(VORNShareFileIndexIsEnabled("one"), 1);
    EXPECT_EQ(files_of("one"), 3);
    EXPECT_EQ(support::syslog_text(), "");
    for (const char* share : {"bad", "relative", "none", "unknown"}) {
      EXPECT_EQ(VORNShareFileIndexIsEnabled(share), 0) << share;
      EXPECT_EQ(VORNShareFileIndexIsEnabled(share), 0) << share;
      EXPECT_EQ(files_of(share), -1) << share;
    }
    EXPECT_EQ(support::syslog_lines().size(), 1U) << "bad was told before the run";
  }));
}

}  // namespace
