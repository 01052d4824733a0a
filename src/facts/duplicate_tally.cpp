#include "facts/duplicate_tally.hpp"

#include <sys/stat.h>

#include "below_share.hpp"

namespace vornreport {

void DuplicateTally::file(const char* share_folder, const char* path) {
  struct stat status {};
  if (stat_below_share(share_folder, path, status)) {
    inodes_.emplace(status.st_dev, status.st_ino);
  } else {
    paths_.emplace(path);
  }
}

void DuplicateTally::end_group(uint64_t size) {
  const uint64_t files = inodes_.size() + paths_.size();
  inodes_.clear();
  paths_.clear();
  if (files == 0) {
    return;
  }
  ++facts_.groups;
  facts_.files += files;
  uint64_t bytes = 0;
  if (__builtin_mul_overflow(files - 1, size, &bytes) ||
      __builtin_add_overflow(facts_.reclaimable, bytes, &facts_.reclaimable)) {
    facts_.reclaimable = UINT64_MAX;
  }
}

}  // namespace vornreport
