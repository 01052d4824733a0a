// A profile's runs: where their files are, how they end, and what is cleared up.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <set>

#include "report_format/facts.hpp"
#include "report_format/run_state.hpp"
#include "run/old_reports.hpp"
#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace fs = std::filesystem;
using support::exists;
using support::read_file;
using support::syslog_lines;
using support::write_file;

namespace {

constexpr const char* kReports = VORN_PATH_REPORTS;
constexpr const char* kWhole =
    "<!DOCTYPE html>\n<template id=\"data\">\nvar vornLang = 'en';\nvar vornFacts = {};\n"
    "</template>\n<body data-empty=\"0\">\n<main id=\"report\">\n"
    "<section data-report=\"share_list\">\n</section>\n</main>\n<script></script>\n</html>\n";

// Without the times.
std::string status_of(const std::string& profile) {
  const std::string text = read_file(VORN_PATH_STATUS "/" + profile);
  return text.substr(0, text.find("started = "));
}

std::string temporary(const char* kind, pid_t pid) {
  return "/tmp/vornreport_" + std::string(kind) + "." + std::to_string(pid);
}

class Run : public testing::Test {
 protected:
  void SetUp() override {
    write_file(VORN_PATH_SHARES, "[photos]\npath = /srv\n");
    // What makes the list of reports.
    for (const char* part : {"index.js", "report.css"}) {
      write_file(std::string(VORN_PATH_TEMPLATE "/") + part, "");
    }
    fs::copy_file(VORN_TEST_SOURCE_DIR "/reportUI/build-template.sh", VORN_PATH_TEMPLATE_SCRIPT,
                  fs::copy_options::overwrite_existing);
  }
  void TearDown() override { fs::remove_all(kReports); }
  // The value of a path key after VornQazInitRealPath.
  std::string path(const char* key) const {
    const char* value = VLIBCSzHashGetValue(hash.get(), key);
    return value == nullptr ? "<unset>" : value;
  }
  int init(const char* profile, int for_report) {
    VLIBCSzHash* raw = hash.get();
    return VornQazInitRealPath(profile, &raw, for_report);
  }
  // A report run of this process.
  int begin(const char* profile) {
    EXPECT_EQ(VornQazProfileRunning(profile), 0);
    return init(profile, 1);
  }
  // What the program does between VornQazInitRealPath and the last status.
  void publish(const std::string& page, const std::string& facts = "{\"format\":1}") {
    write_file(path("real_path_date") + "/report.html", page);
    write_file(path("real_path_date") + "/report.json", facts);
    fs::rename(path("real_path_date"), path("real_path_date_final"));
  }

  support::Hash hash = support::make_hash();
  support::TempFolder folder;
};

}  // namespace

TEST_F(Run, HostileProfileNamesFailEveryCall) {
  const std::string longest(65, 'x');
  for (const char* name : {"", "..", ".hidden", "a/b", "a'b", "a\nb", "a;id", longest.c_str()}) {
    SCOPED_TRACE(name);
    VLIBCSzHash* raw = hash.get();
    EXPECT_EQ(VornQazStatusUpdate(name, "collect_data"), -1);
    EXPECT_EQ(VornQazInitRealPath(name, &raw, 1), -1);
    EXPECT_EQ(VornQazReportCleanTmp(name, raw), -1);
    EXPECT_EQ(VornQazScheduleClean(name, &raw, "k"), -1);
    EXPECT_EQ(VornQazSendReport(name, "l", raw), -1);
    EXPECT_EQ(VornQazProgressUpdate(name, "x"), -1);
  }
}

TEST_F(Run, RefusesAReportDirThatWouldHurt) {
  const std::pair<std::string, const char*> cases[] = {
      {"relative/dir", "is not absolute"},
      {folder.path("it's"), "holds a single quote"},
      {folder.path("a\nb"), "holds a single quote"},
      {folder.path("../up"), "holds \"..\""},
      {"/" + std::string(1024, 'a'), "is longer"},
      {folder.path("new/deep///"), ""},
      {folder.path("two words \xC3\xA4 $(id) \"..x"), ""}};
  for (const auto& [dir, problem] : cases) {
    SCOPED_TRACE(dir);
    hash = support::make_hash({{"report_dir", dir}});
    EXPECT_EQ(begin("dirs"), *problem == '\0' ? 0 : -1);
    EXPECT_NE(support::syslog_text().find(problem), std::string::npos);
    EXPECT_EQ(fs::is_directory(path("real_path_csv")), *problem == '\0');
    EXPECT_EQ(path("real_path_template").find("//"), std::string::npos);
  }
}

