#include "base/host_log.hpp"

#include <syslog.h>

#include <cctype>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <deque>
#include <exception>
#include <string_view>
#include <utility>

#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace host {
namespace {

constexpr std::size_t kMostLines = 20;  // at the beginning, and as many at the end

struct Said {
  std::vector<std::string> first;
  std::deque<std::string> last;
  std::size_t between = 0;
};

Said& said() {
  static Said lines;
  return lines;
}

// Without memory a line is in the log all the same.
void note(std::string_view line) try {
  while (!line.empty() && std::isspace(static_cast<unsigned char>(line.back())) != 0) {
    line.remove_suffix(1);
  }
  Said& lines = said();
  if (lines.first.size() < kMostLines) {
    lines.first.emplace_back(line);
    return;
  }
  lines.last.emplace_back(line);
  if (lines.last.size() > kMostLines) {
    lines.last.pop_front();
    ++lines.between;
  }
} catch (const std::exception&) {
}

void to_syslog(const char* line) {
  syslog(LOG_ERR, "%s", line);
  note(line);
}

LogSink log_sink = to_syslog;

}  // namespace

void log_line(const char* format, ...) {
  const int saved_errno = errno;
  char line[4096];
  va_list args;
  va_start(args, format);
  // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): it is, one line above
  vsnprintf(line, sizeof line, format, args);
  va_end(args);
  for (char* c = line; *c != '\0'; ++c) {
    if (static_cast<unsigned char>(*c) < ' ' || *c == '\x7f') {
      *c = '?';
    }
  }
  log_sink(line);
  errno = saved_errno;
}

std::vector<std::string> lines_said() {
  std::vector<std::string> lines = said().first;
  if (said().between > 0) {
    lines.push_back("... (" + std::to_string(said().between) + " lines)");
  }
  lines.insert(lines.end(), said().last.begin(), said().last.end());
  return lines;
}

LogSink redirect_log(LogSink sink) {
  return std::exchange(log_sink, sink);
}

}  // namespace host

void VornQazNoteLogLine(const char* line) {
  if (line != nullptr) {
    const host::ErrnoKeeper keeper;
    host::note(line);
  }
}
