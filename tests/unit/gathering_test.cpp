// Walking, importing and gathering, over real folders and real SQLite files.
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <filesystem>
#include <map>

#include "facts/run_facts.hpp"
#include "facts/tallies.hpp"
#include "file_gathering/file_gathering.hpp"
#include "file_gathering/index_import.hpp"
#include "file_gathering/share_walk.hpp"
#include "report_fixture.hpp"

namespace vornreport {
namespace {

using support::write_file;

class GatheringTest : public StatisticsTest {
 protected:
  int walk(const std::string& folder) {
    return ReportShareWalk(db_.get(), "share", folder.c_str(), types_.get());
  }

  std::string paths_below(const std::string& top) const {
    return rows("select substr(path," + std::to_string(top.size() + 2) +
                ") from file_stat order by path");
  }
  // The incidents of gathering anew, in order.
  std::string incidents() {
    run_facts() = RunFacts();
    tallies().clear();
    printed([&] { file_gathering("p1", profile_.get()); });
    std::string told;
    for (const report_format::Incident& incident : run_facts().incidents) {
      told += incident.kind + " " + incident.what + "\n";
    }
    run_facts() = RunFacts();
    return told;
  }

  // An index database with one row per line of values.
  void make_index(const std::string& path, const std::string& values) {
    sqlite3* raw = nullptr;
    ASSERT_EQ(sqlite3_open(path.c_str(), &raw), SQLITE_OK);
    const SqliteHandle index(raw);
    rows(raw,
         "create table file_info (owner_name text, time_modify text, size text, path text, "
         "name text, file_ext text, is_dir integer); insert into file_info values " +
             values);
  }
};

// A text whose doubled quotes don't fit is cut where the buffer ends, but never between the halves
// of a doubled quote: that would have ended its literal.
TEST_F(GatheringTest, CutsTextsWhoseQuotesDoNotFit) {
  struct stat status {};
  for (const size_t padding : {0U, 1U, 2U, 3U}) {
    const std::string start = "/" + std::string(padding, 'p');
    const std::string path = start + std::string(3000, '\'') + ",'a','b');delete from file_stat;--";
    const FileInfo info{"s", path.c_str(), nullptr, nullptr, &status};
    EXPECT_EQ(ReportDBAddFile(db_.get(), &info), 0);
    const std::string stored = path.substr(0, start.size() + (4095 - start.size()) / 2);
    EXPECT_EQ(rows("select path,filename,ext from file_stat order by id desc limit 1"),
              stored + "|(NULL)|\n");
  }
  EXPECT_EQ(rows("select count(*) from file_stat"), "4\n");
}

// 4095 bytes of path and of name fit their buffers, but not the statement together.
TEST_F(GatheringTest, AStatementCutAtItsBufferIsRefused) {
  struct stat status {};
  const std::string longest(4095, 'x');
  const FileInfo whole{"s", longest.c_str(), "n", "t", &status};
  EXPECT_EQ(ReportDBAddFile(db_.get(), &whole), 0);
  const FileInfo cut{"s", longest.c_str(), longest.c_str(), "t", &status};
  printed([&] { EXPECT_EQ(ReportDBAddFile(db_.get(), &cut), -1); });
  EXPECT_NE(support::syslog_text().find("] error: unrecognized token"), std::string::npos);
  EXPECT_EQ(rows("select length(path) from file_stat"), "4095\n");
}

// The columns make numbers of what looks like one; how a file goes in must make no difference.
TEST_F(GatheringTest, AFileIsStoredAsItsTextSaysIt) {
  struct stat status {};
  status.st_uid = 0xFFFFFFFFU;
  status.st_mtime = -1;
  status.st_size = INT64_MAX;
  for (const char* name :
       {"1e3", "007", " 5", "0x1f", "9223372036854775808", "-0.0", "", "\xff\xc3", "?1", "n'1"}) {
    rows("delete from file_stat");
    const FileInfo info{"12", "/12/a", name, "1.0", &status};
    ASSERT_EQ(ReportDBAddFile(db_.get(), &info), 0);
    std::string quoted = name;
    if (const size_t quote = quoted.find('\''); quote != std::string::npos) {
      quoted.insert(quote, 1, '\'');
    }
    rows(
        "insert into file_stat (owner, mtime, size, share, path, filename, ext) values "
        "(4294967295, "
        "4294967295, 9223372036854775807, '12', '/12/a', '" +
        quoted + "', '1.0')");
    EXPECT_EQ(
        rows("select count(*) from (select distinct owner, mtime, size, share, path, hex(path), "
             "typeof(share), filename, hex(filename), typeof(filename), typeof(ext), ext from "
             "file_stat)"),
        "1\n")
        << name;
  }
}

TEST_F(GatheringTest, WalkJudgesEveryFileSystemByItsKind) {
  const std::string top = folder_.path("top");
  write_file(top + "/here", "");
  std::filesystem::create_directories(top + "/proc");
  for (const int kind : {-1, 0, 1, 2, 3, 4, 5, 6, 7}) {
    platform.fs_kind = kind;
    rows("delete from file_stat");
    EXPECT_EQ(walk(top), 0);
    EXPECT_EQ(paths_below(top), kind >= 1 && kind <= 6 && kind != 5 ? "here\n" : "") << kind;
  }
  // A folder on another device is asked for again: / is walked, /proc and /dev are not.
  platform.fs_kind = 0;
  platform.fs_kinds["/dev"] = 1;
  rows("delete from file_stat");
  EXPECT_EQ(walk("/dev"), 0);
  EXPECT_EQ(rows("select count(*) from file_stat where path like '/dev/shm/%'"), "0\n");
}

// As deep as a path can be, with another folder to look into on every level: the files above the
// cut are found, the rest is logged and skipped, and neither the stack nor the file handles run
// out.
TEST_F(GatheringTest, WalkGoesAsDeepAsAPathCanBe) {
  const std::string top = folder_.path("deep");
  std::filesystem::create_directories(top);
  ASSERT_EQ(chdir(top.c_str()), 0);
  for (int level = 0; level < 2100; ++level) {
    ASSERT_EQ(mkdir("d", 0700) | mkdir("e", 0700), 0);
    const int file = creat("e/f", 0600);
    ASSERT_GE(file, 0);
    close(file);
    ASSERT_EQ(chdir("d"), 0);
  }
  ASSERT_EQ(chdir("/"), 0);
  rlimit handles{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &handles), 0);
  handles.rlim_cur = 1000;
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &handles), 0);

  std::string output;
  // Every level above the cut says that the one below failed: too much for a queue nobody reads.
  output = printed([&] {
    const pid_t reader = support::fork_child([] {
      for (;;) {
        support::syslog_lines();
        usleep(1000);
      }
      return 0;
    });
    EXPECT_EQ(walk(top), 0);
    kill(reader, SIGKILL);
    waitpid(reader, nullptr, 0);
  });
  constexpr size_t kLongest = 4095;
  EXPECT_EQ(rows("select count(*) from file_stat"),
            std::to_string((kLongest - top.size() - std::strlen("/e/f")) / 2 + 1) + "\n");
  EXPECT_NE(output.find("Failed to stat [" + top + "/d/d/"), std::string::npos);
  const std::string cut = output.substr(output.find("Failed to stat [") + 16);
  EXPECT_EQ(cut.find("].\n\n"), kLongest);
}

