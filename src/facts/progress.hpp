// How far the run has come, in a small file that anyone may read (report_format/run_state.hpp).
// It is written at most ten times a second, and a step that can't be written is left out.
#pragma once

#include <cstdint>

#include "report_format/run_state.hpp"

namespace vornreport {

// `reports` is the number that the run makes.
void progress_begin(const char* profile, int reports);
void progress_share(const char* share);
void progress_report(const char* report);
void progress_phase(report_format::Phase phase);
// Removes the file.
void progress_end();

// `files` were counted; cheap enough for every file.
void progress_count(uint64_t files);
inline void progress_file(uint64_t files) {
  constexpr uint64_t kEvery = 64;
  if (files % kEvery == 0) {
    progress_count(files);
  }
}

}  // namespace vornreport
