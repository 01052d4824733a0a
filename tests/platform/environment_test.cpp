// The process as it is prepared, and SQLite's memory in it.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <random>
#include <set>
#include <thread>

#include "machine/server.hpp"
#include "machine/sqlite_memory.hpp"
#include "support.hpp"
#include "vorn/report.h"

extern char** environ;

namespace {

const sqlite3_mem_methods& memory = host::sqlite_memory;

struct Block {
  unsigned char* bytes;
  int size;
  unsigned char fill;
  bool intact() const {
    return std::all_of(bytes, bytes + size, [this](unsigned char c) { return c == fill; });
  }
};

}  // namespace

TEST(SetEnv, PreparesAProcessStartedAnyhow) {
  EXPECT_TRUE(support::passes_in_child([] {
    setenv("LD_PRELOAD_X", "1", 1);
    setenv("TZ", "AAA-5", 1);
    close(STDIN_FILENO);
    VornQazSetEnv();
    std::vector<std::string> variables;
    for (char** entry = environ; *entry != nullptr; ++entry) {
      variables.emplace_back(*entry);
    }
    std::sort(variables.begin(), variables.end());
    EXPECT_EQ((std::vector<std::string>{"HOME=/", "LC_ALL=C.UTF-8",
                                        "PATH=/usr/sbin:/usr/bin:/sbin:/bin"}),
              variables);
    EXPECT_EQ("/dev/null", std::filesystem::read_symlink("/proc/self/fd/0"));
    EXPECT_EQ(SIG_IGN, std::signal(SIGPIPE, SIG_DFL));
  }));
}

TEST(Server, HasANameAndATimeZone) {
  char text[256] = "x";
  utsname names{};
  ASSERT_EQ(0, uname(&names));
  std::string name = names.nodename;
  std::erase_if(name, [](unsigned char c) { return std::isalnum(c) == 0 && c != '.' && c != '-'; });
  EXPECT_EQ(std::ssize(name), VornQazGetHostName(text, sizeof text));
  EXPECT_EQ(name, text);
  EXPECT_EQ(-1, VornQazGetHostName(text, name.size()));
  EXPECT_STREQ("", text);
  EXPECT_EQ(-1, VornQazGetTimeZone(nullptr, 9));

  const support::TempFolder folder;
  const std::string link = folder.path("localtime");
  const std::string file = folder.path("timezone");
  const struct {
    const char* target;  // of the link; empty: there is none
    const char* text;    // of the file
    const char* expected;
  } cases[] = {{"/usr/share/zoneinfo/Europe/Berlin", "Asia/Tokyo\n", "Europe/Berlin"},
               {"../zoneinfo/x/zoneinfo/Etc/GMT+2", "", "Etc/GMT+2"},
               {"", "America/Port-au-Prince\nmore", "America/Port-au-Prince"},
               {"/etc/zone", "Asia/Tokyo", "Asia/Tokyo"},
               {"/usr/share/zoneinfo/", "Asia/Tokyo", "+05:30"},
               {"/usr/share/zoneinfo/a b", "Asia/Tokyo", "+05:30"},
               {"", "it's", "+05:30"},
               {"", "", "+05:30"}};
  for (const auto& [target, content, expected] : cases) {
    std::filesystem::remove(link);
    if (*target != '\0') {
      std::filesystem::create_symlink(target, link);
    }
    support::write_file(file, content);
    EXPECT_TRUE(support::passes_in_zone("Asia/Kolkata",
                                        [&, wanted = expected] {
                                          EXPECT_EQ(wanted,
                                                    host::time_zone_of(link.c_str(), file.c_str()));
                                        }))
        << target << content;
  }
}

TEST(SqliteMemory, KeepsEveryByteOfEveryBlock) {
  std::mt19937 random(20240229);
  std::vector<Block> blocks(500);
  for (int step = 0; step < 20'000; ++step) {
    // Up to 128 KiB, more often small than large.
    const int size = 1 + static_cast<int>(random() % (2U << (random() % 17)));
    const auto fill = static_cast<unsigned char>(random());
    Block& block = blocks[random() % blocks.size()];
    ASSERT_TRUE(block.intact()) << "of " << block.size << " bytes";
    void* changed = nullptr;
    if (block.bytes != nullptr && random() % 2 == 0) {
      changed = memory.xRealloc(block.bytes, memory.xRoundup(size));
      block = {static_cast<unsigned char*>(changed), std::min(size, block.size), block.fill};
      ASSERT_TRUE(block.intact()) << "moved to " << size << " bytes";
    } else {
      memory.xFree(block.bytes);
      changed = memory.xMalloc(random() % 2 == 0 ? memory.xRoundup(size) : size);
    }
    ASSERT_EQ(0U, reinterpret_cast<std::uintptr_t>(changed) % 8);
    const int given = memory.xSize(changed);  // SQLite uses all of it
    ASSERT_GE(given, size);
    std::memset(changed, fill, static_cast<std::size_t>(given));
    block = {static_cast<unsigned char*>(changed), given, fill};
  }
  for (const Block& block : blocks) {
    EXPECT_TRUE(block.intact());
    memory.xFree(block.bytes);
  }
}

// Blocks are freed by other threads than took them, and outlive the thread they are from; whatever
// a thread leaves free, the next one takes.
TEST(SqliteMemory, OutlivesItsThreads) {
  constexpr int kSize = 3000;  // larger ones are the system's
  std::set<void*> seen;
  std::array<Block, 100> blocks{};
  for (int round = 0; round < 50; ++round) {
    std::thread([&] {
      for (Block& block : blocks) {
        memory.xFree(block.bytes);
        block = {static_cast<unsigned char*>(memory.xMalloc(kSize)), kSize,
                 static_cast<unsigned char>(round)};
        std::memset(block.bytes, block.fill, kSize);
        seen.insert(block.bytes);
      }
    }).join();
    EXPECT_TRUE(
        std::all_of(blocks.begin(), blocks.end(), [](auto& block) { return block.intact(); }));
  }
  EXPECT_EQ(std::size(blocks), seen.size());
  std::array<std::thread, 4> threads;  // which all take and free at once
  for (std::size_t i = 0; i < threads.size(); ++i) {
    threads[i] = std::thread([&, i] {
      for (int step = 0; step < 20'000; ++step) {
        Block& block = blocks[i + 4 * (static_cast<std::size_t>(step) % 25)];
        EXPECT_TRUE(block.intact());
        memory.xFree(block.bytes);
        block.bytes = static_cast<unsigned char*>(memory.xMalloc(kSize));
        std::memset(block.bytes, block.fill = static_cast<unsigned char>(i), kSize);
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  for (const Block& block : blocks) {
    EXPECT_TRUE(block.intact());
    memory.xFree(block.bytes);
  }
}
