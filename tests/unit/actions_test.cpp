// The three actions: orders of calls, failing calls, stable positions and texts.
#include "vornreport/actions.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "fixture.hpp"
#include "vornreport/global.hpp"
#include "vornreport/profile.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

using Calls = std::vector<std::string>;
constexpr char kScript[] = "/usr/vorn/vornreport/reportUI/build-template.sh";
constexpr char kConfig[] = "/usr/vorn/etc/vornreport.conf";

class ActionsTest : public UnitTest {
 protected:
  ActionsTest() : data_(report_data_path().c_str()) {
    platform.config["p1"] = {{"report_list", "large_file,share_list"}};
    for (const char* name : {"template", "date", "csv"}) {
      mkdir(folder_.path(name).c_str(), 0700);
    }
    platform.real_paths = {{"real_path_stat_db", folder_.path("stat.db.p1")},
                           {"real_path_template", folder_.path("template")},
                           {"real_path_date", folder_.path("date")},
                           {"real_path_date_final", folder_.path("it's final")},
                           {"real_path_report_final", folder_.path("it's final/report.html")},
                           {"real_path_csv", folder_.path("csv")}};
    platform.locations = {{"real_path_stat_db", folder_.path("stat.db")},
                          {"real_path_base", folder_.path()}};
    mkdir("/usr/vorn/vornreport", 0755);
    mkdir("/usr/vorn/vornreport/reportUI", 0755);
    mkdir("/usr/vorn/vornreport/reportUI/template", 0755);
    // Shows how it was called, and writes to the file it was given.
    support::write_file(kScript, "#!/bin/sh\necho \"script $*\"\necho \"$1 $3\" >> \"$2\"\n");
    chmod(kScript, 0755);
  }

  template <typename Action>
  int run(Action action, std::vector<std::string> words) {
    std::vector<char*> args;
    for (std::string& word : words) {
      args.push_back(word.data());
    }
    args.push_back(nullptr);
    int result = 0;
    output_ = printed([&] { result = action(args.data()); });
    return result;
  }

  // The lines of the output that begin with `start`, without it.
  std::string lines_with(const std::string& start) const {
    std::string found;
    for (size_t at = 0; at < output_.size();) {
      const size_t end = std::min(output_.find('\n', at), output_.size());
      const std::string line = output_.substr(at, end - at);
      if (line.rfind(start, 0) == 0) {
        found += line.substr(start.size()) + "\n";
      }
      at = end + 1;
    }
    return found;
  }

  // `message` with its line feeds stands in both channels, at `position` ("src/vornreport:302").
  void expect_simple(const std::string& position, const std::string& message) {
    const std::string output = without_errno(output_);
    const std::string log = without_errno(support::syslog_text());
    EXPECT_NE(output.find("(" + position + ")" + message), std::string::npos) << output;
    EXPECT_NE(log.find(position + " " + message), std::string::npos) << log;
  }
  void expect_nested(const std::string& position, const std::string& message) {
    expect_simple(position, "(" + position + ")" + message + "\n\n");
  }

  std::string data_;
  std::string output_;
};

