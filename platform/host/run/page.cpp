#include "run/page.hpp"

#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>

#include <string_view>

#include "vorn/base/file_io.hpp"

namespace host {

bool page_is_complete(const char* path) {
  return page_is_complete_at(AT_FDCWD, path);
}

bool page_is_complete_at(int folder, const char* name) {
  constexpr std::string_view kBeginning = "<!DOCTYPE html>";
  constexpr std::string_view kLastLine = "\n</html>";
  const ErrnoKeeper keeper;
  const Fd fd = open_regular(folder, name);
  struct stat status {};
  if (!fd || fstat(fd.get(), &status) != 0) {
    return false;
  }
  char buffer[kBeginning.size()];
  if (pread(fd.get(), buffer, sizeof buffer, 0) != static_cast<ssize_t>(sizeof buffer) ||
      strncasecmp(buffer, kBeginning.data(), kBeginning.size()) != 0) {
    return false;
  }
  const ssize_t got =
      pread(fd.get(), buffer, sizeof buffer, status.st_size - static_cast<off_t>(sizeof buffer));
  if (got <= 0) {
    return false;
  }
  std::string_view tail(buffer, static_cast<std::size_t>(got));
  if (tail.back() == '\n') {
    tail.remove_suffix(1);
  }
  return tail.ends_with(kLastLine);
}

}  // namespace host
