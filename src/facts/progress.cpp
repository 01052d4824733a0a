#include "facts/progress.hpp"

#include <array>
#include <chrono>
#include <string>

#include "vorn/report.h"

namespace vornreport {
namespace {

using Clock = std::chrono::steady_clock;

struct Running {
  std::string profile;  // empty: nothing is told
  report_format::Progress progress;
  std::array<Clock::time_point, 10> written{};  // when the last ten times were
  size_t next = 0;
};
Running g_running;

void write_progress() {
  constexpr std::chrono::seconds kSpan{1};
  const Clock::time_point now = Clock::now();
  Clock::time_point& tenth = g_running.written[g_running.next];
  if (g_running.profile.empty() || (tenth != Clock::time_point() && now - tenth < kSpan)) {
    return;
  }
  tenth = now;
  g_running.next = (g_running.next + 1) % g_running.written.size();
  VornQazProgressUpdate(g_running.profile.c_str(),
                        report_format::progress_text(g_running.progress).c_str());
}

}  // namespace

void progress_begin(const char* profile, int reports) {
  g_running = Running();
  g_running.profile = profile;
  g_running.progress.reports = reports;
  write_progress();
}

void progress_share(const char* share) {
  g_running.progress.phase = report_format::Phase::kGathering;
  g_running.progress.share = share;
  write_progress();
}

void progress_report(const char* report) {
  g_running.progress.phase = report_format::Phase::kReporting;
  g_running.progress.report = report;
  ++g_running.progress.number;
  write_progress();
}

void progress_phase(report_format::Phase phase) {
  g_running.progress.phase = phase;
  write_progress();
}

// Counts leave room for steps: a share or report that went untold would be the one that is shown
// for as long as it takes.
void progress_count(uint64_t files) {
  constexpr std::chrono::milliseconds kPause{250};
  const size_t count = g_running.written.size();
  const Clock::time_point last = g_running.written[(g_running.next + count - 1) % count];
  g_running.progress.files = files;
  if (Clock::now() - last >= kPause) {
    write_progress();
  }
}

void progress_end() {
  if (!g_running.profile.empty()) {
    VornQazProgressEnd(g_running.profile.c_str());
  }
  g_running = Running();
}

}  // namespace vornreport
