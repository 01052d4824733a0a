// A profile's runs: where their files are, how they end, and what is cleared up.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <regex>

#include "page.hpp"
#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace fs = std::filesystem;
using support::exists;
using support::read_file;
using support::write_file;

namespace {

constexpr const char* kReports = VORN_PATH_REPORTS;

std::string status_of(const std::string& profile) {
  return read_file(VORN_PATH_STATUS "/" + profile);
}

std::string temporary(const char* kind, pid_t pid) {
  return "/tmp/vornreport_" + std::string(kind) + "." + std::to_string(pid);
}

class Run : public testing::Test {
 protected:
  // The value of a path key after VornQazInitRealPath.
  std::string path(const char* key) const {
    const char* value = VLIBCSzHashGetValue(hash.get(), key);
    return value == nullptr ? "<unset>" : value;
  }
  int init(const char* profile, int for_report) {
    VLIBCSzHash* raw = hash.get();
    return VornQazInitRealPath(profile, &raw, for_report);
  }
  void set_report_dir(const std::string& dir) { hash = support::make_hash({{"report_dir", dir}}); }
  // What the program does between VornQazInitRealPath and the last status.
  void publish(const std::string& page) {
    write_file(path("real_path_date") + "/report.html", page);
    fs::rename(path("real_path_date"), path("real_path_date_final"));
  }
  void TearDown() override { fs::remove_all(kReports); }

  support::Hash hash = support::make_hash();
};

}  // namespace

TEST_F(Run, HostileProfileNamesFailEveryCall) {
  for (const std::string& name :
       {std::string(), std::string("."), std::string(".."), std::string(".hidden"),
        std::string("../etc/x"), std::string("a/b"), std::string("a b"), std::string("a'b"),
        std::string("a\nb"), std::string("\xC3\xA4"), std::string("a;id"), std::string(65, 'x')}) {
    SCOPED_TRACE(name);
    VLIBCSzHash* raw = hash.get();
    EXPECT_EQ(VornQazProfileRunning(name.c_str()), 0);
    EXPECT_EQ(VornQazStatusUpdate(name.c_str(), "collect_data"), -1);
    EXPECT_EQ(VornQazInitRealPath(name.c_str(), &raw, 1), -1);
    EXPECT_EQ(VornQazReportCleanTmp(name.c_str(), raw), -1);
    EXPECT_EQ(VornQazScheduleClean(name.c_str(), &raw, "k"), -1);
    const std::vector<std::string> lines = support::syslog_lines();
    ASSERT_EQ(lines.size(), 5U);
    EXPECT_NE(lines[0].find("is no profile name"), std::string::npos);
  }
  EXPECT_EQ(VornQazProfileRunning(std::string(64, 'x').c_str()), 0);
  EXPECT_EQ(VornQazStatusUpdate(std::string(64, 'x').c_str(), "fail"), 0);
}

// --- Paths --------------------------------------------------------------------------------------

TEST_F(Run, GivesThePathsAndChangesNothingUnlessItReports) {
  ASSERT_EQ(init("p1", 0), 0);
  const std::string folder = std::string(kReports) + "/p1";
  EXPECT_EQ(path("real_path_base"), "/usr/vorn/var/stat");
  EXPECT_EQ(path("real_path_stat_db"), "/usr/vorn/var/stat/stat.db.p1");
  EXPECT_EQ(path("real_path_template"), folder + "/template");
  const std::string final_name = path("real_path_date_final").substr(folder.size() + 1);
  EXPECT_TRUE(std::regex_match(final_name, std::regex(R"(\d{4}-\d\d-\d\d_\d\d-\d\d-\d\d)")))
      << final_name;
  EXPECT_EQ(path("real_path_date"), folder + "/." + final_name + ".partial");
  EXPECT_EQ(path("real_path_report_final"), folder + "/" + final_name + "/report.html");
  EXPECT_EQ(path("real_path_csv"), folder + "/." + final_name + ".partial/csv");
  EXPECT_FALSE(exists(kReports));

  VLIBCSzHash* raw = hash.get();
  ASSERT_EQ(VornQazInitLocation(&raw, 0), 0);
  EXPECT_EQ(path("real_path_stat_db"), "/usr/vorn/var/stat/stat.db");
}

