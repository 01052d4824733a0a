#include "vornreport/error_log.hpp"

#include <syslog.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "vorn/text.h"

namespace vornreport {
namespace {

[[gnu::format(printf, 1, 0)]] std::string format_text(const char* format, va_list args) {
  char* text = nullptr;
  const int length = vasprintf(&text, format, args);
  if (length < 0) {
    return format;
  }
  std::string result(text, static_cast<size_t>(length));
  std::free(text);  // NOLINT(cppcoreguidelines-no-malloc): vasprintf's
  return result;
}

// The one place that builds the two channels. syslog() and printf() may change errno, and the
// second channel must show what the first one did.
void write_channels(const char* module, int line, const std::string& message) {
  const int error = errno;
  if (error != 0) {
    syslog(LOG_ERR, "%s:%d (%m)%s", module, line, message.c_str());
    errno = error;
    std::printf("(%s:%d)(%m)%s", module, line, message.c_str());
  } else {
    syslog(LOG_ERR, "%s:%d %s", module, line, message.c_str());
    std::printf("(%s:%d)%s", module, line, message.c_str());
  }
  errno = error;
}

}  // namespace

void REPORT_LOG_ERR(const char* module, int line, const char* format, ...) {
  const int error = errno;
  va_list args;
  va_start(args, format);
  const std::string message = format_text(format, args);
  va_end(args);
  errno = error;
  write_channels(module, line, message);
}

void REPORT_LOG_ERR_NESTED(const char* module, int line, const char* format, ...) {
  const int error = errno;
  char position[512];
  // An errno of zero still prints: the inner part always shows what %m gives.
  std::snprintf(position, sizeof position, "(%s:%d)(%m)", module, line);
  va_list args;
  va_start(args, format);
  errno = error;
  const std::string message = position + format_text(format, args) + "\n\n";
  va_end(args);
  errno = error;
  write_channels(module, line, message);
}

void report_trace(const char* module, int line, const char* format, ...) {
  std::printf("(%s:%d)", module, line);
  va_list args;
  va_start(args, format);
  // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): it is, one line above
  std::vprintf(format, args);
  va_end(args);
}

void report_invalid_argument(const char* module, int line, const char* condition) {
  syslog(LOG_ERR, "%s:%d Invaild Argument (%s)=[%d]\n", module, line, condition, 0);
  VLIBCErrSetEx(VLIBC_ERR_BAD_PARAMETER, module, line);
}

}  // namespace vornreport
