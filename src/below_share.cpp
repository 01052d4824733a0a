#include "below_share.hpp"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>

#include <algorithm>
#include <cerrno>
#include <string>
#include <string_view>

namespace vornreport {
namespace {

constexpr int kHandle = O_PATH | O_NOFOLLOW | O_CLOEXEC;

// The folder of the share that was asked for last: files come share by share.
class TopFolder {
 public:
  // A descriptor that stays this object's, or -1.
  int get(const char* folder) {
    if (!opened_ || path_ != folder) {
      path_ = folder;
      opened_ = Descriptor(open(folder, O_PATH | O_DIRECTORY | O_CLOEXEC));
    }
    return opened_.get();
  }

 private:
  std::string path_;
  Descriptor opened_;
};

// Takes the first name off `path`, and the slashes around it; empty at the end.
std::string_view take_name(std::string_view& path) {
  path.remove_prefix(std::min(path.find_first_not_of('/'), path.size()));
  const std::string_view name = path.substr(0, path.find('/'));
  path.remove_prefix(name.size());
  path.remove_prefix(std::min(path.find_first_not_of('/'), path.size()));
  return name;
}

// The part of `path` below `folder`, or null. One that climbs is none, even if it came back down:
// nobody gathers such a path.
const char* part_below(const char* folder, const char* path) {
  const std::string_view whole(path);
  std::string_view top(folder);
  while (top.ends_with('/')) {
    top.remove_suffix(1);
  }
  if (!whole.starts_with(top) || !whole.substr(top.size()).starts_with('/')) {
    return nullptr;
  }
  const size_t start = std::min(whole.find_first_not_of('/', top.size()), whole.size());
  std::string_view rest = whole.substr(start);
  if (rest.empty()) {
    return nullptr;
  }
  while (!rest.empty()) {
    if (take_name(rest) == "..") {
      return nullptr;
    }
  }
  return path + start;
}

// What openat2 does, folder by folder, where a container or an old kernel doesn't know it.
Descriptor walk_below(int top, std::string_view below) {
  Descriptor folder;
  while (!below.empty()) {
    const std::string name(take_name(below));
    const int flags = below.empty() ? kHandle : kHandle | O_DIRECTORY;
    Descriptor next(openat(folder ? folder.get() : top, name.c_str(), flags));
    if (!next) {
      return next;
    }
    folder = std::move(next);
  }
  return folder;
}

Descriptor open_below(int top, const char* below) {
  open_how how{};
  how.flags = kHandle;
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS;
  const int before = errno;
  Descriptor opened(static_cast<int>(syscall(SYS_openat2, top, below, &how, sizeof how)));
  if (!opened && (errno == ENOSYS || errno == EPERM)) {
    errno = before;
    return walk_below(top, below);
  }
  return opened;
}

}  // namespace

Descriptor open_below_share(const char* share_folder, const char* path) {
  thread_local TopFolder top;
  const char* below = share_folder != nullptr ? part_below(share_folder, path) : nullptr;
  if (below == nullptr) {
    errno = share_folder == nullptr ? ENOENT : EXDEV;
    return {};
  }
  const int folder = top.get(share_folder);
  return folder < 0 ? Descriptor() : open_below(folder, below);
}

bool stat_below_share(const char* share_folder, const char* path, struct stat& status) {
  const int before = errno;
  const Descriptor file = open_below_share(share_folder, path);
  const bool found = file && fstat(file.get(), &status) == 0;
  errno = before;
  return found;
}

}  // namespace vornreport
