#include "run_watch.hpp"

#include <sqlite3.h>

#include <algorithm>
#include <memory>

#include "run_paths.hpp"
#include "words.hpp"

namespace ctl {
namespace {

constexpr std::size_t kLongestLine = 16384;
constexpr std::size_t kKeptComplaints = 5;

struct CloseDb {
  void operator()(sqlite3* db) const { sqlite3_close(db); }
};
struct Finalize {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};

// Takes `prefix` off the text, if it stands there.
bool take(std::string_view& text, std::string_view prefix) {
  if (!text.starts_with(prefix)) {
    return false;
  }
  text.remove_prefix(prefix.size());
  return true;
}

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

void RunWatch::take_output(std::string_view bytes) {
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

void RunWatch::take_line(std::string_view line) {
  std::string_view text = line;
  if (line.empty()) {
    return;
  }
  if (take_position(text) && !is_error(text)) {
    take_progress(text);
    return;
  }
  complaints_.emplace_back(line);
  if (complaints_.size() > kKeptComplaints) {
    complaints_.pop_front();
  }
}

// The texts are stable: operators read them as well.
void RunWatch::take_progress(std::string_view text) {
  if (take(text, "stat share=") || take(text, "use file index db, share=")) {
    phase_ = Phase::gathering;
    share_ = text;
  } else if (take(text, "##### inject report=")) {
    phase_ = Phase::reporting;
    report_ = text;
    ++report_number_;
  } else if (take(text, "########## report.tmp=")) {
    phase_ = Phase::assembling;
  } else if (take(text, "get link=")) {
    phase_ = Phase::publishing;
  } else if (text.ends_with(" is running, skip running again")) {
    was_skipped_ =
        was_skipped_ || text == "profile=" + profile_ + " is running, skip running again";
  }
}

std::string RunWatch::progress() const {
  const std::string files = files_ > 0 ? ", " + std::to_string(files_) + " files" : "";
  switch (phase_) {
    case Phase::starting:
      return profile_ + ": starting";
    case Phase::gathering:
      return profile_ + ": counting files in " + share_ + files;
    case Phase::reporting:
      return profile_ + ": report " + std::to_string(report_number_) + " of " +
             std::to_string(reports_) + ", " + report_ + files;
    case Phase::assembling:
      return profile_ + ": putting the page together";
    case Phase::publishing:
      break;
  }
  return profile_ + ": sending";
}

// Opened as a file that nobody changes, so that no lock is taken: one would make the run's commits
// wait. What is read may be older than what the run knows by now, or unusable while it writes; then
// the last number stays.
void RunWatch::count_files() {
  if (phase_ != Phase::gathering) {
    return;
  }
  const std::string uri = "file:" + host::statistics_path(profile_) + "?immutable=1";
  sqlite3* opened = nullptr;
  const int flags = SQLITE_OPEN_READONLY | SQLITE_OPEN_URI;
  const int result = sqlite3_open_v2(uri.c_str(), &opened, flags, nullptr);
  const std::unique_ptr<sqlite3, CloseDb> db(opened);
  sqlite3_stmt* prepared = nullptr;
  if (result != SQLITE_OK || sqlite3_prepare_v2(db.get(), "SELECT max(id) FROM file_stat", -1,
                                                &prepared, nullptr) != SQLITE_OK) {
    return;
  }
  const std::unique_ptr<sqlite3_stmt, Finalize> statement(prepared);
  if (sqlite3_step(statement.get()) == SQLITE_ROW) {
    files_ = std::max(files_, static_cast<std::int64_t>(sqlite3_column_int64(statement.get(), 0)));
  }
}

}  // namespace ctl
