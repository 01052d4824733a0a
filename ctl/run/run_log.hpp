// What a run has said to the system log.
#ifndef VORN_CTL_RUN_LOG_HPP
#define VORN_CTL_RUN_LOG_HPP

#include <sys/types.h>

#include <string>
#include <vector>

#include "vorn/admin/runs.hpp"

namespace ctl {

// Every line of the run in the system log, with its time. Where the log is a file, which has no
// process numbers, those of other runs at the time are among them. `is_read` tells whether there is
// a log that can be read.
struct RunLines {
  bool is_read = false;
  std::vector<std::string> lines;
};
RunLines lines_of_run(const admin::RunTrace& trace);

class RunLog {
 public:
  // Notes where the log ends now.
  RunLog();
  // The last messages of process `pid` since then; a log daemon gets a moment to write them. Empty
  // when there are none or the log can't be read.
  std::vector<std::string> messages(pid_t pid) const;

 private:
  bool is_journal_ = false;
  std::string file_;  // empty when there is none
  off_t end_ = 0;
};

}  // namespace ctl

#endif
