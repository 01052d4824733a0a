#include "run/run_watch.hpp"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <vector>

#include "vorn/admin/runs.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"

namespace ctl {
namespace {

constexpr std::size_t kLongestLine = 16384;
constexpr std::size_t kKeptComplaints = 5;

using Page = std::vector<unsigned char>;

// The number in SQLite's form of variable length at `at`, which moves behind it.
std::uint64_t take_varint(const Page& page, std::size_t& at) {
  constexpr int kLongest = 9;
  std::uint64_t value = 0;
  for (int i = 0; i < kLongest && at < page.size(); ++i) {
    const unsigned char byte = page[at++];
    value = i + 1 == kLongest ? value << 8U | byte : value << 7U | (byte & 0x7FU);
    if ((byte & 0x80U) == 0) {
      break;
    }
  }
  return value;
}

// The number of the last row on a leaf page of a table; 0 for any other page.
std::int64_t last_row(const Page& page) {
  constexpr unsigned char kTableLeaf = 13;
  constexpr std::size_t kHeader = 8;
  const std::size_t cells = std::size_t{page[3]} << 8U | page[4];
  const std::size_t pointer = kHeader + 2 * cells;
  if (page[0] != kTableLeaf || cells == 0 || pointer > page.size()) {
    return 0;
  }
  std::size_t at = std::size_t{page[pointer - 2]} << 8U | page[pointer - 1];
  take_varint(page, at);  // the row's size
  return static_cast<std::int64_t>(take_varint(page, at));
}

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
             std::to_string(reports_) + ", " + report_;
    case Phase::assembling:
      return profile_ + ": putting the page together";
    case Phase::publishing:
      break;
  }
  return profile_ + ": sending";
}

// The rows of a share are one transaction, which no reader sees before its end, and a reader's lock
// would make its commit wait. But rows are numbered, only ever added, and written out as the cache
// fills: the number of the last row on the last pages of the file tells how many there are.
void RunWatch::count_files() {
  constexpr off_t kPagesLookedAt = 16;
  constexpr std::size_t kPageSizeAt = 16;
  unsigned char head[kPageSizeAt + 2];
  const host::Fd file(open(admin::statistics_file(profile_).c_str(),
                           O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (phase_ != Phase::gathering || !file || fstat(file.get(), &status) != 0 ||
      pread(file.get(), head, sizeof head, 0) != static_cast<ssize_t>(sizeof head)) {
    return;
  }
  const std::size_t size = std::size_t{head[kPageSizeAt]} << 8U | head[kPageSizeAt + 1];
  Page page(std::max<std::size_t>(size, 512));
  const off_t pages = status.st_size / static_cast<off_t>(page.size());
  for (off_t i = pages; i > 1 && i > pages - kPagesLookedAt; --i) {
    if (pread(file.get(), page.data(), page.size(), (i - 1) * static_cast<off_t>(page.size())) ==
        static_cast<ssize_t>(page.size())) {
      files_ = std::max(files_, last_row(page));
    }
  }
}

}  // namespace ctl
