#include "run/page_lines.hpp"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "vorn/base/words.hpp"

namespace host {
namespace {

constexpr std::size_t kMostBytes = std::size_t{64} << 20U;
constexpr std::size_t kLongestLine = std::size_t{64} << 10U;  // a path with every byte escaped fits
constexpr std::size_t kBuffer = std::size_t{64} << 10U;

// Takes the string that `rest` begins with, its quotes included. Escapes stay as they are: they
// tell texts apart as well as what they stand for.
bool take_string(std::string_view& rest, std::string& value) {
  for (std::size_t i = 1; i < rest.size(); ++i) {
    if (rest[i] == '\\') {
      ++i;
    } else if (rest[i] == '\'') {
      value = rest.substr(1, i - 1);
      rest.remove_prefix(i + 1);
      return true;
    }
  }
  return false;
}

}  // namespace

PageLines::PageLines(const char* path)
    : fd_(open(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC)), buffer_(kBuffer) {
  struct stat status {};
  if (fd_ && (fstat(fd_.get(), &status) != 0 || !S_ISREG(status.st_mode))) {
    fd_ = Fd();
  }
}

bool PageLines::next(std::string& line) {
  line.clear();
  for (;;) {
    if (at_ == end_ && !fill()) {
      return !line.empty() && !limit_is_reached();  // half a line is none
    }
    const std::string_view rest(&buffer_[at_], end_ - at_);
    const std::size_t length = std::min(rest.find('\n'), rest.size());
    line.append(rest.substr(0, std::min(length, kLongestLine - line.size())));
    at_ += length;
    if (length < rest.size()) {
      ++at_;
      return true;
    }
  }
}

bool PageLines::limit_is_reached() const {
  return read_ >= kMostBytes;
}

bool PageLines::fill() {
  ssize_t got = -1;
  while (fd_ && !limit_is_reached() &&
         (got = read(fd_.get(), buffer_.data(), buffer_.size())) < 0 && errno == EINTR) {
  }
  at_ = 0;
  end_ = static_cast<std::size_t>(std::max(got, ssize_t{0}));
  read_ += end_;
  return end_ > 0;
}

std::optional<std::vector<std::string>> row_of(std::string_view line) {
  if (!line.starts_with('[')) {
    return std::nullopt;
  }
  line.remove_prefix(1);
  std::vector<std::string> row;
  for (;;) {
    line = trimmed(line);
    std::string& value = row.emplace_back();
    if (line.starts_with('\'')) {
      if (!take_string(line, value)) {
        return std::nullopt;
      }
    } else {
      value = line.substr(0, line.find_first_of(" ,]'"));
      line.remove_prefix(value.size());
    }
    line = trimmed(line);
    if (line.starts_with(']')) {
      const bool ends = line.find_first_not_of("]}, ;") == std::string_view::npos;
      return ends ? std::optional(std::move(row)) : std::nullopt;
    }
    if (!line.starts_with(',')) {
      return std::nullopt;
    }
    line.remove_prefix(1);
  }
}

}  // namespace host
