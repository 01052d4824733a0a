#include "machine/file_system.hpp"

#include <linux/magic.h>
#include <sys/stat.h>
#include <sys/vfs.h>

#include <array>
#include <cerrno>
#include <unordered_map>

#include "config/shares.hpp"
#include "machine/mounts.hpp"

namespace host {
namespace {

constexpr unsigned long kFuseMagic = FUSE_SUPER_MAGIC;

// The numbers that <linux/magic.h> lacks are those of the file systems' own headers.
struct Entry {
  unsigned long magic;
  std::string_view name;
  VornFsKind kind;
};

constexpr std::array kEntries{
    Entry{EXT4_SUPER_MAGIC, "ext4", VORN_FS_EXT},
    Entry{EXT3_SUPER_MAGIC, "ext3", VORN_FS_EXT},
    Entry{EXT2_SUPER_MAGIC, "ext2", VORN_FS_EXT},
    Entry{XFS_SUPER_MAGIC, "xfs", VORN_FS_XFS},
    Entry{F2FS_SUPER_MAGIC, "f2fs", VORN_FS_XFS},
    Entry{BTRFS_SUPER_MAGIC, "btrfs", VORN_FS_COW},
    Entry{0x2FC12FC1, "zfs", VORN_FS_COW},
    Entry{0xCA451A4E, "bcachefs", VORN_FS_COW},
    Entry{TMPFS_MAGIC, "tmpfs", VORN_FS_MEMORY},
    Entry{OVERLAYFS_SUPER_MAGIC, "overlay", VORN_FS_MEMORY},
    Entry{NFS_SUPER_MAGIC, "nfs", VORN_FS_REMOTE},
    Entry{NFS_SUPER_MAGIC, "nfs4", VORN_FS_REMOTE},
    Entry{CIFS_SUPER_MAGIC, "cifs", VORN_FS_REMOTE},
    Entry{SMB2_SUPER_MAGIC, "smb3", VORN_FS_REMOTE},
    Entry{SMB_SUPER_MAGIC, "smbfs", VORN_FS_REMOTE},
    Entry{CEPH_SUPER_MAGIC, "ceph", VORN_FS_CLUSTER},
    Entry{kFuseMagic, "fuse.ceph", VORN_FS_CLUSTER},
    Entry{kFuseMagic, "fuse.ceph-fuse", VORN_FS_CLUSTER},
    Entry{kFuseMagic, "fuse.glusterfs", VORN_FS_CLUSTER},
    Entry{0x0BD00BD0, "lustre", VORN_FS_CLUSTER},
    Entry{0x47504653, "gpfs", VORN_FS_CLUSTER},
    Entry{OCFS2_SUPER_MAGIC, "ocfs2", VORN_FS_CLUSTER},
    Entry{0x01161970, "gfs2", VORN_FS_CLUSTER},
};

// The make of the FUSE file system at `path`, remembered by device: a walk asks for every folder.
VornFsKind fuse_kind(const char* path) {
  static std::unordered_map<dev_t, VornFsKind> known;
  struct stat status {};
  if (stat(path, &status) != 0) {
    return VORN_FS_OTHER;
  }
  const auto [entry, added] = known.try_emplace(status.st_dev, VORN_FS_OTHER);
  if (added) {
    const auto mounts = read_mounts(kOwnMountTable);
    const Mount* mount = mount_holding(mounts, path);
    entry->second = mount == nullptr ? VORN_FS_OTHER : mount->kind;
  }
  return entry->second;
}

}  // namespace

VornFsKind kind_of_magic(unsigned long magic) {
  for (const Entry& entry : kEntries) {
    if (entry.magic == magic && magic != kFuseMagic) {
      return entry.kind;
    }
  }
  return VORN_FS_OTHER;
}

VornFsKind kind_of_name(std::string_view type) {
  for (const Entry& entry : kEntries) {
    if (entry.name == type) {
      return entry.kind;
    }
  }
  return VORN_FS_OTHER;
}

VornFsKind kind_in_walk(VornFsKind kind, std::string_view path) {
  return kind == VORN_FS_REMOTE && is_in_network_share(path) ? VORN_FS_CLUSTER : kind;
}

}  // namespace host

int VORNGetFSType(const char* path, int flags) try {
  struct statfs found {};
  if (path == nullptr || flags != 0) {
    errno = EINVAL;
    return -1;
  }
  int result = -1;
  do {
    result = statfs(path, &found);
  } while (result != 0 && errno == EINTR);
  if (result != 0) {
    return -1;
  }
  // Signed and of another width on some machines; the numbers are 32 bits everywhere.
  const auto magic = static_cast<unsigned long>(found.f_type) & 0xFFFFFFFFUL;
  return host::kind_in_walk(
      magic == host::kFuseMagic ? host::fuse_kind(path) : host::kind_of_magic(magic), path);
} catch (...) {
  errno = ENOMEM;
  return -1;
}
