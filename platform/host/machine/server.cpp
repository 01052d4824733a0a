#include "machine/server.hpp"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <string_view>

#include "vorn/base/file_io.hpp"
#include "vorn/report.h"

namespace host {
namespace {

bool is_letter_or_digit(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9');
}

// The kernel takes any bytes for a host name; pages and mail headers take only these.
std::string host_name() {
  char name[256] = "";
  static_cast<void>(gethostname(name, sizeof name - 1));
  std::string text = name;
  std::erase_if(text, [](char c) { return !is_letter_or_digit(c) && c != '.' && c != '-'; });
  return text;
}

bool is_zone_name(std::string_view zone) {
  return !zone.empty() && std::all_of(zone.begin(), zone.end(), [](char c) {
    return is_letter_or_digit(c) || std::string_view("/_+-").find(c) != std::string_view::npos;
  });
}

std::string utc_offset() {
  const std::time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  char text[16];
  std::string offset(text, std::strftime(text, sizeof text, "%z", &local));
  return offset.insert(offset.size() < 2 ? 0 : offset.size() - 2, ":");
}

int copied(const std::string& text, char* out, std::size_t size) {
  if (out == nullptr || text.size() >= size) {
    errno = out == nullptr ? EINVAL : ENAMETOOLONG;
    if (out != nullptr && size > 0) {
      *out = '\0';
    }
    return -1;
  }
  std::memcpy(out, text.c_str(), text.size() + 1);
  return static_cast<int>(text.size());
}

}  // namespace

std::string time_zone_of(const char* localtime, const char* timezone) {
  constexpr std::string_view kFolder = "/zoneinfo/";
  constexpr std::size_t kLargest = 4096;
  const ErrnoKeeper keeper;
  char target[kLargest];
  const ssize_t length = readlink(localtime, target, sizeof target);
  std::string zone(target, static_cast<std::size_t>(std::max(length, ssize_t{0})));
  if (const std::size_t found = zone.rfind(kFolder); found != std::string::npos) {
    zone.erase(0, found + kFolder.size());
  } else {
    zone = read_file(timezone, kLargest).value_or("");
    zone.resize(std::min(zone.find('\n'), zone.size()));
  }
  return is_zone_name(zone) ? zone : utc_offset();
}

}  // namespace host

int VornQazGetHostName(char* out, size_t size) try {
  return host::copied(host::host_name(), out, size);
} catch (...) {
  errno = ENOMEM;
  return -1;
}

int VornQazGetTimeZone(char* out, size_t size) try {
  return host::copied(host::time_zone_of("/etc/localtime", "/etc/timezone"), out, size);
} catch (...) {
  errno = ENOMEM;
  return -1;
}
