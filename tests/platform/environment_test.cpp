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
#include <cstdint>
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
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    limit.rlim_cur = 256;
    setrlimit(RLIMIT_NOFILE, &limit);
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
    getrlimit(RLIMIT_NOFILE, &limit);
    if (limit.rlim_cur < std::min<rlim_t>(limit.rlim_max, 8192)) {
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

// Up to 128 KiB, more often small than large.
int random_size(std::mt19937& random) {
  const int bits = static_cast<int>(random() % 17);
  return 1 + static_cast<int>(random() % (2U << bits));
}

TEST(SqliteMemory, KeepsEveryByteOfEveryBlock) {
  const sqlite3_mem_methods& memory = host::sqlite_memory;
  std::mt19937 random(20240229);
  std::vector<Block> blocks;
  for (int step = 0; step < 20'000; ++step) {
    const int size = random_size(random);
    const auto fill = static_cast<unsigned char>(random());
    const std::size_t chosen = random() % 500;
    if (chosen >= blocks.size()) {
      blocks.push_back({memory.xMalloc(memory.xRoundup(size)), size, fill});
    } else {
      Block& block = blocks[chosen];
      ASSERT_TRUE(intact(block)) << "of " << block.size << " bytes";
      if (random() % 2 == 0) {
        memory.xFree(block.memory);
        block = {memory.xMalloc(size), size, fill};
      } else {
        block.memory = memory.xRealloc(block.memory, memory.xRoundup(size));
        block.size = std::min(size, block.size);
        ASSERT_TRUE(intact(block)) << "moved to " << size << " bytes";
        block = {block.memory, size, fill};
      }
    }
    const Block& changed = blocks[std::min(chosen, blocks.size() - 1)];
    ASSERT_EQ(0U, reinterpret_cast<std::uintptr_t>(changed.memory) % 8);
    ASSERT_GE(memory.xSize(changed.memory), size);
    std::memset(changed.memory, fill, static_cast<std::size_t>(size));
  }
  for (const Block& block : blocks) {
    EXPECT_TRUE(intact(block));
    memory.xFree(block.memory);
  }
}

TEST(SqliteMemory, UsesFreedBlocksAgain) {
  const pid_t child = support::fork_child([] {
    const sqlite3_mem_methods& memory = host::sqlite_memory;
    rusage first{};
    std::vector<void*> blocks;
    for (int round = 0; round < 200; ++round) {
      blocks.clear();
      for (int size = 1; size <= 16000; size += 16) {
        blocks.push_back(memory.xRealloc(memory.xMalloc(size), size + round));
        std::memset(blocks.back(), 1, static_cast<std::size_t>(size));
      }
      std::for_each(blocks.begin(), blocks.end(), memory.xFree);
      if (round == 10) {
        getrusage(RUSAGE_SELF, &first);
      }
    }
    rusage last{};
    getrusage(RUSAGE_SELF, &last);
    constexpr long kBoundKiB = 4096;  // a round takes twice that
    return last.ru_maxrss - first.ru_maxrss < kBoundKiB ? 0 : 1;
  });
  EXPECT_EQ(0, support::wait_child(child));
}

}  // namespace
