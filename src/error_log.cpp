#include "vornreport/error_log.hpp"

#include <syslog.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "vorn/report.h"
#include "vorn/text.h"

namespace vornreport {
namespace {

// The length of the control character that `text` begins with, 0 when it begins with none. (Those
// above ASCII are two bytes in UTF-8, the first of them C2.)
size_t control_length(const char* text) {
  constexpr unsigned char kDelete = 0x7F;
  constexpr unsigned char kLead = 0xC2;
  constexpr unsigned char kFirstAbove = 0xA0;
  const auto byte = static_cast<unsigned char>(text[0]);
  if (byte == kLead) {
    const auto next = static_cast<unsigned char>(text[1]);
    return next > kDelete && next < kFirstAbove ? 2 : 0;
  }
  return byte < ' ' || byte == kDelete ? 1 : 0;
}

size_t count_controls(const char* text) {
  size_t count = 0;
  for (; *text != '\0'; ++text) {
    count += control_length(text) != 0 ? 1 : 0;
  }
  return count;
}

// `text` with its control characters as \x0a, so that no name from disk can end a line and forge
// the next, or speak to a terminal.
void append_visible(std::string& out, const char* text) {
  for (const char* c = text != nullptr ? text : "(null)"; *c != '\0'; ++c) {
    const size_t length = control_length(c);
    if (length == 0) {
      out += *c;
    }
    for (size_t i = 0; i < length; ++i) {
      char escape[8];
      std::snprintf(escape, sizeof escape, "\\x%02x", static_cast<unsigned char>(c[i]));
      out += escape;
    }
    c += length > 1 ? length - 1 : 0;
  }
}

// One conversion, as printf does it.
template <typename Value>
void append_value(std::string& out, const std::string& conversion, Value value) {
  char text[512];  // the longest number is that of %f: 309 digits, a point, and six more
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"  // a piece of a checked format
  std::snprintf(text, sizeof text, conversion.c_str(), value);
#pragma GCC diagnostic pop
  out += text;
}

// As vsnprintf, but texts of %s come out visible. Knows the conversions that messages have: s, d,
// u, X, f, the lengths ll and z, and m.
[[gnu::format(printf, 1, 0)]] std::string visible_text(const char* format, va_list args) {
  const int error = errno;
  std::string out;
  while (*format != '\0') {
    if (*format != '%') {
      out += *format++;
      continue;
    }
    const size_t length = std::strcspn(format + 1, "sduXfm%") + 2;
    const std::string conversion(format, length);
    format += length;
    const bool is_long =
        conversion.find("ll") != std::string::npos || conversion.find('z') != std::string::npos;
    // NOLINTBEGIN(clang-analyzer-valist.Uninitialized): the caller's is
    switch (conversion.back()) {
      case 's':
        append_visible(out, va_arg(args, const char*));
        break;
      case 'm':
        out += std::strerror(error);
        break;
      case 'f':
        append_value(out, conversion, va_arg(args, double));
        break;
      case '%':
        out += '%';
        break;
      default:
        if (is_long) {
          append_value(out, conversion, va_arg(args, unsigned long long));
        } else {
          append_value(out, conversion, va_arg(args, unsigned));
        }
        break;
    }
    // NOLINTEND(clang-analyzer-valist.Uninitialized)
  }
  errno = error;
  return out;
}

// The message as it is shown. Few have a name with a control character in them: those that hold no
// more than their format itself are as printf makes them.
[[gnu::format(printf, 1, 0)]] std::string format_text(const char* format, va_list args) {
  const int error = errno;
  va_list again;
  va_copy(again, args);
  char* text = nullptr;
  const int length = vasprintf(&text, format, args);
  errno = error;
  std::string result;
  if (length >= 0 && count_controls(text) == count_controls(format)) {
    result.assign(text, static_cast<size_t>(length));
  } else {
    result = visible_text(format, again);
  }
  if (length >= 0) {
    std::free(text);  // NOLINT(cppcoreguidelines-no-malloc): vasprintf's
  }
  va_end(again);
  errno = error;
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
  const std::string reason = error != 0 ? "(" + std::string(std::strerror(error)) + ")" : "";
  VornQazNoteLogLine(
      (std::string(module) + ":" + std::to_string(line) + " " + reason + message).c_str());
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
  va_list args;
  va_start(args, format);
  const std::string text = format_text(format, args);
  va_end(args);
  std::printf("(%s:%d)%s", module, line, text.c_str());
}

void report_invalid_argument(const char* module, int line, const char* condition) {
  syslog(LOG_ERR, "%s:%d Invaild Argument (%s)=[%d]\n", module, line, condition, 0);
  VLIBCErrSetEx(VLIBC_ERR_BAD_PARAMETER, module, line);
}

}  // namespace vornreport