TEST_F(ActionsTest, ReportRunsItsStepsInOrder) {
  EXPECT_EQ(run(report_action, {"p1"}), 0);
  const Calls calls = {"ProfileRunning p1",
                       "StatusUpdate p1 collect_data",
                       std::string("GetSection ") + kConfig + " p1",
                       "InitRealPath p1 1",
                       "CsvFile " + folder_.path("csv/share_list.csv"),
                       "CsvFile " + folder_.path("csv/large_file.csv"),
                       "GetTargetLink " + folder_.path("it's final/report.html"),
                       "SendReport p1 " + platform.link,
                       "StatusUpdate p1 success"};
  EXPECT_EQ(platform.calls, calls);
  const std::string pid = std::to_string(getpid());
  const std::string body = "/tmp/vornreport_body." + pid;
  const std::string script = std::string("run cmd=") + kScript;
  std::string expected;
  const std::pair<int, std::string> commands[] = {
      {238, script + " header " + data_},
      {244, script + " lang " + data_ + " en"},
      {165, script + " body   " + body},
      {171, script + " header " + data_ + " share_list"},
      {173, script + " body " + body + " share_list"},
      {173, script + " body " + body + " large_file"},
      {179, script + " tail " + body},
      {182, "run cmd=/bin/cat " + body + " >> " + data_},
      {183, "run cmd=/bin/rm -f " + body},
      {200, "run cmd=/bin/rm -rf '" + folder_.path("template") + "'"},
      {201, "run cmd=/bin/cp -rfp /usr/vorn/vornreport/reportUI/template '" +
                folder_.path("template") + "'"},
      {204, "run cmd=/bin/mv " + data_ + " '" + folder_.path("date") + "/'report.html"},
      {107,
       "run cmd=/bin/mv '" + folder_.path("date") + "' '" + folder_.path() + "/it'\\''s final'"}};
  for (const auto& [line, command] : commands) {
    expected += std::to_string(line) + ")" + command + "\n";
  }
  std::string shown;
  for (const char* start : {"(src/vornreport:"}) {
    const std::string all = lines_with(start);
    for (size_t at = 0; at < all.size(); at = all.find('\n', at) + 1) {
      const std::string line = all.substr(at, all.find('\n', at) - at + 1);
      shown += line.find(")run cmd=") != std::string::npos ? line : "";
    }
  }
  EXPECT_EQ(shown, expected);
  const std::string facts = support::read_file(folder_.path("it's final/report.json"));
  EXPECT_EQ(facts.find('\n'), facts.size() - 1);
  EXPECT_EQ(support::read_file(folder_.path("it's final/report.html")),
            "header \nlang en\n</script>\n</script>\n<script type='text/javascript'>\n"
            "var vornFacts = " +
                facts.substr(0, facts.size() - 1) +
                ";\n</script>\nheader share_list\n"
                "body \nbody share_list\nbody large_file\ntail \n");
  EXPECT_FALSE(support::exists(folder_.path("stat.db.p1")));
  EXPECT_FALSE(support::exists(data_));
  EXPECT_FALSE(support::exists(body));
  for (const char* trace : {"(src/vornreport:299)init profile name=p1\n\n",
                            "(src/vornreport:357)create report, profile name=p1\n\n",
                            "(src/vornreport:229)report list=large_file,share_list\n\n",
                            "(src/vornreport:280)##### inject report=large_file\n\n",
                            "(src/vornreport:169)build report=share_list\n\n",
                            "(src/vornreport:134)get link=http://files.example/report.html\n\n"}) {
    EXPECT_NE(output_.find(trace), std::string::npos) << trace;
  }
}

TEST_F(ActionsTest, ReportFailsWhenThePlatformFindsNoReport) {
  platform.success_result = 1;
  EXPECT_EQ(run(report_action, {"p1"}), -1);
  EXPECT_EQ(platform.calls.back(), "StatusUpdate p1 success") << "what is stored is stored";
}

// One failing call each: what is logged, at which position, and whether the run is a failure.
TEST_F(ActionsTest, ReportLogsWhatFailed) {
  const struct {
    const char* failing;
    int result;
    const char* position;
    const char* message;
  } cases[] = {
      {"StatusUpdate", -1, "src/vornreport:302", "update status=collect_data failed"},
      {"InitRealPath", -1, "src/vornreport:313", "init path failed, section=p1"},
      {"InitFilterUser", -1, "src/vornreport:232", "init user failed"},
      {"ImportLang", 0, "src/vornreport:241", "Failed to setting language"},
      {"GetVolumePathHash", 0, "src/vornreport:259", "Failed to get volume path info"},
      {"GetSharePathHash", 0, "src/vornreport:266", "Failed to get share path info"},
      {"GetTargetLink", 0, "src/vornreport:131", "create share link failed"},
      {"SendReport", 0, "src/vornreport:136", "send mail failed, profile=p1"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.failing);
    platform.failing = {c.failing};
    platform.calls.clear();
    mkdir(folder_.path("date").c_str(), 0700);
    EXPECT_EQ(run(report_action, {"p1"}), c.result);
    expect_nested(c.position, c.message);
    const Calls& calls = platform.calls;
    if (c.result < 0) {
      EXPECT_TRUE(calls.end()[-2].starts_with("ReportCleanTmp p1 ")) << calls.end()[-2];
      EXPECT_EQ(calls.back(), "StatusUpdate p1 fail");
    } else {
      EXPECT_EQ(calls.back(), "StatusUpdate p1 success");
    }
    EXPECT_FALSE(support::exists(folder_.path("stat.db.p1")));
    std::filesystem::remove_all(folder_.path("it's final"));
  }
}

