// MD5 digests of files.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <string>

#include "support.hpp"
#include "vorn/report.h"

namespace {

std::string md5sum(const std::string& path) {
  FILE* tool = popen(("/usr/bin/md5sum <" + path).c_str(), "r");
  char digest[33] = "";
  const std::size_t size = std::fread(digest, 1, 32, tool);
  pclose(tool);
  return {digest, size};
}

TEST(FileMd5, IsThatOfMd5sum) {
  const support::TempFolder folder;
  const std::string path = folder.path("file");
  for (const std::size_t size : {0U, 1U, 55U, 64U, 262143U, 262144U, 262145U, 524288U, 1000003U}) {
    std::string content(size, '\0');
    for (std::size_t i = 0; i < size; ++i) {
      content[i] = static_cast<char>(i * i >> 7);
    }
    support::write_file(path, content);
    std::string digest(34, '#');
    errno = EXDEV;
    EXPECT_EQ(0, VornQazGetFileMd5(path.c_str(), size, digest.data(), 32)) << size;
    EXPECT_EQ(EXDEV, errno);
    EXPECT_EQ(md5sum(path) + "##", digest) << size;
  }
}

TEST(FileMd5, TellsAChangedFileFromAFailure) {
  const support::TempFolder folder;
  support::write_file(folder.path("file"), "four");
  std::filesystem::create_symlink("file", folder.path("link"));
  mkfifo(folder.path("fifo").c_str(), 0600);
  struct Case {
    std::string path;
    unsigned long long size;
    int expected;
  };
  const Case cases[] = {
      {folder.path("file"), 4, 0},
      {folder.path("file"), 3, 2},  // it has grown
      {folder.path("file"), 5, 2},  // it has shrunk
      {folder.path("gone"), 4, 2},
      {folder.path("file/below"), 4, 2},
      {folder.path("link"), 4, 2},
      {folder.path("fifo"), 4, 2},
      {folder.path("fifo"), 0, 2},
      {folder.path(), 4, 2},
      {"/dev/log", 0, 2},
      {"/dev/null", 0, 2},
      {folder.path(std::string(300, 'n')), 4, -1},
  };
  for (const auto& [path, size, expected] : cases) {
    char digest[32];
    errno = 0;
    EXPECT_EQ(expected, VornQazGetFileMd5(path.c_str(), size, digest, sizeof digest)) << path;
    EXPECT_EQ(expected == 0, errno == 0) << path;
  }
  char digest[33];
  EXPECT_EQ(-1, VornQazGetFileMd5(nullptr, 4, digest, 32));
  EXPECT_EQ(-1, VornQazGetFileMd5(folder.path("file").c_str(), 4, nullptr, 32));
  EXPECT_EQ(-1, VornQazGetFileMd5(folder.path("file").c_str(), 4, digest, 33));
}

// A database that is written to all the while keeps its size.
TEST(FileMd5, OfAFileThatIsWrittenToMeanwhileIsNone) {
  const support::TempFolder folder;
  const std::string path = folder.path("file");
  constexpr unsigned long long kSize = 64U << 20U;
  support::write_file(path, "");
  ASSERT_EQ(0, truncate(path.c_str(), kSize));
  const pid_t writer = support::fork_child([&] {
    const int fd = open(path.c_str(), O_WRONLY | O_CLOEXEC);
    while (pwrite(fd, "x", 1, 0) == 1) {
    }
    return 1;
  });
  const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  for (char first = '\0'; first != 'x';) {
    ASSERT_EQ(1, pread(fd, &first, 1, 0));
  }
  close(fd);
  char digest[32];
  EXPECT_EQ(2, VornQazGetFileMd5(path.c_str(), kSize, digest, sizeof digest));
  kill(writer, SIGKILL);
  EXPECT_EQ(-SIGKILL, support::wait_child(writer));
}

}  // namespace
