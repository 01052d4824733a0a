// The time that the comparison of contents may take: the profile's key `duplicate_compare_minutes`.
#pragma once

#include <cstdint>

#include "vorn/text.h"

namespace vornreport {

// Begins a report's comparison, with the limit that its profile sets; a bad one is one log line and
// none. The platform keeps the time, so that one huge file's digest ends in time as well.
void begin_compare_limit(const VLIBCSzHash* profile_hash);
void end_compare_limit();

// Whether the time is over. To be asked before something is done for files of `size` bytes, since
// the report then tells, once, that it wasn't.
bool past_compare_limit(uint64_t size);

}  // namespace vornreport