TEST_F(Run, RefusesAReportDirThatWouldHurt) {
  const support::TempFolder folder;
  const struct {
    std::string dir;
    const char* problem;  // null: it is fine
  } cases[] = {
      {"relative/dir", "is not absolute"},
      {folder.path("it's"), "holds a single quote"},
      {folder.path("a\nb"), "holds a single quote"},
      {folder.path() + "/../up", "holds \"..\""},
      {folder.path() + "/..", "holds \"..\""},
      {"/" + std::string(1024, 'a'), "is longer"},
      {folder.path("new/deep///"), nullptr},
      {folder.path("two words \xC3\xA4 $(id) \"..x"), nullptr},
  };
  ASSERT_EQ(VornQazProfileRunning("dirs"), 0);
  for (const auto& c : cases) {
    SCOPED_TRACE(c.dir);
    set_report_dir(c.dir);
    EXPECT_EQ(init("dirs", 1), c.problem == nullptr ? 0 : -1);
    const std::string log = support::syslog_text();
    if (c.problem == nullptr) {
      EXPECT_EQ(log, "");
      EXPECT_TRUE(fs::is_directory(path("real_path_csv")));
      EXPECT_EQ(path("real_path_template").find("//"), std::string::npos);
    } else {
      EXPECT_NE(log.find(c.problem), std::string::npos) << log;
      EXPECT_EQ(path("real_path_date"), "<unset>");
    }
  }
}

TEST_F(Run, RefusesAPlantedReportFolder) {
  const support::TempFolder folder;
  fs::create_directory(folder.path("elsewhere"));
  fs::create_symlink(folder.path("elsewhere"), folder.path("link"));
  write_file(folder.path("file"), "");
  fs::create_directory(folder.path("open"));
  ASSERT_EQ(chmod(folder.path("open").c_str(), 0777), 0);
  fs::create_directory(folder.path("foreign"));
  std::vector<const char*> profiles = {"link", "file", "open"};
  if (geteuid() == 0) {
    ASSERT_EQ(chown(folder.path("foreign").c_str(), 1234, 0), 0);
    profiles.push_back("foreign");
  }
  set_report_dir(folder.path());
  for (const char* profile : profiles) {
    SCOPED_TRACE(profile);
    ASSERT_EQ(VornQazProfileRunning(profile), 0);
    EXPECT_EQ(init(profile, 1), -1);
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    EXPECT_EQ(VornQazReportCleanTmp(profile, hash.get()), -1);
    EXPECT_EQ(support::syslog_lines().size(), 1U);
  }
  EXPECT_TRUE(fs::is_empty(folder.path("elsewhere")));
  EXPECT_TRUE(fs::is_empty(folder.path("open")));
}

TEST_F(Run, TwoRunsInOneSecondGetTwoNames) {
  ASSERT_EQ(VornQazProfileRunning("quick"), 0);
  std::vector<std::string> names;
  for (int i = 0; i < 3; ++i) {
    ASSERT_EQ(init("quick", 1), 0);
    names.push_back(path("real_path_date_final"));
    publish("");
  }
  EXPECT_NE(names[0], names[1]);
  EXPECT_NE(names[1], names[2]);
  EXPECT_TRUE(exists(names[0] + "/csv") && exists(names[1] + "/csv") && exists(names[2] + "/csv"));
}

TEST_F(Run, WarnsOfSharesThatDoNotExist) {
  write_file(VORN_PATH_SHARES, "[photos]\npath = /srv\n[two words]\npath = /srv\n");
  ASSERT_EQ(VornQazProfileRunning("typo"), 0);
  hash = support::make_hash({{"share_list", " photos,,two words , fotos,\n"}});
  ASSERT_EQ(init("typo", 0), 0);
  EXPECT_EQ(support::syslog_text(), "");
  ASSERT_EQ(init("typo", 1), 0);
  const std::vector<std::string> lines = support::syslog_lines();
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_NE(lines[0].find("\"fotos\", which is no share"), std::string::npos) << lines[0];
  fs::remove(VORN_PATH_SHARES);
}

