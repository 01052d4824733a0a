// Threads that read files for the comparison of contents.
#include "rep_duplicate_file/readers.hpp"

#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <thread>
#include <vector>

#include "scripted_platform.hpp"

namespace vornreport {
namespace {

// Files that take longer than the trials of more threads and fewer, so that some stop within one.
TEST(ReadersTest, DoEachFileOnce) {
  struct Case {
    size_t files;
    int parts;  // of a file, a millisecond each
  };
  Readers readers;
  for (const Case& c : {Case{0, 0}, {1, 5}, {3, 400}, {20, 40}, {5000, 0}}) {
    std::vector<std::atomic<int>> calls(c.files);
    errno = EDOM;
    readers.for_each(Readers::Kind::kDigests, c.files, [&](size_t i) {
      for (int part = 0; part < c.parts; ++part) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        platform.step(1);
      }
      ++calls[i];
      errno = EIO;
    });
    EXPECT_EQ(errno, EDOM);
    for (const std::atomic<int>& count : calls) {
      EXPECT_EQ(count, 1);
    }
  }
}

}  // namespace
}  // namespace vornreport
