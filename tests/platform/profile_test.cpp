// The list of profiles, and their schedules.
#include <gtest/gtest.h>

#include <filesystem>

#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace fs = std::filesystem;

TEST(Profiles, AreAllSectionsButGlobal) {
  support::write_file(VORN_PATH_CONFIG, "[b]\n[global]\nx=1\n[a]\n[globals]\n");
  const support::List owner = support::make_list();
  VLIBCSzList* list = owner.get();
  EXPECT_EQ(VornQazEnumProfile(&list, 0), 3);
  EXPECT_EQ(support::texts(owner), (std::vector<std::string>{"b", "a", "globals"}));
  EXPECT_EQ(VornQazEnumProfile(&list, 1), -1);
  fs::remove(VORN_PATH_CONFIG);
  EXPECT_EQ(VornQazEnumProfile(&list, 0), -1);
  EXPECT_EQ(support::syslog_lines().size(), 1U);
}

TEST(Schedule, RemovesItsOwnCronFileOnly) {
  const std::string cron = VORN_PATH_CRON;
  const support::TempFolder outside;
  support::write_file(outside.path("vornreport-up"), "");
  support::write_file(cron + "/vornreport-job_1-A", "");
  support::write_file(cron + "/vornreport-other", "");
  support::write_file(cron + "/job", "");
  fs::create_symlink(outside.path("vornreport-up"), cron + "/vornreport-link");
  fs::create_directory(cron + "/vornreport-dir");
  const struct {
    const char* id;
    int result;
  } cases[] = {
      {"job_1-A", 1}, {"job_1-A", 1},  // the second time there is no file
      {"link", 1},    {"dir", -1},    {"../x", -1}, {"a.b", -1},
      {"a b", -1},    {"/etc/x", -1}, {"", 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.id);
    const support::Hash owner = support::make_hash({{"id", c.id}, {"other", "1"}});
    VLIBCSzHash* hash = owner.get();
    EXPECT_EQ(VornQazScheduleClean("p", &hash, "id"), c.result);
    EXPECT_EQ(VLIBCSzHashGetValue(hash, "id") == nullptr, c.result == 1);
    EXPECT_EQ(support::syslog_lines().size(), c.result < 0 ? 1U : 0U);
  }
  const support::Hash owner = support::make_hash();
  VLIBCSzHash* hash = owner.get();
  EXPECT_EQ(VornQazScheduleClean("p", &hash, "id"), 0);

  EXPECT_FALSE(support::exists(cron + "/vornreport-job_1-A"));
  EXPECT_FALSE(support::exists(cron + "/vornreport-link"));
  EXPECT_TRUE(support::exists(cron + "/vornreport-other"));
  EXPECT_TRUE(support::exists(cron + "/vornreport-dir"));
  EXPECT_TRUE(support::exists(cron + "/job"));
  EXPECT_TRUE(support::exists(outside.path("vornreport-up")));
}
