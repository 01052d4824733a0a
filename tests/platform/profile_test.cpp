// Profiles' schedules.
#include <gtest/gtest.h>

#include <filesystem>

#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

TEST(Schedule, RemovesItsOwnCronFileOnly) {
  const std::string cron = VORN_PATH_CRON;
  const support::TempFolder outside;
  support::write_file(outside.path("vornreport-up"), "");
  support::write_file(cron + "/vornreport-job_1-A", "");
  support::write_file(cron + "/job", "");
  std::filesystem::create_symlink(outside.path("vornreport-up"), cron + "/vornreport-link");
  const struct {
    const char* id;
    int result;
  } cases[] = {{"job_1-A", 1}, {"job_1-A", 1},  // the second time there is no file
               {"link", 1},    {"../x", -1},   {"/etc/x", -1}, {"", 0}};
  for (const auto& [id, result] : cases) {
    SCOPED_TRACE(id);
    const support::Hash owner = support::make_hash({{"id", id}, {"other", "1"}});
    VLIBCSzHash* hash = owner.get();
    EXPECT_EQ(VornQazScheduleClean("p", &hash, "id"), result);
    EXPECT_EQ(VLIBCSzHashGetValue(hash, "id") == nullptr, result == 1);
  }
  EXPECT_FALSE(support::exists(cron + "/vornreport-job_1-A"));
  EXPECT_TRUE(support::exists(cron + "/job"));
  EXPECT_TRUE(support::exists(outside.path("vornreport-up")));
}
