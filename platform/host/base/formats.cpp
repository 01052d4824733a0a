#include "base/formats.hpp"

#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "base/host_log.hpp"
#include "base/text_containers.hpp"
#include "base/text_digest.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/utf8.hpp"
#include "vorn/report.h"

namespace host {
namespace {

// Line ends of JavaScript, and what turns the direction of the text around it, so that a file name
// could show as another one.
constexpr bool is_escaped_in_js(char32_t code) {
  return is_control(code) || code == U'<' || code == 0x2028 || code == 0x2029 || code == 0x061C ||
         code == 0x200E || code == 0x200F || (code >= 0x202A && code <= 0x202E) ||
         (code >= 0x2066 && code <= 0x2069);
}

void append_unicode_escape(std::string& out, unsigned code) {
  char escape[8];
  const int length = std::snprintf(escape, sizeof escape, "\\u%04x", code & 0xFFFFU);
  out.append(escape, static_cast<std::size_t>(length));
}

constexpr bool is_letter_or_digit(char32_t code) {
  return (code >= '0' && code <= '9') || (code >= 'A' && code <= 'Z') ||
         (code >= 'a' && code <= 'z');
}

void append_js(std::string& out, char32_t code, std::string_view bytes, char32_t quote) {
  if (code == '\\' || (code == quote && !is_letter_or_digit(code) && !is_escaped_in_js(code))) {
    out += '\\';
    out += bytes;
  } else if (code == '\n') {
    out += "\\n";
  } else if (code == '\r') {
    out += "\\r";
  } else if (code == '\t') {
    out += "\\t";
  } else if (code == quote || is_escaped_in_js(code)) {
    append_unicode_escape(out, code);
  } else {
    out += bytes;
  }
}

constexpr bool is_blank(char c) {
  return c == ' ' || (c >= '\t' && c <= '\r');
}

// Whether a spreadsheet would take the text for a formula. A plain number may have a sign.
bool is_formula(std::string_view text) {
  const auto first = std::find_if_not(text.begin(), text.end(), is_blank);
  text.remove_prefix(static_cast<std::size_t>(first - text.begin()));
  // The full-width forms count as well in East Asian editions.
  for (const std::string_view start : {"=", "@", "＝", "＠", "＋", "－"}) {
    if (text.starts_with(start)) {
      return true;
    }
  }
  if (!text.starts_with('+') && !text.starts_with('-')) {
    return false;
  }
  text.remove_prefix(1);
  return text.empty() || text.find_first_not_of("0123456789.") != std::string_view::npos;
}

using WriteText = std::string (*)(std::string_view text, char quote);

// The beginning of `text`, a mark that there is more, and a digest of it all, so that two long
// texts that begin alike stay two. Cut between characters, so that `write` makes at most `most`
// bytes of it unless mark and digest alone are longer.
std::string shortened(std::string_view text, std::size_t most, WriteText write, char quote) {
  const std::string tail = "…" + text_digest(text);
  const std::size_t taken = write(tail, quote).size();
  std::size_t room = most - std::min(taken, most);
  std::size_t kept = 0;
  while (kept < text.size()) {
    const std::size_t length = std::max<std::size_t>(utf8_at(text.substr(kept)).length, 1);
    const std::size_t written = write(text.substr(kept, length), quote).size();
    if (written > room) {
      break;
    }
    room -= written;
    kept += length;
  }
  return std::string(text.substr(0, kept)) + tail;
}

// Copies `text` out as the C API promises: all of it, or an empty text and -1.
int copy_out(std::string_view text, char* out, size_t size) {
  if (text.size() >= size) {
    *out = '\0';
    errno = ENOBUFS;
    return -1;
  }
  std::memcpy(out, text.data(), text.size());
  out[text.size()] = '\0';
  return static_cast<int>(text.size());
}

// What `write` makes of `text`, or of its beginning where all of it is too long.
int write_out(std::string_view text, char* out, size_t size, WriteText write, char quote) {
  std::string written = write(text, quote);
  if (written.size() >= size) {
    written = write(shortened(text, size - 1, write, quote), quote);
  }
  return copy_out(written, out, size);
}

int bad_argument(char* out, size_t size) {
  if (out != nullptr && size > 0) {
    *out = '\0';
  }
  errno = EINVAL;
  return -1;
}

bool copy_file(int from, int to) {
  for (;;) {
    constexpr std::size_t kStep = std::size_t{1} << 30;
    const ssize_t copied = sendfile(to, from, nullptr, kStep);
    if (copied <= 0) {
      return copied == 0;
    }
  }
}

// The script block of VornQazImportSharePathHash. Its keys are computed ones, so that a share
// named __proto__ is an entry like any other.
std::string share_path_block(const VLIBCSzHash& share_paths) {
  std::string block = "<script type='text/javascript'>\nvar vornSharePath = {\n";
  const char* separator = "";
  for (const auto& [share, path] : share_paths.sorted()) {
    block += separator;
    block += "['" + escape_js(share, '\'') + "'] : '" + escape_js(path, '\'') + "'";
    separator = ",\n";
  }
  return block + "\n};\n</script>\n";
}

}  // namespace

std::string escape_js(std::string_view text, char quote) {
  std::string out;
  out.reserve(text.size() + 16);
  while (!text.empty()) {
    const Utf8Char found = utf8_at(text);
    if (found.length == 0) {
      append_unicode_escape(out, 0xDC00U + static_cast<unsigned char>(text.front()));
      text.remove_prefix(1);
    } else {
      append_js(out, found.code, text.substr(0, found.length), static_cast<unsigned char>(quote));
      text.remove_prefix(found.length);
    }
  }
  return out;
}

std::string csv_field(std::string_view text) {
  std::string out;
  out.reserve(text.size() + 16);
  if (is_formula(text)) {
    out += '\'';
  }
  for (const char c : text) {
    if (c == '"') {
      out += '"';
    }
    out += is_blank(c) ? ' ' : c;
  }
  return out;
}

}  // namespace host

