// The status and the progress of a run.
#include "report_format/run_state.hpp"

#include "fuzz.hpp"

void fuzz::one(std::string_view text) {
  using namespace report_format;
  const std::string status = status_text(status_of(text));
  require(status_text(status_of(status)) == status, "a status that is written is read");
  if (const auto progress = progress_of(text)) {
    require(progress->number >= 0 && progress->reports >= 0, "counts are counts");
    const std::string line = progress_text(*progress);
    require(line.find('\n') == line.size() - 1, "progress is one line");
    const auto again = progress_of(line);
    require(again && progress_text(*again) == line, "progress that is written is read");
  }
}
