// Kinds of file systems, by what statfs says and by the names of the mount table.
#ifndef VORN_HOST_FILE_SYSTEM_HPP
#define VORN_HOST_FILE_SYSTEM_HPP

#include <string_view>

#include "vorn/share.h"

namespace host {

// The kind for statfs' f_type. FUSE is VORN_FS_OTHER here: only the mount table names its make.
VornFsKind kind_of_magic(unsigned long magic);

// The kind for a type of the mount table ("ext4", "fuse.glusterfs").
VornFsKind kind_of_name(std::string_view type);

// The kind that the walk of a share is told for `path`, which is on a file system of `kind`: on the
// network it counts as a cluster's when the share is walked there too.
VornFsKind kind_in_walk(VornFsKind kind, std::string_view path);

// Whether files on such a file system are counted.
constexpr bool is_walked(VornFsKind kind) {
  return kind != VORN_FS_OTHER && kind != VORN_FS_REMOTE;
}

}  // namespace host

#endif
