// How far a run has come, from what it prints and from its statistics database.
#ifndef VORN_CTL_RUN_WATCH_HPP
#define VORN_CTL_RUN_WATCH_HPP

#include <cstdint>
#include <deque>
#include <string>
#include <string_view>

namespace ctl {

class RunWatch {
 public:
  // `reports` is the number of reports that the run will make.
  RunWatch(std::string profile, int reports) : profile_(std::move(profile)), reports_(reports) {}

  // What the run has printed, in pieces of any size.
  void take_output(std::string_view bytes);

  // One line for a terminal, for instance "weekly: report 3 of 9, large_file".
  std::string progress() const;

  // Looks how many files the run has counted so far. Takes no lock that the run could meet.
  void count_files();

  // The run has said that another one is going on, and ended.
  bool was_skipped() const { return was_skipped_; }
  // The last lines that are no progress: what commands and failing steps have said.
  const std::deque<std::string>& complaints() const { return complaints_; }

 private:
  enum class Phase { starting, gathering, reporting, assembling, publishing };

  void take_line(std::string_view line);
  void take_progress(std::string_view text);

  std::string profile_;
  int reports_;
  Phase phase_ = Phase::starting;
  std::string share_;
  std::string report_;
  int report_number_ = 0;
  std::int64_t files_ = 0;
  bool was_skipped_ = false;
  std::string rest_;  // the beginning of a line that isn't whole yet
  std::deque<std::string> complaints_;
};

}  // namespace ctl

#endif
