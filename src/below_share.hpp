// Gathered files, reached again: below their share's folder and through no link, which a user may
// have put in their way since.
#pragma once

#include <sys/stat.h>

namespace vornreport {

// Opens the gathered file `path` with the flags `flags` (O_CLOEXEC and O_NOFOLLOW are added).
// `share_folder` is the folder of its share; null or a folder that `path` doesn't lie in: only a
// link in the last place is refused. A descriptor for the caller, or -1 as open().
int open_below_share(const char* share_folder, const char* path, int flags);

// What the file is now. False when it isn't there, or can't be reached so.
bool stat_below_share(const char* share_folder, const char* path, struct stat& status);

}  // namespace vornreport
