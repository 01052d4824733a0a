// The end of a run that gets no more memory.
#pragma once

#include "vorn/text.h"

namespace vornreport {

// From now on an allocation that fails ends the process: one line in the log, what the run has
// begun is removed, and its status is "fail". A profile of null has no run to end; texts and hash
// stay the caller's and live until the next call. Where there is no room even for what that takes,
// the first call ends the process: one line on standard error, status 1.
void end_without_memory(const char* profile, const VLIBCSzHash* profile_hash);

// Makes room for what a run that fails has to do still: calls that were refused memory fail it too.
void release_memory_reserve();

}  // namespace vornreport
