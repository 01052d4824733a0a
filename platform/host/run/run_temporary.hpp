// The names in /tmp that a run uses; they carry its process id.
#ifndef VORN_HOST_RUN_TEMPORARY_HPP
#define VORN_HOST_RUN_TEMPORARY_HPP

#include <sys/types.h>

namespace host {

// Makes the names of this process anew, as empty files of mode 0600, whatever stood there before.
// False after one log line, with none of them left.
//
// The program and the shell commands that it runs open these names by path. That is safe from here
// on: the files are ours, and nobody else can rename or remove them in a folder that is sticky or
// that only its owner writes to; any other kind of /tmp is refused.
bool claim_temporary_names();

// Removes this user's names of processes that are no more.
void remove_dead_names();

// Removes the names of process `pid`.
void remove_temporary_names(pid_t pid);

}  // namespace host

#endif
