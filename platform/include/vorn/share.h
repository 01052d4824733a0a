// Shares: the sections of share.conf (see VORN_PATH_SHARES), and the file systems they lie on.
//
// A share name is 1 to 64 bytes of UTF-8 without control characters, quotes, backslash, '<', '>',
// '/', comma or tab; it is no number (the statistics columns would turn 007 into 7) and doesn't
// begin with '=', '+', '-' or '@' (it is the first, unformatted field of a CSV line).
#ifndef VORN_SHARE_H
#define VORN_SHARE_H

#include <stddef.h>

#include "vorn/text.h"

#ifdef __cplusplus
extern "C" {
#endif

// Kinds of shares to enumerate. This platform has one kind and ignores the flags.
enum { VORN_SHARE_ENUM_ALL = 0x207 };

// Appends the names of all usable shares to `*list` in file order; a bad name is skipped with one
// syslog line. The number of shares, or -1 when share.conf can't be read.
int VORNShareEnum(VLIBCSzList** list, int flags);

// Writes the folder of `share` into `path` (`size` bytes): absolute, without a slash at the end
// ("/" stays as it is), at most 2048 bytes so that half of a path buffer is left for what is in it.
// 0; -1 when the share is unknown, has no path, or has one that the product can't work with (not
// absolute, a single quote or control character in it, too long), with one syslog line.
int VORNSharePathGet(const char* share, char* path, size_t size);

// Non-zero when the share keeps a file index (the key `file_index` of its section) that can be
// imported to its end. Whoever writes the index is no friend of this process, so nothing but its
// table's rows is used: they are checked and copied to a database of the run's own, which takes the
// time of reading it. One that isn't in order is refused as a whole: one syslog line and an
// incident (VornQazSetIncidentSink) say why, and the share counts as one without an index. Asking
// again is answered without reading again, as long as no other share's index was taken over in
// between. Only in a report run (VornQazInitRealPath); without one every index is refused. errno
// stays.
int VORNShareFileIndexIsEnabled(const char* share);
// Writes the path of that database, which lasts until another share is asked about or the run ends:
// a table `file_info` as the index has it, of files only, whose owners are accounts. 0; -1 for a
// share whose index wasn't asked about or was refused.
int VORNShareFileIndexDBPathGet(const char* share, char* path, size_t size);

// Kinds of file systems. Those below are walked but for VORN_FS_REMOTE.
enum VornFsKind {
  VORN_FS_OTHER = 0,   // kernel file systems, FUSE of unknown make, removable media formats
  VORN_FS_EXT = 1,     // ext2, ext3, ext4
  VORN_FS_XFS = 2,     // XFS, F2FS
  VORN_FS_COW = 3,     // Btrfs, ZFS, bcachefs
  VORN_FS_MEMORY = 4,  // tmpfs, overlay
  VORN_FS_REMOTE = 5,  // NFS, CIFS: counted on the server that owns them
  VORN_FS_CLUSTER = 6  // CephFS, GlusterFS, Lustre, GPFS, OCFS2, GFS2
};

// The kind of the file system that holds `path` (a VornFsKind), or -1 when it can't be told. Within
// the share whose folder was asked for last (VORNSharePathGet), a network file system is of the
// kind VORN_FS_CLUSTER when the share's section says `network = yes`, so that it is walked. `flags`
// must be 0.
int VORNGetFSType(const char* path, int flags);

#ifdef __cplusplus
}
#endif

#endif