int VornQazEscChar(const char* text, char* out, size_t size, char quote) try {
  if (text == nullptr || out == nullptr || size == 0) {
    return host::bad_argument(out, size);
  }
  return host::write_out(text, out, size, host::escape_js, quote);
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazFormatCsvString(const char* text, char* out, size_t size) try {
  if (text == nullptr || out == nullptr || size == 0) {
    return host::bad_argument(out, size);
  }
  constexpr auto kWrite = [](std::string_view part, char /*quote*/) {
    return host::csv_field(part);
  };
  return host::write_out(text, out, size, kWrite, '"');
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazTimeConvert(const char* seconds, char* out, size_t size) {
  if (seconds == nullptr || out == nullptr || size == 0) {
    return host::bad_argument(out, size);
  }
  time_t time = 0;
  const char* end = seconds + std::strlen(seconds);
  const auto [stop, error] = std::from_chars(seconds, end, time);
  const int saved_errno = errno;
  tm local{};
  constexpr int kFirstYear = 0 - 1900;
  constexpr int kLastYear = 9999 - 1900;
  if (error != std::errc{} || stop != end || localtime_r(&time, &local) == nullptr ||
      local.tm_year < kFirstYear || local.tm_year > kLastYear) {
    return host::bad_argument(out, size);
  }
  errno = saved_errno;  // reading the time zone may have failed on the way
  char text[32];
  const int length =
      std::snprintf(text, sizeof text, "%04d-%02d-%02d %02d:%02d:%02d", local.tm_year + 1900,
                    local.tm_mon + 1, local.tm_mday, local.tm_hour, local.tm_min, local.tm_sec);
  return host::copy_out({text, static_cast<std::size_t>(length)}, out, size);
}

int VornQazGetTimeSecond(char* out, size_t size) {
  if (out == nullptr || size == 0) {
    return host::bad_argument(out, size);
  }
  char text[24];
  const int length =
      std::snprintf(text, sizeof text, "%lld", static_cast<long long>(time(nullptr)));
  return host::copy_out({text, static_cast<std::size_t>(length)}, out, size);
}

int VornQazCsvFile(const char* path) try {
  constexpr std::string_view kMark = "\xEF\xBB\xBF";
  if (path == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const host::Fd original(open(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!original || fstat(original.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
    host::log_line("CSV file \"%s\" can't be finished: it is no readable file", path);
    return -1;
  }
  char start[3];
  const ssize_t got = pread(original.get(), start, sizeof start, 0);
  if (got == sizeof start && std::string_view(start, sizeof start) == kMark) {
    return 0;
  }
  host::AtomicFile marked(path);
  if (got < 0 || marked.fd() < 0 || fchmod(marked.fd(), status.st_mode & 0777U) != 0 ||
      !host::write_all(marked.fd(), kMark) || !host::copy_file(original.get(), marked.fd()) ||
      !marked.commit()) {
    const int error = errno;
    host::log_line("CSV file \"%s\" can't be finished (%s); free some space for a copy of it", path,
                   std::strerror(error));
    errno = error;
    return -1;
  }
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazImportSharePathHash(const VLIBCSzHash* share_path_hash, FILE* data) try {
  // Also after a failure: a second try would land inside the report's own block.
  static bool written = false;
  if (written) {
    return 0;
  }
  if (share_path_hash == nullptr || data == nullptr) {
    errno = EINVAL;
    return -1;
  }
  written = true;
  const std::string block = host::share_path_block(*share_path_hash);
  return std::fwrite(block.data(), 1, block.size(), data) == block.size() && std::fflush(data) == 0
             ? 0
             : -1;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
