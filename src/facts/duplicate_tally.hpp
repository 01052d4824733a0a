// What duplicates take: the files of each group, where a physical file counts once, whatever paths
// show it.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <set>
#include <string>
#include <utility>

#include "report_format/facts.hpp"

namespace vornreport {

class DuplicateTally {
 public:
  explicit DuplicateTally(bool by_content) { facts_.by_content = by_content; }

  // Adds a file to the open group. It is looked at below the share's folder and through no link;
  // one that can't be is told apart by its path. `share_folder` may be null.
  void file(const char* share_folder, const char* path);
  // Ends the group, whose files have `size` bytes each.
  void end_group(uint64_t size);

  const report_format::DuplicateFacts& facts() const { return facts_; }

 private:
  report_format::DuplicateFacts facts_;
  std::set<std::pair<dev_t, ino_t>> inodes_;  // of the open group
  std::set<std::string> paths_;               // of those that have none
};

}  // namespace vornreport