// A user swaps a folder for a link to a place outside while the walk is inside. The walk must never
// report a file from there.
TEST_F(GatheringTest, WalkIsNotLedOutByASwappedFolder) {
  const std::string outside = folder_.path("outside");
  const std::string top = folder_.path("top");
  write_file(outside + "/secret", "");
  write_file(outside + "/sub/secret", "");
  for (int i = 0; i < 8; ++i) {
    write_file(top + "/swapped/file" + std::to_string(i), "");
    write_file(top + "/swapped/sub/file" + std::to_string(i), "");
  }
  const std::string folder = top + "/swapped";
  const std::string aside = folder_.path("aside");
  const pid_t swapper = support::fork_child([&] {
    for (;;) {
      rename(folder.c_str(), aside.c_str());
      static_cast<void>(!symlink(outside.c_str(), folder.c_str()));
      unlink(folder.c_str());
      rename(aside.c_str(), folder.c_str());
    }
    return 0;
  });
  printed([&] {
    for (int round = 0; round < 5000; ++round) {
      walk(top);
      support::syslog_lines();
    }
  });
  kill(swapper, SIGKILL);
  waitpid(swapper, nullptr, 0);
  EXPECT_EQ(rows("select count(*) from file_stat where filename='secret'"), "0\n");
  EXPECT_NE(rows("select count(*) from file_stat where filename='file1'"), "0\n");
}