TEST_F(ActionsTest, ReportNeedsWhatTheProfileMustSay) {
  const struct {
    const char* key;
    const char* position;
    const char* message;
  } cases[] = {
      {"report_list", "src/vornreport:226", "No report selected"},
      {"real_path_template", "src/vornreport:189", "get template dir failed"},
      {"real_path_date", "src/vornreport:194", "get target dir failed"},
      {"real_path_date_final", "src/vornreport:101", "get report correct dir failed"},
  };
  const TextMap paths = platform.real_paths;
  for (const auto& c : cases) {
    SCOPED_TRACE(c.key);
    platform.real_paths = paths;
    platform.real_paths.erase(c.key);
    platform.config["p1"] = {{"report_list", "share_list"}, {"language", "en"}};
    platform.config["p1"].erase(c.key);
    EXPECT_EQ(run(report_action, {"p1"}), -1);
    expect_nested(c.position, c.message);
    EXPECT_EQ(platform.calls.end()[-2], "ReportCleanTmp p1 loaded");
    EXPECT_EQ(platform.calls.back(), "StatusUpdate p1 fail");
  }
  platform.config["p1"] = {{"report_list", "nothing_known"}};
  platform.real_paths = paths;
  EXPECT_EQ(run(report_action, {"p1"}), -1);
  expect_nested("src/vornreport:366", "create template failed");
}

TEST_F(ActionsTest, ReportRefusesMissingUnknownAndRunningProfiles) {
  EXPECT_EQ(report_action(nullptr), -1);
  EXPECT_EQ(run(report_action, {}), -1);
  expect_simple("src/vornreport:340", "bad parameter\n");
  EXPECT_EQ(run(report_action, {"nobody"}), -1);
  expect_nested("src/vornreport:309", "Get section failed, section=nobody");
  EXPECT_EQ(platform.calls.back(), "StatusUpdate nobody fail");
  platform.running = {"p1"};
  platform.calls.clear();
  EXPECT_EQ(run(report_action, {"p1"}), 0);
  EXPECT_EQ(output_, "(src/vornreport:345)profile=p1 is running, skip running again\n");
  EXPECT_EQ(platform.calls, Calls{"ProfileRunning p1"});
}

TEST_F(ActionsTest, TemplateLinkIsLeftAlone) {
  rmdir(folder_.path("template").c_str());
  ASSERT_EQ(symlink("/usr/vorn/vornreport", folder_.path("template").c_str()), 0);
  EXPECT_EQ(run(report_action, {"p1"}), 0);
  EXPECT_EQ(output_.find("/bin/cp"), std::string::npos);
  EXPECT_TRUE(std::filesystem::is_symlink(folder_.path("template")));
}

// A call of the script that fails, whichever, prints nothing and skips nothing; but what it should
// have written is missing.
TEST_F(ActionsTest, AFailedCommandLosesTheRunsData) {
  for (const std::string word : {"header", "lang", "body", "tail", "mv"}) {
    const pid_t child = support::fork_child([&] {
      support::write_file(
          kScript, "#!/bin/sh\n[ \"$1\" != " + word + " ] || exit 1\necho \"$1 $3\" >> \"$2\"\n");
      chmod(kScript, 0755);
      if (word == "mv") {
        platform.real_paths["real_path_date_final"] = folder_.path("no/such/folder");
      }
      const int result = run(report_action, {"p1"});
      const char* told = word == "mv" ? "correct dir failed" : "create template failed";
      return result == -1 && output_.find(told) != std::string::npos &&
                     output_.find("/bin/cp -rfp") != std::string::npos
                 ? 0
                 : 1;
    });
    EXPECT_EQ(support::wait_child(child), 0) << word;
  }
}

TEST_F(ActionsTest, CollectCountsTheSelectedReports) {
  EXPECT_EQ(run(collect_action, {"p1"}), 2);
  EXPECT_EQ(platform.calls.back(), "StatusUpdate p1 success");
  platform.config["p1"]["report_list"] = "unknown";
  EXPECT_EQ(run(collect_action, {"p1"}), 0);
  EXPECT_EQ(platform.calls.back(), "StatusUpdate p1 success");
  platform.config["global"] = {{"report_list", "volume_usage"}};
  platform.calls.clear();
  output_ = printed([&] { EXPECT_EQ(collect_action(nullptr), -1); });  // there is no volume
  EXPECT_EQ(platform.calls.back(), "InitRealPath global 0");
  expect_nested("src/vornreport:425", "collect global data failed");
}

