// MD5 digests of files.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>

#include "support.hpp"
#include "vorn/report.h"

TEST(FileMd5, IsThatOfMd5sumAcrossBuffers) {
  const support::TempFolder folder;
  const std::string path = folder.path("file");
  for (const std::size_t size : {0U, 1U, 262143U, 262144U, 262145U, 1000003U}) {
    std::string content(size, '\0');
    for (std::size_t i = 0; i < size; ++i) {
      content[i] = static_cast<char>(i * i >> 7);
    }
    support::write_file(path, content);
    FILE* tool = popen(("/usr/bin/md5sum <" + path).c_str(), "r");
    std::string expected(32, '\0');
    EXPECT_EQ(32U, std::fread(expected.data(), 1, 32, tool));
    pclose(tool);
    std::string digest(34, '#');
    EXPECT_EQ(0, VornQazGetFileMd5(path.c_str(), size, digest.data(), 32)) << size;
    EXPECT_EQ(expected + "##", digest) << size;
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