// --- Names in /tmp ------------------------------------------------------------------------------

TEST_F(Run, TakesItsNamesInTmpFromWhoeverPlantedThem) {
  const support::TempFolder folder;
  write_file(folder.path("victim"), "safe");
  for (const char* kind : {"data", "body"}) {
    fs::remove(temporary(kind, getpid()));
  }
  fs::create_symlink(folder.path("victim"), temporary("data", getpid()));
  write_file(temporary("body", getpid()), "planted");
  ASSERT_EQ(chmod(temporary("body", getpid()).c_str(), 0666), 0);
  ASSERT_EQ(VornQazProfileRunning("tmp"), 0);
  ASSERT_EQ(init("tmp", 1), 0);
  for (const char* kind : {"data", "body", "cmd"}) {
    struct stat status {};
    ASSERT_EQ(lstat(temporary(kind, getpid()).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode, static_cast<mode_t>(S_IFREG | 0600));
    EXPECT_EQ(status.st_size, 0);
    EXPECT_EQ(status.st_uid, geteuid());
  }
  EXPECT_EQ(read_file(folder.path("victim")), "safe");

  fs::remove(temporary("body", getpid()));
  fs::create_directory(temporary("body", getpid()));
  EXPECT_EQ(init("tmp", 1), -1);
  EXPECT_NE(support::syslog_text().find("vornreport_body"), std::string::npos);
  EXPECT_FALSE(exists(temporary("data", getpid())));
  fs::remove(temporary("body", getpid()));

  ASSERT_EQ(chmod("/tmp", 0777), 0);
  EXPECT_EQ(init("tmp", 1), -1);
  EXPECT_NE(support::syslog_text().find("sticky"), std::string::npos);
  ASSERT_EQ(chmod("/tmp", 01777), 0);
}

// --- The end of a run ---------------------------------------------------------------------------

TEST_F(Run, ANewRunRemovesWhatAKilledOneLeft) {
  const support::TempFolder outside;
  write_file(outside.path("precious"), "kept");
  const std::string folder = std::string(kReports) + "/killed";
  support::OtherRun other("killed", [&] {
    init("killed", 1);
    write_file(path("real_path_stat_db"), "");
    write_file(path("real_path_stat_db") + "-journal", "");
    write_file(path("real_path_csv") + "/deep/x.csv", "");
    fs::create_directory_symlink(outside.path(), path("real_path_csv") + "/link");
  });
  ASSERT_TRUE(other.started());
  const pid_t pid = other.pid();
  write_file(folder + "/2020-01-01_00-00-00/report.html", "old report");
  fs::create_directory_symlink(outside.path(), folder + "/template");
  fs::create_directory_symlink(outside.path(), folder + "/.x.partial");
  write_file("/usr/vorn/var/stat/stat.db.other", "");

  // While it lives, clearing up takes nothing from it.
  ASSERT_EQ(init("killed", 0), 0);
  EXPECT_EQ(VornQazReportCleanTmp("killed", hash.get()), 0);
  EXPECT_TRUE(exists("/usr/vorn/var/stat/stat.db.killed"));
  EXPECT_TRUE(exists(folder + "/.x.partial"));
  EXPECT_TRUE(exists(temporary("data", pid)));
  EXPECT_NE(VornQazProfileRunning("killed"), 0);
  other.end();

  // A run that only collects data comes first, and must not hide the killed one's names.
  EXPECT_TRUE(support::OtherRun("killed").started());
  ASSERT_EQ(VornQazProfileRunning("killed"), 0);
  ASSERT_EQ(init("killed", 1), 0);
  EXPECT_FALSE(exists(temporary("data", pid)));
  EXPECT_FALSE(exists("/usr/vorn/var/stat/stat.db.killed"));
  EXPECT_FALSE(exists("/usr/vorn/var/stat/stat.db.killed-journal"));
  EXPECT_TRUE(exists("/usr/vorn/var/stat/stat.db.other"));
  std::vector<std::string> left;
  for (const auto& entry : fs::directory_iterator(folder)) {
    left.push_back(entry.path().filename());
  }
  std::sort(left.begin(), left.end());
  const std::string own = path("real_path_date").substr(folder.size() + 1);
  EXPECT_EQ(left, (std::vector<std::string>{own, "2020-01-01_00-00-00", "template"}));
  EXPECT_EQ(read_file(outside.path("precious")), "kept");
}

TEST_F(Run, CleaningEndsOwnRunAsFailed) {
  for (const bool with_hash : {true, false}) {
    ASSERT_EQ(VornQazProfileRunning("clean"), 0);
    ASSERT_EQ(VornQazStatusUpdate("clean", "collect_data"), 0);
    EXPECT_EQ(status_of("clean"), "collect_data\n");
    ASSERT_EQ(init("clean", 1), 0);
    write_file(path("real_path_stat_db"), "");
    EXPECT_EQ(VornQazReportCleanTmp("clean", with_hash ? hash.get() : nullptr), 0);
    EXPECT_EQ(status_of("clean"), "fail\n");
    EXPECT_FALSE(exists(path("real_path_stat_db")));
    EXPECT_FALSE(exists(temporary("data", getpid())));
    EXPECT_EQ(exists(path("real_path_date")), !with_hash);
    EXPECT_FALSE(support::OtherRun("clean").started());  // it still holds the profile
  }
  // From outside, with nobody running it, the status stays.
  ASSERT_EQ(VornQazProfileRunning("another"), 0);
  ASSERT_EQ(init("clean", 0), 0);
  VornQazReportCleanTmp("clean", hash.get());
  EXPECT_EQ(status_of("clean"), "fail\n");
  EXPECT_EQ(status_of("another"), "<absent>");
}

TEST_F(Run, SuccessNeedsACompletePage) {
  const struct {
    const char* page;  // null: none was made
    const char* status;
  } cases[] = {
      {"<html>\n</html>\n", "success\n"},
      {"<html>\n</html>", "success\n"},
      {"<html>\n<p></html>", "fail\n"},
      {"<html>\n</html>\n\n", "fail\n"},
      {"<html>\n</html>\n<p", "fail\n"},
      {"", "fail\n"},
      {nullptr, "fail\n"},
  };
  ASSERT_EQ(VornQazProfileRunning("page"), 0);
  for (const auto& c : cases) {
    SCOPED_TRACE(c.page == nullptr ? "none" : c.page);
    const bool good = std::string(c.status) == "success\n";
    ASSERT_EQ(init("page", 1), 0);
    if (c.page != nullptr) {
      publish(c.page);
    }
    EXPECT_EQ(VornQazStatusUpdate("page", "success"), 0);
    EXPECT_EQ(status_of("page"), c.status);
    EXPECT_EQ(exists(path("real_path_date_final")), good);
    EXPECT_FALSE(exists(path("real_path_date")));
    EXPECT_EQ(support::syslog_lines().size(), good ? 0U : 1U);
  }
  // A data run of the same process has no page to show.
  EXPECT_EQ(VornQazStatusUpdate("page", "success"), 0);
  EXPECT_EQ(status_of("page"), "success\n");
}

TEST_F(Run, ALinkIsNoPage) {
  const support::TempFolder folder;
  write_file(folder.path("real"), "x\n</html>\n");
  fs::create_symlink(folder.path("real"), folder.path("link"));
  EXPECT_TRUE(host::page_is_complete(folder.path("real").c_str()));
  EXPECT_FALSE(host::page_is_complete(folder.path("link").c_str()));
  EXPECT_FALSE(host::page_is_complete(folder.path().c_str()));
}

TEST_F(Run, TheStatusIsReadableAndOnlyOneOfThreeWords) {
  ASSERT_EQ(VornQazProfileRunning("words"), 0);
  const mode_t mask = umask(077);
  EXPECT_EQ(VornQazStatusUpdate("words", "collect_data"), 0);
  umask(mask);
  EXPECT_EQ(fs::status(VORN_PATH_STATUS "/words").permissions(), fs::perms(0644));
  EXPECT_EQ(VornQazStatusUpdate("words", "done\nmore"), -1);
  EXPECT_EQ(status_of("words"), "collect_data\n");
}