// Two shares with the same files: one folder, one inside the other, one reached through a link, one
// of an index. Each pair is told once; those apart aren't. Of what a volume's use is explained by,
// each file counts once.
TEST_F(GatheringTest, TellsOfSharesThatOverlap) {
  for (const char* name : {"top/inside/deep", "apart", "top/aside"}) {
    std::filesystem::create_directories(folder_.path(name));
  }
  std::filesystem::create_symlink(folder_.path("top/inside"), folder_.path("link"));
  for (const char* name : {"top/a", "top/inside/deep/b", "apart/c", "top/aside/x"}) {
    write_file(folder_.path(name), "text");
  }
  make_index(folder_.path("index.db"), "('ann','1','1','x','x','',0)");
  platform.users = {{"ann", 1}};
  platform.shares = {{"outer", folder_.path("top")},       {"same", folder_.path("top/")},
                     {"link", folder_.path("link")},       {"apart", folder_.path("apart")},
                     {"index", folder_.path("top/aside")}, {"left", folder_.path("apart")}};
  platform.unselected = {"left"};
  platform.indexes["index"] = folder_.path("index.db");
  const std::string told = incidents();
  EXPECT_EQ(std::count(told.begin(), told.end(), '\n'), 5) << told;
  for (const char* pair :
       {"index, outer", "index, same", "link, outer", "link, same", "outer, same"}) {
    EXPECT_NE(told.find(std::string("share_overlap ") + pair + "\n"), std::string::npos) << told;
  }
  struct stat file {};
  ASSERT_EQ(stat(folder_.path("top/a").c_str(), &file), 0);
  const auto block = static_cast<uint64_t>(file.st_blocks) * 512;
  const std::map<std::string, std::pair<uint64_t, uint64_t>> expected{{"outer", {3 * block, block}},
                                                                      {"same", {3 * block, 0}},
                                                                      {"link", {block, block}},
                                                                      {"apart", {block, block}},
                                                                      {"index", {1, 1}}};
  for (const ShareTally& share : tallies().shares()) {
    EXPECT_EQ(std::pair(share.allocated(), share.volumes().front().explained),
              expected.at(share.name()))
        << share.name();
  }
}

// Folders that are mounted again, in their own share and in another's.
TEST_F(GatheringTest, ExplainsWhatIsMountedTwiceOnce) {
  write_file(folder_.path("one/from/deep/file"), "text");
  write_file(folder_.path("one/own"), "text");
  const std::pair<const char*, const char*> mounts[] = {
      {"one/from", "one/again"}, {"one/from/deep", "two/deep"}, {"one", "two/all"}};
  platform.shared_mounts = {"/", folder_.path("one/gone")};
  for (const auto& [from, to] : mounts) {
    std::filesystem::create_directories(folder_.path(to));
    ASSERT_EQ(
        mount(folder_.path(from).c_str(), folder_.path(to).c_str(), nullptr, MS_BIND, nullptr), 0);
    platform.shared_mounts.push_back(folder_.path(to));
  }
  struct stat file {};
  ASSERT_EQ(stat(folder_.path("one/own").c_str(), &file), 0);
  const auto block = static_cast<uint64_t>(file.st_blocks) * 512;
  platform.shares = {{"one", folder_.path("one")}, {"two", folder_.path("two")}};
  for (const uint64_t explained : {2 * block, block}) {  // of the first share, then of the second
    EXPECT_EQ(incidents(), "share_overlap one, two\n");
    for (const ShareTally& share : tallies().shares()) {
      EXPECT_EQ(share.allocated(), 3 * block) << share.name();
      EXPECT_EQ(share.volumes().front().explained,
                share.name() == "one" ? explained : 2 * block - explained);
    }
    std::swap(platform.shares[0], platform.shares[1]);
  }
  for (const auto& [from, to] : mounts) {
    EXPECT_EQ(umount(folder_.path(to).c_str()), 0);
  }
}

