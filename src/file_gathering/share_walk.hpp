// Gathering by walking a share's folders.
#pragma once

#include <sqlite3.h>

#include <chrono>

#include "vorn/text.h"

namespace vornreport {

// Adds one row for every regular file below `szFolderPath`, depth first, in the order the folders
// yield their entries. Left out: folders named "@eaDir", folders on file systems of other kinds
// than those walked, links and other special files. `threads` look ahead, which changes nothing of
// this; 0 for as many as give speed. When none of them gets an answer of the file system for
// `silence`, what isn't known by then counts as unreadable. 0 when the folder could be read,
// whatever happened to single entries (each is logged); -1 for a null argument or an unreadable
// folder.
int ReportShareWalk(sqlite3* db, const char* szShareName, const char* szFolderPath,
                    const VLIBCSzHash* pshFileType, unsigned threads = 0,
                    std::chrono::milliseconds silence = std::chrono::minutes(2));

}  // namespace vornreport
