// The mount table, read with libmount.
#ifndef VORN_HOST_MOUNTS_HPP
#define VORN_HOST_MOUNTS_HPP

#include <sys/types.h>

#include <string>
#include <vector>

#include "vorn/share.h"

namespace host {

struct Mount {
  int id = 0;
  dev_t device = 0;
  std::string root;    // the folder of the file system that is mounted: "/" is all of it
  std::string target;  // where
  std::string type;
  VornFsKind kind = VORN_FS_OTHER;
  bool has_user_quotas = false;  // usage of users is counted, by its options or the kernel's word
  bool visible = true;           // no later mount covers it
  bool is_folder = true;         // containers mount single files too
  bool holds_share = false;      // set by those who ask for volumes
};

inline constexpr const char* kOwnMountTable = "/proc/self/mountinfo";

// The mounts of a table in mountinfo format, in mount order; empty when it can't be read. An entry
// is invisible when a later one has the same target.
std::vector<Mount> read_mounts(const char* table);

// Whether a mount of this kind doesn't answer. Only those with a server or daemon behind them are
// tried (base/silence.hpp).
bool hangs(VornFsKind kind, const std::string& target);

// The mounts of this process. What is visible, what is a folder and what has quotas that its
// options don't tell is asked of the kernel, for file systems of walked kinds (asking a dead
// network server could take for ever).
std::vector<Mount> read_own_mounts();

// Those of `mounts` that are visible folders of walked kinds on a device with several such mounts.
std::vector<const Mount*> shared_mounts(const std::vector<Mount>& mounts);

// The mount that holds `path` (links followed), or null.
const Mount* mount_holding(const std::vector<Mount>& mounts, const char* path);

}  // namespace host

#endif
