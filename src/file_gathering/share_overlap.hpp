// Shares that hold the same files: one folder twice, one inside the other, through bind mounts and
// links. Sums over shares count such files twice, so it is an incident.
#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace vornreport {

// Forgets all folders.
void forget_share_folders();
// Notes the top folder of a share that is about to be gathered.
void add_share_folder(const char* share, const char* path);
// Notes, once all shares are, what is mounted below them and may be there a second time.
void add_mounted_folders();
// The walk of `share` is in the folder (device, inode), whose files it counts unless the folder
// above is one that it doesn't: tells when it is another share's top, or was passed by another's
// walk. True when its files are counted elsewhere: by the share whose top it is, which lies inside
// or is the same folder and comes first; or where a walk, this one too, has passed it before.
bool note_share_folder(dev_t device, ino_t inode, const char* share, bool counts);
// Tells of those whose files come from an index, which no walk passes, by their real paths. The
// folders below this share's (by their paths below it, "" for all of it) whose files others count.
std::vector<std::string> note_index_share(const char* share);

}  // namespace vornreport