TEST_F(Run, RefusesAPlantedReportFolder) {
  for (const char* name : {"elsewhere", "open", "group", "foreign"}) {
    fs::create_directory(folder.path(name));
  }
  fs::create_symlink(folder.path("elsewhere"), folder.path("link"));
  write_file(folder.path("file"), "");
  ASSERT_EQ(chmod(folder.path("open").c_str(), 0777), 0);
  ASSERT_EQ(chmod(folder.path("group").c_str(), 0770), 0);
  if (chown(folder.path("foreign").c_str(), 1234, 0) != 0) {
    chmod(folder.path("foreign").c_str(), 0777);  // only root gives folders away
  }
  hash = support::make_hash({{"report_dir", folder.path()}});
  for (const char* profile : {"link", "file", "open", "group", "foreign"}) {
    SCOPED_TRACE(profile);
    EXPECT_EQ(begin(profile), -1);
    EXPECT_EQ(VornQazReportCleanTmp(profile, hash.get()), -1);
    EXPECT_EQ(syslog_lines().size(), 2U);
  }
  // Nor below one that others rename; where it is sticky they can't.
  for (const auto& [name, result] :
       {std::pair{"open", -1}, {"group", -1}, {"foreign", -1}, {"link", 0}, {"sticky", 0}}) {
    SCOPED_TRACE(name);
    fs::create_directory(folder.path("sticky"));
    ASSERT_EQ(chmod(folder.path("sticky").c_str(), 01777), 0);
    hash = support::make_hash({{"report_dir", folder.path(name)}});
    EXPECT_EQ(begin("weekly"), result);
    EXPECT_EQ(syslog_lines().size(), result == 0 ? 0U : 1U);
    EXPECT_EQ(fs::exists(folder.path(std::string(name) + "/weekly")), result == 0);
  }
  fs::remove_all(folder.path("elsewhere/weekly"));
  EXPECT_TRUE(fs::is_empty(folder.path("elsewhere")) && fs::is_empty(folder.path("open")));
}

// --- Names in /tmp ------------------------------------------------------------------------------

TEST_F(Run, TakesItsNamesInTmpFromWhoeverPlantedThem) {
  const std::string data = temporary("data", getpid());
  const std::string body = temporary("body", getpid());
  write_file(folder.path("victim"), "safe");
  fs::remove(data);
  fs::create_symlink(folder.path("victim"), data);
  write_file(body, "planted");
  ASSERT_EQ(chmod(body.c_str(), 0666), 0);
  fs::remove(temporary("cmd", getpid()));
  write_file(temporary("cmd", getpid()) + "/of a user", "kept");
  ASSERT_EQ(begin("tmp"), 0);
  EXPECT_NE(support::syslog_text().find("was a folder in the way"), std::string::npos);
  EXPECT_EQ(std::count_if(fs::directory_iterator("/tmp"), fs::directory_iterator(),
                          [](const fs::path& path) { return exists(path / "of a user"); }),
            1);
  for (const std::string& name : {data, body, temporary("cmd", getpid())}) {
    const struct stat status = support::status_of(name);
    EXPECT_EQ(status.st_mode, static_cast<mode_t>(S_IFREG | 0600));
    EXPECT_EQ(status.st_size, 0);
  }
  EXPECT_EQ(read_file(folder.path("victim")), "safe");

  ASSERT_EQ(chmod("/tmp", 0777), 0);
  EXPECT_EQ(begin("tmp"), -1);
  EXPECT_NE(support::syslog_text().find("sticky"), std::string::npos);
  ASSERT_EQ(chmod("/tmp", 01777), 0);
}

// --- The end of a run ---------------------------------------------------------------------------