// What the shares of a report lack is an incident, and never only a shorter list.
TEST_F(GatheringTest, TellsWhatTheSharesLack) {
  write_file(folder_.path("index/x"), "1");
  make_index(folder_.path("index.db"), "('ghost','1','1','x','x','',0)");
  std::filesystem::create_directories(folder_.path("other"));
  platform.shares = {{"gone", folder_.path("gone")},
                     {"nowhere", ""},
                     {"other", folder_.path("other")},
                     {"index", folder_.path("index")}};
  platform.fs_kinds[folder_.path("other")] = 0;
  platform.indexes["index"] = folder_.path("index.db");
  EXPECT_EQ(
      incidents(),
      "share_missing gone\nshare_missing nowhere\nshare_missing other\nindex_refused index\n");
  std::string whole;
  for (const ShareTally& share : tallies().shares()) {
    whole += share.name() + (share.is_whole() ? " whole " : " lacking ") +
             std::to_string(share.total().files) + "\n";
  }
  EXPECT_EQ(whole, "gone lacking 0\nnowhere lacking 0\nother lacking 0\nindex whole 1\n");
}

// Two sparse files of exbibytes are more than 64 bits can say.
TEST_F(GatheringTest, SumsOfSizesStayAtTheGreatestNumber) {
  EXPECT_EQ(rows("select sum(size) from file_stat"), "NULL\n");
  rows(db_.get(),
       "insert into file_stat (share, size) values ('a', 9223372036854775807), ('a', 5),"
       " ('b', 3), ('b', 4), ('c', NULL)");
  EXPECT_EQ(rows("select share,sum(size) from file_stat group by share order by 1"),
            "a|9223372036854775807\nb|7\nc|NULL\n");
}

TEST_F(GatheringTest, ImportCopiesTheFilesOfTheIndex) {
  const std::string index = folder_.path("index.db");
  platform.indexes["share"] = index;
  platform.users = {{"ann", 1001}, {"bob", 1002}};
  set(types_, "jpg", "image");
  make_index(index,
             "('ann','1300000000','5368709120','a/x.jpg','x.jpg','jpg',0),"
             "('bob','4294967301','0','y','y','zzz',0),"
             "('ann','1','1','a','a','',1)");
  EXPECT_EQ(ReportFileIndexImport("share", "/srv/s", db_.get(), types_.get()), 0);
  EXPECT_EQ(rows("select owner,mtime,size,share,path,filename,ext from file_stat order by id"),
            "1001|1300000000|5368709120|share|/srv/s/a/x.jpg|x.jpg|image\n"
            "1002|5|0|share|/srv/s/y|y|reportUI_file_type_other\n");
  EXPECT_NE(sqlite3_get_autocommit(db_.get()), 0);
}

// A clean of all profiles removes databases of running reports too.
TEST_F(GatheringTest, ADatabaseRemovedInTheRunIsLostData) {
  platform.shares = {{"s", folder_.path("none")}};
  const std::string log = in_child([&] {
    printed([&] {
      file_gathering("p1", profile_.get());
      VORNReportDBInit(profile_.get());
    });
    const bool kept = !report_data_lost();
    // Another file keeps the number of the removed one from being used again.
    unlink(folder_.path("stat.db").c_str());
    support::write_file(folder_.path("taken"), "");
    printed([&] { VORNReportDBInit(profile_.get()); });
    return std::string(kept && report_data_lost() ? "lost only then" : "");
  });
  EXPECT_EQ(log, "lost only then");
}

}  // namespace
}  // namespace vornreport
