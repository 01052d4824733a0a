// Who holds a profile.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>

#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

using support::OtherRun;

TEST(Holding, LastsUntilTheHolderDiesOrTakesTheNext) {
  OtherRun other("held");
  ASSERT_TRUE(other.started());
  EXPECT_NE(VornQazProfileRunning("held"), 0);
  EXPECT_EQ(VornQazStatusUpdate("held", "collect_data"), -1);
  other.end();
  EXPECT_EQ(VornQazProfileRunning("held"), 0);
  EXPECT_EQ(VornQazProfileRunning("held"), 0);  // its own
  EXPECT_EQ(VornQazStatusUpdate("held", "collect_data"), 0);
  EXPECT_FALSE(OtherRun("held").started());
  EXPECT_EQ(VornQazProfileRunning("next"), 0);
  EXPECT_TRUE(OtherRun("held").started());
  EXPECT_EQ(support::syslog_text(), "");
}

TEST(Holding, NoChildOfTheHolderHoldsIt) {
  // The holder starts a command, as system() would, and dies; the command outlives it, and so does
  // a child that was forked only.
  int ends[2];
  ASSERT_EQ(pipe(ends), 0);
  const pid_t holder = support::fork_child([&] {
    VornQazProfileRunning("parent");
    for (const bool forked_only : {true, false}) {
      if (fork() == 0) {
        dup2(ends[0], 0);
        close(ends[1]);
        char byte = 0;
        _exit(forked_only ? static_cast<int>(read(0, &byte, 1))
                          : execl("/bin/cat", "cat", nullptr));
      }
    }
    return support::wait_child(support::fork_child([] { return VornQazProfileRunning("parent"); }));
  });
  close(ends[0]);
  EXPECT_EQ(support::wait_child(holder), 1);  // what the child that asked was told
  EXPECT_EQ(VornQazProfileRunning("parent"), 0);
  close(ends[1]);
}

TEST(Holding, AnUnworkableLockFailsTheRun) {
  std::filesystem::create_directories(VORN_PATH_STATUS "/.folder.lock");
  std::filesystem::create_symlink("/tmp/victim", VORN_PATH_STATUS "/.linked.lock");
  for (const char* profile : {"linked", "folder"}) {
    const std::string status = VORN_PATH_STATUS "/" + std::string(profile);
    support::write_file(status, "success\n");
    EXPECT_EQ(VornQazProfileRunning(profile), 0);
    EXPECT_EQ(VornQazStatusUpdate(profile, "collect_data"), -1);
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    EXPECT_EQ(support::read_file(status), "fail\n");
  }
  EXPECT_FALSE(support::exists("/tmp/victim"));
}
