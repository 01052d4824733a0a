#include "base/host_log.hpp"

#include <syslog.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <utility>

namespace host {
namespace {

void to_syslog(const char* line) {
  syslog(LOG_ERR, "%s", line);
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

LogSink redirect_log(LogSink sink) {
  return std::exchange(log_sink, sink);
}

}  // namespace host
