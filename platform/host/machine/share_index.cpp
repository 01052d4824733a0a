// File indexes of shares: whether one can be used, and what takes its place when it can.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string>
#include <unordered_set>

#include "base/host_log.hpp"
#include "base/incident.hpp"
#include "base/scratch.hpp"
#include "config/shares.hpp"
#include "machine/index_copy.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"
#include "vorn/share.h"

namespace host {
namespace {

constexpr off_t kLargestIndex = off_t{64} << 30;

// What was found out in this run.
struct Answers {
  std::unordered_set<std::string> refused;
  std::string kept;  // the share whose copy is there
};

Answers& answers() {
  static Answers found;
  return found;
}

std::string copy_path() {
  return scratch_folder() + "/" VORN_INDEX_COPY;
}

// An index as it is opened: by its folder, so that what lies beside it is of the same folder.
struct OpenIndex {
  Fd folder;
  std::string name;
  Fd file;
  struct stat status {};
};

OpenIndex open_index(const std::string& path) {
  if (path.front() != '/') {
    throw IndexRefusal{"its path is not absolute", "run vornctl share set NAME file_index /PATH"};
  }
  const std::size_t name = path.rfind('/') + 1;
  OpenIndex index;
  index.name = path.substr(name);
  index.folder = Fd(open(path.substr(0, name).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (index.folder) {
    index.file = open_regular(index.folder.get(), index.name.c_str());
  }
  if (!index.file || fstat(index.file.get(), &index.status) != 0) {
    throw IndexRefusal{errno == ELOOP || errno == EINVAL || errno == ENXIO ? "it is no regular file"
                                                                           : std::strerror(errno)};
  }
  return index;
}

// With changes of it in another file, it is not whole by itself.
void refuse_open_changes(const OpenIndex& index) {
  for (const char* end : {"-journal", "-wal"}) {
    const std::string name = index.name + end;
    struct stat status {};
    if (fstatat(index.folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
        (!S_ISREG(status.st_mode) || status.st_size > 0)) {
      throw IndexRefusal{"it is being written: " + name + " is not empty"};
    }
  }
}

void refuse_changed(const OpenIndex& index) {
  struct stat now {};
  const auto same_time = [](const timespec& one, const timespec& two) {
    return one.tv_sec == two.tv_sec && one.tv_nsec == two.tv_nsec;
  };
  if (fstat(index.file.get(), &now) != 0 || now.st_size != index.status.st_size ||
      !same_time(now.st_mtim, index.status.st_mtim) ||
      !same_time(now.st_ctim, index.status.st_ctim)) {
    throw IndexRefusal{"it was written while it was read"};
  }
}

// A copy may take twice what the index takes, and as much again must be left for the run's rows.
void refuse_too_large(const OpenIndex& index) {
  struct statvfs room {};
  if (statvfs(scratch_folder().c_str(), &room) != 0) {
    throw IndexRefusal{"the run's folder " + scratch_folder() + ": " + std::strerror(errno),
                       "run the report again"};
  }
  const unsigned long long free = room.f_bavail * room.f_frsize;
  if (index.status.st_size > kLargestIndex) {
    throw IndexRefusal{"it is larger than 64 GiB"};
  }
  if (static_cast<unsigned long long>(index.status.st_size) > free / 4) {
    throw IndexRefusal{"it is larger than a quarter of what is free in " VORN_PATH_STAT,
                       "free some space there"};
  }
}

void take_over(const std::string& path) {
  if (scratch_folder().empty()) {
    throw IndexRefusal{"no report runs in this process", "ask in a run only"};
  }
  const OpenIndex index = open_index(path);
  refuse_too_large(index);
  refuse_open_changes(index);
  copy_index(index.file.get(), index.status.st_size, copy_path());
  refuse_open_changes(index);
  refuse_changed(index);
}

void remove_copy() {
  answers().kept.clear();
  if (!scratch_folder().empty()) {
    unlink(copy_path().c_str());
  }
}

void refuse(const Share& share, const IndexRefusal& refusal) {
  remove_copy();
  answers().refused.insert(share.name);
  log_line(R"(share "%s": its file index %s can't be used (%s), so its folders are walked; %s)",
           share.name.c_str(), share.file_index.c_str(), refusal.reason.c_str(),
           refusal.advice.c_str());
  tell_incident("index_refused", share.name,
                "the file index of share " + share.name + " can't be used (" + refusal.reason +
                    "), so its folders were walked; " + refusal.advice);
}

bool is_usable(const Share& share) {
  if (answers().kept == share.name || answers().refused.contains(share.name)) {
    return answers().kept == share.name;
  }
  remove_copy();
  if (share.file_index.empty()) {
    return false;
  }
  try {
    take_over(share.file_index);
    answers().kept = share.name;
    return true;
  } catch (const IndexRefusal& refusal) {
    refuse(share, refusal);
  } catch (const std::bad_alloc&) {
    refuse(share, {"no memory", "free some memory"});
  }
  return false;
}

}  // namespace
}  // namespace host

int VORNShareFileIndexIsEnabled(const char* share) try {
  const host::ErrnoKeeper keeper;
  const host::Share* found = host::find_share(share);
  return found != nullptr && host::is_usable(*found) ? 1 : 0;
} catch (...) {
  return 0;
}

int VORNShareFileIndexDBPathGet(const char* share, char* path, size_t size) try {
  if (share == nullptr || path == nullptr || *share == '\0' || host::answers().kept != share) {
    errno = ENOENT;
    return -1;
  }
  const std::string copy = host::copy_path();
  if (copy.size() >= size) {
    errno = ENAMETOOLONG;
    return -1;
  }
  std::memcpy(path, copy.c_str(), copy.size() + 1);
  return 0;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
