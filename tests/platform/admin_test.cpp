// What an administrator's tool is told of configuration and runs.
#include <gtest/gtest.h>

#include <filesystem>
#include <tuple>

#include "support.hpp"
#include "vorn/admin/configuration.hpp"
#include "vorn/admin/reports.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/paths.h"

namespace fs = std::filesystem;
using admin::RunState;
using support::write_file;

TEST(AdminConfiguration, RunsDoWithoutWhatIsWrong) {
  write_file(
      VORN_PATH_CONFIG,
      "above = 1\n[global]\nreport_list = x\n[good]\na = 1\nb=\n\n[cut]\na = 1\nbroken\nb = 2\n"
      "[twice]\na = 1\na = 2\n[.bad]\n[same]\n[same]\n");
  const auto found = admin::examine_file(VORN_PATH_CONFIG);
  ASSERT_TRUE(found);
  std::vector<std::size_t> wrong;
  for (const admin::WrongLine& line : found->wrong) {
    wrong.push_back(line.number);
  }
  EXPECT_EQ(wrong, (std::vector<std::size_t>{1, 10, 14, 17}));
  EXPECT_EQ(found->sections.size(), 7U);
  EXPECT_EQ(found->sections[2].value("b"), "2");
  const auto profiles = admin::read_profiles();
  ASSERT_TRUE(profiles);
  ASSERT_EQ(profiles->size(), 1U);
  EXPECT_EQ(profiles->front().name, "good");
  EXPECT_EQ(profiles->front().value("b", "unset"), "unset");
  EXPECT_EQ(support::syslog_lines().size(), 4U);  // cut, twice, .bad, same
  EXPECT_TRUE(admin::read_section(VORN_PATH_CONFIG, "global"));
  EXPECT_FALSE(admin::read_section(VORN_PATH_CONFIG, "none"));
  EXPECT_EQ(support::syslog_text(), "");
  EXPECT_FALSE(admin::read_section(VORN_PATH_CONFIG, "cut"));
  EXPECT_EQ(support::syslog_lines().size(), 1U);
  fs::remove(VORN_PATH_CONFIG);
  EXPECT_FALSE(admin::read_profiles() || admin::examine_file(VORN_PATH_CONFIG));
  EXPECT_EQ(support::syslog_lines().size(), 2U);
}

TEST(AdminRuns, StateIsToldByHolderAndStatus) {
  const std::string status = VORN_PATH_STATUS "/p";
  EXPECT_EQ(admin::last_run("p").state, RunState::never_ran);
  for (const auto& [text, state] :
       {std::tuple("success\nreport = 2026-01-02_03-04-05\nincidents = 2\n", RunState::succeeded),
        std::tuple("fail\n", RunState::failed),
        std::tuple("collect_data\n", RunState::ended_early)}) {
    write_file(status, text);
    EXPECT_EQ(admin::last_run("p").state, state) << text;
    EXPECT_EQ(admin::last_run("p").status.incidents, state == RunState::succeeded ? 2 : 0);
  }
  fs::remove(status);
  fs::create_directory(status);
  EXPECT_EQ(admin::last_run("p").state, RunState::unknown);
  fs::remove(status);
  write_file(VORN_PATH_PROGRESS "/p",
             R"({"phase":"gathering","share":"s","files":7,"report":"","number":0,"reports":3})");
  EXPECT_FALSE(admin::read_progress("p"));  // of a run that was killed
  support::OtherRun other("p");
  ASSERT_TRUE(other.started());
  const admin::LastRun run = admin::last_run("p");
  EXPECT_EQ(run.state, RunState::running);
  EXPECT_EQ(run.process, other.pid());
  EXPECT_EQ(admin::hold_profile("p"), admin::Hold::running);
  const auto progress = admin::read_progress("p");
  ASSERT_TRUE(progress);
  EXPECT_EQ(progress->files, 7U);
  fs::remove(VORN_PATH_PROGRESS "/p");
}
