// What unit tests share: a fresh scripted platform, both channels of the log, temporary folders.
#pragma once

#include <gtest/gtest.h>

#include <cerrno>
#include <string>

#include "scripted_platform.hpp"
#include "support.hpp"
#include "vorn/text.h"

class UnitTest : public testing::Test {
 protected:
  UnitTest() {
    platform = ScriptedPlatform();
    support::syslog_text();  // drops what an earlier test left
    errno = 0;
  }

  // Runs `work` and returns what it printed, children's output included.
  template <typename Work>
  static std::string printed(Work&& work) {
    testing::internal::CaptureStdout();
    work();
    std::fflush(stdout);
    return testing::internal::GetCapturedStdout();
  }

  // Runs `work` in a child, for what the program keeps as long as the process, and returns the text
  // that it gives.
  template <typename Work>
  std::string in_child(Work&& work) {
    const std::string file = folder_.path("child-result");
    const pid_t child = support::fork_child([&] {
      support::write_file(file, work());
      return 0;
    });
    EXPECT_EQ(support::wait_child(child), 0);
    return support::read_file(file);
  }

  // `text` without what %m gave, so that an expectation needn't know an errno left from before.
  static std::string without_errno(std::string text) {
    for (size_t open = text.find('('); open != std::string::npos;) {
      const size_t close = text.find(')', open);
      const std::string inside = text.substr(open, close - open);
      if (close != std::string::npos && inside.rfind("(src/", 0) != 0 &&
          inside.rfind("(0x", 0) != 0) {
        text.erase(open, close - open + 1);
        open = text.find('(', open);
      } else {
        open = text.find('(', open + 1);
      }
    }
    return text;
  }

  support::TempFolder folder_;
};
