// Who holds a profile.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include "support.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace fs = std::filesystem;

TEST(Holding, AHeldProfileIsRunningUntilItsHolderDies) {
  support::OtherRun other("held");
  ASSERT_TRUE(other.started());
  EXPECT_NE(VornQazProfileRunning("held"), 0);
  EXPECT_EQ(VornQazStatusUpdate("held", "collect_data"), -1);
  other.end();
  EXPECT_EQ(VornQazProfileRunning("held"), 0);
  EXPECT_EQ(VornQazProfileRunning("held"), 0);  // its own
  EXPECT_EQ(VornQazStatusUpdate("held", "collect_data"), 0);
  EXPECT_EQ(support::syslog_text(), "");
}

TEST(Holding, TakingTheNextProfileReleasesTheLast) {
  ASSERT_EQ(VornQazProfileRunning("global"), 0);
  ASSERT_EQ(VornQazProfileRunning("next"), 0);
  EXPECT_TRUE(support::OtherRun("global").started());
  EXPECT_FALSE(support::OtherRun("next").started());
}

TEST(Holding, OnlyOneOfManyStartersWins) {
  int gate[2];
  ASSERT_EQ(pipe(gate), 0);
  std::vector<pid_t> starters;
  for (int i = 0; i < 6; ++i) {
    starters.push_back(support::fork_child([&] {
      close(gate[1]);
      char byte = 0;
      if (read(gate[0], &byte, 1) != 0) {  // until the gate opens: all at once
        return 2;
      }
      const int busy = VornQazProfileRunning("race");
      usleep(300'000);  // hold it until everyone has asked
      return busy == 0 ? 0 : 1;
    }));
  }
  close(gate[0]);
  close(gate[1]);
  int winners = 0;
  for (const pid_t starter : starters) {
    const int result = support::wait_child(starter);
    EXPECT_TRUE(result == 0 || result == 1) << result;
    winners += result == 0 ? 1 : 0;
  }
  EXPECT_EQ(winners, 1);
}

TEST(Holding, NoChildOfTheHolderHoldsIt) {
  // The holder starts a command, as system() would, and dies; the command outlives it, and so does
  // a child that was forked only.
  int shell_ends[2];
  ASSERT_EQ(pipe(shell_ends), 0);
  const pid_t holder = support::fork_child([&] {
    if (VornQazProfileRunning("parent") != 0) {
      return 1;
    }
    for (const bool forked_only : {true, false}) {
      if (fork() == 0) {
        dup2(shell_ends[0], 0);
        close(shell_ends[0]);
        close(shell_ends[1]);
        char byte = 0;
        _exit(forked_only ? static_cast<int>(read(0, &byte, 1))
                          : execl("/bin/cat", "cat", nullptr));
      }
    }
    return support::wait_child(support::fork_child([] { return VornQazProfileRunning("parent"); }));
  });
  close(shell_ends[0]);
  EXPECT_EQ(support::wait_child(holder), 1);  // what the child that asked was told
  EXPECT_EQ(VornQazProfileRunning("parent"), 0);
  close(shell_ends[1]);
}

TEST(Holding, NamesOfALiveProcessStay) {
  // The id that the last holder left belongs to another program by now.
  support::write_file(VORN_PATH_STATUS "/.alive.lock", "1\n");
  support::write_file("/tmp/vornreport_data.1", "");
  EXPECT_EQ(VornQazProfileRunning("alive"), 0);
  EXPECT_TRUE(support::exists("/tmp/vornreport_data.1"));
}

TEST(Holding, AnUnworkableLockFailsTheStatusOnly) {
  fs::create_directories(VORN_PATH_STATUS);
  fs::create_symlink("/tmp/victim", VORN_PATH_STATUS "/.linked.lock");
  fs::create_directory(VORN_PATH_STATUS "/.folder.lock");
  for (const char* profile : {"linked", "folder"}) {
    EXPECT_EQ(VornQazProfileRunning(profile), 0);
    EXPECT_EQ(VornQazStatusUpdate(profile, "collect_data"), -1);
    EXPECT_EQ(support::syslog_lines().size(), 1U);
    EXPECT_EQ(support::read_file(VORN_PATH_STATUS "/" + std::string(profile)), "<absent>");
  }
  EXPECT_FALSE(support::exists("/tmp/victim"));
}
