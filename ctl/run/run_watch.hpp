// A run in the foreground: how far it has come, and what it has to say.
#ifndef VORN_CTL_RUN_WATCH_HPP
#define VORN_CTL_RUN_WATCH_HPP

#include <deque>
#include <optional>
#include <string>
#include <string_view>

#include "report_format/run_state.hpp"

namespace ctl {

// One line for a terminal, for instance "weekly: report 3 of 9, large_file". No `progress`: the run
// tells none yet.
std::string progress_line(const std::string& profile,
                          const std::optional<report_format::Progress>& progress);

// What a run prints.
class RunOutput {
 public:
  explicit RunOutput(const std::string& profile)
      : skipped_("profile=" + profile + " is running, skip running again") {}

  // The next piece, of any size.
  void take(std::string_view bytes);

  // The run has said that another one is going on, and ended.
  bool was_skipped() const { return was_skipped_; }
  // The last lines that are no progress: what commands and failing steps have said.
  const std::deque<std::string>& complaints() const { return complaints_; }

 private:
  void take_line(std::string_view line);

  std::string skipped_;
  bool was_skipped_ = false;
  std::string rest_;  // the beginning of a line that isn't whole yet
  std::deque<std::string> complaints_;
};

}  // namespace ctl

#endif
