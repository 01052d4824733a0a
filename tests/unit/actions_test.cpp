// The three actions: orders of calls, failing calls, stable positions and texts.
#include "vornreport/actions.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <regex>

#include "fixture.hpp"
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
    for (const char* path : {"/usr/vorn/vornreport", "/usr/vorn/vornreport/reportUI",
                             "/usr/vorn/vornreport/reportUI/template"}) {
      mkdir(path, 0755);
    }
    // Shows how it was called, and writes to the file it was given.
    support::write_file(kScript, "#!/bin/sh\necho \"script $*\"\necho \"$1 $3\" >> \"$2\"\n");
    chmod(kScript, 0755);
    begin();
  }

  // A platform on which all is well.
  void begin() {
    platform = ScriptedPlatform();
    platform.config["p1"] = {{"report_list", "large_file,share_list"}};
    for (const char* name : {"template", "date", "csv"}) {
      mkdir(folder_.path(name).c_str(), 0700);
    }
    std::filesystem::remove_all(folder_.path("it's final"));
    platform.real_paths = {{"real_path_stat_db", folder_.path("stat.db.p1")},
                           {"real_path_template", folder_.path("template")},
                           {"real_path_date", folder_.path("date")},
                           {"real_path_date_final", folder_.path("it's final")},
                           {"real_path_report_final", folder_.path("it's final/report.html")},
                           {"real_path_csv", folder_.path("csv")}};
    platform.locations = {{"real_path_stat_db", folder_.path("stat.db")},
                          {"real_path_base", folder_.path()}};
  }

  int run(int (*action)(char**), std::string profile = "p1") {
    std::array<char*, 2> args{profile.empty() ? nullptr : profile.data(), nullptr};
    int result = 0;
    output_ = printed([&] { result = action(args.data()); });
    return result;
  }

  std::string data_;
  std::string output_;
};

TEST_F(ActionsTest, ReportRunsItsStepsInOrder) {
  EXPECT_EQ(run(report_action), 0);
  const Calls calls = {"ProfileRunning p1",
                       "StatusUpdate p1 collect_data",
                       std::string("GetSection ") + kConfig + " p1",
                       "InitRealPath p1 1",
                       "GetTargetLink " + folder_.path("it's final/report.html"),
                       "SendReport p1 " + platform.link,
                       "StatusUpdate p1 success"};
  EXPECT_EQ(platform.calls, calls);
  const std::string body = "/tmp/vornreport_body." + std::to_string(getpid());
  const std::string script = kScript;
  const std::pair<int, std::string> commands[] = {
      {238, script + " header " + data_},
      {244, script + " lang " + data_ + " en"},
      {165, script + " body   " + body},
      {171, script + " header " + data_ + " share_list"},
      {173, script + " body " + body + " share_list"},
      {173, script + " body " + body + " large_file"},
      {179, script + " tail " + body},
      {182, "/bin/cat " + body + " >> " + data_},
      {183, "/bin/rm -f " + body},
      {200, "/bin/rm -rf '" + folder_.path("template") + "'"},
      {201,
       "/bin/cp -rfp /usr/vorn/vornreport/reportUI/template '" + folder_.path("template") + "'"},
      {204, "/bin/mv " + data_ + " '" + folder_.path("date") + "/'report.html"},
      {107, "/bin/mv '" + folder_.path("date") + "' '" + folder_.path() + "/it'\\''s final'"}};
  std::string expected;
  for (const auto& [line, command] : commands) {
    expected.append(std::to_string(line)).append(" ").append(command).append("\n");
  }
  std::string shown;
  const std::regex traced(R"(\(src/vornreport:(\d+)\)run cmd=(.*\n))");
  for (std::sregex_iterator at(output_.begin(), output_.end(), traced), end; at != end; ++at) {
    shown.append((*at)[1]).append(" ").append((*at)[2]);
  }
  EXPECT_EQ(shown, expected);
  const std::string facts = support::read_file(folder_.path("it's final/report.json"));
  EXPECT_EQ(support::read_file(folder_.path("it's final/report.html")),
            "header \nlang en\n</script>\n</script>\n<script type='text/javascript'>\n"
            "var vornFacts = " +
                facts.substr(0, facts.find('\n')) +
                ";\n</script>\nheader share_list\n"
                "body \nbody share_list\nbody large_file\ntail \n");
  for (const std::string& gone : {folder_.path("stat.db.p1"), data_, body}) {
    EXPECT_FALSE(support::exists(gone)) << gone;
  }
  for (const char* trace :
       {"299)init profile name=p1\n\n", "357)create report, profile name=p1\n\n",
        "229)report list=large_file,share_list\n\n", "280)##### inject report=large_file\n\n",
        "169)build report=share_list\n\n", "134)get link=http://files.example/report.html\n\n"}) {
    EXPECT_NE(output_.find(std::string("(src/vornreport:") + trace), std::string::npos) << trace;
  }
}

