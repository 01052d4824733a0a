// The system calls of a look at a folder. They may be made by any thread.
#pragma once

#include <cstddef>

#include "look_ahead.hpp"

namespace vornreport {

// Look-ups that follow no link and don't set off an automount either: autofs is never walked.
int look_at(int parent, const char* name, struct stat& status);

// Opens the folder `name` of an open one, through no link. Its handle, or -1 with errno.
int open_folder_at(int parent, const char* name);

// Opens a folder anew whose handle was given up: below the top folder's handle, through no link. -1
// with errno; ESTALE when another folder stands there by now.
int open_again(const Folder& folder);

// How far a batch got.
struct Listed {
  bool at_end;
  int error;  // why it could be read no further, 0 when it could
};
// Reads on in the folder (its handle is open), some `most` entries, and examines them in the order
// of their inode numbers, which is roughly the order in which they lie on a disk.
Listed list_batch(Folder& folder, size_t most, Batch& batch);

}  // namespace vornreport
