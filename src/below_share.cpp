#include "below_share.hpp"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <string>
#include <string_view>

namespace vornreport {
namespace {

// The folder of the share that was asked for last: files come share by share.
class TopFolder {
 public:
  // A descriptor that stays this object's, or -1.
  int get(const char* folder) {
    if (fd_ < 0 || path_ != folder) {
      if (fd_ >= 0) {
        close(fd_);
      }
      path_ = folder;
      fd_ = open(folder, O_PATH | O_DIRECTORY | O_CLOEXEC);
    }
    return fd_;
  }

 private:
  std::string path_;
  int fd_ = -1;
};

// The part of `path` below `folder`, or null.
const char* part_below(const char* folder, const char* path) {
  const std::string_view whole(path);
  std::string_view top(folder != nullptr ? folder : "");
  while (top.ends_with('/')) {
    top.remove_suffix(1);
  }
  if (folder == nullptr || !whole.starts_with(top) || !whole.substr(top.size()).starts_with('/')) {
    return nullptr;
  }
  const char* below = path + top.size();
  while (*below == '/') {
    ++below;
  }
  return *below == '\0' ? nullptr : below;
}

int open_below(int top, const char* below, uint64_t flags) {
  open_how how{};
  how.flags = flags;
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS;
  const auto opened = static_cast<int>(syscall(SYS_openat2, top, below, &how, sizeof how));
  if (opened < 0 && (errno == ENOSYS || errno == EPERM)) {
    // A container that knows no openat2: only a link in the last place is refused then.
    return openat(top, below, static_cast<int>(flags));
  }
  return opened;
}

}  // namespace

int open_below_share(const char* share_folder, const char* path, int flags) {
  static TopFolder top;
  const int all_flags = flags | O_CLOEXEC | O_NOFOLLOW;
  const char* below = part_below(share_folder, path);
  const int folder = below != nullptr ? top.get(share_folder) : -1;
  return folder < 0 ? open(path, all_flags)
                    : open_below(folder, below, static_cast<uint64_t>(all_flags));
}

bool stat_below_share(const char* share_folder, const char* path, struct stat& status) {
  const int before = errno;
  const int file = open_below_share(share_folder, path, O_PATH);
  const bool found = file >= 0 && fstat(file, &status) == 0;
  if (file >= 0) {
    close(file);
  }
  errno = before;
  return found;
}

}  // namespace vornreport