// What is logged when a call fails, or when configuration or platform lack something, at which
// position, and how the run ends.
TEST_F(ActionsTest, TellWhatFailed) {
  const struct {
    int (*action)(char**);
    const char* profile;
    const char* failing;  // a call, or a key that isn't there
    int result;
    int position;
    const char* message;  // nested, unless it brings its line feed
    const char* last_call;
  } cases[] = {
      {report_action, "p1", "StatusUpdate", -1, 302, "update status=collect_data failed",
       "StatusUpdate p1 fail"},
      {report_action, "p1", "InitRealPath", -1, 313, "init path failed, section=p1",
       "StatusUpdate p1 fail"},
      {report_action, "p1", "InitFilterUser", -1, 232, "init user failed", "StatusUpdate p1 fail"},
      {report_action, "p1", "ImportLang", 0, 241, "Failed to setting language", ""},
      {report_action, "p1", "GetVolumePathHash", 0, 259, "Failed to get volume path info", ""},
      {report_action, "p1", "GetSharePathHash", 0, 266, "Failed to get share path info", ""},
      {report_action, "p1", "GetTargetLink", 0, 131, "create share link failed", ""},
      {report_action, "p1", "SendReport", 0, 136, "send mail failed, profile=p1", ""},
      {report_action, "p1", "report_list", -1, 226, "No report selected", "StatusUpdate p1 fail"},
      {report_action, "p1", "real_path_template", -1, 189, "get template dir failed",
       "StatusUpdate p1 fail"},
      {report_action, "p1", "real_path_date", -1, 194, "get target dir failed",
       "StatusUpdate p1 fail"},
      {report_action, "p1", "real_path_date_final", -1, 101, "get report correct dir failed",
       "StatusUpdate p1 fail"},
      {report_action, "odd", "", -1, 366, "create template failed", "StatusUpdate odd fail"},
      {report_action, "nobody", "", -1, 309, "Get section failed, section=nobody",
       "StatusUpdate nobody fail"},
      {report_action, "", "", -1, 340, "bad parameter\n", nullptr},
      {report_action, "held", "", 0, 345, nullptr, "ProfileRunning held"},
      {collect_action, "", "", -1, 409, "bad parameter", nullptr},
      {collect_action, "nobody", "", -1, 420, "init profile failed, profile=nobody", nullptr},
      {collect_action, "p1", "report_list", -1, 433, "No report selected", nullptr},
      {collect_action, "held", "", 0, 413, nullptr, "ProfileRunning held"},
      {collect_action, "global", "", -1, 425, "collect global data failed",  // there is no volume
       "InitRealPath global 0"},
      {clean_action, "p1", "ScheduleClean", 0, 531, "clean schedule failed, profile=p1\n",
       "ReportCleanTmp p1 loaded"},
      {clean_action, "p1", "SetSection", 0, 535, "VLIBCFileSetSectionValue failed.(0x0D04)\n",
       "ReportCleanTmp p1 loaded"},
      {clean_action, "p1", "InitRealPath", 0, 541, "init path failed, section=p1",
       "InitRealPath p1 0"},
      {clean_action, "nobody", "", -1, 525, "Get section failed, section=nobody", nullptr},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::to_string(c.position) + " " + c.failing);
    begin();
    platform.failing = {c.failing};
    platform.real_paths.erase(c.failing);
    platform.config["p1"]["language"] = "en";
    platform.config["p1"].erase(c.failing);
    platform.config["odd"] = {{"report_list", "nothing_known"}};
    platform.config["global"] = {{"report_list", "volume_usage"}};
    platform.running = {"held"};
    platform.schedule_clean = 1;
    VLIBCErrSetEx(0x0D04, "x", 1);
    EXPECT_EQ(std::clamp(run(c.action, c.profile), -1, 0), c.result);
    const std::string position = "src/vornreport:" + std::to_string(c.position);
    const std::string log = without_errno(support::syslog_text());
    if (c.message == nullptr) {
      EXPECT_EQ(output_, "(" + position + ")profile=held is running, skip running again\n");
      EXPECT_EQ(platform.calls, Calls{c.last_call});
      continue;
    }
    const std::string message = c.message;
    const std::string text =
        message.ends_with('\n') ? message : "(" + position + ")" + message + "\n\n";
    EXPECT_NE(without_errno(output_).find("(" + position + ")" + text), std::string::npos);
    EXPECT_NE(log.find(position + " " + text), std::string::npos) << log;
    if (c.last_call != nullptr) {
      EXPECT_EQ(platform.calls.back(),
                *c.last_call == '\0' ? "StatusUpdate p1 success" : c.last_call);
    }
    if (c.action == report_action && *c.profile != '\0') {
      EXPECT_EQ(platform.calls.end()[-2].starts_with("ReportCleanTmp "), c.result < 0);
      EXPECT_FALSE(support::exists(folder_.path("stat.db.p1")));
    }
  }
}

TEST_F(ActionsTest, TemplateLinkIsLeftAlone) {
  rmdir(folder_.path("template").c_str());
  ASSERT_EQ(symlink("/usr/vorn/vornreport", folder_.path("template").c_str()), 0);
  EXPECT_EQ(run(report_action), 0);
  EXPECT_EQ(output_.find("/bin/cp"), std::string::npos);
  EXPECT_TRUE(std::filesystem::is_symlink(folder_.path("template")));
}

// Lost data is remembered for the process, hence the child.
TEST_F(ActionsTest, AReportThatCannotGetItsNameIsNone) {
  EXPECT_TRUE(support::passes_in_child([&] {
    platform.real_paths["real_path_date_final"] = folder_.path("no/such/folder");
    EXPECT_EQ(run(report_action), -1);
    EXPECT_NE(output_.find("correct dir failed"), std::string::npos);
    EXPECT_EQ(platform.calls.back(), "StatusUpdate p1 fail");
  }));
}

}  // namespace
}  // namespace vornreport
