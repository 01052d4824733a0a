// The process as it is prepared, and SQLite's memory in it.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <random>
#include <vector>

#include "sqlite_memory.hpp"
#include "support.hpp"
#include "vorn/report.h"

extern char** environ;

namespace {

TEST(SetEnv, PreparesAProcessStartedAnyhow) {
  const pid_t child = support::fork_child([] {
    setenv("LD_PRELOAD_X", "1", 1);
    setenv("TZ", "XXX-5", 1);
    close(STDIN_FILENO);
    close(STDOUT_FILENO);
    const rlimit low{256, 256};
    setrlimit(RLIMIT_NOFILE, &low);
    errno = 77;
    VornQazSetEnv();
    if (errno != 77) {
      return 2;
    }
    std::vector<std::string> variables;
    for (char** entry = environ; *entry != nullptr; ++entry) {
      variables.emplace_back(*entry);
    }
    std::sort(variables.begin(), variables.end());
    if (variables != std::vector<std::string>{"HOME=/", "LC_ALL=C.UTF-8",
                                              "PATH=/usr/sbin:/usr/bin:/sbin:/bin"}) {
      return 3;
    }
    struct stat null_device {};
    struct stat output {};
    stat("/dev/null", &null_device);
    if (fstat(STDOUT_FILENO, &output) != 0 || output.st_rdev != null_device.st_rdev ||
        fcntl(STDIN_FILENO, F_GETFD) != 0) {
      return 4;
    }
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    if (geteuid() == 0 && limit.rlim_cur < 8192) {
      return 5;
    }
    if (umask(0) != 027 || std::signal(SIGPIPE, SIG_DFL) != SIG_IGN) {
      return 6;
    }
    umask(0);
    VornQazSetEnv();  // once and never again
    return umask(0) == 0 ? 0 : 7;
  });
  EXPECT_EQ(0, support::wait_child(child));
}

struct Block {
  void* memory;
  int size;
  unsigned char fill;
};

bool intact(const Block& block) {
  const auto* bytes = static_cast<unsigned char*>(block.memory);
  return std::all_of(bytes, bytes + block.size, [&](unsigned char c) { return c == block.fill; });
}

// Sizes around every class boundary, more often small than large.
int random_size(std::mt19937& random) {
  const int bits = static_cast<int>(random() % 18);
  return 1 + static_cast<int>(random() % (2U << bits));
}

TEST(SqliteMemory, KeepsEveryByteOfEveryBlock) {
  const sqlite3_mem_methods& memory = host::sqlite_memory;
  std::mt19937 random(20240229);
  std::vector<Block> blocks;
  for (int step = 0; step < 60'000; ++step) {
    const auto fill = static_cast<unsigned char>(random());
    if (blocks.empty() || (random() % 3 == 0 && blocks.size() < 500)) {
      const int size = random_size(random);
      blocks.push_back({memory.xMalloc(memory.xRoundup(size)), size, fill});
      ASSERT_EQ(0U, reinterpret_cast<std::uintptr_t>(blocks.back().memory) % 8);
    } else {
      Block& block = blocks[random() % blocks.size()];
      ASSERT_TRUE(intact(block)) << "of " << block.size << " bytes";
      if (random() % 2 == 0) {
        memory.xFree(block.memory);
        block = blocks.back();
        blocks.pop_back();
        continue;
      }
      const int size = random_size(random);
      block.memory = memory.xRealloc(block.memory, memory.xRoundup(size));
      block.size = std::min(size, block.size);
      ASSERT_TRUE(intact(block)) << "moved to " << size << " bytes";
      block = {block.memory, size, fill};
    }
    if (!blocks.empty()) {
      Block& last = blocks.back();
      ASSERT_GE(memory.xSize(last.memory), last.size);
      last.fill = fill;
      std::memset(last.memory, fill, static_cast<std::size_t>(last.size));
    }
  }
  for (const Block& block : blocks) {
    EXPECT_TRUE(intact(block));
    memory.xFree(block.memory);
  }
}

TEST(SqliteMemory, IsBoundedOverManyStatements) {
  const pid_t child = support::fork_child([] {
    sqlite3_shutdown();
    VornQazSetEnv();
    sqlite3* database = nullptr;
    const auto run = [&](const char* sql) {
      return sqlite3_exec(database, sql, nullptr, nullptr, nullptr) == SQLITE_OK;
    };
    if (sqlite3_open(":memory:", &database) != SQLITE_OK || !run("create table t (a, b)")) {
      return 2;
    }
    rusage before{};
    getrusage(RUSAGE_SELF, &before);
    for (int i = 0; i < 20'000; ++i) {
      if (!run("insert into t values (1, 'text'); delete from t")) {
        return 3;
      }
    }
    rusage after{};
    getrusage(RUSAGE_SELF, &after);
    sqlite3_close(database);
    constexpr long kBoundKiB = 4096;
    return after.ru_maxrss - before.ru_maxrss < kBoundKiB ? 0 : 4;
  });
  EXPECT_EQ(0, support::wait_child(child));
}

}  // namespace
