// The report frame through its two reports, over a real statistics database.
#include <unistd.h>

#include <algorithm>

#include "rep_large_file.hpp"
#include "rep_share_list.hpp"
#include "report_fixture.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

using FrameTest = ReportTest;

TEST_F(FrameTest, LimitsCutThePageAndTheCsv) {
  {
    const SqliteHandle db = VORNReportDBInit(profile_.get());
    sqlite3_exec(db.get(), "BEGIN", nullptr, nullptr, nullptr);
    for (int i = 0; i < 10050; ++i) {
      add(db.get(), "s", "f" + std::to_string(i), 20000 - i);
    }
    sqlite3_exec(db.get(), "COMMIT", nullptr, nullptr, nullptr);
  }
  EXPECT_EQ(run(large_file_db), 0);
  const std::string page = data();
  EXPECT_NE(page.find("'/s/f199'"), std::string::npos);
  EXPECT_EQ(page.find("'/s/f200'"), std::string::npos);
  const std::string table = csv("large_file");
  EXPECT_EQ(std::count(table.begin(), table.end(), '\n'), 10001);
}

TEST_F(FrameTest, ShareWithoutVolumeIsLeftOut) {
  add("gone", "a", 9);
  add("photo", "b", 7);
  set(volumes_, "photo", "/srv");  // which has no identifier
  EXPECT_EQ(run(share_list_db), 0);
  EXPECT_EQ(data(),
            "<script type='text/javascript'>\nvar vornShareListData = [\n"
            "[ 'photo', '', '7' ]\n];\n</script>\n");
  const std::string log = support::syslog_text();
  EXPECT_NE(log.find(")get volume path failed, share=gone\n\n"), std::string::npos) << log;
  EXPECT_NE(log.find(")get volume id failed, volume=/srv\n"), std::string::npos) << log;
  EXPECT_EQ(log.find("src/rep_share_list:"), 0U);
}

// A page or CSV file that can't be opened or written fails the report; without its part of the page
// the run never makes one. Lost data is remembered for the process, hence the children.
TEST_F(FrameTest, AFileThatCannotBeWrittenFailsTheReportOrTheRun) {
  add("s", "a", 1);
  for (const char* file : {"page", "large_file.csv", "nowhere/large_file.csv"}) {
    const std::string said = in_child([&] {
      data_ = report_data_path().c_str();
      const std::string path = file == std::string("page") ? data_ : folder_.path(file);
      unlink(path.c_str());
      if (symlink("/dev/full", path.c_str()) != 0) {
        set_profile("real_path_csv", folder_.path("nowhere"));
      }
      const bool is_page = file == std::string("page");
      const bool lost = run(large_file_db) == -1 && report_data_lost() == is_page;
      unlink(path.c_str());
      unlink(data_.c_str());
      const bool told = output_.find(" file=" + path + " failed") != std::string::npos;
      return std::string(lost && told ? "failed and told" : output_);
    });
    EXPECT_EQ(said, "failed and told") << file;
  }
}

}  // namespace
}  // namespace vornreport