TEST_F(ActionsTest, CollectLogsWhatFailed) {
  EXPECT_EQ(run(collect_action, {}), -1);
  expect_nested("src/vornreport:409", "bad parameter");
  EXPECT_EQ(run(collect_action, {"nobody"}), -1);
  expect_nested("src/vornreport:420", "init profile failed, profile=nobody");
  platform.config["p1"] = {{"language", "de"}};
  EXPECT_EQ(run(collect_action, {"p1"}), -1);
  expect_nested("src/vornreport:433", "No report selected");
  platform.running = {"p1"};
  platform.calls.clear();
  EXPECT_EQ(run(collect_action, {"p1"}), 0);
  EXPECT_EQ(output_, "(src/vornreport:413)profile=p1 is running, skip running again\n");
  EXPECT_EQ(platform.calls, Calls{"ProfileRunning p1"});
  output_ = printed([] { EXPECT_EQ(VornQazGlobalCollectData(nullptr), -1); });
  expect_nested("src/global:22", "bad parameter");
}

TEST_F(ActionsTest, CleanWritesBackOnlyWhatChanged) {
  platform.config["p1"]["schedule_collect_id"] = "7";
  EXPECT_EQ(run(clean_action, {"p1"}), 0);
  EXPECT_EQ(platform.calls, (Calls{std::string("GetSection ") + kConfig + " p1",
                                   "ScheduleClean p1 schedule_collect_id", "InitRealPath p1 0",
                                   "ReportCleanTmp p1 loaded"}));
  platform.schedule_clean = 1;
  platform.calls.clear();
  EXPECT_EQ(run(clean_action, {"p1"}), 0);
  EXPECT_EQ(platform.calls[2],
            std::string("SetSection ") + kConfig + " p1 (null) large_file,share_list \t%s = %s\n");
}

TEST_F(ActionsTest, CleanGoesOnAfterAFailureAndStopsAtAMissingSection) {
  platform.failing = {"ScheduleClean"};
  EXPECT_EQ(run(clean_action, {"p1"}), 0);
  expect_simple("src/vornreport:531", "clean schedule failed, profile=p1\n");
  EXPECT_EQ(platform.calls.back(), "ReportCleanTmp p1 loaded");
  platform.failing = {"SetSection"};
  platform.schedule_clean = 1;
  VLIBCErrSetEx(0x0D04, "x", 1);
  EXPECT_EQ(run(clean_action, {"p1"}), 0);
  expect_simple("src/vornreport:535", "VLIBCFileSetSectionValue failed.(0x0D04)\n");
  platform.failing = {"InitRealPath"};
  platform.calls.clear();
  EXPECT_EQ(run(clean_action, {"p1"}), 0);
  expect_nested("src/vornreport:541", "init path failed, section=p1");
  EXPECT_NE(platform.calls.back(), "ReportCleanTmp p1 loaded");
  EXPECT_LT(run(clean_action, {"nobody"}), 0);
  expect_nested("src/vornreport:525", "Get section failed, section=nobody");
}

TEST_F(ActionsTest, CleanOfAllRemovesEveryStatisticsDatabase) {
  platform.config.clear();
  for (const char* name : {"stat.db.a", "stat.db.b-journal", "stat.db", "keep"}) {
    support::write_file(folder_.path(name), "");
  }
  EXPECT_EQ(run(clean_action, {}), 0);
  EXPECT_NE(
      output_.find("(src/vornreport:480)run cmd=/bin/rm -f '" + folder_.path() + "'/stat.db.*\n\n"),
      std::string::npos);
  EXPECT_FALSE(support::exists(folder_.path("stat.db.a")));
  EXPECT_FALSE(support::exists(folder_.path("stat.db.b-journal")));
  EXPECT_TRUE(support::exists(folder_.path("stat.db")));
  EXPECT_TRUE(support::exists(folder_.path("keep")));
}

}  // namespace
}  // namespace vornreport