TEST_F(Run, ANewRunRemovesWhatAKilledOneLeft) {
  write_file(folder.path("precious"), "kept");
  const std::string own = std::string(kReports) + "/killed";
  const std::string database = "/usr/vorn/var/stat/killed/stat.db";
  support::OtherRun other("killed", [&] {
    init("killed", 1);
    write_file(database, "");
    write_file(database + "-journal", "");
    write_file(path("real_path_csv") + "/deep/x.csv", "");
    fs::create_directory_symlink(folder.path(), path("real_path_csv") + "/link");
  });
  ASSERT_TRUE(other.started());
  const std::string data = temporary("data", other.pid());
  ASSERT_EQ(VornQazProgressUpdate("killed", "far"), 0);
  write_file(own + "/2020-01-01_00-00-00/report.html", "old report");
  fs::create_directory_symlink(folder.path(), own + "/template");
  fs::create_directory_symlink(folder.path(), own + "/.2025-01-02_03-04-05.partial");
  write_file("/usr/vorn/var/stat/other/stat.db", "");
  const pid_t dead = support::fork_child([] { return 0; });
  support::wait_child(dead);
  const std::string gone[] = {VORN_PATH_STATUS "/.killed.aB3dE6",
                              "/usr/vorn/etc/.vornreport.conf.aB3dE6", temporary("body", dead)};
  const std::string kept[] = {VORN_PATH_STATUS "/.other.aB3dE6",
                              VORN_PATH_STATUS "/.killed.aB3dE67", temporary("body", getppid()),
                              temporary("mine", dead)};
  for (const auto& name : gone) {
    write_file(name, "");
  }
  for (const auto& name : kept) {
    write_file(name, "");
  }

  // While it lives, clearing up takes nothing from it.
  ASSERT_EQ(init("killed", 0), 0);
  EXPECT_EQ(VornQazReportCleanTmp("killed", hash.get()), 0);
  EXPECT_TRUE(exists(database) && exists(own + "/.2025-01-02_03-04-05.partial") && exists(data));
  EXPECT_EQ(read_file(VORN_PATH_PROGRESS "/killed"), "far");
  other.end();

  // A run that only collects data comes first, and must not hide the killed one's names.
  EXPECT_TRUE(support::OtherRun("killed").started());
  ASSERT_EQ(begin("killed"), 0);
  EXPECT_FALSE(exists(data) || exists(database) || exists(database + "-journal"));
  EXPECT_TRUE(exists("/usr/vorn/var/stat/other/stat.db"));
  EXPECT_TRUE(std::none_of(std::begin(gone), std::end(gone), exists));
  EXPECT_TRUE(std::all_of(std::begin(kept), std::end(kept), exists));
  EXPECT_EQ(support::names_in(own),
            (std::set<std::string>{fs::path(path("real_path_date")).filename(),
                                   "2020-01-01_00-00-00", "template"}));
  EXPECT_EQ(read_file(folder.path("precious")), "kept");
}

TEST_F(Run, SuccessNeedsACompletePage) {
  const std::string whole = kWhole;
  report_format::Facts told;
  told.incidents.resize(2);
  const std::string facts = to_line(told);
  std::vector<std::tuple<std::string, std::string, bool>> cases{
      {whole, facts, true}, {whole + "<p", facts, false}, {"", facts, false},
      {"none", "", false},  {whole, "", false},           {whole, "{", false}};
  // Each of its lines is a part.
  for (std::size_t begins = 0; begins < whole.size(); begins = whole.find('\n', begins) + 1) {
    std::string page = whole;
    cases.emplace_back(page.erase(begins, page.find('\n', begins) + 1 - begins), facts, false);
  }
  hash = support::make_hash({{"report_list", "share_list"}});
  for (const auto& [page, json, good] : cases) {
    SCOPED_TRACE(page + json);
    ASSERT_EQ(begin("page"), 0);
    if (page != "none") {
      publish(page, json);
    }
    EXPECT_EQ(VornQazStatusUpdate("page", "success"), good ? 0 : 1);
    const std::string name = fs::path(path("real_path_date_final")).filename();
    EXPECT_EQ(status_of("page"),
              good ? "success\nreport = " + name + "\nincidents = 2\n" : "fail\n");
    EXPECT_EQ(exists(path("real_path_date_final")), good);
    EXPECT_FALSE(exists(path("real_path_date")));
    EXPECT_EQ(syslog_lines().size(), good ? 0U : 1U);
  }
}

TEST_F(Run, OnlyItsEndStoresHowItEnded) {
  ASSERT_EQ(begin("end"), 0);
  ASSERT_EQ(VornQazStatusUpdate("end", "collect_data"), 0);
  EXPECT_EQ(VornQazReportCleanTmp("end", hash.get()), 0);
  EXPECT_EQ(status_of("end"), "collect_data\n");
  EXPECT_FALSE(exists(path("real_path_date")));
  // Having cleared up is no way around the judgement.
  EXPECT_EQ(VornQazStatusUpdate("end", "success"), 1);
  EXPECT_EQ(status_of("end"), "fail\n");
  syslog_lines();

  // A run that fails behind its report's last name leaves nothing that looks like a report.
  ASSERT_EQ(begin("end"), 0);
  publish("<!DOCTYPE html>\n");
  EXPECT_EQ(VornQazStatusUpdate("end", "fail"), 0);
  EXPECT_FALSE(exists(path("real_path_date_final")) || exists(path("real_path_date")));
  EXPECT_EQ(support::syslog_text(), "") << "the program has said why";

  // A collection makes no report.
  EXPECT_EQ(VornQazStatusUpdate("end", "success"), 0);
  EXPECT_EQ(status_of("end"), "success\n");
}

