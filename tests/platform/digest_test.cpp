// MD5 digests of files.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <map>
#include <thread>
#include <vector>

#include "support.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace {

constexpr std::size_t kMiB = std::size_t{1} << 20U;

// The digest, or the result that came instead.
std::string digest_of(const std::string& path) {
  std::string digest(34, '#');
  const int result =
      VornQazGetFileMd5(path.c_str(), std::filesystem::file_size(path), digest.data(), 32);
  return result == 0 ? digest : std::to_string(result);
}

// A file of `size` bytes: `content`, and holes.
std::string sparse(const support::TempFolder& folder, const std::string& name, std::uintmax_t size,
                   const std::map<off_t, std::string>& content) {
  const std::string path = folder.path(name);
  const host::Fd file(open(path.c_str(), O_CREAT | O_WRONLY, 0600));
  for (const auto& [offset, bytes] : content) {
    EXPECT_EQ(bytes.size(), pwrite(file.get(), bytes.data(), bytes.size(), offset));
  }
  EXPECT_EQ(0, ftruncate(file.get(), static_cast<off_t>(size)));
  return path;
}

}  // namespace

// Zeros below an aligned MiB are content as any other. A handle names its file as a path does, even
// where that has gone.
TEST(FileMd5, IsThatOfMd5sumAcrossBuffers) {
  const support::TempFolder folder;
  const std::string path = folder.path("file");
  for (const std::size_t size :
       {std::size_t{0}, std::size_t{1}, kMiB - 1, kMiB, kMiB + 1, 3 * kMiB + 5}) {
    std::string content(size, '\0');
    for (std::size_t i = size > 2 * kMiB ? kMiB + 1 : 0; i < size; ++i) {
      content[i] = static_cast<char>(i * i >> 7);
    }
    if (size > 2 * kMiB) {
      content[0] = 'x';
    }
    support::write_file(path, content);
    FILE* tool = popen(("/usr/bin/md5sum <" + path).c_str(), "r");
    std::string expected(32, '\0');
    EXPECT_EQ(32U, std::fread(expected.data(), 1, 32, tool));
    pclose(tool);
    EXPECT_EQ(expected + "##", digest_of(path)) << size;
    const host::Fd handle(open(path.c_str(), O_PATH));
    unlink(path.c_str());
    const std::string held = "/proc/self/fd/" + std::to_string(handle.get());
    EXPECT_EQ(expected + "##", digest_of(held)) << size;
    EXPECT_EQ("2", digest_of("/proc/self/fd/../fd/" + std::to_string(handle.get())));
  }
}

// Two empty files of 8 TiB would take hours to read.
TEST(FileMd5, TellsContentsApartWhateverTheirHoles) {
  const support::TempFolder folder;
  constexpr std::uintmax_t kHuge = std::uintmax_t{8} << 40U;
  constexpr off_t kMiddle = off_t{4} << 40U;
  const std::string one(1, 'x');
  const std::string zeros(3 * kMiB, '\0');
  const std::vector<std::vector<std::string>> groups = {
      {sparse(folder, "hole", kHuge, {}), sparse(folder, "zeros", kHuge, {{kMiddle + 7, zeros}})},
      {sparse(folder, "x", kHuge, {{kMiddle, one}}),
       sparse(folder, "x, zeros", kHuge, {{0, zeros}, {kMiddle, one + zeros}})},
      {sparse(folder, "y", kHuge, {{kMiddle, "y"}})},
      {sparse(folder, "next byte", kHuge, {{kMiddle + 1, one}})},
      {sparse(folder, "other block", kHuge, {{kMiddle + static_cast<off_t>(kMiB), one}})},
      {sparse(folder, "twice", kHuge, {{kMiddle, one}, {2 * kMiddle - 1, one}})}};
  std::map<std::string, std::size_t> seen;
  for (std::size_t i = 0; i < groups.size(); ++i) {
    for (const std::string& path : groups[i]) {
      EXPECT_EQ(i, seen.emplace(digest_of(path), i).first->second) << path;
    }
  }
  EXPECT_EQ(groups.size(), seen.size());
}

// Each thread has a file of its own, with zeros to leave out, and is told of its own bytes.
TEST(FileMd5, IsForSeveralThreadsAtOnce) {
  const support::TempFolder folder;
  static thread_local unsigned long long t_bytes;
  VornQazSetDigestStep([](unsigned long long bytes) { t_bytes += bytes; });
  std::vector<std::string> expected;
  for (int i = 0; i < 4; ++i) {
    const std::string path = folder.path(std::to_string(i));
    support::write_file(path,
                        std::string(kMiB, static_cast<char>(i)) + std::string(kMiB, '\0') + "x");
    expected.push_back(digest_of(path));
  }
  std::vector<std::jthread> threads;
  for (std::size_t i = 0; i < expected.size(); ++i) {
    threads.emplace_back([&, i] {
      for (int round = 0; round < 50; ++round) {
        t_bytes = 0;
        EXPECT_EQ(expected[i], digest_of(folder.path(std::to_string(i))));
        EXPECT_EQ(2 * kMiB + 1, t_bytes);
      }
    });
  }
  threads.clear();
  VornQazSetDigestStep(nullptr);
}

TEST(FileMd5, EndsAtItsDeadline) {
  const support::TempFolder folder;
  support::write_file(folder.path("file"), "four");
  VornQazSetDigestDeadline(1);
  while (VornQazDigestDeadlinePassed() == 0) {
    usleep(10000);
  }
  EXPECT_EQ("2", digest_of(folder.path("file")));
  for (const unsigned long long seconds : {~0ULL, 0ULL}) {
    VornQazSetDigestDeadline(seconds);
    EXPECT_NE("2", digest_of(folder.path("file"))) << seconds;
  }
}

TEST(FileMd5, TellsAChangedFileFromAFailure) {
  const support::TempFolder folder;
  support::write_file(folder.path("file"), "four");
  std::filesystem::create_symlink("file", folder.path("link"));
  ASSERT_EQ(0, mkfifo(folder.path("fifo").c_str(), 0600));
  const std::tuple<std::string, unsigned long long, int> cases[] = {
      {"file", 3, 2},  // it has grown
      {"file", 5, 2},  // it has shrunk
      {"gone", 4, 2}, {"link", 4, 2}, {"fifo", 0, 2}, {std::string(300, 'n'), 4, -1}};
  for (const auto& [name, size, expected] : cases) {
    char digest[32];
    const std::string path = folder.path(name);
    EXPECT_EQ(expected, VornQazGetFileMd5(path.c_str(), size, digest, sizeof digest)) << name;
  }
}

// Of many files of one size that may not be read each pair would be a line of the log.
TEST(FileMd5, WhatMayNotBeReadIsAnExpectedOutcome) {
  const support::TempFolder folder;
  const std::string path = folder.path("file");
  support::write_file(path, "four");
  ASSERT_EQ(0, chmod(path.c_str(), 0));
  const pid_t child = support::fork_child([&] {
    constexpr uid_t kNobody = 65534;
    if (geteuid() == 0 && (chmod(folder.path().c_str(), 0755) != 0 || setuid(kNobody) != 0)) {
      return -1;
    }
    char digest[32];
    return VornQazGetFileMd5(path.c_str(), 4, digest, sizeof digest);
  });
  EXPECT_EQ(2, support::wait_child(child));
}
