// Volumes: the mounted file systems that hold users' data, each device once.
#ifndef VORN_VOLUME_H
#define VORN_VOLUME_H

#include <stddef.h>

#include "vorn/text.h"

#ifdef __cplusplus
extern "C" {
#endif

// One volume of an enumeration, in the order of the mount table.
typedef struct VORNMountVolInfo {
  char* path;                    // mount path; never empty
  unsigned long long free_size;  // bytes free for users
  // Bytes used or free for users. Their difference is what is used, as df shows it, and their
  // ratio is df's; what a file system reserves for root is in neither.
  unsigned long long total_size;
  struct VORNMountVolInfo* next;
} VORNMountVolInfo;

// Which volumes: all that hold users' data, or those of them that have users' quotas; where none
// has, all again, so that the quota tool itself says what is the matter.
enum { VORN_VOLUMES_OF_USAGE = 11, VORN_VOLUMES_OF_QUOTA = 15 };

// The mounted volumes, freed by the caller; null when there are none. `filter` must be null. A
// volume that can't be measured is left out, with one syslog line and an incident
// ("volume_unknown"). What was measured counts for five minutes: a run stores a sample and compares
// with it a moment later, and what is written in between must not pass for growth.
VORNMountVolInfo* VORNMountVolAllEnum(const char* filter, int selector);
// Frees the whole list; accepts null.
void VORNMountVolInfoFree(VORNMountVolInfo* volumes);

// Makes `*hash` (freed by the caller): share name to the mount path of the volume that holds the
// share's folder (of a share with `network = yes` also a network file system, which is no volume of
// the enumeration). A share whose folder doesn't exist is left out. 0, or -1 with `*hash` null.
int VornQazGetVolumePathHash(VLIBCSzHash** hash);

// Writes the mount path of the volume that holds `path` (links followed), as the enumeration has
// it, into `mount_path`; of a path on a file system that is no volume the mount's own. The length,
// or -1 when it can't be told or doesn't fit.
int VORNVolumeOfPath(const char* path, char* mount_path, size_t size);

// Appends to `*list` the mount paths below which the files of another mount may be found again: of
// each device with several mounts, each of a folder on a walked file system that answers. Their
// number, or -1 for a null list or without memory.
int VORNMountSharedEnum(VLIBCSzList** list);

// Non-zero when the volume mounted at `mount_path` keeps users' quotas, by its mount options
// or the kernel's word.
int VORNVolumeHasQuotas(const char* mount_path);

// Writes the identifier of the volume mounted at `mount_path`: a short text, the same from run to
// run, fit for a quoted JavaScript string and a quoted CSV field. Never fails for a volume of the
// mount table, also when its path was cut at 15 or 31 bytes: the identifier is then that of the
// volume whose path begins so. Where several do, nobody can tell which is meant; all have one
// identifier then, of the cut path and "...", and a syslog line says so once. The length, or -1 for
// a null or empty argument or a buffer below 64 bytes.
int VornQazVolumeGetId(const char* mount_path, char* id, size_t size);

#ifdef __cplusplus
}
#endif

#endif
