// Gathered files, reached again: below their share's folder and through no link, which a user may
// have put in their way since.
#pragma once

#include <sys/stat.h>

#include "vornreport/handles.hpp"

namespace vornreport {

// A handle (O_PATH) of what `path` names: nothing is opened by it, so no pipe finds its reader and
// no device starts. A link in the last place is named itself. `share_folder` is the folder of its
// share. Any thread may call it. None, with errno: ENOENT when it is null, EXDEV when `path`
// doesn't lie in it or climbs by "..", else as open().
Descriptor open_below_share(const char* share_folder, const char* path);

// What the file is now. False when it isn't there, or can't be reached so; errno is left alone.
bool stat_below_share(const char* share_folder, const char* path, struct stat& status);

}  // namespace vornreport