TEST_F(Run, AStatusThatCannotBeStoredIsTold) {
  ASSERT_EQ(begin("stuck"), 0);
  publish(kWhole);
  fs::create_directories(VORN_PATH_STATUS "/stuck/x");
  EXPECT_EQ(VornQazStatusUpdate("stuck", "success"), -1);
  EXPECT_EQ(syslog_lines().size(), 1U);
  EXPECT_TRUE(exists(path("real_path_date_final")));
}

// --- Progress -----------------------------------------------------------------------------------

TEST_F(Run, ProgressIsThereForAnyoneUntilItsEnd) {
  const std::string folder_path = VORN_PATH_PROGRESS;
  const std::string file = folder_path + "/far";
  const auto mode_of = [](const std::string& path) {
    return support::status_of(path).st_mode & 07777U;
  };
  fs::remove_all(folder_path);
  const mode_t mask = umask(077);
  EXPECT_EQ(VornQazProgressUpdate("far", "begun\n"), 0);
  EXPECT_EQ(mode_of(folder_path), 0755U);
  write_file(folder_path + "/.far.new", std::string(9999, 'x'));  // of a run that was killed
  EXPECT_EQ(VornQazProgressUpdate("far", "half\n"), 0);
  EXPECT_EQ(VornQazProgressUpdate("other", "x"), 0);
  umask(mask);
  EXPECT_EQ(mode_of(file), 0644U);
  EXPECT_EQ(read_file(file), "half\n");
  EXPECT_FALSE(exists(folder_path + "/.far.new"));

  fs::remove(file);
  fs::create_directories(file + "/x");  // in the way
  errno = 0;
  EXPECT_EQ(VornQazProgressUpdate("far", "lost"), -1);
  EXPECT_EQ(errno, 0) << "what the run says next is not about this";
  EXPECT_FALSE(exists(folder_path + "/.far.new"));
  fs::remove_all(file);
  VornQazProgressEnd("far");
  EXPECT_EQ(VornQazProgressUpdate("far", "again"), 0);
  VornQazProgressEnd("far");
  EXPECT_FALSE(exists(file));
  EXPECT_TRUE(exists(folder_path + "/other"));
  EXPECT_EQ(VornQazReportCleanTmp("other", nullptr), 0);
  EXPECT_FALSE(exists(folder_path + "/other"));
  EXPECT_EQ(support::syslog_text(), "");
}

// --- Old reports --------------------------------------------------------------------------------

// Which reports those are, and what is none, is told by the tests of vornctl and of their order.
TEST_F(Run, KeepsAsManyReportsAsTheProfileSays) {
  const std::string own = folder.path("keep");
  const struct {
    const char* value;
    std::size_t stay;  // of three old ones
    std::size_t lines;
  } cases[] = {{"", 3, 0},  {"4", 3, 0},  {"2", 1, 0},     {"1", 0, 0},
               {"0", 3, 1}, {"+1", 3, 1}, {"1 week", 3, 1}};
  write_file(folder.path("elsewhere/report.html"), kWhole);
  for (const auto& [value, stay, lines] : cases) {
    SCOPED_TRACE(value);
    fs::remove_all(own);
    for (const char* name :
         {"2999-01-01_00-00-00", "1999-12-31_23-59-59", "2001-02-03_04-05-06-10"}) {
      write_file(own + "/" + name + "/report.html", kWhole);
      fs::create_directory_symlink(folder.path("elsewhere"), own + "/" + name + "/csv");
    }
    fs::create_directory_symlink(folder.path("elsewhere"), own + "/2000-01-01_00-00-01");
    hash = support::make_hash({{"report_dir", folder.path()}, {"keep_reports", value}});
    ASSERT_EQ(begin("keep"), 0);
    publish(kWhole);
    EXPECT_EQ(VornQazStatusUpdate("keep", "success"), 0);
    EXPECT_EQ(syslog_lines().size(), lines);
    EXPECT_EQ(support::names_in(own).size(), stay + 4);  // with the list and the link
    EXPECT_TRUE(exists(path("real_path_date_final")) && exists(own + "/2000-01-01_00-00-01"));
    EXPECT_EQ(exists(own + "/2001-02-03_04-05-06-10"), stay > 0);
  }
  EXPECT_EQ(read_file(folder.path("elsewhere/report.html")), kWhole);
  for (const char* name : {"2000-01-01_00-00-01", "..", "elsewhere"}) {
    EXPECT_FALSE(host::remove_report(own, name)) << name;
    EXPECT_EQ(syslog_lines().size(), 1U);
  }
}
