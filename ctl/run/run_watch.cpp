#include "run/run_watch.hpp"

#include <algorithm>

#include "vorn/base/words.hpp"

namespace ctl {
namespace {

constexpr std::size_t kLongestLine = 16384;
constexpr std::size_t kKeptComplaints = 5;

// Takes "(module:line)" off the text.
bool take_position(std::string_view& text) {
  const std::size_t end = text.find(')');
  if (!text.starts_with("(src/") || end == std::string_view::npos) {
    return false;
  }
  text.remove_prefix(end + 1);
  return true;
}

// What remains of an error of the program when its positions are taken off: "(reason)" and a
// message. Progress has no reason.
bool is_error(std::string_view text) {
  return text.starts_with('(') && !text.starts_with("('");
}

}  // namespace

std::string progress_line(const std::string& profile,
                          const std::optional<report_format::Progress>& progress) {
  using report_format::Phase;
  switch (progress ? progress->phase : Phase::kStarting) {
    case Phase::kStarting:
      return profile + ": starting";
    case Phase::kGathering:
      return profile + ": counting files in " + progress->share +
             (progress->files > 0 ? ", " + std::to_string(progress->files) + " files" : "");
    case Phase::kReporting:
      return profile + ": report " + std::to_string(progress->number) + " of " +
             std::to_string(progress->reports) + ", " + progress->report;
    case Phase::kAssembling:
      return profile + ": putting the page together";
    case Phase::kPublishing:
      break;
  }
  return profile + ": sending";
}

void RunOutput::take(std::string_view bytes) {
  while (!bytes.empty()) {
    const std::size_t end = bytes.find('\n');
    rest_ += bytes.substr(0, end);
    rest_.resize(std::min(rest_.size(), kLongestLine));
    if (end == std::string_view::npos) {
      return;
    }
    take_line(host::trimmed(rest_));
    rest_.clear();
    bytes.remove_prefix(end + 1);
  }
}

void RunOutput::take_line(std::string_view line) {
  std::string_view text = line;
  if (line.empty()) {
    return;
  }
  if (take_position(text) && !is_error(text)) {
    was_skipped_ = was_skipped_ || text == skipped_;
    return;
  }
  complaints_.emplace_back(line);
  if (complaints_.size() > kKeptComplaints) {
    complaints_.pop_front();
  }
}

}  // namespace ctl
