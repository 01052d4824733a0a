// Volumes: the mounted file systems that hold users' data, each device once.
#ifndef VORN_VOLUME_H
#define VORN_VOLUME_H

#include <stddef.h>

#include "vorn/text.h"

#ifdef __cplusplus
extern "C" {
#endif

// Makes `*hash` (freed by the caller): share name to the mount path of the volume that holds the
// share's folder. A share whose folder doesn't exist is left out. 0, or -1 with `*hash` null.
int VornQazGetVolumePathHash(VLIBCSzHash** hash);

// Writes the identifier of the volume mounted at `mount_path`: a short text, the same from run to
// run, fit for a quoted JavaScript string and a quoted CSV field. Never fails for a volume of the
// mount table, also when its path was cut at 15 or 31 bytes. The length, or -1 for a null or empty
// argument or a buffer below 64 bytes.
int VornQazVolumeGetId(const char* mount_path, char* id, size_t size);

#ifdef __cplusplus
}
#endif

#endif
